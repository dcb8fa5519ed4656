#include "sim/sim_nl_socket.h"

#include <linux/netlink.h>
#include <netlink/socket.h>

namespace hardware {
namespace dalix {
namespace sim {

SimNlSocket::SimNlSocket(EventLoop* event_loop, uint32_t peer_port)
    : NlSocket(event_loop), peer_port_(peer_port) {}

// The kernel's generic netlink is replaced by the simulator's port; all the
// rest of the production set-up runs unchanged.
bool SimNlSocket::Setup() {
  return SetupWith([this](nl_sock* sock) {
    int result = nl_connect(sock, NETLINK_USERSOCK);
    if (result == 0) nl_socket_set_peer_port(sock, peer_port_);
    return result;
  });
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
