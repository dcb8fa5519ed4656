// The CCC test-mode reply handler on arbitrary replies (see
// fuzz/generic_message.h for the input's form).

#include <cstddef>
#include <cstdint>

#include "fuzz/generic_message.h"
#include "net/ccc_region_utils.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  hardware::dalix::UniqueNlMsg msg;
  if (hardware::dalix::fuzz::FrameGenericMessage(data, size, &msg)) {
    hardware::dalix::CccRegionUtils::ParseTestModeCmdResponse(msg.get());
  }
  return 0;
}
