#include "net/mcps_utils.h"

#include <stdint.h>

#include <cmath>
#include <iterator>
#include <memory>
#include <optional>
#include <string>
#include <tuple>
#include <type_traits>
#include <utility>
#include <vector>

#include <android-base/file.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netlink/attr.h>
#include <netlink/genl/genl.h>

#include "looper/looper_backed_event_loop.h"
#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"
#include "sim/driver_simulator.h"
#include "sim/mcps_family.h"
#include "sim/radio_store.h"
#include "sim/sim_nl_socket_factory.h"
#include "sim/simple_ranging_sim.h"
#include "tests/log_capture.h"
#include "tests/mock_nl_socket.h"
#include "tests/sent_message.h"
#include "uwb_aidl.h"

namespace hardware {
namespace dalix {
namespace {

using ::android::base::ERROR;
using ::android::base::INFO;
using ::android::base::WARNING;
using ::testing::_;
using ::testing::Return;
using ::testing::StrictMock;

constexpr uint32_t kFamily = 0x1d;
constexpr uint32_t kHw = 3;
constexpr char kTag[] = "dalix.uwb.McpsUtils";

// The driver client and the HAL objects name the same types, both headers included.
static_assert(
    std::is_same_v<McpsUtils::RangingRequest, aidl::hardware::dalix::uwb::RangingRequest>);
static_assert(std::is_same_v<McpsUtils::RangingResult, aidl::hardware::dalix::uwb::RangingResult>);

// Keeps a copy of the request of a mocked exchange, which succeeds.
ACTION_P(Record, sent) {
  sent->emplace_back(arg0);
  return true;
}

class McpsUtilsTest : public ::testing::Test {
 protected:
  void SetUp() override {
    auto socket = std::make_unique<StrictMock<MockNlSocket>>();
    EXPECT_CALL(*socket, Resolve(::testing::StrEq(kMcpsFamilyName))).WillOnce(Return(kFamily));
    EXPECT_CALL(factory_, Create()).WillOnce(Return(::testing::ByMove(std::move(socket))));
    ASSERT_TRUE(mcps_.Start());
  }

  // The next socket: requests recorded and answered with success, a watch's handler kept.
  void ExpectSocket(bool watched = false) {
    EXPECT_CALL(factory_, Create()).WillOnce([this, watched] {
      auto socket = std::make_unique<StrictMock<MockNlSocket>>();
      EXPECT_CALL(*socket, SendAndAwaitAck(_, _)).WillRepeatedly(Record(&sent_));
      EXPECT_CALL(*socket, SendAndAwaitResponse(_, _, MCPS802154_CMD_SET_CALIBRATIONS))
          .WillRepeatedly(Record(&sent_));
      if (watched) {
        EXPECT_CALL(*socket, DisableAutoAck());
        EXPECT_CALL(*socket, WatchNetlinkSocket(_, _))
            .WillOnce(::testing::DoAll(::testing::SaveArg<1>(&on_report_), Return(true)));
      }
      return std::unique_ptr<NlSocket>(std::move(socket));
    });
  }

  // Installs requests of these ids and peers; their encoding is proven end to end.
  void Install(const std::vector<std::pair<int32_t, int64_t>>& ids_and_peers) {
    std::vector<McpsUtils::RangingRequest> requests(ids_and_peers.size());
    for (size_t i = 0; i < requests.size(); ++i) {
      std::tie(requests[i].id, requests[i].peerAddress) = ids_and_peers[i];
    }
    mcps_.SubscribeRangingResults([this](const auto& result) { results_.push_back(result); });
    ExpectSocket(true);
    ASSERT_TRUE(mcps_.SetRangingRequests(kHw, requests));
  }

  void Deliver(const sim::RangingReport& report, uint8_t cmd = MCPS802154_CMD_RANGING_REPORT) {
    UniqueNlMsg msg = sim::DriverSimulator::NewEvent(kFamily, cmd);
    ASSERT_TRUE(sim::SimpleRangingSim::EncodeRangingReport(msg.get(), kHw, report));
    EXPECT_EQ(on_report_(msg.get()), NL_STOP);
  }

  StrictMock<MockNlSocketFactory> factory_;
  McpsUtils mcps_{&factory_};
  std::function<int(nl_msg*)> on_report_;
  std::vector<McpsUtils::RangingResult> results_;
  std::vector<SentMessage> sent_;
  ConfigUtils store_;
  LogCapture log_;
};

// The parameters-only command and nest flags, which the simulated driver does not check.
TEST_F(McpsUtilsTest, SchedulerParametersNestFlaggedAndFiraRegionsNestPlain) {
  ExpectSocket();
  ASSERT_TRUE(mcps_.SetScheduler(kHw, McpsScheduler::kSimpleRanging,
                                 McpsUtils::kSimpleRangingSlotDuration, McpsUtils::kResponder,
                                 true));
  ExpectSocket();
  ASSERT_TRUE(mcps_.SetFiraRegion(kHw));
  ASSERT_EQ(sent_.size(), 2u);
  EXPECT_EQ(sent_[0].cmd(), MCPS802154_CMD_SET_SCHEDULER_PARAMS);
  EXPECT_EQ(sent_[0].Attrs().back()->nla_type, MCPS802154_ATTR_SCHEDULER_PARAMS | NLA_F_NESTED);

  // The driver tells these nests apart by plain type words, without NLA_F_NESTED.
  nlattr* regions = sent_[1].Attrs().back();
  EXPECT_EQ(regions->nla_type, MCPS802154_ATTR_SCHEDULER_REGIONS);
  for (nlattr* region : SentMessage::Children(regions)) {
    EXPECT_EQ(region->nla_type, MCPS802154_SCHEDULER_REGIONS_ATTR_REGION);
  }
}

// The driver's verdicts are proven against the simulated driver.
TEST_F(McpsUtilsTest, CalibrationSendsParsableKeysAsTheStoreHoldsThemWithinThePage) {
  // "abc" is all hexadecimal digits: 0xabc.
  const std::pair<const char*, const char*> values[] = {
      {"a_dec", "12"},   {"b_hex", "1F"},   {"c_0x", "0x1F"}, {"d_frac", "1.5"},
      {"e_text", "xyz"}, {"e_word", "abc"}, {"f_neg", "-1"},  {"g_empty", ""}};
  for (auto [key, value] : values) store_.Set(key, value);
  // A key read from a file goes out whole, NUL and all; a value cut by a NUL is no number.
  const std::string nul_key("h_nul\0x", 7);
  const std::string path = ::testing::TempDir() + "calibration_with_nul.conf";
  ASSERT_TRUE(android::base::WriteStringToFile(
      nul_key + " = 9\nh_nul = 4\nh_nulv = " + std::string("5\0z", 3) + "\n", path));
  ASSERT_TRUE(store_.Load(path.c_str()));
  std::vector<std::pair<std::string, uint32_t>> expected = {
      {"a_dec", 12},         {"b_hex", 31}, {"c_0x", 31}, {"e_word", 0xabc},
      {"f_neg", 0xffffffff}, {"h_nul", 4},  {nul_key, 9}};
  // The largest key that fits into an empty message, so goes in one of its own, and one byte more.
  const int room = McpsUtils::CalibrationPayloadBudget() - GENL_HDRLEN - nla_total_size(4) -
                   nla_total_size(0) - 12 - NLA_HDRLEN;
  const std::string fits = "key_9" + std::string(room - 1 - 5, 'f');
  const std::string too_long = fits + "x";
  store_.Set(fits.c_str(), "1");
  store_.Set(too_long.c_str(), "2");
  expected.emplace_back(fits, 1);

  ExpectSocket();
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  ASSERT_EQ(sent_.size(), 2u);
  std::vector<std::pair<std::string, uint32_t>> keys;
  for (SentMessage& sent : sent_) {
    EXPECT_LE(static_cast<int>(sent.header()->nlmsg_len - NLMSG_HDRLEN),
              McpsUtils::CalibrationPayloadBudget());
    for (nlattr* element : SentMessage::Children(sent.Attrs().back())) {
      std::vector<nlattr*> f = SentMessage::Children(element);
      ASSERT_EQ(f.size(), 2u);
      keys.emplace_back(std::string(static_cast<char*>(nla_data(f[0])), nla_len(f[0]) - 1),
                        nla_get_u32(f[1]));
    }
  }
  EXPECT_EQ(keys, expected);
  for (const char* key : {"d_frac", "e_text", "g_empty", "h_nulv"}) {
    EXPECT_TRUE(log_.Contains(WARNING, std::string("Skip incorrect key ") + key, kTag)) << key;
  }
  EXPECT_EQ(log_.Count(ERROR, "Skip incorrect key " + too_long, kTag), 1);
  EXPECT_FALSE(mcps_.SetCalibration(kHw, nullptr));
  EXPECT_TRUE(log_.Contains(ERROR, "SetCalibration Bad argument", kTag));
}

// The angle of arrival straight from its definition, in double precision.
double ExpectedAngle(std::optional<int32_t> phase) {
  if (!phase || *phase < -32767) return NAN;
  const double x = *phase / 2048.0 * 0.046108086 / (2 * M_PI * 0.0208);
  return std::asin(std::fmax(-1.0, std::fmin(1.0, x)));
}

TEST_F(McpsUtilsTest, ReportsReachTheFirstRequestOfTheirIdWithPhasesAsAnglesUntilAnEmptyList) {
  EXPECT_FALSE(mcps_.SetRangingRequests(kHw, {}));
  EXPECT_TRUE(log_.Contains(
      WARNING, "SetRangingRequests: The ranging result handler needs to be set first", kTag));
  Install({{1, 10}, {1, 11}, {2, 12}});
  const std::optional<int32_t> phases[] = {0,     1000,   -1000,  5805,        5806,
                                           32767, -32767, -32768, std::nullopt};
  for (std::optional<int32_t> phase : phases) {
    SCOPED_TRACE(phase.value_or(0));
    std::optional<int32_t> half = phase ? std::optional<int32_t>(*phase / 2) : std::nullopt;
    Deliver({2u, 1234u, phase, half});
    ASSERT_EQ(results_.size(), 1u);
    EXPECT_THAT(static_cast<double>(results_[0].firstAngleRad),
                ::testing::NanSensitiveDoubleNear(ExpectedAngle(phase), 2e-6));
    EXPECT_THAT(static_cast<double>(results_[0].secondAngleRad),
                ::testing::NanSensitiveDoubleNear(ExpectedAngle(half), 2e-6));
    results_.clear();
  }
  Deliver({1u, 5u, 0, 0});
  Deliver({8u, 5u, 0, 0});
  Deliver({1u, 5u, 0, 0}, MCPS802154_CMD_NEW_HW);
  Deliver({std::nullopt, 5u, 0, 0});
  // A phase shorter than its 4 bytes is refused, not read past.
  UniqueNlMsg short_phase = sim::DriverSimulator::NewEvent(kFamily, MCPS802154_CMD_RANGING_REPORT);
  nla_put_u32(short_phase.get(), MCPS802154_ATTR_HW, kHw);
  nlattr* result = nla_nest_start(short_phase.get(), MCPS802154_ATTR_RANGING_RESULT);
  nla_put_u32(short_phase.get(), MCPS802154_RANGING_RESULT_ATTR_REQUEST_ID, 1);
  nla_put_u16(short_phase.get(), MCPS802154_RANGING_RESULT_ATTR_PDOA_2, 7);
  nla_nest_end(short_phase.get(), result);
  on_report_(short_phase.get());
  EXPECT_EQ(log_.Count(WARNING, "OnRangingResult: Failed to parse nested attr", kTag), 1);
  ASSERT_EQ(results_.size(), 1u);
  EXPECT_EQ(results_[0].peerAddress, 10);
  EXPECT_EQ(log_.Count(WARNING, "OnRangingResult: Received result for unknown request", kTag), 1);
  EXPECT_EQ(log_.Count(WARNING, "OnRangingResult: Incorrect command received: 2", kTag), 1);

  // An empty list closes the ranging socket without asking the driver.
  EXPECT_TRUE(mcps_.SetRangingRequests(kHw, {}));
  Deliver({1u, 5u, 0, 0});
  EXPECT_EQ(results_.size(), 1u);
}

// McpsUtils against the simulated mcps802154 family, over real sockets.
class McpsFamilyTest : public ::testing::Test {
 protected:
  void SetUp() override {
    simulator_.RegisterFamily(kMcpsFamilyName, &family_);
    ASSERT_TRUE(simulator_.Start());
    ASSERT_TRUE(mcps_.Start());
  }

  sim::SimRadio Radio(uint32_t hw_index) {
    return radios_.Radio(hw_index).value_or(sim::SimRadio());
  }

  sim::RadioStore radios_;
  sim::McpsFamily family_{&radios_};
  sim::DriverSimulator simulator_;
  LooperBackedEventLoop loop_;
  sim::SimNlSocketFactory factory_{&loop_, simulator_.port()};
  McpsUtils mcps_{&factory_};
  ConfigUtils store_;
  LogCapture log_;
};

TEST_F(McpsFamilyTest, DiscoveryKeepsOnlyRadiosWithAUsablePhyName) {
  bool ok = false;
  EXPECT_TRUE(mcps_.ListHardware(&ok).empty());  // NLMSG_DONE alone
  // Only a number right after the exact prefix counts; a name too long is refused whole.
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
  EXPECT_EQ(std::tie(ok, info.hw_index, info.phy_index, info.scheduler),
            std::make_tuple(true, 2u, 0u, std::string("default")));
  info = mcps_.GetHardwareInfo(13, &ok);
  EXPECT_EQ(std::tie(info.hw_index, info.scheduler), std::make_tuple(0u, std::string()));
  info = mcps_.GetHardwareInfo(99, &ok);
  EXPECT_EQ(std::tie(ok, info.hw_index, info.scheduler), std::make_tuple(false, 0u, std::string()));
}

TEST_F(McpsFamilyTest, DumpsAreReadWholeHoweverPacked) {
  // Packed, NLMSG_DONE shares the last of several datagrams; 300 unpacked would overflow.
  for (auto [datagram_bytes, radios] :
       {std::pair<size_t, uint32_t>(sim::DriverSimulator::kDefaultDumpDatagramBytes, 300),
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

TEST_F(McpsFamilyTest, CalibrationArrivesWholeOrFailsTheTransfer) {
  radios_.AddRadio(kHw, 0u);
  for (uint32_t i = 0; i < 400; ++i) {
    const std::string key = "bench.key" + std::to_string(1000 + i);
    radios_.AddCalibrationKey(key);
    store_.Set(key.c_str(), std::to_string(i).c_str());
  }
  ASSERT_TRUE(mcps_.SetCalibration(kHw, &store_));
  // 400 elements of 32 bytes take 13 kB: four pages.
  EXPECT_EQ(Radio(kHw).calibration.size(), 400u);
  EXPECT_EQ(Radio(kHw).calibration_messages, 4);

  radios_.RemoveRadio(kHw);
  radios_.AddRadio(kHw, 0u);
  // A reply cut inside its generic header carries no command: not the awaited one.
  simulator_.SetCommandFault(kMcpsFamilyName, MCPS802154_CMD_SET_CALIBRATIONS,
                             {sim::Fault::Kind::kMalformed, 0, 0, 1});
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  EXPECT_TRUE(log_.Contains(INFO,
                            "SendAndAwaitResponse: Incorrect received command, got -1 instead of 8",
                            "dalix.uwb.NlSocket"))
      << log_.Text();

  // An unknown key, named or too long to name, ends the transfer after its message.
  size_t unknown_keys = 0;
  for (const char* unknown : {"aa.unknown.and.too.long.to.name", "aa.unknown"}) {
    radios_.RemoveRadio(kHw);
    radios_.AddRadio(kHw, 0u);
    store_.Set(unknown, "0x4010");
    ++unknown_keys;
    EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
    sim::SimRadio radio = Radio(kHw);
    EXPECT_EQ(radio.calibration_messages, 1);
    EXPECT_EQ(radio.calibration_keys_received.front(), unknown);
    EXPECT_EQ(radio.calibration.size() + unknown_keys, radio.calibration_keys_received.size());
  }
  EXPECT_EQ(log_.Count(ERROR, "Error on key aa.unknown", kTag), 1);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
