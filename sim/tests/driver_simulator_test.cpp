#include "sim/driver_simulator.h"

#include <sys/socket.h>
#include <sys/time.h>

#include <cerrno>
#include <cstring>
#include <vector>

#include <android-base/unique_fd.h>
#include <gtest/gtest.h>
#include <linux/genetlink.h>
#include <netlink/attr.h>
#include <netlink/genl/ctrl.h>
#include <netlink/genl/genl.h>

#include "sim/test_family.h"
#include "sim/test_family_defs.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

using android::base::unique_fd;

constexpr uint32_t kClientPort = 4242;

// A bare netlink client, so that every datagram the simulator sends can be
// checked as it is on the wire, without libnl's interpretation.
class DriverSimulatorTest : public ::testing::Test {
 protected:
  void SetUp() override {
    family_id_ = simulator_.RegisterFamily(kTestFamilyName, &family_);
    ASSERT_TRUE(simulator_.Start());
    client_.reset(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_USERSOCK));
    ASSERT_GE(client_.get(), 0);
    sockaddr_nl local = {};
    local.nl_family = AF_NETLINK;
    local.nl_pid = kClientPort;
    ASSERT_EQ(0, bind(client_.get(), reinterpret_cast<sockaddr*>(&local), sizeof(local)));
    timeval timeout = {1, 0};
    setsockopt(client_.get(), SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof(timeout));
  }

  UniqueNlMsg NewRequest(int type, uint8_t cmd, int flags, uint32_t seq) {
    UniqueNlMsg msg;
    genlmsg_put(msg.get(), kClientPort, seq, type, 0, NLM_F_REQUEST | flags, cmd,
                kTestFamilyVersion);
    return msg;
  }

  void Send(nl_msg* msg) {
    sockaddr_nl peer = {};
    peer.nl_family = AF_NETLINK;
    peer.nl_pid = simulator_.port();
    nlmsghdr* header = nlmsg_hdr(msg);
    ASSERT_EQ(static_cast<ssize_t>(header->nlmsg_len),
              sendto(client_.get(), header, header->nlmsg_len, 0,
                     reinterpret_cast<sockaddr*>(&peer), sizeof(peer)));
  }

  // One datagram, or an empty vector after the one-second timeout.
  std::vector<uint8_t> Receive() {
    std::vector<uint8_t> datagram(8192);
    ssize_t size = recv(client_.get(), datagram.data(), datagram.size(), 0);
    datagram.resize(size < 0 ? 0 : size);
    return datagram;
  }

  static const nlmsghdr* Header(const std::vector<uint8_t>& datagram) {
    return reinterpret_cast<const nlmsghdr*>(datagram.data());
  }

  TestFamily family_{&simulator_};
  DriverSimulator simulator_;
  int family_id_ = -1;
  unique_fd client_;
};

TEST_F(DriverSimulatorTest, ReplyThenSeparateAck) {
  UniqueNlMsg request = NewRequest(family_id_, kTestCmdGet, NLM_F_ACK, 7);
  Send(request.get());

  std::vector<uint8_t> reply = Receive();
  ASSERT_FALSE(reply.empty());
  EXPECT_EQ(family_id_, Header(reply)->nlmsg_type);
  EXPECT_EQ(7u, Header(reply)->nlmsg_seq);
  EXPECT_EQ(reply.size(), Header(reply)->nlmsg_len);

  std::vector<uint8_t> ack = Receive();
  ASSERT_EQ(36u, ack.size());
  EXPECT_EQ(NLMSG_ERROR, Header(ack)->nlmsg_type);
  auto* err = static_cast<const nlmsgerr*>(NLMSG_DATA(Header(ack)));
  EXPECT_EQ(0, err->error);
  EXPECT_EQ(7u, err->msg.nlmsg_seq);
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
