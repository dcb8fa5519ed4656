#pragma once

#include <cstdint>

#include "looper/event_loop.h"
#include "net/nl_socket.h"

namespace hardware {
namespace dalix {
namespace sim {

// The service's NlSocket, connected to the driver simulator instead of the
// kernel: NETLINK_USERSOCK with the simulator's port as peer, and otherwise
// the same buffers, receive timeout and code paths. Service thread only.
class SimNlSocket : public NlSocket {
 public:
  SimNlSocket(EventLoop* event_loop, uint32_t peer_port);

  bool Setup() override;

 private:
  const uint32_t peer_port_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
