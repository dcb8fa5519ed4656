#include "net/mcps_utils.h"

#include <stdint.h>

#include <cmath>
#include <deque>
#include <memory>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include <android-base/file.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netlink/attr.h>
#include <netlink/genl/genl.h>

#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"
#include "sim/driver_simulator.h"
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
using ::testing::AnyNumber;
using ::testing::ByMove;
using ::testing::DoAll;
using ::testing::Return;
using ::testing::SaveArg;
using ::testing::StrEq;
using ::testing::StrictMock;

constexpr uint32_t kFamily = 0x1d;
constexpr uint32_t kHw = 3;
constexpr char kTag[] = "dalix.uwb.McpsUtils";

// The driver client and the HAL objects must name the same request and result
// types, with both headers in one translation unit.
static_assert(
    std::is_same_v<McpsUtils::RangingRequest, aidl::hardware::dalix::uwb::RangingRequest>);
static_assert(std::is_same_v<McpsUtils::RangingResult, aidl::hardware::dalix::uwb::RangingResult>);

class McpsUtilsTest : public ::testing::Test {
 protected:
  void SetUp() override {
    auto socket = std::make_unique<StrictMock<MockNlSocket>>();
    EXPECT_CALL(*socket, Resolve(StrEq(kMcpsFamilyName))).WillOnce(Return(kFamily));
    EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
    ASSERT_TRUE(mcps_.Start());
  }

  // The next socket records every request and answers it with success; a
  // response may only be awaited as |awaited|, and each delivers the next of
  // replies_ if any is left.
  void ExpectSocket(int awaited) {
    EXPECT_CALL(factory_, Create()).WillOnce([this, awaited] {
      auto socket = std::make_unique<StrictMock<MockNlSocket>>();
      EXPECT_CALL(*socket, SendAndAwaitAck(_, _))
          .Times(AnyNumber())
          .WillRepeatedly([this](nl_msg* msg, auto) {
            sent_.emplace_back(msg);
            return true;
          });
      EXPECT_CALL(*socket, SendAndAwaitResponse(_, _, awaited))
          .Times(AnyNumber())
          .WillRepeatedly([this](nl_msg* msg, std::function<void(nl_msg*)> handler, int) {
            sent_.emplace_back(msg);
            if (!replies_.empty()) {
              handler(replies_.front().get());
              replies_.pop_front();
            }
            return true;
          });
      return std::unique_ptr<NlSocket>(std::move(socket));
    });
  }

  // Installs |requests| through a socket that keeps the handler that the
  // watch is given; results are collected.
  void Install(const std::vector<McpsUtils::RangingRequest>& requests) {
    mcps_.SubscribeRangingResults([this](const auto& result) { results_.push_back(result); });
    EXPECT_CALL(factory_, Create()).WillOnce([this] {
      auto socket = std::make_unique<StrictMock<MockNlSocket>>();
      EXPECT_CALL(*socket, SendAndAwaitAck(_, _)).WillOnce(Return(true));
      EXPECT_CALL(*socket, DisableAutoAck());
      EXPECT_CALL(*socket, WatchNetlinkSocket(_, _))
          .WillOnce(DoAll(SaveArg<1>(&on_report_), Return(true)));
      return std::unique_ptr<NlSocket>(std::move(socket));
    });
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
  std::deque<UniqueNlMsg> replies_;
  ConfigUtils store_;
  LogCapture log_;
};

// What the driver makes of schedulers and their parameters is proven against
// the simulated driver; these nest flags it does not look at.
TEST_F(McpsUtilsTest, SchedulerParametersNestFlaggedAndFiraRegionsNestPlain) {
  ExpectSocket(-1);
  ASSERT_TRUE(mcps_.SetScheduler(kHw, McpsScheduler::kSimpleRanging,
                                 McpsUtils::kSimpleRangingSlotDuration, McpsUtils::kResponder,
                                 false));
  ExpectSocket(-1);
  ASSERT_TRUE(mcps_.SetFiraRegion(kHw));
  ASSERT_EQ(sent_.size(), 2u);
  EXPECT_EQ(sent_[0].Attrs().back()->nla_type, MCPS802154_ATTR_SCHEDULER_PARAMS | NLA_F_NESTED);

  // The driver tells these nests apart by plain type words, without NLA_F_NESTED.
  nlattr* regions = sent_[1].Attrs().back();
  EXPECT_EQ(regions->nla_type, MCPS802154_ATTR_SCHEDULER_REGIONS);
  for (nlattr* region : SentMessage::Children(regions)) {
    EXPECT_EQ(region->nla_type, MCPS802154_SCHEDULER_REGIONS_ATTR_REGION);
  }
}

TEST_F(McpsUtilsTest, CalibrationSendsParsableKeysInOrderUntilTheDriversVerdict) {
  // "abc" is all hexadecimal digits: 0xabc.
  const std::pair<const char*, const char*> values[] = {
      {"a_dec", "12"},   {"b_hex", "1F"},   {"c_0x", "0x1F"}, {"d_frac", "1.5"},
      {"e_text", "xyz"}, {"e_word", "abc"}, {"f_neg", "-1"},  {"g_empty", ""}};
  for (auto [key, value] : values) store_.Set(key, value);
  // Keys and values read from a file may hold a NUL: each key goes out whole
  // with its own value, and a value cut by a NUL is no number.
  const std::string nul_key("h_nul\0x", 7);
  const std::string path = ::testing::TempDir() + "calibration_with_nul.conf";
  ASSERT_TRUE(android::base::WriteStringToFile(
      nul_key + " = 9\nh_nul = 4\nh_nulv = " + std::string("5\0z", 3) + "\n", path));
  ASSERT_TRUE(store_.Load(path.c_str()));
  std::vector<std::pair<std::string, uint32_t>> expected = {
      {"a_dec", 12},         {"b_hex", 31}, {"c_0x", 31}, {"e_word", 0xabc},
      {"f_neg", 0xffffffff}, {"h_nul", 4},  {nul_key, 9}};
  // The largest key that fits into an empty message, and one byte more.
  const int base = GENL_HDRLEN + nla_total_size(4) + nla_total_size(0);
  const int room = McpsUtils::CalibrationPayloadBudget() - base - 12;
  const std::string fits = "key_9" + std::string(room - NLA_HDRLEN - 1 - 5, 'f');
  const std::string too_long = "key_9" + std::string(room - NLA_HDRLEN - 5, 'x');
  store_.Set(fits.c_str(), "1");
  store_.Set(too_long.c_str(), "2");
  expected.emplace_back(fits, 1);

  ExpectSocket(MCPS802154_CMD_SET_CALIBRATIONS);
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  // The longest key fits in a message of its own; the layout of each element
  // is proven against the simulated driver.
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

  // A status without a key, as the driver gives for a refusal it cannot name,
  // ends the transfer after the current message.
  sent_.clear();
  nl_msg* reply = replies_.emplace_back().get();
  genlmsg_put(reply, 0, 0, kFamily, 0, 0, MCPS802154_CMD_SET_CALIBRATIONS, 0);
  nlattr* list = nla_nest_start(reply, MCPS802154_ATTR_CALIBRATIONS | NLA_F_NESTED);
  nlattr* element = nla_nest_start(reply, MCPS802154_CALIBRATIONS_ATTR_CALIBRATION);
  nla_put_s32(reply, MCPS802154_CALIBRATION_ATTR_STATUS, 3);
  nla_nest_end(reply, element);
  nla_nest_end(reply, list);
  ExpectSocket(MCPS802154_CMD_SET_CALIBRATIONS);
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  EXPECT_EQ(sent_.size(), 1u);
  EXPECT_FALSE(mcps_.SetCalibration(kHw, nullptr));
  EXPECT_TRUE(log_.Contains(ERROR, "SetCalibration Bad argument", kTag));
}

// Their encoding is proven against the simulated driver.
McpsUtils::RangingRequest Request(int32_t id, int64_t peer) {
  McpsUtils::RangingRequest request;
  request.id = id;
  request.peerAddress = peer;
  return request;
}

// The angle of arrival straight from its definition, in double precision.
double ExpectedAngle(std::optional<int32_t> phase) {
  if (!phase || *phase < -32767) return NAN;
  const double x = *phase / 2048.0 * 0.046108086 / (2 * M_PI * 0.0208);
  return std::asin(std::fmax(-1.0, std::fmin(1.0, x)));
}

TEST_F(McpsUtilsTest, PhasesComeBackAsAngles) {
  Install({Request(7, 0x0102030405060708), Request(9, -1)});
  const std::optional<int32_t> phases[] = {0,     1000,   -1000,  5805,        5806,
                                           32767, -32767, -32768, std::nullopt};
  for (std::optional<int32_t> phase : phases) {
    SCOPED_TRACE(phase.value_or(0));
    results_.clear();
    std::optional<int32_t> half = phase ? std::optional<int32_t>(*phase / 2) : std::nullopt;
    Deliver({9u, phase ? std::optional<uint32_t>(1234) : std::nullopt, phase, half});
    ASSERT_EQ(results_.size(), 1u);
    EXPECT_EQ(results_[0].peerAddress, -1);
    EXPECT_EQ(results_[0].measurement, phase ? 1234 : INT32_MIN);
    for (auto [angle, source] : {std::pair(results_[0].firstAngleRad, phase),
                                 std::pair(results_[0].secondAngleRad, half)}) {
      const double expected = ExpectedAngle(source);
      if (std::isnan(expected)) {
        EXPECT_TRUE(std::isnan(angle));
      } else {
        EXPECT_NEAR(angle, expected, 2e-6);
      }
    }
  }
}

TEST_F(McpsUtilsTest, ReportsReachTheFirstRequestOfTheirIdOnlyUntilAnEmptyList) {
  EXPECT_FALSE(mcps_.SetRangingRequests(kHw, {}));
  EXPECT_TRUE(log_.Contains(
      WARNING, "SetRangingRequests: The ranging result handler needs to be set first", kTag));
  Install({Request(1, 10), Request(1, 11), Request(2, 12)});
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
  EXPECT_TRUE(log_.Contains(INFO, "CloseRangingSocket: Close ranging socket", kTag));
  Deliver({1u, 5u, 0, 0});
  EXPECT_EQ(results_.size(), 1u);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
