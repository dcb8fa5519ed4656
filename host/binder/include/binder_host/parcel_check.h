#pragma once

// What one transaction would put in a parcel on the device, measured
// without a parcel: its size and whether every value could be written at
// all. The generated proxies fill one for a call's request and one for its
// reply, and fail the call as the platform would when either is refused:
// a String that is not valid UTF-8 cannot be written (STATUS_BAD_VALUE),
// and a parcel above what the binder driver buffers for one transaction is
// refused (STATUS_FAILED_TRANSACTION). Used on one thread at a time.

#include <stddef.h>
#include <stdint.h>

#include <memory>
#include <optional>
#include <string>
#include <type_traits>
#include <vector>

#include <android/binder_interface_utils.h>
#include <android/binder_status.h>

namespace ndk {
namespace host {

class ParcelCheck {
 public:
  // What the binder driver takes in one transaction: its 1 MiB buffer less
  // the two pages it keeps.
  static constexpr size_t kMaxTransactionBytes = 1024 * 1024 - 2 * 4096;

  ParcelCheck() = default;
  // A request: starts with the interface token of |descriptor|.
  explicit ParcelCheck(const char* descriptor);

  // STATUS_OK, or the status the platform fails the transaction with.
  binder_status_t status() const;
  size_t size() const { return size_; }

  // Primitives and enumerations each take at least one 32-bit slot.
  template <typename T, typename = std::enable_if_t<std::is_arithmetic_v<T> || std::is_enum_v<T>>>
  void Write(T) {
    size_ += sizeof(T) > 4 ? 8 : 4;
  }
  void Write(const std::string& text);
  void Write(const std::vector<uint8_t>& bytes);
  template <typename T>
  void Write(const std::vector<T>& values) {
    size_ += 4;
    for (const T& value : values) Write(value);
  }
  template <typename T>
  void Write(const std::optional<T>& value) {
    if (value.has_value()) {
      Write(*value);
    } else {
      size_ += 4;
    }
  }
  // An interface crosses as a flattened binder object and its stability.
  template <typename T, typename = std::enable_if_t<std::is_base_of_v<ICInterface, T>>>
  void Write(const std::shared_ptr<T>&) {
    size_ += kBinderObjectBytes;
  }
  // A parcelable: its presence marker and size, then its fields, written
  // by the CheckParcel overload generated beside each parcelable type.
  template <typename T, typename = std::enable_if_t<std::is_class_v<T>>, typename = void>
  void Write(const T& parcelable) {
    size_ += 8;
    CheckParcel(this, parcelable);
  }

 private:
  static constexpr size_t kBinderObjectBytes = 28;

  size_t size_ = 0;
  bool bad_value_ = false;
};

// Whether |text| is well-formed UTF-8: no stray continuation bytes, no
// overlong forms, no surrogates, nothing above U+10FFFF.
bool IsValidUtf8(const std::string& text);

}  // namespace host
}  // namespace ndk
