#define LOG_TAG "dalix.uwb.NlSocket"

#include "sim/sim_nl_socket.h"

#include <sys/socket.h>
#include <sys/time.h>

#include <android-base/logging.h>
#include <linux/netlink.h>
#include <netlink/socket.h>

namespace hardware {
namespace dalix {
namespace sim {

SimNlSocket::SimNlSocket(EventLoop* event_loop, uint32_t peer_port)
    : NlSocket(event_loop), peer_port_(peer_port) {}

// Step for step the production Setup(), with the kernel's generic netlink
// replaced by the simulator's port; the log lines stay the service's own.
bool SimNlSocket::Setup() {
  set_sock(nl_socket_alloc());
  if (sock() == nullptr) {
    LOG(ERROR) << "Setup: Failed to create netlink socket";
    return false;
  }
  nl_socket_set_buffer_size(sock(), kBufferBytes, kBufferBytes);
  if (nl_connect(sock(), NETLINK_USERSOCK) != 0) {
    LOG(ERROR) << "Setup: Failed to connect to generic netlink";
    set_sock(nullptr);
    return false;
  }
  nl_socket_set_peer_port(sock(), peer_port_);
  timeval timeout = {kReceiveTimeoutSeconds, 0};
  setsockopt(nl_socket_get_fd(sock()), SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof(timeout));
  return true;
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
