#include "net/mcps_utils.h"

#include <stdint.h>
#include <stdio.h>

#include <cmath>
#include <deque>
#include <map>
#include <memory>
#include <string>
#include <tuple>
#include <type_traits>
#include <utility>
#include <vector>

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

  // Installs |requests| through a socket that records the request and keeps
  // the handler that the watch is given; results are collected.
  void Install(const std::vector<McpsUtils::RangingRequest>& requests) {
    mcps_.SubscribeRangingResults([this](const auto& result) { results_.push_back(result); });
    EXPECT_CALL(factory_, Create()).WillOnce([this] {
      auto socket = std::make_unique<StrictMock<MockNlSocket>>();
      EXPECT_CALL(*socket, SendAndAwaitAck(_, _)).WillOnce([this](nl_msg* msg, auto) {
        sent_.emplace_back(msg);
        return true;
      });
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

TEST_F(McpsUtilsTest, SetSchedulerEncodesNameCommandAndOnlyTheGivenParameters) {
  const struct {
    int scheduler, slot_duration, node_type;
    bool params_only;
    const char* name;
  } cases[] = {{0, -1, -1, false, "default"},
               {1, 16, 0, false, "simple-ranging"},
               {1, 16, 1, true, "simple-ranging"},
               {2, 16, -1, false, "endless"},
               {7, -1, 1, false, "7"},
               {-3, -1, -1, true, "-3"}};
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    sent_.clear();
    ExpectSocket(-1);
    ASSERT_TRUE(mcps_.SetScheduler(kHw, static_cast<McpsScheduler>(c.scheduler),
                                   static_cast<McpsUtils::SlotDuration>(c.slot_duration),
                                   static_cast<McpsUtils::NodeType>(c.node_type), c.params_only));
    ASSERT_EQ(sent_.size(), 1u);
    EXPECT_EQ(sent_[0].header()->nlmsg_type, kFamily);
    EXPECT_EQ(sent_[0].cmd(),
              c.params_only ? MCPS802154_CMD_SET_SCHEDULER_PARAMS : MCPS802154_CMD_SET_SCHEDULER);
    std::vector<nlattr*> attrs = sent_[0].Attrs();
    std::map<int, uint32_t> expected;
    if (c.slot_duration != -1) {
      expected[MCPS802154_SCHEDULER_PARAMS_ATTR_SLOT_DURATION] = c.slot_duration;
    }
    if (c.node_type != -1) expected[MCPS802154_SCHEDULER_PARAMS_ATTR_NODE_TYPE] = c.node_type;
    ASSERT_EQ(attrs.size(), expected.empty() ? 2u : 3u);
    EXPECT_EQ(attrs[0]->nla_type, MCPS802154_ATTR_HW);
    EXPECT_EQ(nla_get_u32(attrs[0]), kHw);
    EXPECT_EQ(attrs[1]->nla_type, MCPS802154_ATTR_SCHEDULER_NAME);
    EXPECT_EQ(SentMessage::Payload(attrs[1]), SentMessage::StringBytes(c.name));
    if (expected.empty()) continue;
    EXPECT_EQ(attrs[2]->nla_type, MCPS802154_ATTR_SCHEDULER_PARAMS | NLA_F_NESTED);
    std::map<int, uint32_t> params;
    for (nlattr* param : SentMessage::Children(attrs[2])) {
      EXPECT_EQ(nla_len(param), 4);
      params[param->nla_type] = nla_get_u32(param);
    }
    EXPECT_EQ(params, expected);
  }
}

TEST_F(McpsUtilsTest, SetFiraRegionSendsEndlessWithOnePlainFiraRegionNest) {
  ExpectSocket(-1);
  ASSERT_TRUE(mcps_.SetFiraRegion(kHw));
  ASSERT_EQ(sent_.size(), 1u);
  EXPECT_EQ(sent_[0].cmd(), MCPS802154_CMD_SET_SCHEDULER);
  std::vector<nlattr*> attrs = sent_[0].Attrs();
  ASSERT_EQ(attrs.size(), 3u);
  EXPECT_EQ(nla_get_u32(attrs[0]), kHw);
  EXPECT_EQ(SentMessage::Payload(attrs[1]), SentMessage::StringBytes("endless"));
  // The driver tells these nests apart by plain type words, without NLA_F_NESTED.
  EXPECT_EQ(attrs[2]->nla_type, MCPS802154_ATTR_SCHEDULER_REGIONS);
  std::vector<nlattr*> regions = SentMessage::Children(attrs[2]);
  ASSERT_EQ(regions.size(), 1u);
  EXPECT_EQ(regions[0]->nla_type, MCPS802154_SCHEDULER_REGIONS_ATTR_REGION);
  std::vector<nlattr*> fields = SentMessage::Children(regions[0]);
  ASSERT_EQ(fields.size(), 1u);
  EXPECT_EQ(fields[0]->nla_type, MCPS802154_REGION_ATTR_NAME);
  EXPECT_EQ(SentMessage::Payload(fields[0]), SentMessage::StringBytes("fira"));
}

TEST_F(McpsUtilsTest, ListHardwareDumpsWithoutIndex) {
  ExpectSocket(MCPS802154_CMD_NEW_HW);
  bool ok = false;
  mcps_.ListHardware(&ok);
  ASSERT_EQ(sent_.size(), 1u);
  EXPECT_EQ(sent_[0].cmd(), MCPS802154_CMD_GET_HW);
  EXPECT_EQ(sent_[0].flags() & NLM_F_DUMP, NLM_F_DUMP);
  EXPECT_TRUE(sent_[0].Attrs().empty());
}

TEST_F(McpsUtilsTest, CalibrationSendsParsableKeysInOrderWithinOnePagePerMessage) {
  // "abc" is all hexadecimal digits: 0xabc.
  const std::pair<const char*, const char*> values[] = {
      {"a_dec", "12"},   {"b_hex", "1F"},   {"c_0x", "0x1F"}, {"d_frac", "1.5"},
      {"e_text", "xyz"}, {"e_word", "abc"}, {"f_neg", "-1"},  {"g_empty", ""}};
  for (auto [key, value] : values) store_.Set(key, value);
  std::vector<std::pair<std::string, uint32_t>> expected = {
      {"a_dec", 12}, {"b_hex", 31}, {"c_0x", 31}, {"e_word", 0xabc}, {"f_neg", 0xffffffff}};
  for (uint32_t i = 0; i < 600; ++i) {
    char key[16];
    snprintf(key, sizeof(key), "key_%04u", i);
    store_.Set(key, std::to_string(i).c_str());
    expected.emplace_back(key, i);
  }
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
  // 605 elements of at most 28 bytes fill five messages; the long key needs one of its own.
  ASSERT_EQ(sent_.size(), 6u);
  std::vector<std::pair<std::string, uint32_t>> keys;
  for (size_t i = 0; i < sent_.size(); ++i) {
    EXPECT_EQ(sent_[i].cmd(), MCPS802154_CMD_SET_CALIBRATIONS);
    EXPECT_LE(static_cast<int>(sent_[i].header()->nlmsg_len - NLMSG_HDRLEN),
              McpsUtils::CalibrationPayloadBudget());
    std::vector<nlattr*> attrs = sent_[i].Attrs();
    ASSERT_EQ(attrs.size(), 2u);
    EXPECT_EQ(nla_get_u32(attrs[0]), kHw);
    EXPECT_EQ(attrs[1]->nla_type, MCPS802154_ATTR_CALIBRATIONS | NLA_F_NESTED);
    for (nlattr* element : SentMessage::Children(attrs[1])) {
      std::vector<nlattr*> f = SentMessage::Children(element);
      ASSERT_EQ(element->nla_type, MCPS802154_CALIBRATIONS_ATTR_CALIBRATION | NLA_F_NESTED);
      ASSERT_EQ(f.size(), 2u);
      ASSERT_EQ(
          std::make_tuple(f[0]->nla_type, f[1]->nla_type, nla_len(f[1])),
          std::make_tuple(MCPS802154_CALIBRATION_ATTR_KEY, MCPS802154_CALIBRATION_ATTR_VALUE, 4));
      keys.emplace_back(nla_get_string(f[0]), nla_get_u32(f[1]));
    }
  }
  EXPECT_EQ(keys, expected);
  for (const char* key : {"d_frac", "e_text", "g_empty"}) {
    EXPECT_TRUE(log_.Contains(WARNING, std::string("Skip incorrect key ") + key, kTag)) << key;
  }
  EXPECT_EQ(log_.Count(ERROR, "Skip incorrect key " + too_long, kTag), 1);
}

TEST_F(McpsUtilsTest, CalibrationVerdictEndsTheTransferAfterTheCurrentMessage) {
  for (int i = 0; i < 400; ++i) store_.Set(("key_" + std::to_string(1000 + i)).c_str(), "1");
  // A status without a key, as the driver gives for a refusal it cannot name.
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
}

TEST_F(McpsUtilsTest, CalibrationOfANullStoreIsRefusedAndOfAnEmptyOneSendsNothing) {
  EXPECT_FALSE(mcps_.SetCalibration(kHw, nullptr));
  EXPECT_TRUE(log_.Contains(ERROR, "SetCalibration Bad argument", kTag));
  ExpectSocket(MCPS802154_CMD_SET_CALIBRATIONS);
  EXPECT_TRUE(mcps_.SetCalibration(kHw, &store_));
  EXPECT_TRUE(sent_.empty());
}

McpsUtils::RangingRequest Request(int32_t id, int32_t parameter, int64_t peer) {
  McpsUtils::RangingRequest request;
  request.id = id;
  request.parameter = parameter;
  request.peerAddress = peer;
  return request;
}

// The angle of arrival straight from its definition, in double precision.
double ExpectedAngle(std::optional<int32_t> phase) {
  if (!phase || *phase < -32767) return NAN;
  const double x = *phase / 2048.0 * 0.046108086 / (2 * M_PI * 0.0208);
  return std::asin(std::fmax(-1.0, std::fmin(1.0, x)));
}

TEST_F(McpsUtilsTest, RequestsAreSentInOrderAndPhasesComeBackAsAngles) {
  Install({Request(7, -2, 0x0102030405060708), Request(9, 5, -1)});
  ASSERT_EQ(sent_.size(), 1u);
  EXPECT_EQ(sent_[0].cmd(), MCPS802154_CMD_SET_RANGING_REQUESTS);
  std::vector<nlattr*> attrs = sent_[0].Attrs();
  ASSERT_EQ(attrs.size(), 2u);
  EXPECT_EQ(nla_get_u32(attrs[0]), kHw);
  EXPECT_EQ(attrs[1]->nla_type, MCPS802154_ATTR_RANGING_REQUESTS | NLA_F_NESTED);
  std::vector<std::vector<uint8_t>> fields;
  for (nlattr* element : SentMessage::Children(attrs[1])) {
    EXPECT_EQ(element->nla_type, MCPS802154_RANGING_REQUESTS_ATTR_REQUEST | NLA_F_NESTED);
    for (nlattr* field : SentMessage::Children(element))
      fields.push_back(SentMessage::Payload(field));
  }
  EXPECT_EQ(fields, (std::vector<std::vector<uint8_t>>{
                        SentMessage::Bytes(7), SentMessage::Bytes(-2),
                        SentMessage::Bytes(int64_t{0x0102030405060708}), SentMessage::Bytes(9),
                        SentMessage::Bytes(5), SentMessage::Bytes(int64_t{-1})}));

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

TEST_F(McpsUtilsTest, ReportsReachTheFirstRequestOfTheirIdOnly) {
  Install({Request(1, 0, 10), Request(1, 0, 11), Request(2, 0, 12)});
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
}

TEST_F(McpsUtilsTest, AnEmptyListStopsRangingWithoutTheDriver) {
  EXPECT_FALSE(mcps_.SetRangingRequests(kHw, {}));
  EXPECT_TRUE(log_.Contains(
      WARNING, "SetRangingRequests: The ranging result handler needs to be set first", kTag));
  Install({Request(1, 0, 10)});
  EXPECT_TRUE(mcps_.SetRangingRequests(kHw, {}));
  EXPECT_TRUE(log_.Contains(INFO, "CloseRangingSocket: Close ranging socket", kTag));
  Deliver({1u, 5u, 0, 0});
  EXPECT_TRUE(results_.empty());
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
