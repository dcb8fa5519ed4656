#pragma once

#include <atomic>
#include <cstdint>
#include <optional>
#include <string>

#include "sim/ccc_test_mode_sim.h"
#include "sim/driver_simulator.h"
#include "sim/fira_region_sim.h"
#include "sim/mcps_family.h"
#include "sim/nl802154_family.h"
#include "sim/radio_store.h"
#include "sim/simple_ranging_sim.h"
#include "sim/world.h"
#include "sim/wpan_device_store.h"

namespace hardware {
namespace dalix {
namespace sim {

// The whole simulated driver that a host run of the service talks to: both
// netlink families served from one set of radios and network interfaces,
// with the FiRa region, simple ranging and the CCC test mode measuring the
// peers of one world. A radio ranges only while its interface is up. What runs it (a test, the demo) configures it from its own thread;
// the stores and the world lock, and the families run on the simulator's
// thread.
class SimulatedDriver {
 public:
  SimulatedDriver();
  ~SimulatedDriver();
  SimulatedDriver(const SimulatedDriver&) = delete;
  SimulatedDriver& operator=(const SimulatedDriver&) = delete;

  bool Start() { return simulator_.Start(); }

  // A radio of |hw_index| that drives phy |phy_index|, with the network
  // interface |ifname| on that phy unless |ifname| is empty. False, with the
  // reason in |error|, when the interface cannot be made.
  bool AddRadio(uint32_t hw_index, uint32_t phy_index, const std::string& ifname,
                std::string* error);

  // From the next request list on, simple ranging reports each request once
  // per |period_ms| instead of once per scheduler slot: a slower radio, for
  // a run that must leave the service's one thread time for other sockets.
  // 0 goes back to the slot. Any thread.
  void SetSimpleRangingPeriod(int32_t period_ms) { simple_ranging_period_ms_ = period_ms; }

  DriverSimulator& simulator() { return simulator_; }
  RadioStore& radios() { return radios_; }
  WpanDeviceStore& devices() { return devices_; }
  World& world() { return world_; }
  const World& world() const { return world_; }
  FiraRegionSim& fira_region() { return fira_region_; }
  SimpleRangingSim& simple_ranging() { return simple_ranging_; }
  CccTestModeSim& ccc_test_mode() { return ccc_test_mode_; }
  uint32_t port() const { return simulator_.port(); }

 private:
  // Whether the network interface on the phy of radio |hw_index| is up.
  bool InterfaceUp(uint32_t hw_index) const;

  std::atomic<int32_t> simple_ranging_period_ms_{0};
  RadioStore radios_;
  WpanDeviceStore devices_;
  World world_;
  McpsFamily mcps_family_;
  Nl802154Family nl802154_family_;
  // Stopped first, by the destructor, so that its thread never runs a
  // handler that is gone.
  DriverSimulator simulator_;
  FiraRegionSim fira_region_;
  SimpleRangingSim simple_ranging_;
  CccTestModeSim ccc_test_mode_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
