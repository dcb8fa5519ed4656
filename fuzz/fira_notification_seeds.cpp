#include "fuzz/generic_message.h"
#include "fuzz/seed_recorder.h"
#include "net/fira_region.h"
#include "sim/fira_notification.h"
#include "sim/fira_region_sim.h"
#include "sim/world.h"

using hardware::dalix::UniqueNlMsg;
using hardware::dalix::fuzz::SeedRecorder;
namespace sim = hardware::dalix::sim;

namespace {

// The fuzzer's input for |data|: the command byte, then the attributes.
std::string Input(const sim::FiraNotificationData& data) {
  UniqueNlMsg msg;
  if (!sim::EncodeFiraNotification(msg.get(), 0x1d, data)) return std::string();
  return hardware::dalix::fuzz::SeedOf(msg.get());
}

}  // namespace

// Rounds of the simulated FiRa region with every kind of angle report and
// peer outcome, and the stopped notice.
bool WriteSeeds(SeedRecorder& recorder) {
  sim::World world;
  world.PlaceRadio(1, {{0, 0, 1}, 0.3, 0.1});
  world.AddPeer({0x0101, 1, sim::Motion::Standing({3, 1, 0})});
  world.AddPeer({0x0202, 2, sim::Motion::Circle({0, 0, 2}, 4, 1)});
  world.AddPeer({0x0303, 3, sim::Motion::Line({1, -2, 0}, {0, 1, 0}, 1)});
  world.SetLineOfSight(0x0202, false);
  world.SetStopped(0x0303, true);
  world.AddPeer({0x0404, 4, sim::Motion::Standing({900, 0, 0})});
  world.SetRangeLimit(100);
  sim::FiraRegionSim region(&recorder.simulator(), &recorder.radios(), &world);

  sim::SimFiraSession session;
  session.hw_index = 1;
  session.session_id = 7;
  for (uint16_t peer : {0x0101, 0x0202, 0x0303, 0x0404, 0x0505}) {
    session.controlees.push_back({peer, std::nullopt});
  }
  using P = std::map<int, uint32_t>;
  const std::pair<const char*, P> settings[] = {
      {"distance_only", {}},
      {"raw_angles", {{43, 1}, {45, 1}, {46, 1}, {47, 1}, {32, 255}}},
      {"pair_nests", {{43, 1}, {32, 1}, {33, 2}}},
      {"pair_mode", {{43, 1}, {32, 1}, {35, 1}, {45, 1}}},
  };
  bool written = true;
  for (const auto& [name, params] : settings) {
    session.params = params;
    written &= recorder.Write(name, Input(region.RoundData(session, world.epoch_ns() + 500000000)));
  }
  sim::FiraNotificationData stopped;
  stopped.hw_index = 0;
  stopped.session_id = 7;
  stopped.stopped = true;
  written &= recorder.Write("stopped", Input(stopped));
  return written;
}
