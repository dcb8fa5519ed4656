#include "sim/sim_nl_socket.h"

#include <sys/socket.h>
#include <sys/time.h>

#include <gtest/gtest.h>
#include <linux/netlink.h>
#include <netlink/socket.h>

#include "sim/driver_simulator.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

template <typename Socket>
class Inspectable : public Socket {
 public:
  using Socket::Socket;
  nl_sock* raw() const { return this->sock(); }
  int Option(int name) const {
    int value = -1;
    socklen_t size = sizeof(value);
    getsockopt(nl_socket_get_fd(raw()), SOL_SOCKET, name, &value, &size);
    return value;
  }
  timeval ReceiveTimeout() const {
    timeval timeout = {};
    socklen_t size = sizeof(timeout);
    getsockopt(nl_socket_get_fd(raw()), SOL_SOCKET, SO_RCVTIMEO, &timeout, &size);
    return timeout;
  }
};

// The simulator's socket may differ from the service's only in where it is
// connected: whatever else Setup() gives a socket must be the same.
TEST(SimNlSocketTest, DiffersFromTheServiceSocketOnlyInItsPeer) {
  Inspectable<NlSocket> service(nullptr);
  Inspectable<SimNlSocket> simulated(nullptr, DriverSimulator::kDefaultPort);
  ASSERT_TRUE(service.Setup());
  ASSERT_TRUE(simulated.Setup());

  EXPECT_EQ(NETLINK_GENERIC, service.Option(SO_PROTOCOL));
  EXPECT_EQ(NETLINK_USERSOCK, simulated.Option(SO_PROTOCOL));
  EXPECT_EQ(DriverSimulator::kDefaultPort, nl_socket_get_peer_port(simulated.raw()));

  EXPECT_EQ(service.Option(SO_RCVBUF), simulated.Option(SO_RCVBUF));
  EXPECT_EQ(service.Option(SO_SNDBUF), simulated.Option(SO_SNDBUF));
  EXPECT_EQ(1, simulated.ReceiveTimeout().tv_sec);
  EXPECT_EQ(0, simulated.ReceiveTimeout().tv_usec);
  EXPECT_EQ(service.ReceiveTimeout().tv_sec, simulated.ReceiveTimeout().tv_sec);
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
