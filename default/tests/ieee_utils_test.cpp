#include "net/ieee_utils.h"

#include <algorithm>
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
#include "tests/mock_nl_socket.h"

namespace hardware {
namespace dalix {
namespace {

using ::android::base::ERROR;
using ::testing::_;
using ::testing::ByMove;
using ::testing::Return;
using ::testing::StrEq;
using ::testing::StrictMock;

constexpr char kTag[] = "dalix.uwb.IeeeUtils";
constexpr int kFamilyId = 0x2b;
// Present in every network namespace, so requests can name a real interface.
constexpr char kIface[] = "lo";

UniqueNlMsg NewReply(uint8_t cmd) {
  UniqueNlMsg msg;
  genlmsg_put(msg.get(), 0, 0, kFamilyId, 0, 0, cmd, 0);
  return msg;
}

class IeeeUtilsTest : public ::testing::Test {
 protected:
  // Every request opens a socket of its own; this one hands |replies| to the
  // client's response handler.
  void ExpectExchange(std::vector<UniqueNlMsg> replies, bool result = true) {
    auto socket = std::make_unique<StrictMock<MockNlSocket>>();
    auto kept = std::make_shared<std::vector<UniqueNlMsg>>(std::move(replies));
    EXPECT_CALL(*socket, SendAndAwaitResponse(_, _, _))
        .WillOnce([kept, result](nl_msg*, std::function<void(nl_msg*)> on_response, int) {
          for (const UniqueNlMsg& reply : *kept) on_response(reply.get());
          return result;
        });
    EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
  }

  LogCapture log_;
  StrictMock<MockNlSocketFactory> factory_;
  IeeeUtils utils_{&factory_};
};

TEST_F(IeeeUtilsTest, MissingFamilyIsReported) {
  auto socket = std::make_unique<StrictMock<MockNlSocket>>();
  EXPECT_CALL(*socket, Resolve(StrEq(kNl802154FamilyName))).WillOnce(Return(-NLE_OBJ_NOTFOUND));
  EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
  EXPECT_FALSE(utils_.Setup());
  EXPECT_EQ(1, log_.Count(ERROR, "Setup Generic netlink nl802154 not found.", kTag)) << log_.Text();
}

// Entries without a name or a phy are left out end to end; what was gathered
// is returned even when the exchange fails.
TEST_F(IeeeUtilsTest, DumpEntryWithAShortPhyIndexIsSkipped) {
  std::vector<UniqueNlMsg> replies;
  for (int i = 0; i < 2; ++i) replies.push_back(NewReply(NL802154_CMD_NEW_INTERFACE));
  nla_put_string(replies[0].get(), NL802154_ATTR_IFNAME, "wpan0");
  nla_put_u32(replies[0].get(), NL802154_ATTR_WPAN_PHY, 12);
  // A phy index too short for a u32 must not be read past its end.
  nla_put_string(replies[1].get(), NL802154_ATTR_IFNAME, "wpan3");
  nla_put_u8(replies[1].get(), NL802154_ATTR_WPAN_PHY, 3);
  ExpectExchange(std::move(replies), /*result=*/false);

  bool ok = true;
  const std::vector<DevInfo> devices = utils_.ListDevices(&ok);
  EXPECT_FALSE(ok);
  ASSERT_EQ(1u, devices.size());
  EXPECT_EQ("wpan0", devices[0].name);
  EXPECT_EQ(12u, devices[0].phy_index);
  EXPECT_EQ(
      1, log_.Count(ERROR, "operator(): Incorrect attr in NL802154_CMD_GET_INTERFACE dump", kTag))
      << log_.Text();
}

TEST_F(IeeeUtilsTest, PhyRepliesAreReadOrFailWithTheirOwnLine) {
  std::vector<UniqueNlMsg> replies;
  for (int i = 0; i < 5; ++i) replies.push_back(NewReply(NL802154_CMD_NEW_WPAN_PHY));
  nla_put_u32(replies[0].get(), NL802154_ATTR_WPAN_PHY, 1);  // no capabilities
  nla_put_u16(replies[1].get(), NL802154_ATTR_WPAN_PHY, 1);  // short phy index
  nla_put_u32(replies[2].get(), NL802154_ATTR_WPAN_PHY, 1);
  // libnl drops a nest that ends up empty, so the empty ones are put directly.
  nla_put(replies[2].get(), NL802154_ATTR_WPAN_PHY_CAPS, 0, nullptr);  // no channel list
  nla_put_u32(replies[3].get(), NL802154_ATTR_WPAN_PHY, 1);
  nlattr* caps = nla_nest_start(replies[3].get(), NL802154_ATTR_WPAN_PHY_CAPS);
  nla_put(replies[3].get(), NL802154_CAP_ATTR_CHANNELS, 0, nullptr);  // a phy without channels
  nla_nest_end(replies[3].get(), caps);
  nla_put(replies[4].get(), NL802154_ATTR_WPAN_PHY_CAPS, 0, nullptr);  // no phy
  // An empty error: the reply is read, with no channel to add.
  const std::string errors[] = {
      "operator(): Incorrect attr in CMD_GET_WPAN_PHY response",
      "operator(): Failed to parse CMD_GET_WPAN_PHY",
      "operator(): Incorrect NL802154_CAP_ATTR_CHANNELS in CMD_GET_WPAN_PHY",
      "",
      "operator(): Incorrect attr in CMD_GET_WPAN_PHY response",
  };
  for (size_t i = 0; i < replies.size(); ++i) {
    SCOPED_TRACE(errors[i]);
    log_.Reset();
    std::vector<UniqueNlMsg> one;
    one.push_back(std::move(replies[i]));
    ExpectExchange(std::move(one));
    PhyInfo info;
    EXPECT_EQ(errors[i].empty(), utils_.GetPhyInfo(kIface, &info));
    EXPECT_TRUE(info.channels.empty());
    const std::vector<LogCapture::Entry> lines = log_.Entries();
    EXPECT_EQ(errors[i].empty() ? 0 : 1,
              std::count_if(lines.begin(), lines.end(),
                            [](const LogCapture::Entry& line) { return line.severity == ERROR; }));
    EXPECT_EQ(errors[i].empty() ? 0 : 1, log_.Count(ERROR, errors[i], kTag)) << log_.Text();
  }
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
