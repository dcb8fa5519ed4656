#include "net/fira_region_utils.h"

#include <unistd.h>

#include <cmath>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netlink/msg.h>

#include "net/fira_region.h"
#include "sim/fira_notification.h"
#include "tests/fira_callback_recorder.h"
#include "tests/fira_session_builder.h"
#include "tests/log_capture.h"
#include "tests/mock_nl_socket.h"
#include "tests/sent_message.h"

namespace hardware {
namespace dalix {
namespace {

using ::android::base::ERROR;
using ::android::base::INFO;
using ::android::base::LogSeverity;
using ::android::base::WARNING;
using ::testing::_;
using ::testing::StrictMock;
namespace uwb = ::aidl::hardware::dalix::uwb;
using Session = uwb::FiraTwrSession;
using sim::FiraAoaData;
using sim::FiraMeasurementData;
using sim::FiraNotificationData;

constexpr uint32_t kFamily = 0x1d;
constexpr uint32_t kHw = 3;
constexpr char kTag[] = "dalix.uwb.FiraRegionUtils";

// Shortens the payload at |path|, each type inside the one before, in place.
void Shorten(nl_msg* msg, std::initializer_list<int> path, int bytes) {
  nlattr* attr = nullptr;
  for (int type : path) {
    attr = attr == nullptr ? nlmsg_find_attr(nlmsg_hdr(msg), GENL_HDRLEN, type)
                           : nla_find(static_cast<nlattr*>(nla_data(attr)), nla_len(attr), type);
    ASSERT_NE(attr, nullptr) << type;
  }
  attr->nla_len = static_cast<uint16_t>(NLA_HDRLEN + bytes);
}

class FiraRegionUtilsTest : public ::testing::Test {
 protected:
  void SetUp() override { fira_.SetMcpsNetId(kFamily); }
  void TearDown() override { nlmsg_set_default_size(getpagesize()); }

  // The next one-shot socket answers one request with |ack| and keeps a copy.
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

TEST_F(FiraRegionUtilsTest, ValueChecksRefuseWithTheirLineAndSendNothing) {
  const std::string bad_address =
      ": Incorrect deviceAddress size, Fira 1.1 only supports short address.";
  const std::pair<std::function<void(Session&)>, std::string> cases[] = {
      {[](Session& s) { s.rangingRoundUsage = uwb::RangingRoundUsage(0); },
       "PutMainSessionParams: Unsupported rangingRoundUsage OWR"},
      {[](Session& s) { s.multiNodeMode = uwb::MultiNodeMode(2); },
       "PutMainSessionParams: Unsupported multiNodeMode MANY_TO_MANY"},
      {[](Session& s) { s.deviceAddress.address.push_back(3); },
       "PutMainSessionParams" + bad_address},
      {[](Session& s) { s.destAddressList[0].address = {1}; },
       "PutMainSessionParams" + bad_address},
      {[](Session& s) { s.rframeConfig = uwb::RframeConfig(2); },
       "PutRadioParams: Unsupported Rframe config 2"},
      {[](Session& s) { s.psduDataRate = uwb::PsduDataRate(-1); },
       "PutRadioParams: Unsupported PSDU data rate -1"},
      {[](Session& s) { s.aoaType = uwb::AoaType(3); }, "PutAntennaParams: Unsupported AoaType: 3"},
      {[](Session& s) { s.stsConfig = uwb::FiraStsConfig(3); },
       "PutCryptoParams: Unsupported STS configuration: 3"},
  };
  for (const auto& [change, log] : cases) {
    Session session = FullFiraSession(42);
    change(session);
    EXPECT_FALSE(fira_.ConfigTwrSession(kHw, session));
    EXPECT_EQ(Logged(ERROR, log), 1) << log_.Text();
    log_.Reset();
  }
  EXPECT_FALSE(fira_.AddControlees(kHw, 9, {}, nullptr));
  EXPECT_FALSE(fira_.RemoveControlees(kHw, 9, {}));
  EXPECT_FALSE(fira_.AddControlees(kHw, 9, {{{1, 2, 3}}}, nullptr));
  EXPECT_EQ(Logged(ERROR, "AddControlees: Empty controlees"), 1);
  EXPECT_EQ(Logged(ERROR, "RemoveControlees: Empty controlees"), 1);
  EXPECT_EQ(Logged(ERROR, "PutControlees" + bad_address), 1);
}

// Every request is refused when the driver does not acknowledge it. What
// each request carries is proved against the simulated driver.
TEST_F(FiraRegionUtilsTest, RequestsFailWhenRefusedOrTooLong) {
  const std::vector<uwb::UwbAddress> two = {{{0x0a, 0x0b}}, {{0x0c, 0x0d}}};
  const std::function<bool()> requests[] = {
      [&] { return fira_.InitSession(kHw, 9); },
      [&] { return fira_.StopSession(kHw, 9); },
      [&] { return fira_.DeinitSession(kHw, 9); },
      [&] { return fira_.ConfigTwrSession(kHw, FullFiraSession(9)); },
      [&] { return fira_.UpdateBlockStriding(kHw, 9, 3); },
      [&] { return fira_.AddControlees(kHw, 9, two, nullptr); },
      [&] { return fira_.RemoveControlees(kHw, 9, two); },
  };
  // Its nests carry plain type words: the driver reads no NLA_F_NESTED.
  ExpectSocket();
  ASSERT_TRUE(requests[0]());
  nlattr* call = sent_.back().Attrs().back();
  EXPECT_EQ(call->nla_type, MCPS802154_ATTR_SCHEDULER_REGION_CALL);
  EXPECT_EQ(SentMessage::Children(call).back()->nla_type, MCPS802154_REGION_CALL_ATTR_CALL_PARAMS);
  for (const auto& run : requests) {
    ExpectSocket(false);
    EXPECT_FALSE(run());
  }
  // A call nest longer than its 16-bit length can say.
  nlmsg_set_default_size(1 << 17);
  EXPECT_FALSE(fira_.AddControlees(kHw, 1, std::vector<uwb::UwbAddress>(5460, {{1, 2}}), nullptr));
  EXPECT_EQ(Logged(ERROR, "EndCallMessage Error creating MCPS message"), 1);
}

TEST_F(FiraRegionUtilsTest, SetPropertiesTakesTheLowByteOfValidNumbersOnly) {
  const struct {
    const char* values[3];  // azimuth pair, elevation pair, transmit antenna
    bool valid;
    uint32_t stored[3];
  } cases[] = {
      {{"1", "2", "4"}, true, {1, 2, 4}},           {{"", "0x3", "04"}, true, {0, 3, 4}},
      {{"257", "6", "0"}, true, {1, 6, 0}},         {{"7", "2x", "5"}, false, {1, 6, 0}},
      {{nullptr, nullptr, "-1"}, false, {1, 6, 0}}, {{"3", nullptr, nullptr}, false, {3, 6, 0}},
  };
  const char* keys[] = {"antenna_pair_azimuth", "antenna_pair_elevation", "tx_antenna"};
  for (const auto& c : cases) {
    config_.Clear();
    for (int i = 0; i < 3; ++i) {
      if (c.values[i]) config_.Set(keys[i], c.values[i]);
    }
    EXPECT_EQ(fira_.SetProperties(kHw, config_), c.valid);
    FiraRegionUtils::HwConfig stored = fira_.GetHwConfig(kHw).value();
    EXPECT_EQ((std::vector<uint32_t>{stored.antenna_pair_azimuth, stored.antenna_pair_elevation,
                                     stored.tx_antenna}),
              (std::vector<uint32_t>(c.stored, c.stored + 3)));
  }
  config_.Clear();
  EXPECT_FALSE(fira_.SetProperties(kHw + 1, config_));
  EXPECT_EQ(fira_.GetHwConfig(kHw + 1)->antenna_pair_elevation, 255u);
}

// Well-formed results are proved against the simulated world; here, what a
// driver should not send, and values at the edges of their ranges.
TEST_F(FiraRegionUtilsTest, BrokenNotificationsAndMeasurementsAreDroppedWithTheirLine) {
  fira_.SubscribeCallback(kHw, &recorder_);
  config_.Set("antenna_pair_azimuth", "2");
  config_.Set("antenna_pair_elevation", "3");
  fira_.SetProperties(kHw, config_);
  auto peer = [](uint16_t address, std::function<void(FiraMeasurementData&)> change) {
    FiraMeasurementData m;
    m.short_address = address;
    m.status = 0;
    m.distance_cm = 250;
    change(m);
    return m;
  };
  // A notification encoded as the driver would, then |mutate|d.
  auto encoded = [](std::function<void(FiraNotificationData&)> change,
                    std::function<void(nl_msg*)> mutate = nullptr) {
    FiraNotificationData data;
    data.hw_index = kHw;
    data.session_id = 77;
    data.index = 5;
    data.measurements.emplace();
    change(data);
    auto msg = std::make_shared<UniqueNlMsg>();
    EXPECT_TRUE(sim::EncodeFiraNotification(msg->get(), kFamily, data));
    if (mutate) mutate(msg->get());
    return msg;
  };
  const int kCall = MCPS802154_ATTR_SCHEDULER_REGION_CALL;
  const int kParams = MCPS802154_REGION_CALL_ATTR_CALL_PARAMS;
  const int kData = FIRA_SESSION_NTF_ATTR_RANGING_DATA;
  auto none = [](FiraNotificationData&) {};
  const struct {
    std::shared_ptr<UniqueNlMsg> msg;
    LogSeverity severity;
    std::string log;
  } cases[] = {
      {encoded([](auto& d) { d.cmd = MCPS802154_CMD_RANGING_REPORT; }), WARNING,
       "GetCallContent: Incorrect command received: 13"},
      // As long as a generic netlink header, but without one.
      {encoded(none, [](nl_msg* m) { nlmsg_hdr(m)->nlmsg_len = NLMSG_HDRLEN + 1; }), ERROR,
       "GetCallContent: Message doesn't respect policy"},
      {encoded(none, [](nl_msg* m) { Shorten(m, {MCPS802154_ATTR_HW}, 2); }), ERROR,
       "GetCallContent: Message doesn't respect policy"},
      {encoded([](auto& d) { d.hw_index.reset(); }), ERROR,
       "GetCallContent: Missing MCPS802154_ATTR_HW or MCPS802154_ATTR_SCHEDULER_REGION_CALL"},
      {encoded(none,
               [&](nl_msg* m) {
                 Shorten(m, {kCall, MCPS802154_REGION_CALL_ATTR_CALL}, 1);
               }),
       ERROR, "GetCallContent: Incorrect MCPS802154_ATTR_SCHEDULER_REGION_CALL nested message"},
      {encoded([](auto& d) { d.region = "ccc"; }), ERROR,
       "GetCallContent: Missing Fira region name in mcps message"},
      {encoded([](auto& d) { d.call.reset(); }), ERROR,
       "GetCallContent: Missing Fira call in mcps message"},
      {encoded([](auto& d) { d.call = FIRA_CALL_SESSION_START; }), INFO,
       "OnRangingResult: Not a ranging notification message."},
      {encoded([](auto& d) { d.hw_index = kHw + 1; }), INFO,
       "OnRangingResult: No callback for hw index: 4"},
      {encoded([](auto& d) { d.session_id.reset(); }), WARNING,
       "OnRangingResult: Missing session ntf call attrs"},
      {encoded([](auto& d) { d.index = 1; },
               [&](nl_msg* m) {
                 Shorten(m, {kCall, kParams, kData, FIRA_RANGING_DATA_ATTR_INDEX}, 2);
               }),
       WARNING, "OnRangingResult: Failed to parse session ntf call attr"},
      {encoded([](auto& d) { d.measurements.reset(); }), WARNING,
       "OnRangingResult: Missing ranging data attr"},
  };
  for (const auto& c : cases) {
    log_.Reset();
    EXPECT_EQ(fira_.OnRangingResult(c.msg->get()), NL_STOP);
    EXPECT_EQ(Logged(c.severity, c.log), 1) << log_.Text();
  }
  EXPECT_TRUE(recorder_.results.empty());
  EXPECT_TRUE(recorder_.stopped.empty());
  // A field of the wrong width drops only its measurement or angle.
  auto broken = encoded(
      [&](auto& d) {
        d.measurements = {peer(1, [](auto&) {}), peer(2, [](auto& m) {
                            m.aoa_azimuth = FiraAoaData{1, 1, 1, 1};
                          })};
      },
      [&](nl_msg* m) {
        const int list = FIRA_RANGING_DATA_ATTR_MEASUREMENTS;
        Shorten(m, {kCall, kParams, kData, list, 1, FIRA_MEASUREMENT_ATTR_SHORT_ADDR}, 1);
        Shorten(m,
                {kCall, kParams, kData, list, 2, FIRA_MEASUREMENT_ATTR_AOA_AZIMUTH,
                 FIRA_AOA_ATTR_FIRST_ANGLE},
                1);
      });
  fira_.OnRangingResult(broken->get());
  EXPECT_EQ(Logged(ERROR, "ParseMeasurements: Failed to parse ranging measurement"), 1);
  EXPECT_EQ(Logged(ERROR, "ParseAntennaMeasurement: Failed to parse aoa data measurement"), 1);
  ASSERT_EQ(recorder_.results.size(), 1u);
  EXPECT_EQ(recorder_.results[0].second.size(), 1u);
  recorder_.results.clear();

  fira_.OnRangingResult(
      encoded([&](auto& d) {
        d.measurements = {
            peer(0x1234,
                 [](auto& m) {
                   m.azimuth = 32767;
                   m.azimuth_fom = 255;
                 }),
            peer(2, [](auto& m) { m.line_of_sight = m.non_line_of_sight = true; }),
            peer(5, [](auto& m) { m.distance_cm.reset(); }),
            peer(6, [](auto& m) { m.short_address.reset(); }),
            peer(7,
                 [](auto& m) {
                   m.aoa_azimuth = FiraAoaData{2, 1, 2, std::nullopt};
                 }),
            peer(8,
                 [](auto& m) {
                   m.aoa = FiraAoaData{4, 1, 2, 3};
                   m.aoa_azimuth = FiraAoaData{std::nullopt, 1, 2, 3};
                 }),
        };
      })->get());
  for (const std::string text : {"ParseMeasurements: Missing addr or status in ranging measurement",
                                 "ParseMeasurements: Missing fields in ranging measurement",
                                 "ParseAntennaMeasurement: Missing aoa data measurement fields"}) {
    EXPECT_EQ(Logged(ERROR, text), 1) << text;
  }
  ASSERT_EQ(recorder_.results.size(), 1u);
  const auto& m = recorder_.results[0].second;
  ASSERT_EQ(m.size(), 4u);
  EXPECT_EQ(m[0].address.address, (std::vector<uint8_t>{0x34, 0x12}));
  EXPECT_LT(m[0].azimuthRad, M_PI);
  EXPECT_GT(m[0].azimuthRad, M_PI - 1e-4);
  EXPECT_EQ(m[0].azimuthFigureOfMerit, 1.0);
  // Both sight flags mean neither; no flag, unknown.
  EXPECT_EQ((std::vector<int>{m[1].lineOfSight, m[2].lineOfSight}), (std::vector<int>{0, -1}));
  EXPECT_TRUE(m[2].antennaMeasurements.empty());
  // 9 is azimuth data whatever it names; 8 of pair 4 is no pair of this radio.
  ASSERT_EQ(m[3].antennaMeasurements.size(), 1u);
  EXPECT_EQ(m[3].antennaMeasurements[0].kind, kFiraAntennaKindAzimuth);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
