#include "net/ieee_utils.h"

#include <errno.h>
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
using ::testing::ElementsAre;
using ::testing::Invoke;
using ::testing::IsEmpty;
using ::testing::Return;
using ::testing::StrictMock;

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
  std::vector<std::pair<int, std::vector<uint8_t>>> attrs;

  std::vector<int> AttrTypes() const {
    std::vector<int> types;
    for (const auto& attr : attrs) types.push_back(attr.first);
    return types;
  }
  std::vector<uint8_t> Payload(int type) const {
    for (const auto& attr : attrs) {
      if (attr.first == type) return attr.second;
    }
    return {};
  }
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

// The reply of an interface dump; a null name or a negative phy is left out.
UniqueNlMsg InterfaceReply(const char* name, int64_t phy) {
  UniqueNlMsg msg = NewReply(NL802154_CMD_NEW_INTERFACE);
  if (name != nullptr) nla_put_string(msg.get(), NL802154_ATTR_IFNAME, name);
  if (phy >= 0) nla_put_u32(msg.get(), NL802154_ATTR_WPAN_PHY, static_cast<uint32_t>(phy));
  return msg;
}

// libnl drops a nest that ends up empty, so empty nests are put directly.
void PutEmptyNest(nl_msg* msg, int type) { nla_put(msg, type, 0, nullptr); }

using Pages = std::vector<std::pair<int, std::vector<int>>>;

UniqueNlMsg PhyReply(uint32_t phy, const Pages& pages) {
  UniqueNlMsg msg = NewReply(NL802154_CMD_NEW_WPAN_PHY);
  nla_put_u32(msg.get(), NL802154_ATTR_WPAN_PHY, phy);
  nlattr* caps = nla_nest_start(msg.get(), NL802154_ATTR_WPAN_PHY_CAPS);
  nlattr* channels = nla_nest_start(msg.get(), NL802154_CAP_ATTR_CHANNELS);
  for (const auto& [page, page_channels] : pages) {
    if (page_channels.empty()) {
      PutEmptyNest(msg.get(), page);
      continue;
    }
    nlattr* nest = nla_nest_start(msg.get(), page);
    for (int channel : page_channels) nla_put_flag(msg.get(), channel);
    nla_nest_end(msg.get(), nest);
  }
  nla_nest_end(msg.get(), channels);
  nla_nest_end(msg.get(), caps);
  return msg;
}

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

  // The next acknowledged request is captured and answered with |result|.
  void ExpectAck(SentRequest* sent, bool result = true) {
    auto socket = std::make_unique<StrictMock<MockNlSocket>>();
    EXPECT_CALL(*socket, SendAndAwaitAck(_, _))
        .WillOnce(Invoke([sent, result](nl_msg* msg, std::function<int(nl_msg*)>) {
          *sent = Capture(msg);
          return result;
        }));
    EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
  }

  // The next request is captured and answered with |replies|, as a socket
  // would hand them over for reply command |cmd|.
  void ExpectResponse(SentRequest* sent, int* cmd, std::vector<UniqueNlMsg> replies,
                      bool result = true) {
    auto socket = std::make_unique<StrictMock<MockNlSocket>>();
    auto shared_replies = std::make_shared<std::vector<UniqueNlMsg>>(std::move(replies));
    EXPECT_CALL(*socket, SendAndAwaitResponse(_, _, _))
        .WillOnce(Invoke([=](nl_msg* msg, std::function<void(nl_msg*)> on_response, int reply) {
          *sent = Capture(msg);
          *cmd = reply;
          for (const UniqueNlMsg& r : *shared_replies) on_response(r.get());
          return result;
        }));
    EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
  }

  const std::vector<uint8_t> kIfindex = Bytes<uint32_t>(if_nametoindex(kIface));
  LogCapture log_;
  StrictMock<MockNlSocketFactory> factory_;
  IeeeUtils utils_{&factory_};
};

TEST(IeeeUtilsSetupTest, ReportsAMissingFamilyAndAMissingSocket) {
  LogCapture log;
  StrictMock<MockNlSocketFactory> factory;
  IeeeUtils utils(&factory);

  EXPECT_CALL(factory, Create()).WillOnce(Return(ByMove(nullptr)));
  EXPECT_FALSE(utils.Setup());
  EXPECT_TRUE(log.Entries().empty()) << log.Text();

  auto socket = std::make_unique<StrictMock<MockNlSocket>>();
  EXPECT_CALL(*socket, Resolve(_)).WillOnce(Return(-NLE_OBJ_NOTFOUND));
  EXPECT_CALL(factory, Create()).WillOnce(Return(ByMove(std::move(socket))));
  EXPECT_FALSE(utils.Setup());
  EXPECT_EQ(1, log.Count(android::base::ERROR, "Setup Generic netlink nl802154 not found.", kTag))
      << log.Text();
}

TEST_F(IeeeUtilsTest, SettersSendTheInterfaceFirstThenTheirValues) {
  const struct {
    const char* name;
    std::function<bool(IeeeUtils&)> call;
    uint8_t cmd;
    std::vector<std::pair<int, std::vector<uint8_t>>> values;
  } cases[] = {
      {"channel 0", [](IeeeUtils& u) { return u.SetChannel(kIface, 0); },
       NL802154_CMD_SET_CHANNEL,
       {{NL802154_ATTR_PAGE, {4}}, {NL802154_ATTR_CHANNEL, {0}}}},
      {"channel 15", [](IeeeUtils& u) { return u.SetChannel(kIface, 15); },
       NL802154_CMD_SET_CHANNEL,
       {{NL802154_ATTR_PAGE, {4}}, {NL802154_ATTR_CHANNEL, {15}}}},
      {"pan id", [](IeeeUtils& u) { return u.SetPanId(kIface, 0xcafe); },
       NL802154_CMD_SET_PAN_ID,
       {{NL802154_ATTR_PAN_ID, Bytes<uint16_t>(0xcafe)}}},
      {"short address, first byte high",
       [](IeeeUtils& u) { return u.SetShortMacAddress(kIface, {0x12, 0x34}); },
       NL802154_CMD_SET_SHORT_ADDR,
       {{NL802154_ATTR_SHORT_ADDR, Bytes<uint16_t>(0x1234)}}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    for (bool acked : {true, false}) {
      SentRequest sent;
      ExpectAck(&sent, acked);
      EXPECT_EQ(acked, c.call(utils_));
      EXPECT_EQ(kFamilyId, sent.type);
      EXPECT_EQ(c.cmd, sent.cmd);
      EXPECT_EQ(0, sent.flags & NLM_F_DUMP);
      auto expected = c.values;
      expected.insert(expected.begin(), {NL802154_ATTR_IFINDEX, kIfindex});
      EXPECT_EQ(expected, sent.attrs);
    }
  }
  EXPECT_EQ(2, log_.Count(android::base::INFO, "SetChannel: Set channel to 15", kTag));
  EXPECT_EQ(2, log_.Count(android::base::INFO, "SetPanId: Set pan id to 51966", kTag));
}

TEST_F(IeeeUtilsTest, BadArgumentsAreRefusedBeforeAnythingIsSent) {
  // The strict factory fails the test if any of these asks for a socket.
  EXPECT_FALSE(utils_.SetChannel(kIface, 16));
  EXPECT_FALSE(utils_.SetChannel(kIface, -1));
  EXPECT_TRUE(log_.Contains(android::base::INFO, "SetChannel: Set channel to -1", kTag));
  EXPECT_EQ(0, log_.Count(android::base::ERROR, "SetChannel: Error creating IEEE message"));

  for (const std::vector<uint8_t>& address :
       {std::vector<uint8_t>{1, 2, 3}, std::vector<uint8_t>{1}, std::vector<uint8_t>{}}) {
    EXPECT_FALSE(utils_.SetShortMacAddress(kIface, address));
    EXPECT_EQ(1, log_.Count(android::base::ERROR,
                            "SetShortMacAddress: Incorrect short address, size is " +
                                std::to_string(address.size()),
                            kTag))
        << log_.Text();
  }
}

TEST_F(IeeeUtilsTest, UnknownInterfaceFailsEveryRequestBeforeSending) {
  const char kMissing[] = "nosuchwpan7";
  PhyInfo info;
  errno = 0;
  EXPECT_FALSE(utils_.SetChannel(kMissing, 5));
  EXPECT_EQ(ENODEV, errno);
  EXPECT_FALSE(utils_.SetPanId(kMissing, 1));
  EXPECT_FALSE(utils_.SetShortMacAddress(kMissing, {0, 1}));
  EXPECT_FALSE(utils_.GetPhyInfo(kMissing, &info));
  EXPECT_EQ(4, log_.Count(android::base::ERROR,
                          std::string("SetIeeeCommand: Failed to resolve iface ") + kMissing +
                              ": " + strerror(ENODEV),
                          kTag))
      << log_.Text();
}

TEST_F(IeeeUtilsTest, ListDevicesDumpsWithoutAttributesAndSkipsIncompleteEntries) {
  std::vector<UniqueNlMsg> replies;
  replies.push_back(InterfaceReply("wpan0", 0));
  replies.push_back(InterfaceReply(nullptr, 1));
  replies.push_back(InterfaceReply("wpan2", -1));
  replies.push_back(InterfaceReply("wpan3", 12));
  // A phy index too short to be a u32 must not be read past its end.
  UniqueNlMsg short_phy = NewReply(NL802154_CMD_NEW_INTERFACE);
  nla_put_string(short_phy.get(), NL802154_ATTR_IFNAME, "wpan4");
  nla_put_u8(short_phy.get(), NL802154_ATTR_WPAN_PHY, 4);
  replies.push_back(std::move(short_phy));
  SentRequest sent;
  int reply_cmd = 0;
  ExpectResponse(&sent, &reply_cmd, std::move(replies));

  bool ok = false;
  const std::vector<DevInfo> devices = utils_.ListDevices(&ok);
  EXPECT_TRUE(ok);
  ASSERT_EQ(2u, devices.size());
  EXPECT_EQ("wpan0", devices[0].name);
  EXPECT_EQ(0u, devices[0].phy_index);
  EXPECT_EQ("wpan3", devices[1].name);
  EXPECT_EQ(12u, devices[1].phy_index);
  EXPECT_EQ(3, log_.Count(android::base::ERROR,
                          "operator(): Incorrect attr in NL802154_CMD_GET_INTERFACE dump", kTag))
      << log_.Text();
  EXPECT_TRUE(log_.Contains(android::base::INFO, "ListDevices", kTag));

  EXPECT_EQ(kFamilyId, sent.type);
  EXPECT_EQ(NL802154_CMD_GET_INTERFACE, sent.cmd);
  EXPECT_EQ(NLM_F_DUMP, sent.flags & NLM_F_DUMP);
  EXPECT_THAT(sent.attrs, IsEmpty());
  EXPECT_EQ(NL802154_CMD_NEW_INTERFACE, reply_cmd);
}

TEST_F(IeeeUtilsTest, ListDevicesKeepsWhatCameBeforeAFailure) {
  std::vector<UniqueNlMsg> replies;
  replies.push_back(InterfaceReply("wpan0", 3));
  SentRequest sent;
  int reply_cmd = 0;
  ExpectResponse(&sent, &reply_cmd, std::move(replies), /*result=*/false);
  bool ok = true;
  const std::vector<DevInfo> devices = utils_.ListDevices(&ok);
  EXPECT_FALSE(ok);
  ASSERT_EQ(1u, devices.size());
  EXPECT_EQ("wpan0", devices[0].name);
}

TEST_F(IeeeUtilsTest, GetPhyInfoReadsOnlyTheUwbPageAndAppends) {
  const struct {
    const char* name;
    Pages pages;
    std::vector<int> channels;
  } cases[] = {
      {"uwb page among others", {{0, {1, 2}}, {4, {9, 1, 5}}, {5, {3}}}, {7, 9, 1, 5}},
      {"no uwb page", {{0, {11, 12}}, {2, {3}}}, {7}},
      {"empty uwb page", {{4, {}}}, {7}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    std::vector<UniqueNlMsg> replies;
    replies.push_back(PhyReply(3, c.pages));
    SentRequest sent;
    int reply_cmd = 0;
    ExpectResponse(&sent, &reply_cmd, std::move(replies));
    PhyInfo info;
    info.channels = {7};
    EXPECT_TRUE(utils_.GetPhyInfo(kIface, &info));
    EXPECT_EQ(3u, info.phy_index);
    EXPECT_EQ(c.channels, info.channels);
    EXPECT_EQ(NL802154_CMD_GET_WPAN_PHY, sent.cmd);
    EXPECT_THAT(sent.AttrTypes(), ElementsAre(NL802154_ATTR_IFINDEX));
    EXPECT_EQ(kIfindex, sent.Payload(NL802154_ATTR_IFINDEX));
    EXPECT_EQ(NL802154_CMD_NEW_WPAN_PHY, reply_cmd);
  }
  EXPECT_EQ(3, log_.Count(android::base::INFO, "GetPhyInfo", kTag));
  EXPECT_EQ(3u, log_.Entries().size()) << log_.Text();
}

TEST_F(IeeeUtilsTest, GetPhyInfoFailsOnIncompleteReplies) {
  UniqueNlMsg no_caps = NewReply(NL802154_CMD_NEW_WPAN_PHY);
  nla_put_u32(no_caps.get(), NL802154_ATTR_WPAN_PHY, 1);

  UniqueNlMsg no_phy = NewReply(NL802154_CMD_NEW_WPAN_PHY);
  PutEmptyNest(no_phy.get(), NL802154_ATTR_WPAN_PHY_CAPS);

  UniqueNlMsg no_channels = NewReply(NL802154_CMD_NEW_WPAN_PHY);
  nla_put_u32(no_channels.get(), NL802154_ATTR_WPAN_PHY, 1);
  PutEmptyNest(no_channels.get(), NL802154_ATTR_WPAN_PHY_CAPS);

  UniqueNlMsg bad_caps = NewReply(NL802154_CMD_NEW_WPAN_PHY);
  nla_put_u32(bad_caps.get(), NL802154_ATTR_WPAN_PHY, 1);
  nlattr* caps = nla_nest_start(bad_caps.get(), NL802154_ATTR_WPAN_PHY_CAPS);
  nla_put_u8(bad_caps.get(), NL802154_CAP_ATTR_CHANNELS, 4);  // too short for a page
  nla_nest_end(bad_caps.get(), caps);

  UniqueNlMsg bad_phy = NewReply(NL802154_CMD_NEW_WPAN_PHY);
  nla_put_u16(bad_phy.get(), NL802154_ATTR_WPAN_PHY, 1);

  struct Case {
    const char* name;
    UniqueNlMsg reply;
    std::string error;
  };
  Case cases[] = {
      {"no capabilities", std::move(no_caps),
       "operator(): Incorrect attr in CMD_GET_WPAN_PHY response"},
      {"no phy", std::move(no_phy), "operator(): Incorrect attr in CMD_GET_WPAN_PHY response"},
      {"no channel list", std::move(no_channels),
       "operator(): Incorrect NL802154_CAP_ATTR_CHANNELS in CMD_GET_WPAN_PHY"},
      {"channel list without room for a page", std::move(bad_caps),
       "operator(): Failed to parse CMD_GET_WPAN_PHY channels"},
      {"short phy index", std::move(bad_phy), "operator(): Failed to parse CMD_GET_WPAN_PHY"},
  };
  for (Case& c : cases) {
    SCOPED_TRACE(c.name);
    log_.Reset();
    std::vector<UniqueNlMsg> replies;
    replies.push_back(std::move(c.reply));
    SentRequest sent;
    int reply_cmd = 0;
    ExpectResponse(&sent, &reply_cmd, std::move(replies));
    PhyInfo info;
    EXPECT_FALSE(utils_.GetPhyInfo(kIface, &info));
    EXPECT_THAT(info.channels, IsEmpty());
    EXPECT_EQ(1, log_.Count(android::base::ERROR, c.error, kTag)) << log_.Text();
  }
}

TEST_F(IeeeUtilsTest, GetPhyInfoFailsWhenTheExchangeFails) {
  SentRequest sent;
  int reply_cmd = 0;
  ExpectResponse(&sent, &reply_cmd, {}, /*result=*/false);
  PhyInfo info;
  EXPECT_FALSE(utils_.GetPhyInfo(kIface, &info));
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
