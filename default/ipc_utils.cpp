#define LOG_TAG "dalix.uwb.IpcUtils"

#include "ipc_utils.h"

#include <stdarg.h>
#include <stdio.h>

#include <android-base/logging.h>

namespace hardware {
namespace dalix {
namespace {

// Upper bound of a status message, terminator included.
constexpr size_t kMessageBufferSize = 1024;
// Channel numbers below this pass the range check.
constexpr uint32_t kChannelLimit = 16;
constexpr size_t kShortAddressSize = 2;

}  // namespace

ndk::ScopedAStatus IllegalArgument(const char* format, ...) {
  char message[kMessageBufferSize] = {};
  va_list args;
  va_start(args, format);
  vsnprintf(message, sizeof(message), format, args);
  va_end(args);
  LOG(ERROR) << message;
  return ndk::ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT, message);
}

ndk::ScopedAStatus CheckUwbChannelRange(int channel) {
  // Compared unsigned so that negative channels fail as well.
  if (static_cast<uint32_t>(channel) < kChannelLimit) return ndk::ScopedAStatus::ok();
  return IllegalArgument("Incorrect channel value %d", channel);
}

uint16_t ToShortAddress(const std::vector<uint8_t>& bytes, bool* ok) {
  if (bytes.size() != kShortAddressSize) {
    *ok = false;
    return 0;
  }
  *ok = true;
  return static_cast<uint16_t>((bytes[0] << 8) | bytes[1]);
}

}  // namespace dalix
}  // namespace hardware
