#pragma once

#include <cstdint>
#include <memory>

#include "looper/event_loop.h"
#include "net/nl_socket.h"
#include "net/nl_socket_factory.h"

namespace hardware {
namespace dalix {
namespace sim {

// The host build's socket factory: every socket it makes talks to the driver
// simulator listening on |peer_port|. Service thread only, like the
// production factory it replaces.
class SimNlSocketFactory : public NlSocketFactory {
 public:
  SimNlSocketFactory(EventLoop* event_loop, uint32_t peer_port);

  std::unique_ptr<NlSocket> Create() override;

 private:
  const uint32_t peer_port_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
