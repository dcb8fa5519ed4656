#include <optional>
#include <string>

#include "fuzz/generic_message.h"
#include "fuzz/seed_recorder.h"
#include "net/mcps802154.h"
#include "sim/ccc_test_mode_sim.h"

using hardware::dalix::MCPS802154_CMD_TESTMODE;
using hardware::dalix::UniqueNlMsg;
namespace sim = hardware::dalix::sim;

// Replies as the simulated driver encodes them: success, failure, no code.
bool WriteSeeds(hardware::dalix::fuzz::SeedRecorder& recorder) {
  bool written = true;
  for (std::optional<uint8_t> code :
       {std::optional<uint8_t>(1), std::optional<uint8_t>(0), std::optional<uint8_t>()}) {
    UniqueNlMsg msg = sim::DriverSimulator::NewEvent(0x1a, MCPS802154_CMD_TESTMODE);
    written &= sim::CccTestModeSim::EncodeTestModeReply(msg.get(), 0, code) &&
               recorder.Write("code_" + (code ? std::to_string(*code) : std::string("none")),
                              hardware::dalix::fuzz::SeedOf(msg.get()));
  }
  return written;
}
