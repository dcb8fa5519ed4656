#include "net/ieee_utils.h"

#include <functional>
#include <iterator>
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
using ::testing::StrictMock;

constexpr char kTag[] = "dalix.uwb.IeeeUtils";
constexpr int kFamilyId = 0x2b;
// Present in every network namespace, so requests can name a real interface.
constexpr char kIface[] = "lo";

class IeeeUtilsTest : public ::testing::Test {
 protected:
  // Every request opens a socket of its own; this one hands |reply| to the
  // client's response handler.
  void ExpectReply(nl_msg* reply) {
    auto socket = std::make_unique<StrictMock<MockNlSocket>>();
    EXPECT_CALL(*socket, SendAndAwaitResponse(_, _, _))
        .WillOnce([reply](nl_msg*, std::function<void(nl_msg*)> on_response, int) {
          on_response(reply);
          return true;
        });
    EXPECT_CALL(factory_, Create()).WillOnce(Return(ByMove(std::move(socket))));
  }

  LogCapture log_;
  StrictMock<MockNlSocketFactory> factory_;
  IeeeUtils utils_{&factory_};
};

// Replies the simulator never sends, with attributes missing or too short:
// each is skipped with its own line, and nothing is read past its end.
TEST_F(IeeeUtilsTest, BrokenRepliesAreSkippedWithTheirOwnLine) {
  // The first reply is an entry of the interface dump; the others describe a phy.
  const std::string errors[] = {
      "operator(): Incorrect attr in NL802154_CMD_GET_INTERFACE dump",
      "operator(): Incorrect attr in CMD_GET_WPAN_PHY response",
      "operator(): Failed to parse CMD_GET_WPAN_PHY",
      "operator(): Incorrect NL802154_CAP_ATTR_CHANNELS in CMD_GET_WPAN_PHY",
      "",  // read, with no channel to add
      "operator(): Incorrect attr in CMD_GET_WPAN_PHY response",
  };
  std::vector<UniqueNlMsg> replies(std::size(errors));
  for (size_t i = 0; i < replies.size(); ++i) {
    const uint8_t cmd = i == 0 ? NL802154_CMD_NEW_INTERFACE : NL802154_CMD_NEW_WPAN_PHY;
    genlmsg_put(replies[i].get(), 0, 0, kFamilyId, 0, 0, cmd, 0);
  }
  nla_put_string(replies[0].get(), NL802154_ATTR_IFNAME, "wpan3");
  nla_put_u8(replies[0].get(), NL802154_ATTR_WPAN_PHY, 3);   // short phy index
  nla_put_u32(replies[1].get(), NL802154_ATTR_WPAN_PHY, 1);  // no capabilities
  nla_put_u16(replies[2].get(), NL802154_ATTR_WPAN_PHY, 1);  // short phy index
  nla_put_u32(replies[3].get(), NL802154_ATTR_WPAN_PHY, 1);
  // libnl drops a nest that ends up empty, so the empty ones are put directly.
  nla_put(replies[3].get(), NL802154_ATTR_WPAN_PHY_CAPS, 0, nullptr);  // no channel list
  nla_put_u32(replies[4].get(), NL802154_ATTR_WPAN_PHY, 1);
  nlattr* caps = nla_nest_start(replies[4].get(), NL802154_ATTR_WPAN_PHY_CAPS);
  nla_put(replies[4].get(), NL802154_CAP_ATTR_CHANNELS, 0, nullptr);  // a phy without channels
  nla_nest_end(replies[4].get(), caps);
  nla_put(replies[5].get(), NL802154_ATTR_WPAN_PHY_CAPS, 0, nullptr);  // no phy
  for (size_t i = 0; i < replies.size(); ++i) {
    SCOPED_TRACE(errors[i]);
    log_.Reset();
    ExpectReply(replies[i].get());
    bool ok = false;
    PhyInfo info;
    const bool read = i == 0 ? !utils_.ListDevices(&ok).empty() : utils_.GetPhyInfo(kIface, &info);
    EXPECT_EQ(errors[i].empty(), read);
    EXPECT_TRUE(info.channels.empty());
    EXPECT_EQ(errors[i].empty() ? 0 : 1, log_.Count(ERROR, errors[i], kTag)) << log_.Text();
  }
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
