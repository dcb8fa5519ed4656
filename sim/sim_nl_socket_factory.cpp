#include "sim/sim_nl_socket_factory.h"

#include "sim/sim_nl_socket.h"

namespace hardware {
namespace dalix {
namespace sim {

SimNlSocketFactory::SimNlSocketFactory(EventLoop* event_loop, uint32_t peer_port)
    : NlSocketFactory(event_loop), peer_port_(peer_port) {}

std::unique_ptr<NlSocket> SimNlSocketFactory::Create() {
  auto socket = std::make_unique<SimNlSocket>(event_loop(), peer_port_);
  if (!socket->Setup()) return nullptr;
  return socket;
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
