#include "sim/fira_region_sim.h"

#include <chrono>
#include <cmath>
#include <functional>
#include <map>
#include <vector>

#include <gtest/gtest.h>

#include "looper/looper_backed_event_loop.h"
#include "net/config_utils.h"
#include "net/fira_region_utils.h"
#include "net/mcps_utils.h"
#include "sim/driver_simulator.h"
#include "sim/mcps_family.h"
#include "sim/sim_nl_socket_factory.h"
#include "tests/fira_callback_recorder.h"
#include "tests/fira_session_builder.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

namespace uwb = ::aidl::hardware::dalix::uwb;

constexpr uint16_t kStanding = 0xab01, kCircling = 0xab02, kStopped = 0xab03, kFar = 0xab04;

uwb::UwbAddress Address(uint16_t short_address) {
  return {{static_cast<uint8_t>(short_address >> 8), static_cast<uint8_t>(short_address)}};
}

// A driver-controller session with one destination that asks for every
// angle: both pairs, raw values, confidence.
uwb::FiraTwrSession AngleSession(int32_t id) {
  uwb::FiraTwrSession s = FullFiraSession(id);
  s.destAddressList = {Address(kStanding)};
  s.rangingBlockDurationMs = 40;
  s.aoaType = uwb::AoaType(2);
  s.resultReportConfig = {true, true, true, true};
  return s;
}

// What FullFiraSession sends on a radio without antenna properties.
const std::map<int, uint32_t> kFullSessionParams = {
    {1, 0},   {2, 1},   {3, 2},  {4, 1},  {5, 0x0001}, {6, 0x5678}, {7, 10}, {8, 2400},
    {9, 200}, {10, 25}, {12, 5}, {13, 1}, {15, 50},    {18, 0},     {19, 1}, {20, 9},
    {21, 10}, {22, 3},  {23, 0}, {25, 2}, {26, 1},     {27, 0},     {28, 1}, {34, 1},
    {32, 0},  {36, 1},  {43, 1}, {44, 1}, {45, 1},     {47, 1}};

// The service's FiraRegionUtils against the simulated FiRa region, end to end.
class FiraRegionSimTest : public ::testing::Test {
 protected:
  void SetUp() override {
    radios_.AddRadio(0, 0);
    radios_.AddRadio(1, 1);
    family_.AttachFiraRegion(&region_);
    simulator_.RegisterFamily(kMcpsFamilyName, &family_);
    ASSERT_TRUE(simulator_.Start());
    ASSERT_TRUE(mcps_.Start());
    fira_.SetMcpsNetId(mcps_.GetNetId());
    ASSERT_TRUE(mcps_.SetFiraRegion(0));
    ASSERT_TRUE(mcps_.SetFiraRegion(1));
    world_.PlaceRadio(0, {{0, 0, 0}, M_PI / 6, 0.1});
    world_.AddPeer({kStanding, 1, Motion::Standing({3, 4, 1})});
    world_.AddPeer({kCircling, 2, Motion::Circle({1, 0, 2}, 2, 1.5)});
    world_.AddPeer({kStopped, 3, Motion::Standing({1, 1, 0})});
    world_.AddPeer({kFar, 4, Motion::Line({50, 0, 0}, {1, 0, 0}, 1)});
    world_.SetLineOfSight(kCircling, false);
    world_.SetStopped(kStopped, true);
    world_.SetRangeLimit(40);
    ConfigUtils antennas;
    antennas.Set("antenna_pair_azimuth", "1");
    antennas.Set("antenna_pair_elevation", "2");
    antennas.Set("tx_antenna", "1");
    ASSERT_TRUE(fira_.SetProperties(0, antennas));
    fira_.SubscribeCallback(0, &recorder_);
    fira_.SubscribeCallback(1, &recorder_);
  }

  // Serves the ranging socket on this thread until |done|, for 5 s at most.
  void RunUntil(const std::function<bool()>& done) {
    android::sp<android::Looper> looper = android::Looper::getForThread();
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(5);
    while (!done() && std::chrono::steady_clock::now() < deadline) looper->pollOnce(100);
  }

  World world_;
  RadioStore radios_;
  McpsFamily family_{&radios_};
  FiraRegionSim region_{&simulator_, &radios_, &world_};
  DriverSimulator simulator_;
  LooperBackedEventLoop loop_;
  SimNlSocketFactory factory_{&loop_, simulator_.port()};
  McpsUtils mcps_{&factory_};
  FiraRegionUtils fira_{&factory_};
  FiraCallbackRecorder recorder_;
};

TEST_F(FiraRegionSimTest, SessionRangesTheWorldsPeersUntilStopped) {
  ASSERT_TRUE(fira_.InitSession(0, 5));
  ASSERT_TRUE(fira_.ConfigTwrSession(0, AngleSession(5)));
  const std::vector<int32_t> sub_sessions = {11, 12, 13};
  ASSERT_TRUE(fira_.AddControlees(0, 5, {Address(kCircling), Address(kStopped), Address(kFar)},
                                  &sub_sessions));
  ASSERT_TRUE(fira_.StartSession(0, 5));
  RunUntil([&] { return recorder_.results.size() >= 3; });
  ASSERT_GE(recorder_.results.size(), 3u);

  for (size_t round = 0; round < recorder_.results.size(); ++round) {
    SCOPED_TRACE(round);
    const auto& [data, measurements] = recorder_.results[round];
    EXPECT_EQ(data.sessionId, 5);
    EXPECT_EQ(data.index, static_cast<int32_t>(round));
    // The stopped peer is left out; the far one failed.
    ASSERT_EQ(measurements.size(), 3u);
    EXPECT_EQ(measurements[1].address.address, (std::vector<uint8_t>{0x04, 0xab}));
    EXPECT_NE(measurements[1].status, 0);
    for (size_t i : {0, 2}) {
      const auto& m = measurements[i];
      const uint16_t peer = i == 0 ? kCircling : kStanding;
      Observation truth =
          world_.Truth(0, peer, world_.SecondsAt(static_cast<uint64_t>(m.timestampNs))).value();
      EXPECT_EQ(m.address.address, (std::vector<uint8_t>{static_cast<uint8_t>(peer), 0xab}));
      EXPECT_EQ(m.status, 0);
      EXPECT_NEAR(m.distance, truth.distance_m * 100, 0.5);
      EXPECT_EQ(m.lineOfSight, peer == kStanding ? 1 : 0);
      EXPECT_NEAR(m.azimuthRad, truth.azimuth_rad, 1e-4);
      EXPECT_NEAR(m.elevationRad, truth.elevation_rad, 1e-4);
      EXPECT_NEAR(m.azimuthFigureOfMerit, peer == kStanding ? 0.9 : 0.4, 0.003);
      // The azimuth pair's nest carries both angles, the elevation pair's
      // the elevation first.
      ASSERT_EQ(m.antennaMeasurements.size(), 2u);
      EXPECT_EQ(m.antennaMeasurements[0].kind, kFiraAntennaKindAzimuth);
      EXPECT_NEAR(m.antennaMeasurements[0].secondAngleRad, truth.elevation_rad, 1e-4);
      EXPECT_EQ(m.antennaMeasurements[1].kind, kFiraAntennaKindElevation);
      EXPECT_NEAR(m.antennaMeasurements[1].firstAngleRad, truth.elevation_rad, 1e-4);
    }
  }
  // The radio's antenna properties reach the driver, and the controlees.
  SimFiraSession kept = region_.Session(0, 5).value();
  EXPECT_EQ(kept.Param(FIRA_SESSION_PARAM_ATTR_AZIMUTH_ANTENNA_PAIR), 1u);
  EXPECT_EQ(kept.Param(FIRA_SESSION_PARAM_ATTR_ELEVATION_ANTENNA_PAIR), 2u);
  EXPECT_EQ(kept.Param(FIRA_SESSION_PARAM_ATTR_TX_ANTENNA_MASK), 2u);
  EXPECT_EQ(kept.controlees,
            (std::vector<SimFiraControlee>{{kCircling, 11}, {kStopped, 12}, {kFar, 13}}));

  ASSERT_TRUE(fira_.UpdateBlockStriding(0, 5, 1));
  ASSERT_TRUE(fira_.RemoveControlees(0, 5, {Address(kStopped)}));
  ASSERT_TRUE(fira_.StopSession(0, 5));
  RunUntil([&] { return !recorder_.stopped.empty(); });
  EXPECT_EQ(recorder_.stopped, std::vector<uint32_t>{5});
  kept = region_.Session(0, 5).value();
  EXPECT_EQ(kept.Param(FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_VALUE), 1u);
  EXPECT_EQ(kept.controlees.size(), 2u);
  ASSERT_TRUE(fira_.DeinitSession(0, 5));
  EXPECT_FALSE(region_.Session(0, 5));
}

// The driver keeps every parameter the session calls for, each at its own
// width, and nothing else.
TEST_F(FiraRegionSimTest, ConfigurationReachesTheDriverAsTheSessionCallsFor) {
  const struct {
    const char* name;
    std::function<void(uwb::FiraTwrSession&)> change;
    std::map<int, int64_t> delta;  // -1: not sent
  } cases[] = {
      {"driver controlee: no destination, its report phases; both angles",
       [](uwb::FiraTwrSession& s) {
         s.deviceType = uwb::DeviceType(0);
         s.stsConfig = uwb::FiraStsConfig(2);
         s.rangingRoundControl = {false, uwb::MeasurementReportType(1), true};
         s.aoaType = uwb::AoaType(2);
       },
       {{1, 1}, {6, -1}, {16, 0}, {17, 1}, {18, -1}, {33, 255}, {35, 0}, {36, 2}}},
      {"driver controller: no report phases, a sub-session, no angles whatever the type; "
       "block striding, negative retries",
       [](uwb::FiraTwrSession& s) {
         s.stsConfig = uwb::FiraStsConfig(2);
         s.rangingRoundControl = {false, uwb::MeasurementReportType(1), false};
         s.aoaResultRequest = uwb::AoaResultRequest(0);
         s.aoaType = uwb::AoaType(7);
         s.isBlockStridingEnabled = true;
         s.maxRangingRoundRetries = -1;
       },
       {{11, 3}, {12, -1}, {14, 1}, {36, 2}, {37, 7}, {43, -1}}},
      {"static STS: IV then vendor id; elevation, no retries",
       [](uwb::FiraTwrSession& s) {
         s.stsConfig = uwb::FiraStsConfig(0);
         s.staticStsIV = {1, 2, 3, 4, 5, 6};
         s.vendorId = {0xa, 0xb};
         s.aoaType = uwb::AoaType(1);
         s.maxRangingRoundRetries = 0;
       },
       {{12, -1}, {32, -1}, {33, 255}, {36, 0}, {38, -1}}},  // The key is kept apart.
      {"both angles in pair mode; signed and wide values",
       [](uwb::FiraTwrSession& s) {
         s.aoaType = uwb::AoaType(2);
         s.deviceRole = uwb::DeviceRole(0);
         s.inBandTerminationAttemptCount = -1;
         s.channelNumber = 0x109;
         s.sessionPriority = -56;
       },
       {{2, 0}, {15, 200}, {19, 0xffffffff}, {20, 9}, {33, 255}, {35, 1}}},
      {"other switches",
       [](uwb::FiraTwrSession& s) {
         s.isKeyRotationEnabled = s.isTxAdaptivePayloadPowerEnabled = true;
         s.keyRotationRate = 4;
         s.fcsType = uwb::FcsType(1);
         s.isHoppingEnabled = false;
         s.rangingRoundControl.hasDeferredMode = true;
         s.prfMode = uwb::PrfMode(1);
         s.preambleDuration = uwb::PreambleDuration(0);
         s.bprfPhrDataRate = uwb::BprfPhrDataRate(0);
       },
       {{41, 1}, {42, 4}, {30, 1}, {29, 1}, {13, -1}, {18, -1}, {23, -1}, {24, 0}, {28, -1}}},
  };
  int32_t id = 100;
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    uwb::FiraTwrSession session = FullFiraSession(++id);
    c.change(session);
    std::map<int, uint32_t> expected = kFullSessionParams;
    for (auto [attr, value] : c.delta) {
      if (value == -1) expected.erase(attr);
      if (value >= 0) expected[attr] = static_cast<uint32_t>(value);
    }
    ASSERT_TRUE(fira_.InitSession(1, id));
    ASSERT_TRUE(fira_.ConfigTwrSession(1, session));
    const SimFiraSession kept = region_.Session(1, id).value();
    EXPECT_EQ(kept.params, expected);
    const std::vector<uint8_t> key = {1, 2, 3, 4, 5, 6, 0xa, 0xb};
    EXPECT_EQ(kept.static_sts_key, c.delta.count(38) ? key : std::vector<uint8_t>{});
  }
  // A start the driver refuses: a session it does not know.
  EXPECT_FALSE(fira_.StartSession(1, 99));
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
