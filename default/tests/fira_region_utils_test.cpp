#include "net/fira_region_utils.h"

#include <unistd.h>

#include <cmath>
#include <functional>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netlink/msg.h>

#include "net/fira_region.h"
#include "sim/fira_notification.h"
#include "tests/fira_callback_recorder.h"
#include "tests/log_capture.h"
#include "tests/mock_nl_socket.h"
#include "tests/sent_message.h"

namespace hardware {
namespace dalix {
namespace {

using ::aidl::hardware::dalix::uwb::FiraRangingData;
using ::aidl::hardware::dalix::uwb::FiraTwrMeasurement;
using ::android::base::ERROR;
using ::android::base::INFO;
using ::android::base::LogSeverity;
using ::android::base::WARNING;
using ::testing::_;
using ::testing::ByMove;
using ::testing::Return;
using ::testing::SaveArg;
using ::testing::StrictMock;
namespace uwb = ::aidl::hardware::dalix::uwb;
using Session = uwb::FiraTwrSession;
using Attrs = std::map<int, std::vector<uint8_t>>;

constexpr uint32_t kFamily = 0x1d;
constexpr uint32_t kHw = 3;
constexpr char kTag[] = "dalix.uwb.FiraRegionUtils";

// A session parameter as it goes on the wire.
std::vector<uint8_t> Param(int attr, uint32_t value) {
  switch (FiraSessionParamWidth(attr)) {
    case 1:
      return SentMessage::Bytes(static_cast<uint8_t>(value));
    case 2:
      return SentMessage::Bytes(static_cast<uint16_t>(value));
    default:
      return SentMessage::Bytes(value);
  }
}

// A driver-controller session (interface value 1) that sets most switches.
Session BaseSession() {
  Session s;
  s.id = 42;
  s.deviceType = uwb::DeviceType(1);
  s.deviceRole = uwb::DeviceRole(1);
  s.rangingRoundUsage = uwb::RangingRoundUsage(2);
  s.multiNodeMode = uwb::MultiNodeMode(1);
  s.deviceAddress = {{0x12, 0x34}};
  s.destAddressList = {{{0x56, 0x78}}, {{0x9a, 0xbc}}};
  s.initiationTimeMs = 10;
  s.slotDurationRstu = 2400;
  s.slotsPerRangingRound = 25;
  s.rangingBlockDurationMs = 200;
  s.blockStridingValue = 3;
  s.maxRangingRoundRetries = 5;
  s.isHoppingEnabled = true;
  s.sessionPriority = 50;
  s.rangingRoundControl.hasResultReportPhase = true;
  s.inBandTerminationAttemptCount = 1;
  s.channelNumber = 9;
  s.preambleCodeIndex = 10;
  s.rframeConfig = uwb::RframeConfig(3);
  s.preambleDuration = uwb::PreambleDuration(1);
  s.sfdId = 2;
  s.stsSegmentCount = 1;
  s.bprfPhrDataRate = uwb::BprfPhrDataRate(1);
  s.stsConfig = uwb::FiraStsConfig(1);
  s.subSessionId = 7;
  s.aoaResultRequest = uwb::AoaResultRequest(1);
  s.resultReportConfig = {true, true, false, true};
  return s;
}

Attrs BaseAttrs() {
  Attrs attrs;
  for (auto [attr, value] : std::map<int, uint32_t>{
           {1, 0},   {2, 1},   {3, 2},  {4, 1},  {5, 0x1234}, {6, 0x5678}, {7, 10}, {8, 2400},
           {9, 200}, {10, 25}, {12, 5}, {13, 1}, {15, 50},    {18, 0},     {19, 1}, {20, 9},
           {21, 10}, {22, 3},  {23, 0}, {25, 2}, {26, 1},     {27, 0},     {28, 1}, {34, 1},
           {32, 0},  {36, 1},  {43, 1}, {44, 1}, {45, 1},     {47, 1}}) {
    attrs[attr] = Param(attr, value);
  }
  return attrs;
}

class FiraRegionUtilsTest : public ::testing::Test {
 protected:
  void SetUp() override { fira_.SetMcpsNetId(kFamily); }
  void TearDown() override { nlmsg_set_default_size(getpagesize()); }

  // The next one-shot socket acknowledges every request with |ack| and keeps a copy.
  void ExpectSocket(bool ack = true) {
    EXPECT_CALL(factory_, Create()).WillOnce([this, ack] {
      auto socket = std::make_unique<StrictMock<MockNlSocket>>();
      EXPECT_CALL(*socket, SendAndAwaitAck(_, _)).WillOnce([this, ack](nl_msg* msg, auto) {
        sent_.emplace_back(msg);
        return ack;
      });
      return std::unique_ptr<NlSocket>(std::move(socket));
    });
  }

  // Checks the framing of the last request and returns its CALL_PARAMS children.
  std::vector<nlattr*> CallParams(uint8_t call, uint32_t hw = kHw) {
    SentMessage& sent = sent_.back();
    EXPECT_EQ(sent.header()->nlmsg_type, kFamily);
    EXPECT_EQ(sent.cmd(), MCPS802154_CMD_CALL_REGION);
    std::vector<nlattr*> top = sent.Attrs();
    EXPECT_EQ(top.size(), 3u);
    EXPECT_EQ(nla_get_u32(top[0]), hw);
    EXPECT_EQ(SentMessage::Payload(top[1]), SentMessage::StringBytes("endless"));
    EXPECT_EQ(top[2]->nla_type, MCPS802154_ATTR_SCHEDULER_REGION_CALL);
    std::vector<nlattr*> region = SentMessage::Children(top[2]);
    EXPECT_EQ(region.size(), 3u);
    EXPECT_EQ(SentMessage::Payload(region[0]), SentMessage::StringBytes("fira"));
    EXPECT_EQ(region[1]->nla_type, MCPS802154_REGION_CALL_ATTR_CALL);
    EXPECT_EQ(SentMessage::Payload(region[1]), SentMessage::Bytes<uint32_t>(call));
    EXPECT_EQ(region[2]->nla_type, MCPS802154_REGION_CALL_ATTR_CALL_PARAMS);
    return SentMessage::Children(region[2]);
  }

  // The session parameters of the last ConfigTwrSession, checked for their order.
  Attrs SentSessionParams(uint32_t hw = kHw) {
    std::vector<nlattr*> params = CallParams(FIRA_CALL_SESSION_SET_PARAMS, hw);
    EXPECT_EQ(params.size(), 2u);
    EXPECT_EQ(params[1]->nla_type, FIRA_CALL_ATTR_SESSION_PARAMS);
    Attrs attrs;
    double previous = 0;
    for (nlattr* attr : SentMessage::Children(params[1])) {
      // The transmit mask goes first among the antenna parameters.
      double rank = attr->nla_type == 34 ? 31.5 : attr->nla_type;
      EXPECT_GT(rank, previous) << "attribute " << attr->nla_type << " out of order";
      previous = rank;
      attrs[attr->nla_type] = SentMessage::Payload(attr);
    }
    return attrs;
  }

  int Logged(LogSeverity severity, const std::string& text) {
    return log_.Count(severity, text, kTag);
  }

  StrictMock<MockNlSocketFactory> factory_;
  FiraRegionUtils fira_{&factory_};
  std::vector<SentMessage> sent_;
  ConfigUtils config_;
  LogCapture log_;
  FiraCallbackRecorder recorder_;
};

TEST_F(FiraRegionUtilsTest, ConfigTwrSessionSendsExactlyTheParametersTheSessionCallsFor) {
  const struct {
    const char* name;
    std::function<void(Session&)> change;
    std::map<int, int64_t> delta;  // -1: not sent
    uint32_t hw = kHw;
  } cases[] = {
      {"base", [](Session&) {}, {}},
      {"driver controlee sends no destination, reports its phases",
       [](Session& s) {
         s.deviceType = uwb::DeviceType(0);
         s.stsConfig = uwb::FiraStsConfig(2);
         s.rangingRoundControl = {false, uwb::MeasurementReportType(1), true};
       },
       {{1, 1}, {6, -1}, {16, 0}, {17, 1}, {18, -1}, {36, 2}}},
      {"driver controller ignores the report phases, has a sub-session",
       [](Session& s) {
         s.stsConfig = uwb::FiraStsConfig(2);
         s.rangingRoundControl = {false, uwb::MeasurementReportType(1), false};
       },
       {{36, 2}, {37, 7}}},
      {"static STS key: IV then vendor id",
       [](Session& s) {
         s.stsConfig = uwb::FiraStsConfig(0);
         s.staticStsIV = {1, 2, 3, 4, 5, 6};
         s.vendorId = {0xa, 0xb};
       },
       {{36, 0}, {38, -2}}},
      {"block striding", [](Session& s) { s.isBlockStridingEnabled = true; }, {{11, 3}, {14, 1}}},
      {"no retries", [](Session& s) { s.maxRangingRoundRetries = 0; }, {{12, -1}}},
      {"negative retries", [](Session& s) { s.maxRangingRoundRetries = -1; }, {{12, -1}}},
      {"no angles, whatever the type",
       [](Session& s) {
         s.aoaResultRequest = uwb::AoaResultRequest(0);
         s.aoaType = uwb::AoaType(7);
       },
       {{43, -1}}},
      {"elevation only", [](Session& s) { s.aoaType = uwb::AoaType(1); }, {{32, -1}, {33, 255}}},
      {"both angles in pair mode",
       [](Session& s) {
         s.aoaType = uwb::AoaType(2);
         s.deviceRole = uwb::DeviceRole(0);
       },
       {{2, 0}, {33, 255}, {35, 1}}},
      {"both angles without pair mode",
       [](Session& s) { s.aoaType = uwb::AoaType(2); },
       {{33, 255}, {35, 0}}},
      {"configured hardware",
       [](Session& s) { s.aoaType = uwb::AoaType(2); },
       {{32, 2}, {33, 3}, {34, 8}, {35, 0}},
       kHw + 1},
      {"other switches flipped",
       [](Session& s) {
         s.isKeyRotationEnabled = true;
         s.keyRotationRate = 4;
         s.isTxAdaptivePayloadPowerEnabled = true;
         s.fcsType = uwb::FcsType(1);
         s.isHoppingEnabled = false;
         s.rangingRoundControl.hasDeferredMode = true;
         s.prfMode = uwb::PrfMode(1);
         s.preambleDuration = uwb::PreambleDuration(0);
         s.bprfPhrDataRate = uwb::BprfPhrDataRate(0);
       },
       {{41, 1}, {42, 4}, {30, 1}, {29, 1}, {13, -1}, {18, -1}, {23, -1}, {24, 0}, {28, -1}}},
      {"bytes and wide values",
       [](Session& s) {
         s.inBandTerminationAttemptCount = -1;
         s.channelNumber = 0x109;
         s.sessionPriority = -56;
       },
       {{19, 0xffffffff}, {20, 9}, {15, 200}}},
  };
  config_.Set("antenna_pair_azimuth", "2");
  config_.Set("antenna_pair_elevation", "3");
  config_.Set("tx_antenna", "3");
  ASSERT_TRUE(fira_.SetProperties(kHw + 1, config_));
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    Session session = BaseSession();
    c.change(session);
    Attrs expected = BaseAttrs();
    for (auto [attr, value] : c.delta) {
      if (value == -1) expected.erase(attr);
      if (value >= 0) expected[attr] = Param(attr, static_cast<uint32_t>(value));
    }
    if (c.delta.count(38)) expected[38] = {1, 2, 3, 4, 5, 6, 0xa, 0xb};
    ExpectSocket();
    ASSERT_TRUE(fira_.ConfigTwrSession(c.hw, session));
    EXPECT_EQ(SentSessionParams(c.hw), expected);
    EXPECT_EQ(nla_get_u32(CallParams(FIRA_CALL_SESSION_SET_PARAMS, c.hw)[0]), 42u);
  }
  ExpectSocket(false);
  EXPECT_FALSE(fira_.ConfigTwrSession(kHw, BaseSession()));
}

TEST_F(FiraRegionUtilsTest, ValueChecksRefuseWithTheirLineAndSendNothing) {
  const std::string address_text =
      ": Incorrect deviceAddress size, Fira 1.1 only supports short address.";
  const struct {
    std::function<void(Session&)> change;
    std::string log;
  } cases[] = {
      {[](Session& s) { s.rangingRoundUsage = uwb::RangingRoundUsage(0); },
       "PutMainSessionParams: Unsupported rangingRoundUsage OWR"},
      {[](Session& s) { s.multiNodeMode = uwb::MultiNodeMode(2); },
       "PutMainSessionParams: Unsupported multiNodeMode MANY_TO_MANY"},
      {[](Session& s) {
         s.deviceAddress.address = {1, 2, 3};
       },
       "PutMainSessionParams" + address_text},
      {[](Session& s) { s.destAddressList[0].address = {1}; },
       "PutMainSessionParams" + address_text},
      {[](Session& s) { s.destAddressList.clear(); }, "PutMainSessionParams" + address_text},
      {[](Session& s) { s.rframeConfig = uwb::RframeConfig(2); },
       "PutRadioParams: Unsupported Rframe config 2"},
      {[](Session& s) { s.psduDataRate = uwb::PsduDataRate(4); },
       "PutRadioParams: Unsupported PSDU data rate 4"},
      {[](Session& s) { s.psduDataRate = uwb::PsduDataRate(-1); },
       "PutRadioParams: Unsupported PSDU data rate -1"},
      {[](Session& s) { s.aoaType = uwb::AoaType(3); }, "PutAntennaParams: Unsupported AoaType: 3"},
      {[](Session& s) { s.stsConfig = uwb::FiraStsConfig(3); },
       "PutCryptoParams: Unsupported STS configuration: 3"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.log);
    Session session = BaseSession();
    c.change(session);
    EXPECT_FALSE(fira_.ConfigTwrSession(kHw, session));
    EXPECT_EQ(Logged(ERROR, c.log), 1) << log_.Text();
    log_.Reset();
  }
  Session controlee = BaseSession();
  controlee.deviceType = uwb::DeviceType(0);
  controlee.destAddressList.clear();
  ExpectSocket();
  EXPECT_TRUE(fira_.ConfigTwrSession(kHw, controlee));
}

TEST_F(FiraRegionUtilsTest, CallsAreFramedAndCarryTheirParameters) {
  using Controlees = std::vector<uwb::UwbAddress>;
  const Controlees controlees = {{{0x0a, 0x0b}}, {{0x0c, 0x0d}}};
  const std::vector<int32_t> sub_sessions = {7, -1};
  const struct {
    uint8_t call;
    std::function<bool(FiraRegionUtils&)> run;
    std::vector<std::pair<int, std::vector<uint8_t>>> extra;  // after the session id
  } cases[] = {
      {FIRA_CALL_SESSION_INIT, [](auto& f) { return f.InitSession(kHw, 9); }, {}},
      {FIRA_CALL_SESSION_STOP, [](auto& f) { return f.StopSession(kHw, 9); }, {}},
      {FIRA_CALL_SESSION_DEINIT, [](auto& f) { return f.DeinitSession(kHw, 9); }, {}},
      {FIRA_CALL_SESSION_SET_PARAMS,
       [](auto& f) { return f.UpdateBlockStriding(kHw, 9, 0x10203); },
       {{FIRA_CALL_ATTR_SESSION_PARAMS,
         {8, 0, FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_VALUE, 0, 3, 2, 1, 0}}}},
      {FIRA_CALL_NEW_CONTROLEE,
       [&](auto& f) { return f.AddControlees(kHw, 9, controlees, &sub_sessions); },
       {{FIRA_CALL_ATTR_CONTROLEES,
         {20, 0, 1, 0, 6, 0, 1, 0, 0x0b, 0x0a, 0, 0, 8, 0, 2, 0, 7,    0,    0,    0,
          20, 0, 2, 0, 6, 0, 1, 0, 0x0d, 0x0c, 0, 0, 8, 0, 2, 0, 0xff, 0xff, 0xff, 0xff}}}},
      {FIRA_CALL_DEL_CONTROLEE,
       [&](auto& f) { return f.RemoveControlees(kHw, 9, controlees); },
       {{FIRA_CALL_ATTR_CONTROLEES,
         {12, 0, 1, 0, 6, 0, 1, 0, 0x0b, 0x0a, 0, 0, 12, 0, 2, 0, 6, 0, 1, 0, 0x0d, 0x0c, 0, 0}}}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(static_cast<int>(c.call));
    ExpectSocket();
    ASSERT_TRUE(c.run(fira_));
    std::vector<nlattr*> params = CallParams(c.call);
    ASSERT_EQ(params.size(), 1 + c.extra.size());
    EXPECT_EQ(params[0]->nla_type, FIRA_CALL_ATTR_SESSION_ID);
    EXPECT_EQ(SentMessage::Payload(params[0]), SentMessage::Bytes<uint32_t>(9));
    for (size_t i = 0; i < c.extra.size(); ++i) {
      EXPECT_EQ(params[i + 1]->nla_type, c.extra[i].first);
      EXPECT_EQ(SentMessage::Payload(params[i + 1]), c.extra[i].second);
    }
  }
  ExpectSocket(false);
  EXPECT_FALSE(fira_.InitSession(kHw, 9));
  for (const char* op : {"InitSession", "StopSession", "DeinitSession", "UpdateBlockStriding",
                         "AddControlees", "RemoveControlees", "CreateSessionStateMsg"}) {
    EXPECT_GE(Logged(INFO, op), 1) << op;
  }
  EXPECT_FALSE(fira_.AddControlees(kHw, 9, {}, nullptr));
  EXPECT_FALSE(fira_.RemoveControlees(kHw, 9, {}));
  EXPECT_FALSE(fira_.AddControlees(kHw, 9, {{{1, 2, 3}}}, nullptr));
  EXPECT_EQ(Logged(ERROR, "AddControlees: Empty controlees"), 1);
  EXPECT_EQ(Logged(ERROR, "RemoveControlees: Empty controlees"), 1);
  EXPECT_EQ(Logged(ERROR,
                   "PutControlees: Incorrect deviceAddress size, Fira 1.1 only supports "
                   "short address."),
            1);
  fira_.SetMcpsNetId(0);
  EXPECT_FALSE(fira_.InitSession(kHw, 9));
  EXPECT_EQ(Logged(ERROR, "SetMcpsCommand: MCPS netlink id is not resolved"), 1);
}

// Whatever point a request runs out of room at, it fails with the line of the
// builder that ran out, and nothing is sent.
TEST_F(FiraRegionUtilsTest, EveryBuilderReportsRunningOutOfRoom) {
  const std::vector<uwb::UwbAddress> controlees = {{{1, 2}}, {{3, 4}}};
  const std::vector<int32_t> sub_sessions = {1, 2};
  Session session = BaseSession();
  session.stsConfig = uwb::FiraStsConfig(0);
  session.isKeyRotationEnabled = true;
  const std::function<bool()> ops[] = {
      [&] { return fira_.InitSession(kHw, 1); },
      [&] { return fira_.ConfigTwrSession(kHw, session); },
      [&] { return fira_.AddControlees(kHw, 1, controlees, &sub_sessions); },
      [&] { return fira_.RemoveControlees(kHw, 1, controlees); },
      [&] { return fira_.UpdateBlockStriding(kHw, 1, 2); },
  };
  for (const auto& op : ops) {
    ExpectSocket();
    ASSERT_TRUE(op());
    const size_t full = sent_.back().header()->nlmsg_len;
    for (size_t size = NLMSG_HDRLEN; size < full; size += 4) {
      nlmsg_set_default_size(size);
      EXPECT_FALSE(op()) << size;
    }
    nlmsg_set_default_size(getpagesize());
  }
  std::set<std::string> seen;
  for (const auto& entry : log_.Entries()) {
    if (entry.severity == ERROR && entry.message.find("Error creating") != std::string::npos) {
      seen.insert(entry.message);
    }
  }
  std::set<std::string> expected = {"StartCallMessage Error creating MCPS message",
                                    "PutRadioParams Error creating MCPS message"};
  for (const char* name :
       {"SetMcpsCommand", "CreateSessionStateMsg", "ConfigTwrSession", "PutMainSessionParams",
        "PutShortAddress", "PutTimingsParams", "PutBehaviorParams", "PutAntennaParams",
        "PutCryptoParams", "PutReportParams", "PutControlees", "AddControlees", "RemoveControlees",
        "UpdateBlockStriding"}) {
    expected.insert(std::string(name) + ": Error creating MCPS message");
  }
  EXPECT_EQ(seen, expected);

  // A call nest beyond what its 16-bit length can say.
  nlmsg_set_default_size(1 << 17);
  const std::vector<uwb::UwbAddress> many(5460, uwb::UwbAddress{{1, 2}});
  EXPECT_FALSE(fira_.AddControlees(kHw, 1, many, nullptr));
  EXPECT_EQ(Logged(ERROR, "EndCallMessage Error creating MCPS message"), 1);
}

TEST_F(FiraRegionUtilsTest, SetPropertiesTakesTheLowByteOfValidNumbersOnly) {
  const struct {
    const char* azimuth;
    const char* elevation;
    const char* tx;
    bool valid;
    uint32_t stored[3];
  } cases[] = {
      {"1", "2", "4", true, {1, 2, 4}},           {"", "0x3", "04", true, {0, 3, 4}},
      {"257", "6", "0", true, {1, 6, 0}},         {"7", "2x", "5", false, {1, 6, 0}},
      {nullptr, nullptr, "-1", false, {1, 6, 0}}, {"3", nullptr, nullptr, false, {3, 6, 0}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.azimuth ? c.azimuth : "none");
    config_.Clear();
    if (c.azimuth) config_.Set("antenna_pair_azimuth", c.azimuth);
    if (c.elevation) config_.Set("antenna_pair_elevation", c.elevation);
    if (c.tx) config_.Set("tx_antenna", c.tx);
    EXPECT_EQ(fira_.SetProperties(kHw, config_), c.valid);
    FiraRegionUtils::HwConfig stored = fira_.GetHwConfig(kHw).value();
    EXPECT_EQ(stored.antenna_pair_azimuth, c.stored[0]);
    EXPECT_EQ(stored.antenna_pair_elevation, c.stored[1]);
    EXPECT_EQ(stored.tx_antenna, c.stored[2]);
  }
  config_.Clear();
  EXPECT_FALSE(fira_.SetProperties(kHw + 1, config_));
  FiraRegionUtils::HwConfig fresh = fira_.GetHwConfig(kHw + 1).value();
  EXPECT_EQ(fresh.antenna_pair_azimuth, 0u);
  EXPECT_EQ(fresh.antenna_pair_elevation, 255u);
  EXPECT_EQ(fresh.tx_antenna, 0u);
}

TEST_F(FiraRegionUtilsTest, StartSessionSharesOneWatchedRangingSocket) {
  EXPECT_FALSE(fira_.StartSession(kHw, 1));
  fira_.SubscribeCallback(kHw, nullptr);
  EXPECT_FALSE(fira_.StartSession(kHw, 1));
  EXPECT_EQ(Logged(ERROR, "StartSession: Fira callback needs to be set for this hw_index."), 2);

  fira_.SubscribeCallback(kHw, &recorder_);
  fira_.SubscribeCallback(kHw + 1, &recorder_);
  EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(nullptr)));
  EXPECT_FALSE(fira_.StartSession(kHw, 1));
  EXPECT_EQ(Logged(ERROR, "StartSession: BAD_ALLOC: cannot allocate NlSocket"), 1);

  // The first socket refuses the start, the second cannot be watched: both go.
  std::weak_ptr<NlSocket> watched;
  for (bool send_ok : {false, true}) {
    auto socket = std::make_unique<StrictMock<MockNlSocket>>();
    EXPECT_CALL(*socket, SendAndAwaitAck(_, _)).WillOnce(Return(send_ok));
    if (send_ok) {
      EXPECT_CALL(*socket, DisableAutoAck());
      EXPECT_CALL(*socket, WatchNetlinkSocket(_, _))
          .WillOnce(testing::DoAll(SaveArg<0>(&watched), Return(false)));
    }
    EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
    EXPECT_FALSE(fira_.StartSession(kHw, 1));
  }
  EXPECT_TRUE(watched.expired());

  // A notification that comes before the acknowledgement reaches the callback.
  sim::FiraNotificationData early;
  early.hw_index = kHw + 1;
  early.session_id = 2;
  early.stopped = true;
  UniqueNlMsg notification;
  ASSERT_TRUE(sim::EncodeFiraNotification(notification.get(), kFamily, early));
  auto socket = std::make_unique<StrictMock<MockNlSocket>>();
  MockNlSocket* shared = socket.get();
  EXPECT_CALL(*socket, SendAndAwaitAck(_, _)).WillOnce(Return(true));
  EXPECT_CALL(*socket, DisableAutoAck());
  EXPECT_CALL(*socket, WatchNetlinkSocket(_, _))
      .WillOnce(testing::DoAll(SaveArg<0>(&watched), Return(true)));
  EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
  ASSERT_TRUE(fira_.StartSession(kHw, 1));
  testing::Mock::VerifyAndClearExpectations(shared);
  EXPECT_CALL(*shared, SendAndAwaitAck(_, _))
      .WillOnce([&](nl_msg*, std::function<int(nl_msg*)> handler) {
        EXPECT_EQ(handler(notification.get()), NL_STOP);
        return true;
      });
  ASSERT_TRUE(fira_.StartSession(kHw + 1, 2));
  EXPECT_EQ(recorder_.stopped, std::vector<uint32_t>{2});

  fira_.UnsubscribeCallback(kHw);
  EXPECT_FALSE(watched.expired());
  fira_.UnsubscribeCallback(kHw + 1);
  EXPECT_TRUE(watched.expired());
  EXPECT_EQ(Logged(INFO, "CloseRangingSocket: Close ranging socket"), 1);
  fira_.UnsubscribeCallback(kHw + 7);
  EXPECT_EQ(Logged(INFO, "CloseRangingSocket: Close ranging socket"), 1);
  EXPECT_EQ(Logged(INFO, "SubscribeCallback"), 3);
  EXPECT_EQ(Logged(INFO, "UnsubscribeCallback"), 3);
}

TEST_F(FiraRegionUtilsTest, NotificationsDecodeIntoResultsOrAreDroppedWithTheirLine) {
  using sim::FiraAoaData;
  using sim::FiraMeasurementData;
  using sim::FiraNotificationData;
  fira_.SubscribeCallback(kHw, &recorder_);
  config_.Set("antenna_pair_azimuth", "2");
  config_.Set("antenna_pair_elevation", "3");
  config_.Set("tx_antenna", "0");
  fira_.SetProperties(kHw, config_);
  auto ok = [](uint16_t address) {
    FiraMeasurementData m;
    m.short_address = address;
    m.status = 0;
    m.distance_cm = 250;
    return m;
  };
  auto aoa = [](std::optional<uint8_t> pair) { return FiraAoaData{pair, 100, 1, -200}; };
  auto base = [&](std::vector<FiraMeasurementData> measurements) {
    FiraNotificationData data;
    data.hw_index = kHw;
    data.session_id = 77;
    data.index = 5;
    data.timestamp_ns = 123456789;
    data.measurements = std::move(measurements);
    return data;
  };
  FiraMeasurementData angles = ok(0x1234);
  angles.line_of_sight = true;
  angles.azimuth = 32767;
  angles.azimuth_fom = 255;
  angles.elevation = 32767;
  angles.elevation_fom = 1;
  angles.aoa_elevation = aoa(9);
  angles.aoa = aoa(3);
  FiraMeasurementData both = ok(2), stopped = ok(3), failed = ok(4);
  both.line_of_sight = both.non_line_of_sight = true;
  stopped.stopped = true;
  failed.status = 2;
  FiraMeasurementData no_distance = ok(6), bad_aoa = ok(7), unpaired = ok(8), bad_entry = ok(9);
  no_distance.distance_cm.reset();
  bad_aoa.aoa_azimuth = FiraAoaData{2, 1, 2, std::nullopt};
  unpaired.aoa = aoa(4);
  unpaired.aoa_azimuth = aoa(std::nullopt);
  bad_entry.short_address.reset();
  bad_entry.status.reset();

  FiraNotificationData stop = base({ok(1)});
  stop.stopped = true;
  FiraNotificationData other_hw = base({});
  other_hw.hw_index = kHw + 1;
  FiraNotificationData other_call = base({});
  other_call.call = FIRA_CALL_SESSION_START;
  FiraNotificationData no_session = base({}), no_index = base({}), no_list = base({});
  no_session.session_id.reset();
  no_index.index.reset();
  no_list.measurements.reset();

  const struct {
    const char* name;
    FiraNotificationData data;
    size_t results;
    std::vector<std::pair<LogSeverity, std::string>> logs;
  } cases[] = {
      {"stopped wins over measurements", stop, 0, {}},
      {"angles", base({angles}), 1, {}},
      {"a bad measurement drops only itself",
       base({both, stopped, failed, no_distance, bad_aoa, unpaired, bad_entry}),
       1,
       {{INFO, "ParseMeasurements: Stop ranging with peer."},
        {ERROR, "ParseMeasurements: Missing addr or status in ranging measurement"},
        {ERROR, "ParseMeasurements: Missing fields in ranging measurement"},
        {ERROR, "ParseAntennaMeasurement: Missing aoa data measurement fields"}}},
      {"unknown hardware", other_hw, 0, {{INFO, "OnRangingResult: No callback for hw index: 4"}}},
      {"another call",
       other_call,
       0,
       {{INFO, "OnRangingResult: Not a ranging notification message."}}},
      {"no session id",
       no_session,
       0,
       {{WARNING, "OnRangingResult: Missing session ntf call attrs"}}},
      {"no index", no_index, 0, {{WARNING, "OnRangingResult: Missing ranging data attr"}}},
      {"no list", no_list, 0, {{WARNING, "OnRangingResult: Missing ranging data attr"}}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    recorder_.results.clear();
    log_.Reset();
    UniqueNlMsg msg;
    ASSERT_TRUE(sim::EncodeFiraNotification(msg.get(), kFamily, c.data));
    EXPECT_EQ(fira_.OnRangingResult(msg.get()), NL_STOP);
    ASSERT_EQ(recorder_.results.size(), c.results);
    for (const auto& [severity, text] : c.logs) EXPECT_EQ(Logged(severity, text), 1) << text;
  }
  EXPECT_EQ(recorder_.stopped, std::vector<uint32_t>{77});

  // The last batch: both flags, a failed status, the pair nobody configured.
  const std::vector<FiraTwrMeasurement>& batch = [&]() -> const auto& {
    UniqueNlMsg msg;
    sim::EncodeFiraNotification(msg.get(), kFamily, base({both, failed, bad_aoa, unpaired}));
    recorder_.results.clear();
    fira_.OnRangingResult(msg.get());
    return recorder_.results.at(0).second;
  }
  ();
  ASSERT_EQ(batch.size(), 4u);
  EXPECT_EQ(batch[0].lineOfSight, 0);
  EXPECT_EQ(batch[0].address.address, (std::vector<uint8_t>{2, 0}));
  EXPECT_EQ(batch[1].status, 2);
  EXPECT_EQ(batch[1].distance, 0);
  EXPECT_EQ(batch[1].lineOfSight, 0);
  EXPECT_TRUE(batch[2].antennaMeasurements.empty());
  EXPECT_EQ(batch[2].lineOfSight, -1);
  // Attribute 9 is azimuth data whatever pair it names; 8 of pair 4 is dropped.
  ASSERT_EQ(batch[3].antennaMeasurements.size(), 1u);
  EXPECT_EQ(batch[3].antennaMeasurements[0].kind, kFiraAntennaKindAzimuth);

  UniqueNlMsg msg;
  sim::EncodeFiraNotification(msg.get(), kFamily, base({angles}));
  recorder_.results.clear();
  fira_.OnRangingResult(msg.get());
  const FiraRangingData& data = recorder_.results.at(0).first;
  EXPECT_EQ(data.sessionId, 77);
  EXPECT_EQ(data.index, 5);
  const FiraTwrMeasurement& m = recorder_.results.at(0).second.at(0);
  EXPECT_EQ(m.address.address, (std::vector<uint8_t>{0x34, 0x12}));
  EXPECT_EQ(m.timestampNs, 123456789);
  EXPECT_EQ(m.distance, 250);
  EXPECT_EQ(m.lineOfSight, 1);
  EXPECT_LT(m.azimuthRad, M_PI);
  EXPECT_GT(m.azimuthRad, M_PI - 1e-4);
  EXPECT_NEAR(m.elevationRad, M_PI / 2, 1e-4);
  EXPECT_EQ(m.azimuthFigureOfMerit, 1.0);
  EXPECT_EQ(m.elevationFigureOfMerit, 0.0);
  // Attribute 10 keeps its kind whatever pair it names; attribute 8 is
  // classified by its pair, 3 being the elevation pair.
  ASSERT_EQ(m.antennaMeasurements.size(), 2u);
  for (const auto& angle : m.antennaMeasurements) {
    EXPECT_EQ(angle.kind, kFiraAntennaKindElevation);
    EXPECT_DOUBLE_EQ(angle.firstAngleRad, 100 * kFiraAzimuthScale);
    EXPECT_DOUBLE_EQ(angle.secondAngleRad, -200 * kFiraAzimuthScale);
    EXPECT_EQ(angle.figureOfMerit, 0.0);
  }
}

TEST_F(FiraRegionUtilsTest, MessagesThatAreNotFiraCallsAreRefusedWithTheirLine) {
  fira_.SubscribeCallback(kHw, &recorder_);
  sim::FiraNotificationData good;
  good.hw_index = kHw;
  good.session_id = 1;
  good.stopped = true;
  auto message = [&](std::function<void(sim::FiraNotificationData&)> change) {
    sim::FiraNotificationData data = good;
    change(data);
    auto msg = std::make_shared<UniqueNlMsg>();
    sim::EncodeFiraNotification(msg->get(), kFamily, data);
    return msg;
  };
  // Raw messages for what the encoder cannot make.
  auto raw = [](std::function<void(nl_msg*)> build) {
    auto msg = std::make_shared<UniqueNlMsg>();
    genlmsg_put(msg->get(), 0, 0, kFamily, 0, 0, MCPS802154_CMD_CALL_REGION, 1);
    build(msg->get());
    return msg;
  };
  auto truncated = raw([](nl_msg* msg) { nlmsg_hdr(msg)->nlmsg_len = NLMSG_HDRLEN + 1; });
  const struct {
    std::shared_ptr<UniqueNlMsg> msg;
    LogSeverity severity;
    std::string log;
  } cases[] = {
      {message([](auto& d) { d.cmd = MCPS802154_CMD_RANGING_REPORT; }), WARNING,
       "Incorrect command received: 13"},
      {truncated, ERROR, "Message doesn't respect policy"},
      {raw([](nl_msg* m) { nla_put_u16(m, MCPS802154_ATTR_HW, 1); }), ERROR,
       "Message doesn't respect policy"},
      {message([](auto& d) { d.hw_index.reset(); }), ERROR,
       "Missing MCPS802154_ATTR_HW or MCPS802154_ATTR_SCHEDULER_REGION_CALL"},
      {raw([](nl_msg* m) {
         nla_put_u32(m, MCPS802154_ATTR_HW, 1);
         nlattr* call = nla_nest_start(m, MCPS802154_ATTR_SCHEDULER_REGION_CALL);
         nla_put_u8(m, MCPS802154_REGION_CALL_ATTR_CALL, 8);
         nla_nest_end(m, call);
       }),
       ERROR, "Incorrect MCPS802154_ATTR_SCHEDULER_REGION_CALL nested message"},
      {message([](auto& d) { d.region = "ccc"; }), ERROR,
       "Missing Fira region name in mcps message"},
      {raw([](nl_msg* m) {
         nla_put_u32(m, MCPS802154_ATTR_HW, 1);
         nlattr* call = nla_nest_start(m, MCPS802154_ATTR_SCHEDULER_REGION_CALL);
         nla_put_string(m, MCPS802154_REGION_CALL_ATTR_REGION_NAME, "fira");
         nla_nest_end(m, call);
       }),
       ERROR, "Missing Fira call in mcps message"},
      {raw([](nl_msg* m) {
         nla_put_u32(m, MCPS802154_ATTR_HW, 1);
         nlattr* call = nla_nest_start(m, MCPS802154_ATTR_SCHEDULER_REGION_CALL);
         nla_put_string(m, MCPS802154_REGION_CALL_ATTR_REGION_NAME, "fira");
         nla_put_u32(m, MCPS802154_REGION_CALL_ATTR_CALL, 8);
         nla_nest_end(m, call);
       }),
       ERROR, "Missing Fira call params in mcps message"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.log);
    log_.Reset();
    uint32_t hw = 0;
    uint8_t call = 0;
    EXPECT_EQ(fira_.GetCallContent(c.msg->get(), &hw, &call), nullptr);
    EXPECT_EQ(Logged(c.severity, "GetCallContent: " + c.log), 1) << log_.Text();
  }
  // Attributes of the wrong width deeper down.
  auto notification = [&](std::function<void(nl_msg*)> params) {
    return raw([&](nl_msg* m) {
      nla_put_u32(m, MCPS802154_ATTR_HW, kHw);
      nlattr* call = nla_nest_start(m, MCPS802154_ATTR_SCHEDULER_REGION_CALL);
      nla_put_string(m, MCPS802154_REGION_CALL_ATTR_REGION_NAME, "fira");
      nla_put_u32(m, MCPS802154_REGION_CALL_ATTR_CALL, 8);
      nlattr* nest = nla_nest_start(m, MCPS802154_REGION_CALL_ATTR_CALL_PARAMS);
      params(m);
      nla_nest_end(m, nest);
      nla_nest_end(m, call);
    });
  };
  auto short_session = notification([](nl_msg* m) { nla_put_u8(m, 1, 1); });
  auto short_index = notification([](nl_msg* m) {
    nla_put_u32(m, FIRA_SESSION_NTF_ATTR_SESSION_ID, 1);
    nlattr* data = nla_nest_start(m, FIRA_SESSION_NTF_ATTR_RANGING_DATA);
    nla_put_u8(m, FIRA_RANGING_DATA_ATTR_INDEX, 1);
    nla_nest_end(m, data);
  });
  auto short_fields = notification([](nl_msg* m) {
    nla_put_u32(m, FIRA_SESSION_NTF_ATTR_SESSION_ID, 1);
    nlattr* data = nla_nest_start(m, FIRA_SESSION_NTF_ATTR_RANGING_DATA);
    nla_put_u32(m, FIRA_RANGING_DATA_ATTR_INDEX, 1);
    nlattr* list = nla_nest_start(m, FIRA_RANGING_DATA_ATTR_MEASUREMENTS);
    nlattr* bad = nla_nest_start(m, 1);
    nla_put_u8(m, FIRA_MEASUREMENT_ATTR_SHORT_ADDR, 1);
    nla_nest_end(m, bad);
    nlattr* good = nla_nest_start(m, 2);
    nla_put_u16(m, FIRA_MEASUREMENT_ATTR_SHORT_ADDR, 1);
    nla_put_u8(m, FIRA_MEASUREMENT_ATTR_STATUS, 0);
    nla_put_u32(m, FIRA_MEASUREMENT_ATTR_DISTANCE, 1);
    nlattr* aoa = nla_nest_start(m, FIRA_MEASUREMENT_ATTR_AOA_AZIMUTH);
    nla_put_u8(m, FIRA_AOA_ATTR_FIRST_ANGLE, 1);
    nla_nest_end(m, aoa);
    nla_nest_end(m, good);
    nla_nest_end(m, list);
    nla_nest_end(m, data);
  });
  log_.Reset();
  for (const auto& msg : {short_session, short_index, short_fields}) {
    EXPECT_EQ(fira_.OnRangingResult(msg->get()), NL_STOP);
  }
  EXPECT_EQ(Logged(WARNING, "OnRangingResult: Failed to parse session ntf call attr"), 2);
  EXPECT_EQ(Logged(ERROR, "ParseMeasurements: Failed to parse ranging measurement"), 1);
  EXPECT_EQ(Logged(ERROR, "ParseAntennaMeasurement: Failed to parse aoa data measurement"), 1);
  ASSERT_EQ(recorder_.results.size(), 1u);
  EXPECT_EQ(recorder_.results[0].second.size(), 1u);
  EXPECT_TRUE(recorder_.results[0].second[0].antennaMeasurements.empty());
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
