#include "net/mcps_utils.h"

#include <stdint.h>
#include <string.h>

#include <map>
#include <memory>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netlink/attr.h>
#include <netlink/genl/genl.h>

#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using ::testing::_;
using ::testing::ByMove;
using ::testing::ElementsAre;
using ::testing::Return;
using ::testing::StrEq;
using ::testing::StrictMock;

constexpr uint32_t kFamily = 0x1d;
constexpr uint32_t kHw = 3;

class MockNlSocket : public NlSocket {
 public:
  MockNlSocket() : NlSocket(nullptr) {}
  MOCK_METHOD(int, Resolve, (const char*), (override));
  MOCK_METHOD(bool, SendAndAwaitAck, (nl_msg*, std::function<int(nl_msg*)>), (override));
  MOCK_METHOD(bool, SendAndAwaitResponse, (nl_msg*, std::function<void(nl_msg*)>, int),
              (override));
};

class MockNlSocketFactory : public NlSocketFactory {
 public:
  MockNlSocketFactory() : NlSocketFactory(nullptr) {}
  MOCK_METHOD(std::unique_ptr<NlSocket>, Create, (), (override));
};

// A sent request, copied out of libnl so that it outlives the exchange.
struct Sent {
  explicit Sent(nl_msg* msg) {
    const nlmsghdr* header = nlmsg_hdr(msg);
    const auto* begin = reinterpret_cast<const uint8_t*>(header);
    bytes.assign(begin, begin + header->nlmsg_len);
  }
  nlmsghdr* header() { return reinterpret_cast<nlmsghdr*>(bytes.data()); }
  genlmsghdr* genl() { return genlmsg_hdr(header()); }
  std::vector<nlattr*> Attrs() {
    std::vector<nlattr*> attrs;
    nlattr* attr;
    int remaining;
    nla_for_each_attr(attr, genlmsg_attrdata(genl(), 0), genlmsg_attrlen(genl(), 0), remaining) {
      attrs.push_back(attr);
    }
    return attrs;
  }
  std::vector<uint8_t> bytes;
};

std::vector<nlattr*> Children(nlattr* nest) {
  std::vector<nlattr*> children;
  nlattr* attr;
  int remaining;
  nla_for_each_nested(attr, nest, remaining) children.push_back(attr);
  return children;
}

std::string String(nlattr* attr) {
  return std::string(static_cast<const char*>(nla_data(attr)), nla_len(attr));
}

// A NEW_HW reply; a null name leaves the attribute out.
UniqueNlMsg NewHw(uint32_t hw, const char* phy, const char* scheduler) {
  UniqueNlMsg msg;
  genlmsg_put(msg.get(), 0, 0, kFamily, 0, 0, MCPS802154_CMD_NEW_HW, 0);
  nla_put_u32(msg.get(), MCPS802154_ATTR_HW, hw);
  if (phy) nla_put_string(msg.get(), MCPS802154_ATTR_WPAN_PHY_NAME, phy);
  if (scheduler) nla_put_string(msg.get(), MCPS802154_ATTR_SCHEDULER_NAME, scheduler);
  return msg;
}

struct CalibrationVerdict {
  const char* key;  // null: no key in the element
  int status;
};

UniqueNlMsg CalibrationReply(const std::vector<CalibrationVerdict>& verdicts) {
  UniqueNlMsg msg;
  genlmsg_put(msg.get(), 0, 0, kFamily, 0, 0, MCPS802154_CMD_SET_CALIBRATIONS, 0);
  nla_put_u32(msg.get(), MCPS802154_ATTR_HW, kHw);
  nlattr* list = nla_nest_start(msg.get(), MCPS802154_ATTR_CALIBRATIONS | NLA_F_NESTED);
  for (const CalibrationVerdict& verdict : verdicts) {
    nlattr* element = nla_nest_start(msg.get(), MCPS802154_CALIBRATIONS_ATTR_CALIBRATION);
    if (verdict.key) nla_put_string(msg.get(), MCPS802154_CALIBRATION_ATTR_KEY, verdict.key);
    nla_put_s32(msg.get(), MCPS802154_CALIBRATION_ATTR_STATUS, verdict.status);
    nla_nest_end(msg.get(), element);
  }
  nla_nest_end(msg.get(), list);
  return msg;
}

class McpsUtilsTest : public ::testing::Test {
 protected:
  void SetUp() override {
    auto socket = std::make_unique<StrictMock<MockNlSocket>>();
    EXPECT_CALL(*socket, Resolve(StrEq(kMcpsFamilyName))).WillOnce(Return(kFamily));
    EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
    ASSERT_TRUE(mcps_.Start());
  }

  // The next one-shot acknowledged exchange records its request and answers |result|.
  void ExpectAck(bool result) {
    EXPECT_CALL(factory_, Create()).WillOnce([this, result] {
      auto socket = std::make_unique<StrictMock<MockNlSocket>>();
      EXPECT_CALL(*socket, SendAndAwaitAck(_, _)).WillOnce([this, result](nl_msg* msg, auto) {
        sent_.emplace_back(msg);
        return result;
      });
      return std::unique_ptr<NlSocket>(std::move(socket));
    });
  }

  // The next socket answers each request with the next of |replies| and
  // records the request; the exchange fails once the replies run out.
  void ExpectResponses(int cmd, std::vector<std::vector<UniqueNlMsg>>* replies, int exchanges) {
    EXPECT_CALL(factory_, Create()).WillOnce([this, cmd, replies, exchanges] {
      auto socket = std::make_unique<StrictMock<MockNlSocket>>();
      if (exchanges == 0) {
        EXPECT_CALL(*socket, SendAndAwaitResponse(_, _, _)).Times(0);
        return std::unique_ptr<NlSocket>(std::move(socket));
      }
      EXPECT_CALL(*socket, SendAndAwaitResponse(_, _, cmd))
          .Times(exchanges)
          .WillRepeatedly([this, replies](nl_msg* msg, std::function<void(nl_msg*)> handler, int) {
            sent_.emplace_back(msg);
            if (replies->empty()) return false;
            for (UniqueNlMsg& reply : replies->front()) handler(reply.get());
            replies->erase(replies->begin());
            return true;
          });
      return std::unique_ptr<NlSocket>(std::move(socket));
    });
  }

  StrictMock<MockNlSocketFactory> factory_;
  McpsUtils mcps_{&factory_};
  std::vector<Sent> sent_;
  LogCapture log_;
};

TEST_F(McpsUtilsTest, StartKeepsTheResolvedFamilyAndFailsWhenItIsMissing) {
  EXPECT_EQ(mcps_.GetNetId(), kFamily);

  auto socket = std::make_unique<StrictMock<MockNlSocket>>();
  EXPECT_CALL(*socket, Resolve(_)).WillOnce(Return(-12));
  EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
  EXPECT_FALSE(mcps_.Start());
  EXPECT_TRUE(log_.Contains(android::base::ERROR, "Start: Generic netlink mcps802154 not found.",
                            "dalix.uwb.McpsUtils"));

  EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(nullptr)));
  EXPECT_FALSE(mcps_.Start());
}

TEST_F(McpsUtilsTest, SetSchedulerEncodesNameCommandAndOnlyTheGivenParameters) {
  const struct {
    int scheduler;
    int slot_duration;
    int node_type;
    bool params_only;
    const char* name;
  } cases[] = {
      {0, -1, -1, false, "default"},       {1, 16, 0, false, "simple-ranging"},
      {1, 16, 1, true, "simple-ranging"},  {2, 16, -1, false, "endless"},
      {7, -1, 1, false, "7"},              {-3, -1, -1, true, "-3"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    sent_.clear();
    ExpectAck(true);
    ASSERT_TRUE(mcps_.SetScheduler(kHw, static_cast<McpsScheduler>(c.scheduler),
                                   static_cast<McpsUtils::SlotDuration>(c.slot_duration),
                                   static_cast<McpsUtils::NodeType>(c.node_type), c.params_only));
    ASSERT_EQ(sent_.size(), 1u);
    Sent& msg = sent_[0];
    EXPECT_EQ(msg.header()->nlmsg_type, kFamily);
    EXPECT_EQ(msg.genl()->cmd, c.params_only ? MCPS802154_CMD_SET_SCHEDULER_PARAMS
                                             : MCPS802154_CMD_SET_SCHEDULER);
    std::vector<nlattr*> attrs = msg.Attrs();
    bool has_params = c.slot_duration != -1 || c.node_type != -1;
    ASSERT_EQ(attrs.size(), has_params ? 3u : 2u);
    EXPECT_EQ(attrs[0]->nla_type, MCPS802154_ATTR_HW);
    EXPECT_EQ(nla_get_u32(attrs[0]), kHw);
    EXPECT_EQ(attrs[1]->nla_type, MCPS802154_ATTR_SCHEDULER_NAME);
    EXPECT_EQ(String(attrs[1]), std::string(c.name) + '\0');
    if (!has_params) continue;
    EXPECT_EQ(attrs[2]->nla_type, MCPS802154_ATTR_SCHEDULER_PARAMS | NLA_F_NESTED);
    std::map<int, uint32_t> params;
    for (nlattr* param : Children(attrs[2])) {
      EXPECT_EQ(nla_len(param), 4);
      params[param->nla_type] = nla_get_u32(param);
    }
    std::map<int, uint32_t> expected;
    if (c.slot_duration != -1) {
      expected[MCPS802154_SCHEDULER_PARAMS_ATTR_SLOT_DURATION] = c.slot_duration;
    }
    if (c.node_type != -1) expected[MCPS802154_SCHEDULER_PARAMS_ATTR_NODE_TYPE] = c.node_type;
    EXPECT_EQ(params, expected);
  }
}

TEST_F(McpsUtilsTest, SetFiraRegionSendsEndlessWithOnePlainFiraRegionNest) {
  ExpectAck(true);
  ASSERT_TRUE(mcps_.SetFiraRegion(kHw));
  ASSERT_EQ(sent_.size(), 1u);
  EXPECT_EQ(sent_[0].genl()->cmd, MCPS802154_CMD_SET_SCHEDULER);
  std::vector<nlattr*> attrs = sent_[0].Attrs();
  ASSERT_EQ(attrs.size(), 3u);
  EXPECT_EQ(nla_get_u32(attrs[0]), kHw);
  EXPECT_EQ(String(attrs[1]), std::string("endless") + '\0');
  // Plain type words, without NLA_F_NESTED, unlike the parameter nest.
  EXPECT_EQ(attrs[2]->nla_type, MCPS802154_ATTR_SCHEDULER_REGIONS);
  std::vector<nlattr*> regions = Children(attrs[2]);
  ASSERT_EQ(regions.size(), 1u);
  EXPECT_EQ(regions[0]->nla_type, MCPS802154_SCHEDULER_REGIONS_ATTR_REGION);
  std::vector<nlattr*> fields = Children(regions[0]);
  ASSERT_EQ(fields.size(), 1u);
  EXPECT_EQ(fields[0]->nla_type, MCPS802154_REGION_ATTR_NAME);
  EXPECT_EQ(String(fields[0]), std::string("fira") + '\0');
}

TEST_F(McpsUtilsTest, ListHardwareDumpsWithoutIndex) {
  std::vector<std::vector<UniqueNlMsg>> replies(1);
  replies[0].push_back(NewHw(0, "phy0", "default"));
  replies[0].push_back(NewHw(2, "phy7", nullptr));
  ExpectResponses(MCPS802154_CMD_NEW_HW, &replies, 1);

  bool ok = false;
  std::vector<McpsHwInfo> radios = mcps_.ListHardware(&ok);
  EXPECT_TRUE(ok);
  ASSERT_EQ(radios.size(), 2u);
  EXPECT_EQ(radios[1].hw_index, 2u);
  EXPECT_EQ(radios[1].scheduler, "default");

  ASSERT_EQ(sent_.size(), 1u);
  EXPECT_EQ(sent_[0].genl()->cmd, MCPS802154_CMD_GET_HW);
  EXPECT_EQ(sent_[0].header()->nlmsg_flags & NLM_F_DUMP, NLM_F_DUMP);
  EXPECT_TRUE(sent_[0].Attrs().empty());
}

TEST_F(McpsUtilsTest, GetHardwareInfoAddressesOneRadio) {
  std::vector<std::vector<UniqueNlMsg>> replies(1);
  replies[0].push_back(NewHw(kHw, "phy2", "endless"));
  ExpectResponses(MCPS802154_CMD_NEW_HW, &replies, 1);
  bool ok = false;
  McpsHwInfo info = mcps_.GetHardwareInfo(kHw, &ok);
  EXPECT_TRUE(ok);
  EXPECT_EQ(info.hw_index, kHw);
  EXPECT_EQ(info.phy_index, 2u);
  EXPECT_EQ(info.scheduler, "endless");
  ASSERT_EQ(sent_.size(), 1u);
  EXPECT_EQ(sent_[0].header()->nlmsg_flags & NLM_F_DUMP, 0);
  std::vector<nlattr*> attrs = sent_[0].Attrs();
  ASSERT_EQ(attrs.size(), 1u);
  EXPECT_EQ(attrs[0]->nla_type, MCPS802154_ATTR_HW);
  EXPECT_EQ(nla_get_u32(attrs[0]), kHw);
}

TEST(McpsParseHwInfoTest, ReadsThePhyNumberOnlyAfterTheExactPrefix) {
  const struct {
    const char* phy;
    bool ok;
    uint32_t phy_index;
  } cases[] = {
      {"phy0", true, 0},    {"phy3", true, 3},        {"phy12x", true, 12},
      {"phy 4", true, 4},   {"phy4294967297", true, 1},  // truncated to 32 bits
      {"wpan-phy0", false, 0}, {"Phy1", false, 0},    {"ph", false, 0},
      {"phy", false, 0},    {"phyX", false, 0},       {"", false, 0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.phy);
    UniqueNlMsg msg = NewHw(5, c.phy, "endless");
    McpsHwInfo info;
    EXPECT_EQ(McpsUtils::ParseHwInfo(msg.get(), &info), c.ok);
    EXPECT_EQ(info.phy_index, c.phy_index);
    // Index and scheduler are read before the phy name is looked at.
    EXPECT_EQ(info.hw_index, 5u);
    EXPECT_EQ(info.scheduler, "endless");
  }
}

TEST(McpsParseHwInfoTest, RefusesOverlongNamesWithoutTouchingTheRecord) {
  UniqueNlMsg msg = NewHw(5, "phy0123456789012345678", nullptr);
  McpsHwInfo info;
  EXPECT_FALSE(McpsUtils::ParseHwInfo(msg.get(), &info));
  EXPECT_EQ(info.hw_index, 0u);
  EXPECT_EQ(info.scheduler, "");
}

class McpsCalibrationTest : public McpsUtilsTest {
 protected:
  // Every key/value pair sent, in order, and the size of each message.
  std::vector<std::pair<std::string, uint32_t>> SentKeys() {
    std::vector<std::pair<std::string, uint32_t>> keys;
    for (Sent& msg : sent_) {
      EXPECT_EQ(msg.genl()->cmd, MCPS802154_CMD_SET_CALIBRATIONS);
      EXPECT_LE(static_cast<int>(msg.header()->nlmsg_len - NLMSG_HDRLEN),
                McpsUtils::CalibrationPayloadBudget());
      std::vector<nlattr*> attrs = msg.Attrs();
      EXPECT_EQ(attrs.size(), 2u);
      if (attrs.size() != 2u) continue;
      EXPECT_EQ(nla_get_u32(attrs[0]), kHw);
      EXPECT_EQ(attrs[1]->nla_type, MCPS802154_ATTR_CALIBRATIONS | NLA_F_NESTED);
      for (nlattr* element : Children(attrs[1])) {
        EXPECT_EQ(element->nla_type, MCPS802154_CALIBRATIONS_ATTR_CALIBRATION | NLA_F_NESTED);
        std::vector<nlattr*> fields = Children(element);
        EXPECT_EQ(fields.size(), 2u);
        if (fields.size() != 2u) continue;
        EXPECT_EQ(fields[0]->nla_type, MCPS802154_CALIBRATION_ATTR_KEY);
        EXPECT_EQ(fields[1]->nla_type, MCPS802154_CALIBRATION_ATTR_VALUE);
        EXPECT_EQ(nla_len(fields[1]), 4);
        keys.emplace_back(nla_get_string(fields[0]), nla_get_u32(fields[1]));
      }
    }
    return keys;
  }

  ConfigUtils store_;
};

TEST_F(McpsCalibrationTest, ParsesDecimalAndHexValuesAndSkipsTheRest) {
  store_.Set("a_dec", "12");
  store_.Set("b_hex", "1F");
  store_.Set("c_0x", "0x1F");
  store_.Set("d_frac", "1.5");
  store_.Set("e_text", "xyz");
  store_.Set("e_word", "abc");  // hexadecimal digits only: 0xabc
  store_.Set("f_neg", "-1");
  store_.Set("g_empty", "");
  std::vector<std::vector<UniqueNlMsg>> replies(1);
  replies[0].push_back(CalibrationReply({{nullptr, 0}}));
  ExpectResponses(MCPS802154_CMD_SET_CALIBRATIONS, &replies, 1);

  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  EXPECT_THAT(SentKeys(), ElementsAre(std::make_pair("a_dec", 12u), std::make_pair("b_hex", 31u),
                                      std::make_pair("c_0x", 31u), std::make_pair("e_word", 0xabcu),
                                      std::make_pair("f_neg", 0xffffffffu)));
  EXPECT_TRUE(log_.Contains(android::base::WARNING, "Skip incorrect key d_frac"));
  EXPECT_TRUE(log_.Contains(android::base::WARNING, "Skip incorrect key e_text"));
  EXPECT_TRUE(log_.Contains(android::base::WARNING, "Skip incorrect key g_empty"));
}

TEST_F(McpsCalibrationTest, EmptyStoreSendsNothingAndNullStoreIsRefused) {
  ExpectResponses(MCPS802154_CMD_SET_CALIBRATIONS, nullptr, 0);
  EXPECT_TRUE(mcps_.SetCalibration(kHw, &store_));
  EXPECT_FALSE(mcps_.SetCalibration(kHw, nullptr));
  EXPECT_TRUE(log_.Contains(android::base::ERROR, "SetCalibration Bad argument"));
  EXPECT_TRUE(sent_.empty());
}

TEST_F(McpsCalibrationTest, SplitsOverMessagesWithinOnePageAndSkipsKeysThatNeverFit) {
  std::vector<std::pair<std::string, uint32_t>> expected;
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

  std::vector<std::vector<UniqueNlMsg>> replies;
  for (int i = 0; i < 6; ++i) {
    replies.emplace_back();
    replies.back().push_back(CalibrationReply({}));
  }
  ExpectResponses(MCPS802154_CMD_SET_CALIBRATIONS, &replies, 6);
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  EXPECT_EQ(SentKeys(), expected);
  EXPECT_EQ(log_.Count(android::base::ERROR, "Skip incorrect key " + too_long), 1);
  // 600 elements of 28 bytes fill five messages; the long key needs one of its own.
  EXPECT_EQ(sent_.size(), 6u);
}

TEST_F(McpsCalibrationTest, DriverVerdictEndsTheTransferAfterTheCurrentMessage) {
  for (int i = 0; i < 400; ++i) store_.Set(("key_" + std::to_string(1000 + i)).c_str(), "1");
  std::vector<std::vector<UniqueNlMsg>> replies(1);
  replies[0].push_back(CalibrationReply({{"key_1001", 0}, {nullptr, 3}}));
  ExpectResponses(MCPS802154_CMD_SET_CALIBRATIONS, &replies, 1);
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  EXPECT_EQ(sent_.size(), 1u);
  EXPECT_TRUE(log_.Contains(android::base::ERROR, "Error on key key_1001"));
}

TEST_F(McpsCalibrationTest, FailedExchangeOrUnreadableReplyFails) {
  store_.Set("a", "1");
  std::vector<std::vector<UniqueNlMsg>> none;
  ExpectResponses(MCPS802154_CMD_SET_CALIBRATIONS, &none, 1);
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));

  // A reply too short for its generic netlink header cannot be read.
  std::vector<std::vector<UniqueNlMsg>> replies(1);
  replies[0].emplace_back();
  nlmsg_put(replies[0][0].get(), 0, 0, kFamily, 0, 0);
  ExpectResponses(MCPS802154_CMD_SET_CALIBRATIONS, &replies, 1);
  EXPECT_FALSE(mcps_.SetCalibration(kHw, &store_));
  EXPECT_EQ(log_.Count(android::base::ERROR,
                       "Error parsing response for calibration " + std::to_string(-NLE_MSG_TOOSHORT)),
            1)
      << log_.Text();
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
