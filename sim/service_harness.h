#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "looper/event_loop.h"
#include "net/fira_region_utils.h"
#include "net/ieee_utils.h"
#include "net/interface_tool.h"
#include "net/mcps_utils.h"
#include "net/nl_socket_factory.h"
#include "sim/simulated_driver.h"

namespace hardware {
namespace dalix {
namespace sim {

// The simulated driver with its world, and the service's driver clients on a
// service thread of their own that runs one event loop serving polled binder
// calls, as the daemon does. A test or benchmark builds HAL objects on that
// thread (RunOnService) and calls them from its own thread through their
// binder proxies, which the host binder carries to the service thread.
//
// The world and the simulator may be configured from any thread; the driver
// clients are for the service thread only. The process must already be in
// its private namespace.
class ServiceHarness {
 public:
  // One simulated radio and the 802.15.4 interface it drives.
  struct Radio {
    uint32_t hw_index;
    std::string iface;
  };

  explicit ServiceHarness(std::vector<Radio> radios = {{0, "uwb0"}});
  // Stops the service thread, then the simulator.
  ~ServiceHarness();
  ServiceHarness(const ServiceHarness&) = delete;
  ServiceHarness& operator=(const ServiceHarness&) = delete;

  // Creates the interfaces, starts the simulator and the service thread, and
  // resolves the families. False, with the reason in |error|, on failure.
  bool Start(std::string* error);
  // Runs |task| on the service thread and returns once it ran; runs it at
  // once when the harness does not serve.
  void RunOnService(const std::function<void()>& task);

  // Service thread only.
  McpsUtils* mcps_utils() { return clients_->mcps.get(); }
  IeeeUtils* ieee_utils() { return clients_->ieee.get(); }
  FiraRegionUtils* fira_region_utils() { return clients_->fira.get(); }
  InterfaceTool* interface_tool() { return clients_->interface_tool.get(); }
  EventLoop* event_loop() { return event_loop_; }

  DriverSimulator& simulator() { return driver_.simulator(); }
  RadioStore& radios() { return driver_.radios(); }
  WpanDeviceStore& devices() { return driver_.devices(); }
  World& world() { return driver_.world(); }
  FiraRegionSim& fira_region() { return driver_.fira_region(); }

 private:
  struct Clients {
    std::unique_ptr<NlSocketFactory> factory;
    std::unique_ptr<McpsUtils> mcps;
    std::unique_ptr<IeeeUtils> ieee;
    std::unique_ptr<FiraRegionUtils> fira;
    std::unique_ptr<InterfaceTool> interface_tool;
  };

  void Serve(const std::function<void(bool)>& ready);

  const std::vector<Radio> radio_list_;
  SimulatedDriver driver_;
  // Owned by the service thread, valid while it serves.
  std::unique_ptr<Clients> clients_;
  EventLoop* event_loop_ = nullptr;
  std::thread thread_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
