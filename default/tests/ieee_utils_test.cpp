#include "net/ieee_utils.h"

#include <net/if.h>
#include <string.h>

#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netlink/attr.h>
#include <netlink/genl/genl.h>

#include "net/nl802154.h"
#include "net/unique_nl_msg.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using ::testing::_;
using ::testing::ByMove;
using ::testing::Invoke;
using ::testing::Return;
using ::testing::StrictMock;

using Attrs = std::vector<std::pair<int, std::vector<uint8_t>>>;

constexpr char kTag[] = "dalix.uwb.IeeeUtils";
constexpr int kFamilyId = 0x2b;
// Present in every network namespace, so requests can name a real interface.
constexpr char kIface[] = "lo";

class MockNlSocket : public NlSocket {
 public:
  MockNlSocket() : NlSocket(nullptr) {}
  MOCK_METHOD(int, Resolve, (const char* family), (override));
  MOCK_METHOD(bool, SendAndAwaitAck, (nl_msg * msg, std::function<int(nl_msg*)> on_message),
              (override));
  MOCK_METHOD(bool, SendAndAwaitResponse,
              (nl_msg * msg, std::function<void(nl_msg*)> on_response, int cmd), (override));
};

class MockNlSocketFactory : public NlSocketFactory {
 public:
  MockNlSocketFactory() : NlSocketFactory(nullptr) {}
  MOCK_METHOD(std::unique_ptr<NlSocket>, Create, (), (override));
};

// A request as it left the service: header fields and attributes in order.
struct SentRequest {
  uint16_t type = 0;
  uint16_t flags = 0;
  uint8_t cmd = 0;
  Attrs attrs;
  int reply_cmd = -1;  // what the exchange waited for; -1 for an acknowledgement
};

SentRequest Capture(nl_msg* msg) {
  SentRequest sent;
  nlmsghdr* header = nlmsg_hdr(msg);
  sent.type = header->nlmsg_type;
  sent.flags = header->nlmsg_flags;
  sent.cmd = genlmsg_hdr(header)->cmd;
  nlattr* attr;
  int rem;
  nla_for_each_attr(attr, genlmsg_attrdata(genlmsg_hdr(header), 0),
                    genlmsg_attrlen(genlmsg_hdr(header), 0), rem) {
    const auto* data = static_cast<const uint8_t*>(nla_data(attr));
    sent.attrs.emplace_back(nla_type(attr), std::vector<uint8_t>(data, data + nla_len(attr)));
  }
  return sent;
}

template <typename T>
std::vector<uint8_t> Bytes(T value) {
  std::vector<uint8_t> bytes(sizeof(value));
  memcpy(bytes.data(), &value, sizeof(value));
  return bytes;
}

UniqueNlMsg NewReply(uint8_t cmd) {
  UniqueNlMsg msg;
  genlmsg_put(msg.get(), 0, 0, kFamilyId, 0, 0, cmd, 0);
  return msg;
}

// libnl drops a nest that ends up empty, so empty nests are put directly.
void PutEmptyNest(nl_msg* msg, int type) { nla_put(msg, type, 0, nullptr); }

class IeeeUtilsTest : public ::testing::Test {
 protected:
  void SetUp() override {
    auto socket = std::make_unique<StrictMock<MockNlSocket>>();
    EXPECT_CALL(*socket, Resolve(::testing::StrEq(kNl802154FamilyName)))
        .WillOnce(Return(kFamilyId));
    EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
    ASSERT_TRUE(utils_.Setup());
    log_.Reset();
  }

  // The next request is captured into |sent|; a response exchange is fed
  // |replies| as the socket would hand them over.
  void ExpectExchange(SentRequest* sent, std::vector<UniqueNlMsg> replies = {},
                      bool result = true) {
    auto socket = std::make_unique<StrictMock<MockNlSocket>>();
    auto shared = std::make_shared<std::vector<UniqueNlMsg>>(std::move(replies));
    ON_CALL(*socket, SendAndAwaitAck(_, _)).WillByDefault(Invoke([=](nl_msg* msg, auto) {
      *sent = Capture(msg);
      return result;
    }));
    ON_CALL(*socket, SendAndAwaitResponse(_, _, _))
        .WillByDefault(Invoke([=](nl_msg* msg, std::function<void(nl_msg*)> on_response, int cmd) {
          *sent = Capture(msg);
          sent->reply_cmd = cmd;
          for (const UniqueNlMsg& reply : *shared) on_response(reply.get());
          return result;
        }));
    EXPECT_CALL(*socket, SendAndAwaitAck(_, _)).Times(::testing::AtMost(1));
    EXPECT_CALL(*socket, SendAndAwaitResponse(_, _, _)).Times(::testing::AtMost(1));
    EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
  }

  const std::vector<uint8_t> kIfindex = Bytes<uint32_t>(if_nametoindex(kIface));
  LogCapture log_;
  StrictMock<MockNlSocketFactory> factory_;
  IeeeUtils utils_{&factory_};
};

TEST(IeeeUtilsSetupTest, MissingFamilyIsReported) {
  LogCapture log;
  StrictMock<MockNlSocketFactory> factory;
  IeeeUtils utils(&factory);
  auto socket = std::make_unique<StrictMock<MockNlSocket>>();
  EXPECT_CALL(*socket, Resolve(_)).WillOnce(Return(-NLE_OBJ_NOTFOUND));
  EXPECT_CALL(factory, Create()).WillOnce(Return(ByMove(std::move(socket))));
  EXPECT_FALSE(utils.Setup());
  EXPECT_EQ(1, log.Count(android::base::ERROR, "Setup Generic netlink nl802154 not found.", kTag))
      << log.Text();
}

TEST_F(IeeeUtilsTest, RequestsCarryTheInterfaceFirstThenTheirValues) {
  PhyInfo info;
  bool ok;
  const struct {
    const char* name;
    std::function<void(IeeeUtils&)> call;
    uint8_t cmd;
    int reply_cmd;
    uint16_t dump;
    Attrs attrs;
  } cases[] = {
      {"channel 0", [](IeeeUtils& u) { u.SetChannel(kIface, 0); }, NL802154_CMD_SET_CHANNEL, -1, 0,
       {{NL802154_ATTR_IFINDEX, kIfindex}, {NL802154_ATTR_PAGE, {4}}, {NL802154_ATTR_CHANNEL, {0}}}},
      {"channel 15", [](IeeeUtils& u) { u.SetChannel(kIface, 15); }, NL802154_CMD_SET_CHANNEL, -1,
       0,
       {{NL802154_ATTR_IFINDEX, kIfindex},
        {NL802154_ATTR_PAGE, {4}},
        {NL802154_ATTR_CHANNEL, {15}}}},
      {"pan id", [](IeeeUtils& u) { u.SetPanId(kIface, 0xcafe); }, NL802154_CMD_SET_PAN_ID, -1, 0,
       {{NL802154_ATTR_IFINDEX, kIfindex}, {NL802154_ATTR_PAN_ID, Bytes<uint16_t>(0xcafe)}}},
      {"short address, first byte high",
       [](IeeeUtils& u) { u.SetShortMacAddress(kIface, {0x12, 0x34}); },
       NL802154_CMD_SET_SHORT_ADDR, -1, 0,
       {{NL802154_ATTR_IFINDEX, kIfindex}, {NL802154_ATTR_SHORT_ADDR, Bytes<uint16_t>(0x1234)}}},
      {"phy", [&info](IeeeUtils& u) { u.GetPhyInfo(kIface, &info); }, NL802154_CMD_GET_WPAN_PHY,
       NL802154_CMD_NEW_WPAN_PHY, 0, {{NL802154_ATTR_IFINDEX, kIfindex}}},
      {"interface dump", [&ok](IeeeUtils& u) { u.ListDevices(&ok); }, NL802154_CMD_GET_INTERFACE,
       NL802154_CMD_NEW_INTERFACE, NLM_F_DUMP, {}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    SentRequest sent;
    ExpectExchange(&sent);
    c.call(utils_);
    EXPECT_EQ(kFamilyId, sent.type);
    EXPECT_EQ(c.cmd, sent.cmd);
    EXPECT_EQ(c.reply_cmd, sent.reply_cmd);
    EXPECT_EQ(c.dump, sent.flags & NLM_F_DUMP);
    EXPECT_EQ(c.attrs, sent.attrs);
  }
  EXPECT_TRUE(log_.Contains(android::base::INFO, "SetChannel: Set channel to 15", kTag));
  EXPECT_TRUE(log_.Contains(android::base::INFO, "SetPanId: Set pan id to 51966", kTag));
}

TEST_F(IeeeUtilsTest, DumpEntriesThatCannotBeReadAreSkipped) {
  std::vector<UniqueNlMsg> replies;
  for (int i = 0; i < 4; ++i) replies.push_back(NewReply(NL802154_CMD_NEW_INTERFACE));
  nla_put_string(replies[0].get(), NL802154_ATTR_IFNAME, "wpan0");
  nla_put_u32(replies[0].get(), NL802154_ATTR_WPAN_PHY, 12);
  nla_put_u32(replies[1].get(), NL802154_ATTR_WPAN_PHY, 1);  // no name
  nla_put_string(replies[2].get(), NL802154_ATTR_IFNAME, "wpan2");
  // A phy index too short for a u32 must not be read past its end.
  nla_put_string(replies[3].get(), NL802154_ATTR_IFNAME, "wpan3");
  nla_put_u8(replies[3].get(), NL802154_ATTR_WPAN_PHY, 3);
  SentRequest sent;
  ExpectExchange(&sent, std::move(replies), /*result=*/false);

  bool ok = true;
  const std::vector<DevInfo> devices = utils_.ListDevices(&ok);
  EXPECT_FALSE(ok);  // what was gathered is returned all the same
  ASSERT_EQ(1u, devices.size());
  EXPECT_EQ("wpan0", devices[0].name);
  EXPECT_EQ(12u, devices[0].phy_index);
  EXPECT_EQ(3, log_.Count(android::base::ERROR,
                          "operator(): Incorrect attr in NL802154_CMD_GET_INTERFACE dump", kTag))
      << log_.Text();
}

TEST_F(IeeeUtilsTest, PhyRepliesThatCannotBeReadFailWithTheirOwnLine) {
  std::vector<UniqueNlMsg> replies;
  for (int i = 0; i < 5; ++i) replies.push_back(NewReply(NL802154_CMD_NEW_WPAN_PHY));
  nla_put_u32(replies[0].get(), NL802154_ATTR_WPAN_PHY, 1);  // no capabilities
  nla_put_u16(replies[1].get(), NL802154_ATTR_WPAN_PHY, 1);  // short phy index
  nla_put_u32(replies[2].get(), NL802154_ATTR_WPAN_PHY, 1);
  PutEmptyNest(replies[2].get(), NL802154_ATTR_WPAN_PHY_CAPS);  // no channel list
  nla_put_u32(replies[3].get(), NL802154_ATTR_WPAN_PHY, 1);
  nlattr* caps = nla_nest_start(replies[3].get(), NL802154_ATTR_WPAN_PHY_CAPS);
  nla_put_u8(replies[3].get(), NL802154_CAP_ATTR_CHANNELS, 4);  // too short for a page
  nla_nest_end(replies[3].get(), caps);
  PutEmptyNest(replies[4].get(), NL802154_ATTR_WPAN_PHY_CAPS);  // no phy
  const std::string errors[] = {
      "operator(): Incorrect attr in CMD_GET_WPAN_PHY response",
      "operator(): Failed to parse CMD_GET_WPAN_PHY",
      "operator(): Incorrect NL802154_CAP_ATTR_CHANNELS in CMD_GET_WPAN_PHY",
      "operator(): Failed to parse CMD_GET_WPAN_PHY channels",
      "operator(): Incorrect attr in CMD_GET_WPAN_PHY response",
  };
  for (size_t i = 0; i < replies.size(); ++i) {
    SCOPED_TRACE(errors[i]);
    log_.Reset();
    std::vector<UniqueNlMsg> one;
    one.push_back(std::move(replies[i]));
    SentRequest sent;
    ExpectExchange(&sent, std::move(one));
    PhyInfo info;
    EXPECT_FALSE(utils_.GetPhyInfo(kIface, &info));
    EXPECT_TRUE(info.channels.empty());
    EXPECT_EQ(1, log_.Count(android::base::ERROR, errors[i], kTag)) << log_.Text();
  }
}

TEST_F(IeeeUtilsTest, PhyChannelsAreAppendedFromTheUwbPageOnly) {
  std::vector<UniqueNlMsg> replies;
  replies.push_back(NewReply(NL802154_CMD_NEW_WPAN_PHY));
  nl_msg* reply = replies[0].get();
  nla_put_u32(reply, NL802154_ATTR_WPAN_PHY, 3);
  nlattr* caps = nla_nest_start(reply, NL802154_ATTR_WPAN_PHY_CAPS);
  nlattr* channels = nla_nest_start(reply, NL802154_CAP_ATTR_CHANNELS);
  for (const auto& [page, list] : std::vector<std::pair<int, std::vector<int>>>{
           {0, {1, 2}}, {4, {9, 1, 5}}, {5, {3}}}) {
    nlattr* nest = nla_nest_start(reply, page);
    for (int channel : list) nla_put_flag(reply, channel);
    nla_nest_end(reply, nest);
  }
  nla_nest_end(reply, channels);
  nla_nest_end(reply, caps);
  SentRequest sent;
  ExpectExchange(&sent, std::move(replies));

  PhyInfo info;
  info.channels = {7};
  EXPECT_TRUE(utils_.GetPhyInfo(kIface, &info));
  EXPECT_EQ(3u, info.phy_index);
  EXPECT_EQ((std::vector<int>{7, 9, 1, 5}), info.channels);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
