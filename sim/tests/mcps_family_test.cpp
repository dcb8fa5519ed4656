#include "sim/mcps_family.h"

#include <iterator>
#include <map>
#include <optional>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "looper/looper_backed_event_loop.h"
#include "net/config_utils.h"
#include "net/mcps802154.h"
#include "net/mcps_utils.h"
#include "sim/driver_simulator.h"
#include "sim/radio_store.h"
#include "sim/sim_nl_socket_factory.h"
#include "sim/simple_ranging_sim.h"
#include "sim/world.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

using ::android::base::ERROR;
using ::android::base::WARNING;

constexpr char kTag[] = "dalix.uwb.McpsUtils";
constexpr uint32_t kHw = 2;
// The next reply to a command is cut short inside its generic netlink header.
const Fault kMalformedOnce{Fault::Kind::kMalformed, 0, 0, 1};

// The service's McpsUtils against the simulated driver, over real sockets.
class McpsFamilyTest : public ::testing::Test {
 protected:
  void SetUp() override {
    family_.SetCommandHandler(MCPS802154_CMD_SET_RANGING_REQUESTS,
                              [this](auto& request, nlattr** attrs, auto& responder) {
                                ranging_.SetRangingRequests(request, attrs, responder);
                              });
    simulator_.RegisterFamily(kMcpsFamilyName, &family_);
    ASSERT_TRUE(simulator_.Start());
    ASSERT_TRUE(mcps_.Start());
    mcps_.SubscribeRangingResults([](const McpsUtils::RangingResult&) {});
  }

  SimRadio Radio(uint32_t hw_index) { return radios_.Radio(hw_index).value_or(SimRadio()); }

  RadioStore radios_;
  McpsFamily family_{&radios_};
  World world_;
  // Its reports run on the simulator, which is stopped before it goes.
  SimpleRangingSim ranging_{&simulator_, &radios_, nullptr, &world_};
  DriverSimulator simulator_;
  LooperBackedEventLoop loop_;
  SimNlSocketFactory factory_{&loop_, simulator_.port()};
  McpsUtils mcps_{&factory_};
  ConfigUtils store_;
  LogCapture log_;
};

TEST_F(McpsFamilyTest, DiscoveryKeepsOnlyRadiosWithAUsablePhyName) {
  bool ok = false;
  // No radio: the dump is NLMSG_DONE alone.
  EXPECT_TRUE(mcps_.ListHardware(&ok).empty());
  // Only a number right after the exact prefix counts; a name longer than the
  // policy allows is refused whole.
  const char* phy_names[] = {
      "phy0", "phy12x", "wpan-phy0", nullptr, "phy", "phyX",          "phy3",
      "phy1", "phy 4",  "Phy1",      "ph",    "",    "phy4294967297", "phy0123456789012345678"};
  for (uint32_t i = 0; i < std::size(phy_names); ++i) {
    radios_.AddRadio(i, phy_names[i] ? std::optional<std::string>(phy_names[i]) : std::nullopt);
  }
  radios_.SetReportsScheduler(6, false);
  // A scheduler name longer than the policy allows reads as none.
  radios_.AddRadio(14, 5u);
  radios_.SetScheduler(14, std::string(kMcpsNameMaxLen, 's'), -1, -1, {});
  radios_.SetScheduler(7, kMcpsSchedulerEndless, -1, -1, {kMcpsRegionFira});
  // A malformed reply is dropped and does not spoil the next dump.
  simulator_.SetCommandFault(kMcpsFamilyName, MCPS802154_CMD_GET_HW, kMalformedOnce);
  EXPECT_TRUE(mcps_.ListHardware(&ok).empty());

  std::vector<std::tuple<uint32_t, uint32_t, std::string>> found;
  for (const McpsHwInfo& info : mcps_.ListHardware(&ok)) {
    found.emplace_back(info.hw_index, info.phy_index, info.scheduler);
  }
  EXPECT_TRUE(ok);
  std::vector<std::tuple<uint32_t, uint32_t, std::string>> expected = {
      {0, 0, "default"}, {1, 12, "default"}, {6, 3, "default"},
      {7, 1, "endless"}, {8, 4, "default"},  {12, 1, "default"},  // truncated to 32 bits
      {14, 5, "default"}};
  EXPECT_EQ(found, expected);
  // The radio without a phy name and the one whose name is too long.
  EXPECT_EQ(log_.Count(WARNING, "ParseHwInfo: Missing mcps attribute", kTag), 2) << log_.Text();
  EXPECT_EQ(log_.Count(WARNING, "ParseHwInfo: Failed to parse mcps attributes", kTag), 0);

  // Index and scheduler are read before the phy name; nothing of a refused record is.
  McpsHwInfo info = mcps_.GetHardwareInfo(2, &ok);
  EXPECT_TRUE(ok);
  EXPECT_EQ(std::tie(info.hw_index, info.phy_index, info.scheduler),
            std::make_tuple(2u, 0u, std::string("default")));
  info = mcps_.GetHardwareInfo(13, &ok);
  EXPECT_EQ(std::tie(info.hw_index, info.scheduler), std::make_tuple(0u, std::string()));
  info = mcps_.GetHardwareInfo(99, &ok);
  EXPECT_FALSE(ok);
  EXPECT_EQ(std::tie(info.hw_index, info.scheduler), std::make_tuple(0u, std::string()));

  simulator_.SetFamilyPresent(kMcpsFamilyName, false);
  EXPECT_FALSE(McpsUtils(&factory_).Start());
  EXPECT_TRUE(log_.Contains(ERROR, "Start: Generic netlink mcps802154 not found.", kTag));
}

TEST_F(McpsFamilyTest, DumpsAreReadWholeHoweverPacked) {
  // Packed, a few hundred radios fill several datagrams, NLMSG_DONE sharing
  // the last. Unpacked, as many would overflow the client's receive buffer:
  // the kernel writes a dump only as fast as it is read, the simulator at once.
  for (auto [datagram_bytes, radios] :
       {std::pair<size_t, uint32_t>(DriverSimulator::kDefaultDumpDatagramBytes, 300),
        {0, 40},
        {100, 40}}) {
    SCOPED_TRACE(datagram_bytes);
    for (uint32_t i = 0; i < radios; ++i) radios_.AddRadio(i, i + 1);
    simulator_.SetDumpDatagramBytes(datagram_bytes);
    bool ok = false;
    std::vector<McpsHwInfo> found = mcps_.ListHardware(&ok);
    EXPECT_TRUE(ok);
    ASSERT_EQ(found.size(), radios);
    for (uint32_t i = 0; i < radios; ++i) EXPECT_EQ(found[i].phy_index, i + 1);
    for (uint32_t i = 0; i < radios; ++i) radios_.RemoveRadio(i);
  }
}

// The service's own changes are proved end to end; these are the ones the
// kernel refuses, and the parameters-only change the service does not use.
TEST_F(McpsFamilyTest, SchedulerChangesAreCheckedAndOnlySimpleRangingTakesRequests) {
  radios_.AddRadio(0, 0u);
  radios_.SetScheduler(0, kMcpsSchedulerSimpleRanging, 16, 0, {});
  EXPECT_TRUE(mcps_.SetScheduler(0, McpsScheduler::kSimpleRanging, McpsUtils::kNoSlotDuration,
                                 McpsUtils::kResponder, true));
  const struct {
    const char* what;
    int scheduler, slot_duration, node_type;
    bool params_only;
  } refused[] = {
      {"simple ranging without parameters", 1, -1, -1, false},
      {"parameters of another scheduler", 2, 16, 0, true},
      {"unknown scheduler", 7, -1, -1, false},
      {"endless without region", 2, -1, -1, false},
      {"default with a parameter", 0, 16, -1, false},
  };
  for (const auto& change : refused) {
    EXPECT_FALSE(mcps_.SetScheduler(0, static_cast<McpsScheduler>(change.scheduler),
                                    static_cast<McpsUtils::SlotDuration>(change.slot_duration),
                                    static_cast<McpsUtils::NodeType>(change.node_type),
                                    change.params_only))
        << change.what;
  }
  SimRadio radio = Radio(0);
  EXPECT_EQ(std::tie(radio.scheduler, radio.slot_duration, radio.node_type),
            std::make_tuple(std::string(kMcpsSchedulerSimpleRanging), 16, 1));
  EXPECT_FALSE(mcps_.SetFiraRegion(9));  // no such radio

  McpsUtils::RangingRequest request;
  request.peerAddress = 0x0102030405060708;
  EXPECT_TRUE(mcps_.SetRangingRequests(0, {request}));
  ASSERT_TRUE(mcps_.SetFiraRegion(0));
  EXPECT_FALSE(mcps_.SetRangingRequests(0, {request}));
}

TEST_F(McpsFamilyTest, CalibrationArrivesWholeOrFailsTheTransfer) {
  radios_.AddRadio(kHw, 0u);
  std::map<std::string, uint32_t> values;
  for (uint32_t i = 0; i < 400; ++i) {
    const std::string key = "bench.key" + std::to_string(1000 + i);
    radios_.AddCalibrationKey(key);
    store_.Set(key.c_str(), std::to_string(i).c_str());
    values[key] = i;
  }
  ASSERT_TRUE(mcps_.SetCalibration(kHw, &store_));
  EXPECT_EQ(Radio(kHw).calibration, values);
  // 400 elements of 32 bytes take 13 kB: four pages.
  EXPECT_EQ(Radio(kHw).calibration_messages, 4);

  radios_.RemoveRadio(kHw);
  radios_.AddRadio(kHw, 0u);
  // The driver refuses a message beyond its payload limit, as the kernel would.
  family_.SetMaxPayload(McpsUtils::CalibrationPayloadBudget() - 64);
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  family_.SetMaxPayload(McpsUtils::CalibrationPayloadBudget());
  simulator_.SetCommandFault(kMcpsFamilyName, MCPS802154_CMD_SET_CALIBRATIONS, kMalformedOnce);
  // A reply too short for its generic header carries no command: it is not
  // the awaited one, so the transfer waits in vain and fails.
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  EXPECT_TRUE(log_.Contains(android::base::INFO,
                            "SendAndAwaitResponse: Incorrect received command, got -1 instead of 8",
                            "dalix.uwb.NlSocket"))
      << log_.Text();
  EXPECT_FALSE(mcps_.SetCalibration(kHw + 1, &store_));  // no such radio
  // None of these transfers went past its first message.
  EXPECT_EQ(Radio(kHw).calibration_messages, 0);

  // An unknown key ahead of known ones in the same message is named in the
  // reply and its status ends the transfer after that message; the known
  // keys beside it are still kept.
  store_.Set("aa.unknown", "0x4010");
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  SimRadio radio = Radio(kHw);
  EXPECT_EQ(radio.calibration_messages, 1);
  EXPECT_EQ(radio.calibration_keys_received.front(), "aa.unknown");
  EXPECT_LT(radio.calibration_keys_received.size(), 401u);
  EXPECT_EQ(radio.calibration.size(), radio.calibration_keys_received.size() - 1);
  EXPECT_TRUE(log_.Contains(ERROR, "Error on key aa.unknown", kTag));
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
