#include <binder_host/parcel_check.h>

#include <string.h>

namespace ndk {
namespace host {
namespace {

size_t PaddedTo4(size_t bytes) { return (bytes + 3) & ~size_t{3}; }

// The UTF-16 units |text| becomes; |text| must be valid UTF-8.
size_t Utf16Length(const std::string& text) {
  size_t units = 0;
  for (unsigned char byte : text) {
    if ((byte & 0xC0) != 0x80) units += byte >= 0xF0 ? 2 : 1;
  }
  return units;
}

}  // namespace

ParcelCheck::ParcelCheck(const char* descriptor) {
  // Strict-mode policy, work source and partition header, then the name.
  size_ += 12;
  Write(std::string(descriptor));
}

binder_status_t ParcelCheck::status() const {
  if (bad_value_) return STATUS_BAD_VALUE;
  if (size_ > kMaxTransactionBytes) return STATUS_FAILED_TRANSACTION;
  return STATUS_OK;
}

void ParcelCheck::Write(const std::string& text) {
  if (!IsValidUtf8(text)) {
    bad_value_ = true;
    return;
  }
  // Length, then the UTF-16 units and their terminator.
  size_ += 4 + PaddedTo4((Utf16Length(text) + 1) * 2);
}

void ParcelCheck::Write(const std::vector<uint8_t>& bytes) { size_ += 4 + PaddedTo4(bytes.size()); }

bool IsValidUtf8(const std::string& text) {
  const auto* bytes = reinterpret_cast<const unsigned char*>(text.data());
  const size_t length = text.size();
  for (size_t i = 0; i < length;) {
    const unsigned char lead = bytes[i];
    size_t extra;
    uint32_t code_point;
    if (lead < 0x80) {
      ++i;
      continue;
    } else if (lead >= 0xC2 && lead <= 0xDF) {
      extra = 1;
      code_point = lead & 0x1F;
    } else if (lead >= 0xE0 && lead <= 0xEF) {
      extra = 2;
      code_point = lead & 0x0F;
    } else if (lead >= 0xF0 && lead <= 0xF4) {
      extra = 3;
      code_point = lead & 0x07;
    } else {
      return false;  // a continuation byte, an overlong two-byte lead, or beyond U+10FFFF
    }
    if (length - i <= extra) return false;
    for (size_t k = 1; k <= extra; ++k) {
      if ((bytes[i + k] & 0xC0) != 0x80) return false;
      code_point = (code_point << 6) | (bytes[i + k] & 0x3F);
    }
    static constexpr uint32_t kSmallest[] = {0, 0x80, 0x800, 0x10000};
    if (code_point < kSmallest[extra] || code_point > 0x10FFFF) return false;
    if (code_point >= 0xD800 && code_point <= 0xDFFF) return false;
    i += extra + 1;
  }
  return true;
}

}  // namespace host
}  // namespace ndk
