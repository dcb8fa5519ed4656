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
  template <typename T>
  T Option(int name) const {
    T value = {};
    socklen_t size = sizeof(value);
    getsockopt(nl_socket_get_fd(raw()), SOL_SOCKET, name, &value, &size);
    return value;
  }
};

// Whatever else Setup() gives a socket must be the same as for the service.
TEST(SimNlSocketTest, DiffersFromTheServiceSocketOnlyInItsPeer) {
  Inspectable<NlSocket> service(nullptr);
  Inspectable<SimNlSocket> simulated(nullptr, DriverSimulator::kDefaultPort);
  ASSERT_TRUE(service.Setup());
  ASSERT_TRUE(simulated.Setup());

  EXPECT_EQ(NETLINK_GENERIC, service.Option<int>(SO_PROTOCOL));
  EXPECT_EQ(NETLINK_USERSOCK, simulated.Option<int>(SO_PROTOCOL));
  EXPECT_EQ(DriverSimulator::kDefaultPort, nl_socket_get_peer_port(simulated.raw()));
  for (int option : {SO_RCVBUF, SO_SNDBUF}) {
    EXPECT_EQ(service.Option<int>(option), simulated.Option<int>(option)) << option;
  }
  timeval timeout = simulated.Option<timeval>(SO_RCVTIMEO);
  EXPECT_EQ(1, timeout.tv_sec);
  EXPECT_EQ(0, timeout.tv_usec);
  EXPECT_EQ(service.Option<timeval>(SO_RCVTIMEO).tv_sec, timeout.tv_sec);
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
