#pragma once

#include <stdint.h>

#include <vector>

#include <android/binder_auto_utils.h>

namespace hardware {
namespace dalix {

// Argument helpers shared by the HAL objects and the driver message encoders.
// Stateless; callable from any thread.

// The status every HAL object returns for a bad client argument:
// EX_ILLEGAL_ARGUMENT with the printf-style message (at most 1023
// characters), which is also logged at ERROR.
ndk::ScopedAStatus IllegalArgument(const char* format, ...) __attribute__((format(printf, 1, 2)));

// OK for channels 0 to 15; anything else is an illegal argument naming the
// channel. Deliberately looser than what any radio supports.
ndk::ScopedAStatus CheckUwbChannelRange(int channel);

// The 16-bit short address held by a 2-byte address, first byte high.
// Any other size sets |*ok| to false and gives 0.
uint16_t ToShortAddress(const std::vector<uint8_t>& bytes, bool* ok);

}  // namespace dalix
}  // namespace hardware
