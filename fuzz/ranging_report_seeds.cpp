#include <optional>
#include <string>

#include "fuzz/generic_message.h"
#include "fuzz/seed_recorder.h"
#include "net/mcps802154.h"
#include "sim/simple_ranging_sim.h"

using hardware::dalix::MCPS802154_CMD_RANGING_REPORT;
using hardware::dalix::UniqueNlMsg;
namespace sim = hardware::dalix::sim;

// Reports as the simulated driver encodes them: measured, at the phase
// limits, unmeasured, and without a request id.
bool WriteSeeds(hardware::dalix::fuzz::SeedRecorder& recorder) {
  const sim::RangingReport reports[] = {
      {0u, 250u, sim::SimpleRangingSim::AngleToPhase(0.5), -300},
      {1u, 800u, -32767, 32767},
      {2u, std::nullopt, std::nullopt, std::nullopt},
      {std::nullopt, 5u, 0, 0},
  };
  bool written = true;
  int index = 0;
  for (const sim::RangingReport& report : reports) {
    UniqueNlMsg msg = sim::DriverSimulator::NewEvent(0x1a, MCPS802154_CMD_RANGING_REPORT);
    written &= sim::SimpleRangingSim::EncodeRangingReport(msg.get(), 0, report) &&
               recorder.Write("report_" + std::to_string(index++),
                              hardware::dalix::fuzz::SeedOf(msg.get()));
  }
  return written;
}
