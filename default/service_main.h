#pragma once

#include <memory>
#include <string>

#include "looper/event_loop.h"
#include "looper/looper_backed_event_loop.h"
#include "net/interface_tool.h"
#include "net/nl_socket_factory.h"

namespace hardware {
namespace dalix {

// What tells the daemon on a device from a host program that runs the same
// service against the driver simulator: where netlink sockets lead and how
// network interfaces are switched. Everything else of start-up is shared,
// so a host program runs the real start-up path.
class ServicePlatform {
 public:
  virtual ~ServicePlatform() = default;

  virtual std::unique_ptr<NlSocketFactory> NewSocketFactory(EventLoop* event_loop) = 0;
  virtual std::unique_ptr<InterfaceTool> NewInterfaceTool() = 0;
  // Called on the service thread once the service is registered, right
  // before the event loop runs. The daemon has nothing to do here; a host
  // harness keeps |event_loop| so that it can quit it.
  virtual void OnServing(LooperBackedEventLoop* /*event_loop*/) {}
};

// The daemon's whole life on the calling thread: binder polling set up (a
// fatal check when the process cannot poll binder), the event loop, the
// driver clients and the root service built in their order, the service
// registered under the IUwb descriptor followed by "/default", and the loop
// run. The daemon's loop never ends; when a host harness quits it, the
// objects are destroyed in reverse order and 0 is returned.
int RunService(ServicePlatform* platform);

// The instance name under which the root service is registered.
std::string ServiceInstanceName();

}  // namespace dalix
}  // namespace hardware
