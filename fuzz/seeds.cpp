// The seed program: records the seed corpus of one fuzz target from what the
// simulated driver says to the service's own clients, or encodes (for the
// targets whose input is one message in the form of generic_message.h).
#include <cstdio>
#include <cstring>
#include <map>
#include <optional>
#include <string>

#include <android-base/logging.h>

#include "fuzz/generic_message.h"
#include "fuzz/seed_recorder.h"
#include "net/config_utils.h"
#include "net/fira_region.h"
#include "net/ieee_utils.h"
#include "net/mcps802154.h"
#include "net/mcps_utils.h"
#include "sim/ccc_test_mode_sim.h"
#include "sim/fira_notification.h"
#include "sim/fira_region_sim.h"
#include "sim/simple_ranging_sim.h"
#include "sim/world.h"

namespace hardware {
namespace dalix {
namespace fuzz {
namespace {

// Configuration files in the shapes the service meets: properties,
// calibration values, comments, blanks, and a NUL inside a line.
bool WriteConfigSeeds(SeedRecorder& recorder) {
  return recorder.Write("properties", "# antenna\nAntennaPairs = 1\n  spacing=20 ; mm\n\n") &&
         recorder.Write("calibration",
                        "cal.ch5.tx_power = 0x1F1F1F1F\ncal.ch9.pg_delay=0x34\n;x=1\nbroken\n") &&
         recorder.Write("nul", std::string("key\0x = 1\nvalue = 2\0y\n", 23));
}

// An interface dump and a phy description, with the usual and a broken
// device among them.
bool WriteIeeeSeeds(SeedRecorder& recorder) {
  IeeeUtils ieee(recorder.factory());
  if (!ieee.Setup()) return false;
  std::string error;
  sim::WpanDeviceConfig first{"wpan0", 0};
  first.pages = {{0, {1, 2}}, {4, {1, 5, 9}}};
  sim::WpanDeviceConfig nameless{"wpan1", 1};
  nameless.dump_without_name = true;
  if (!recorder.devices().AddDevice(first, &error) ||
      !recorder.devices().AddDevice(nameless, &error)) {
    LOG(ERROR) << "WriteIeeeSeeds: " << error;
    return false;
  }
  auto exchanges = [&ieee](const char* iface) {
    return [&ieee, iface]() {
      bool ok = false;
      ieee.ListDevices(&ok);
      PhyInfo info;
      ieee.GetPhyInfo(iface, &info);
    };
  };
  return recorder.Write("two_devices", recorder.Record(exchanges("wpan0"))) &&
         recorder.Write("unknown_interface", recorder.Record(exchanges("lo")));
}

// The same 300 keys as the target sends, against a driver that knows all of
// them, some of them, or the radio not at all.
bool WriteMcpsCalibrationSeeds(SeedRecorder& recorder) {
  McpsUtils mcps(recorder.factory());
  if (!mcps.Start()) return false;
  ConfigUtils store;
  for (int i = 0; i < 300; ++i) {
    std::string key = "cal.key_" + std::to_string(i);
    store.Set(key.c_str(), std::to_string(i).c_str());
    if (i % 7 != 3) recorder.radios().AddCalibrationKey(key);
  }
  auto transfer = [&]() { mcps.SetCalibration(0, &store); };
  recorder.radios().AddRadio(0, 0);
  bool written = recorder.Write("some_refused", recorder.Record(transfer));
  for (int i = 3; i < 300; i += 7) {
    recorder.radios().AddCalibrationKey("cal.key_" + std::to_string(i));
  }
  written &= recorder.Write("all_accepted", recorder.Record(transfer));
  recorder.radios().RemoveRadio(0);
  written &= recorder.Write("no_radio", recorder.Record(transfer));
  return written;
}

// A dump of several radios and a single query, in the driver's usual and
// unusual shapes.
bool WriteMcpsHwSeeds(SeedRecorder& recorder) {
  McpsUtils mcps(recorder.factory());
  if (!mcps.Start()) return false;
  auto list_then_get = [&mcps]() {
    bool ok = false;
    mcps.ListHardware(&ok);
    mcps.GetHardwareInfo(0, &ok);
  };
  recorder.radios().AddRadio(0, 0);
  recorder.radios().AddRadio(1, 12);
  bool written = recorder.Write("two_radios", recorder.Record(list_then_get));
  recorder.radios().AddRadio(1, std::nullopt);
  recorder.radios().AddRadio(2, "wpan-phy7");
  recorder.radios().SetReportsScheduler(0, false);
  written &= recorder.Write("odd_radios", recorder.Record(list_then_get));
  recorder.radios().RemoveRadio(0);
  written &= recorder.Write("unknown_index", recorder.Record(list_then_get));
  return written;
}

// The answers of the four exchanges the target makes: a reply, an
// acknowledgement, a reply, an acknowledgement; then the same refused.
bool WriteNlExchangeSeeds(SeedRecorder& recorder) {
  McpsUtils mcps(recorder.factory());
  if (!mcps.Start()) return false;
  recorder.radios().AddRadio(0, 0);
  auto exchanges = [&mcps]() {
    bool ok = false;
    mcps.GetHardwareInfo(0, &ok);
    mcps.SetScheduler(0, McpsScheduler::kDefault, McpsUtils::kNoSlotDuration,
                      McpsUtils::kNoNodeType, false);
    mcps.GetHardwareInfo(0, &ok);
    mcps.SetFiraRegion(0);
  };
  bool written = recorder.Write("answered", recorder.Record(exchanges));
  recorder.radios().RemoveRadio(0);
  written &= recorder.Write("refused", recorder.Record(exchanges));
  return written;
}

// Reports as the simulated driver encodes them: measured, at the phase
// limits, unmeasured, and without a request id.
bool WriteRangingReportSeeds(SeedRecorder& recorder) {
  const sim::RangingReport reports[] = {
      {0u, 250u, sim::SimpleRangingSim::AngleToPhase(0.5), -300},
      {1u, 800u, -32767, 32767},
      {2u, std::nullopt, std::nullopt, std::nullopt},
      {std::nullopt, 5u, 0, 0},
  };
  bool written = true;
  int index = 0;
  for (const sim::RangingReport& report : reports) {
    UniqueNlMsg msg = sim::DriverSimulator::NewEvent(kMessageFamily, MCPS802154_CMD_RANGING_REPORT);
    written &= sim::SimpleRangingSim::EncodeRangingReport(msg.get(), 0, report) &&
               recorder.Write("report_" + std::to_string(index++), SeedOf(msg.get()));
  }
  return written;
}

// Replies as the simulated driver encodes them: success, failure, no code.
bool WriteCccTestModeReplySeeds(SeedRecorder& recorder) {
  bool written = true;
  for (std::optional<uint8_t> code :
       {std::optional<uint8_t>(1), std::optional<uint8_t>(0), std::optional<uint8_t>()}) {
    UniqueNlMsg msg = sim::DriverSimulator::NewEvent(kMessageFamily, MCPS802154_CMD_TESTMODE);
    written &= sim::CccTestModeSim::EncodeTestModeReply(msg.get(), 0, code) &&
               recorder.Write("code_" + (code ? std::to_string(*code) : std::string("none")),
                              SeedOf(msg.get()));
  }
  return written;
}

// Rounds of the simulated FiRa region with every kind of angle report and
// peer outcome, and the stopped notice.
bool WriteFiraNotificationSeeds(SeedRecorder& recorder) {
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
  auto seed = [](const sim::FiraNotificationData& data) {
    UniqueNlMsg msg;
    return sim::EncodeFiraNotification(msg.get(), kMessageFamily, data) ? SeedOf(msg.get())
                                                                        : std::string();
  };

  sim::SimFiraSession session;
  session.hw_index = 1;
  session.session_id = 7;
  for (uint16_t peer : {0x0101, 0x0202, 0x0303, 0x0404, 0x0505}) {
    session.controlees.push_back({peer, std::nullopt});
  }
  const std::pair<const char*, std::map<int, uint32_t>> settings[] = {
      {"distance_only", {}},
      {"raw_angles", {{43, 1}, {45, 1}, {46, 1}, {47, 1}, {32, 255}}},
      {"pair_nests", {{43, 1}, {32, 1}, {33, 2}}},
      {"pair_mode", {{43, 1}, {32, 1}, {35, 1}, {45, 1}}},
  };
  bool written = true;
  for (const auto& [name, params] : settings) {
    session.params = params;
    written &= recorder.Write(name, seed(region.RoundData(session, world.epoch_ns() + 500000000)));
  }
  sim::FiraNotificationData stopped;
  stopped.hw_index = 0;
  stopped.session_id = 7;
  stopped.stopped = true;
  return recorder.Write("stopped", seed(stopped)) && written;
}

}  // namespace
}  // namespace fuzz
}  // namespace dalix
}  // namespace hardware

int main(int argc, char** argv) {
  using namespace hardware::dalix::fuzz;
  const std::map<std::string, bool (*)(SeedRecorder&)> writers = {
      {"ccc_test_mode_reply_fuzzer", WriteCccTestModeReplySeeds},
      {"config_fuzzer", WriteConfigSeeds},
      {"fira_notification_fuzzer", WriteFiraNotificationSeeds},
      {"ieee_fuzzer", WriteIeeeSeeds},
      {"mcps_calibration_fuzzer", WriteMcpsCalibrationSeeds},
      {"mcps_hw_fuzzer", WriteMcpsHwSeeds},
      {"nl_exchange_fuzzer", WriteNlExchangeSeeds},
      {"ranging_report_fuzzer", WriteRangingReportSeeds},
  };
  auto writer = argc == 3 ? writers.find(argv[1]) : writers.end();
  if (writer == writers.end()) {
    fprintf(stderr, "usage: %s FUZZ_TARGET CORPUS_DIRECTORY\n", argv[0]);
    return 2;
  }
  // The exchanges' own lines would drown the build's output.
  android::base::SetMinimumLogSeverity(android::base::ERROR);
  SeedRecorder recorder(argv[2]);
  if (!recorder.Start()) return 1;
  return writer->second(recorder) ? 0 : 1;
}
