#include "net/ccc_region_utils.h"

#include <memory>
#include <optional>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"
#include "sim/ccc_test_mode_sim.h"
#include "sim/driver_simulator.h"
#include "tests/log_capture.h"
#include "tests/mock_nl_socket.h"
#include "tests/sent_message.h"

namespace hardware {
namespace dalix {
namespace {

using ::android::base::ERROR;
using ::testing::_;
using ::testing::StrictMock;

constexpr uint32_t kFamily = 0x1c;
constexpr uint32_t kHw = 6;
constexpr char kTag[] = "dalix.uwb.CccRegionUtils";

class CccRegionUtilsTest : public ::testing::Test {
 protected:
  // The next exchange records the request and, when |reply| is set, answers
  // with it.
  void ExpectExchange(std::optional<UniqueNlMsg> reply) {
    auto answer = std::make_shared<std::optional<UniqueNlMsg>>(std::move(reply));
    EXPECT_CALL(factory_, Create()).WillOnce([this, answer] {
      auto socket = std::make_unique<StrictMock<MockNlSocket>>();
      EXPECT_CALL(*socket, SendAndAwaitResponse(_, _, MCPS802154_CMD_TESTMODE))
          .WillOnce([this, answer](nl_msg* msg, std::function<void(nl_msg*)> handler, int) {
            sent_.emplace_back(msg);
            if (*answer) handler((*answer)->get());
            return answer->has_value();
          });
      return std::unique_ptr<NlSocket>(std::move(socket));
    });
  }

  static UniqueNlMsg Reply(std::optional<uint8_t> code, bool with_testdata = true) {
    UniqueNlMsg msg = sim::DriverSimulator::NewEvent(kFamily, MCPS802154_CMD_TESTMODE);
    if (with_testdata) {
      sim::CccTestModeSim::EncodeTestModeReply(msg.get(), kHw, code);
    } else {
      nla_put_u32(msg.get(), MCPS802154_ATTR_HW, kHw);
    }
    return msg;
  }

  StrictMock<MockNlSocketFactory> factory_;
  CccRegionUtils ccc_{&factory_};
  std::vector<SentMessage> sent_;
  LogCapture log_;
};

TEST_F(CccRegionUtilsTest, AnUnresolvedFamilySendsNothing) {
  uint32_t value = 5;
  EXPECT_FALSE(ccc_.StartCccSession(kHw, 1, 2, 9, &value));
  EXPECT_EQ(value, 5u);
  EXPECT_TRUE(log_.Contains(ERROR, "StartRegionMessage: MCPS netlink id is not resolved", kTag));
}

TEST_F(CccRegionUtilsTest, TheStartSucceedsOnAnyReplyWhateverItsReturnCode) {
  ccc_.SetMcpsNetId(kFamily);
  struct {
    std::optional<UniqueNlMsg> reply;
    bool result;
    const char* error;
  } cases[] = {
      {Reply(1), true, nullptr},
      {Reply(0), true, "ParseTestModeCmdResponse: Error on the command"},
      {Reply(std::nullopt), true, "ParseTestModeCmdResponse: Missing KX7200_TM_ATTR_CCC_CMD_RC"},
      {Reply(1, false), true, "ParseTestModeCmdResponse: Missing MCPS802154_ATTR_TESTDATA"},
      {std::nullopt, false, nullptr},
  };
  for (auto& c : cases) {
    SCOPED_TRACE(c.error ? c.error : "no error");
    log_.Reset();
    sent_.clear();
    ExpectExchange(std::move(c.reply));
    uint32_t value = 0;
    EXPECT_EQ(ccc_.StartCccSession(kHw, 0xabcd, 0x1234567890, 11, &value), c.result);
    EXPECT_EQ(value, 123000u);
    EXPECT_EQ(log_.Count(ERROR, c.error ? c.error : ""), c.error ? 1 : 0) << log_.Text();

    ASSERT_EQ(sent_.size(), 1u);
    EXPECT_EQ(sent_[0].header()->nlmsg_type, kFamily);
    EXPECT_EQ(sent_[0].cmd(), MCPS802154_CMD_TESTMODE);
    std::vector<nlattr*> attrs = sent_[0].Attrs();
    ASSERT_EQ(attrs.size(), 2u);
    EXPECT_EQ(nla_get_u32(attrs[0]), kHw);
    EXPECT_EQ(attrs[1]->nla_type, MCPS802154_ATTR_TESTDATA | NLA_F_NESTED);
    std::vector<std::pair<int, std::vector<uint8_t>>> fields;
    for (nlattr* f : SentMessage::Children(attrs[1]))
      fields.emplace_back(f->nla_type, SentMessage::Payload(f));
    // The session's first value and time reference are not sent.
    EXPECT_EQ(fields, (std::vector<std::pair<int, std::vector<uint8_t>>>{
                          {KX7200_TM_ATTR_CMD, SentMessage::Bytes(uint32_t{9})},
                          {KX7200_TM_ATTR_CCC_CHANNEL, {11}},
                          {KX7200_TM_ATTR_CCC_U32_PARAM, SentMessage::Bytes(uint32_t{123000})}}));
  }
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
