#include "sim/mcps_family.h"

#include <cstdio>
#include <map>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "net/config_utils.h"
#include "net/mcps802154.h"
#include "net/mcps_utils.h"
#include "sim/driver_simulator.h"
#include "sim/radio_store.h"
#include "sim/sim_nl_socket_factory.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

// The service's McpsUtils against the simulated driver, over real sockets.
class McpsFamilyTest : public ::testing::Test {
 protected:
  void SetUp() override {
    simulator_.RegisterFamily(kMcpsFamilyName, &family_);
    ASSERT_TRUE(simulator_.Start());
    ASSERT_TRUE(mcps_.Start());
  }

  SimRadio Radio(uint32_t hw_index) {
    std::optional<SimRadio> radio = radios_.Radio(hw_index);
    EXPECT_TRUE(radio.has_value());
    return radio.value_or(SimRadio());
  }

  RadioStore radios_;
  McpsFamily family_{&radios_};
  DriverSimulator simulator_;
  SimNlSocketFactory factory_{nullptr, simulator_.port()};
  McpsUtils mcps_{&factory_};
  LogCapture log_;
};

TEST_F(McpsFamilyTest, StartFailsWhenTheFamilyIsGone) {
  simulator_.SetFamilyPresent(kMcpsFamilyName, false);
  McpsUtils other(&factory_);
  EXPECT_FALSE(other.Start());
  EXPECT_TRUE(log_.Contains(android::base::ERROR, "Start: Generic netlink mcps802154 not found."));
}

TEST_F(McpsFamilyTest, ListHardwareKeepsOnlyRadiosWithAUsablePhyName) {
  radios_.AddRadio(0, 0u);
  radios_.AddRadio(1, std::string("phy12x"));
  radios_.AddRadio(2, std::string("wpan-phy0"));
  radios_.AddRadio(3, std::nullopt);
  radios_.AddRadio(4, std::string("phy"));
  radios_.AddRadio(5, std::string("phyX"));
  radios_.AddRadio(6, 3u);
  radios_.SetReportsScheduler(6, false);
  radios_.AddRadio(7, 1u);
  radios_.SetScheduler(7, kMcpsSchedulerEndless, -1, -1, {kMcpsRegionFira});

  bool ok = false;
  std::vector<McpsHwInfo> found = mcps_.ListHardware(&ok);
  EXPECT_TRUE(ok);
  std::vector<std::tuple<uint32_t, uint32_t, std::string>> summary;
  for (const McpsHwInfo& info : found) {
    summary.emplace_back(info.hw_index, info.phy_index, info.scheduler);
  }
  std::vector<std::tuple<uint32_t, uint32_t, std::string>> expected = {
      {0, 0, "default"}, {1, 12, "default"}, {6, 3, "default"}, {7, 1, "endless"}};
  EXPECT_EQ(summary, expected);
  EXPECT_EQ(log_.Count(android::base::WARNING, "ParseHwInfo: Missing mcps attribute",
                       "dalix.uwb.McpsUtils"),
            1)
      << log_.Text();
}

TEST_F(McpsFamilyTest, ListHardwareOfNoRadioIsEmpty) {
  // The dump ends with NLMSG_DONE alone. Whether that counts as success is
  // the transport's call: its response exchange waits for a NEW_HW reply.
  bool ok = false;
  EXPECT_TRUE(mcps_.ListHardware(&ok).empty());
}

TEST_F(McpsFamilyTest, MalformedDiscoveryReplyIsDroppedAndTheNextDumpWorks) {
  radios_.AddRadio(0, 0u);
  Fault fault;
  fault.kind = Fault::Kind::kMalformed;
  fault.count = 1;
  simulator_.SetCommandFault(kMcpsFamilyName, MCPS802154_CMD_GET_HW, fault);
  bool ok = false;
  EXPECT_TRUE(mcps_.ListHardware(&ok).empty());
  std::vector<McpsHwInfo> found = mcps_.ListHardware(&ok);
  EXPECT_TRUE(ok);
  ASSERT_EQ(found.size(), 1u);
  EXPECT_EQ(found[0].hw_index, 0u);
}

TEST_F(McpsFamilyTest, GetHardwareInfoReadsOneRadioAndRefusesUnknownIndexes) {
  radios_.AddRadio(4, 2u);
  radios_.SetScheduler(4, kMcpsSchedulerSimpleRanging, 16, 1, {});
  bool ok = false;
  McpsHwInfo info = mcps_.GetHardwareInfo(4, &ok);
  EXPECT_TRUE(ok);
  EXPECT_EQ(info.hw_index, 4u);
  EXPECT_EQ(info.phy_index, 2u);
  EXPECT_EQ(info.scheduler, "simple-ranging");

  info = mcps_.GetHardwareInfo(5, &ok);
  EXPECT_FALSE(ok);
  EXPECT_EQ(info.hw_index, 0u);
  EXPECT_EQ(info.scheduler, "");
}

TEST_F(McpsFamilyTest, SchedulerChangesAreCheckedAndKept) {
  radios_.AddRadio(0, 0u);
  const int kFira = 100;  // SetFiraRegion instead of SetScheduler
  const struct {
    const char* what;
    int scheduler;
    int slot_duration;
    int node_type;
    bool params_only;
    bool accepted;
    // The radio's state afterwards.
    const char* running;
    int32_t slot;
    int32_t node;
    std::vector<std::string> regions;
  } steps[] = {
      {"initiator", 1, 16, 0, false, true, "simple-ranging", 16, 0, {}},
      {"responder, parameters only", 1, -1, 1, true, true, "simple-ranging", 16, 1, {}},
      {"simple ranging without parameters", 1, -1, -1, false, false, "simple-ranging", 16, 1, {}},
      {"parameters of another scheduler", 2, 16, 0, true, false, "simple-ranging", 16, 1, {}},
      {"unknown scheduler", 7, -1, -1, false, false, "simple-ranging", 16, 1, {}},
      {"negative unknown scheduler", -3, -1, -1, false, false, "simple-ranging", 16, 1, {}},
      {"endless without region", 2, -1, -1, false, false, "simple-ranging", 16, 1, {}},
      {"fira region", kFira, -1, -1, false, true, "endless", -1, -1, {"fira"}},
      {"default with a parameter", 0, 16, -1, false, false, "endless", -1, -1, {"fira"}},
      {"back to default", 0, -1, -1, false, true, "default", -1, -1, {}},
  };
  for (const auto& step : steps) {
    SCOPED_TRACE(step.what);
    bool result = step.scheduler == kFira
                      ? mcps_.SetFiraRegion(0)
                      : mcps_.SetScheduler(0, static_cast<McpsScheduler>(step.scheduler),
                                           static_cast<McpsUtils::SlotDuration>(step.slot_duration),
                                           static_cast<McpsUtils::NodeType>(step.node_type),
                                           step.params_only);
    EXPECT_EQ(result, step.accepted);
    SimRadio radio = Radio(0);
    EXPECT_EQ(radio.scheduler, step.running);
    EXPECT_EQ(radio.slot_duration, step.slot);
    EXPECT_EQ(radio.node_type, step.node);
    EXPECT_EQ(radio.regions, step.regions);
  }
  bool ok = false;
  EXPECT_EQ(mcps_.GetHardwareInfo(0, &ok).scheduler, "default");
  EXPECT_FALSE(mcps_.SetFiraRegion(9));
}

class McpsCalibrationFamilyTest : public McpsFamilyTest {
 protected:
  void SetUp() override {
    McpsFamilyTest::SetUp();
    radios_.AddRadio(kHw, 0u);
  }

  // |count| keys the driver knows, valued by their position.
  void AddKnownKeys(int count) {
    for (int i = 0; i < count; ++i) {
      char key[24];
      std::snprintf(key, sizeof(key), "bench.key%04d", i);
      radios_.AddCalibrationKey(key);
      store_.Set(key, std::to_string(i).c_str());
    }
  }

  static constexpr uint32_t kHw = 2;
  ConfigUtils store_;
};

TEST_F(McpsCalibrationFamilyTest, LargeStoreArrivesWhole) {
  AddKnownKeys(400);
  ASSERT_TRUE(mcps_.SetCalibration(kHw, &store_));
  SimRadio radio = Radio(kHw);
  std::vector<std::string> keys;
  std::map<std::string, uint32_t> values;
  for (auto it = store_.GetIterator(); it != store_.GetEnd(); ++it) {
    keys.push_back(it->first);
    values[it->first] = std::stoul(it->second);
  }
  // In store order, each exactly once.
  EXPECT_EQ(radio.calibration_keys_received, keys);
  EXPECT_EQ(radio.calibration, values);
  // 400 elements of 32 bytes take 13 kB: four pages.
  EXPECT_EQ(radio.calibration_messages, 4);
}

TEST_F(McpsCalibrationFamilyTest, DriverRefusesWhatExceedsItsLimit) {
  AddKnownKeys(200);
  family_.SetMaxPayload(McpsUtils::CalibrationPayloadBudget() - 64);
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  EXPECT_EQ(Radio(kHw).calibration_messages, 0);
}

TEST_F(McpsCalibrationFamilyTest, UnknownKeyIsNamedAndFailsTheTransfer) {
  store_.Set("ch5.ant0.tx_delay", "0x4010");
  store_.Set("ch9.ant1.rx_delay", "16400");
  store_.Set("zz.unknown", "1");
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  SimRadio radio = Radio(kHw);
  std::map<std::string, uint32_t> accepted = {{"ch5.ant0.tx_delay", 0x4010},
                                              {"ch9.ant1.rx_delay", 16400}};
  EXPECT_EQ(radio.calibration, accepted);
  EXPECT_EQ(radio.calibration_keys_received.size(), 3u);
  EXPECT_TRUE(log_.Contains(android::base::ERROR, "Error on key zz.unknown", "dalix.uwb.McpsUtils"));
}

TEST_F(McpsCalibrationFamilyTest, UnknownRadioIsRefused) {
  store_.Set("xtal_trim", "3");
  EXPECT_FALSE(mcps_.SetCalibration(kHw + 1, &store_));
  EXPECT_TRUE(Radio(kHw).calibration_keys_received.empty());
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
