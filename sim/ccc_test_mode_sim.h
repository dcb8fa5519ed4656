#pragma once

#include <cstdint>
#include <mutex>
#include <optional>
#include <vector>

#include <netlink/attr.h>
#include <netlink/msg.h>

#include "sim/family_handler.h"
#include "sim/radio_store.h"
#include "sim/responder.h"

namespace hardware {
namespace dalix {
namespace sim {

// The simulated driver's test mode, as far as CCC uses it: a session start
// carrying a channel and a 32-bit value, answered with a reply whose test
// data holds a return code (non-zero for success). A refusal instead of the
// reply is a command fault of DriverSimulator. Requests are handled on the
// simulator thread; tests set the return code and read the starts from any
// thread.
class CccTestModeSim {
 public:
  // One session start as the driver received it.
  struct Start {
    uint32_t hw_index = 0;
    uint8_t channel = 0;
    uint32_t u32_param = 0;
  };

  explicit CccTestModeSim(RadioStore* radios) : radios_(radios) {}

  // Handles MCPS802154_CMD_TESTMODE; |attrs| parsed at top level.
  void TestMode(const Request& request, nlattr** attrs, Responder& responder);

  // The code the next replies carry; nothing leaves it out of the test data.
  void SetReturnCode(std::optional<uint8_t> code);
  std::vector<Start> Starts() const;

  // The reply's attributes after its generic netlink header.
  static bool EncodeTestModeReply(nl_msg* msg, uint32_t hw_index,
                                  std::optional<uint8_t> return_code);

 private:
  RadioStore* const radios_;
  mutable std::mutex mutex_;
  std::optional<uint8_t> return_code_ = 1;
  std::vector<Start> starts_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
