#pragma once

#include <cstdint>
#include <string>

#include "sim/driver_simulator.h"
#include "sim/mcps_family.h"
#include "sim/nl802154_family.h"
#include "sim/radio_store.h"
#include "sim/wpan_device_store.h"

namespace hardware {
namespace dalix {
namespace sim {

// The whole simulated driver that a host run of the service talks to: both
// netlink families served from one set of radios and network interfaces.
// What runs it (a test, the demo) configures it from its own thread; the
// stores lock, and the families run on the simulator's thread.
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

  DriverSimulator& simulator() { return simulator_; }
  RadioStore& radios() { return radios_; }
  WpanDeviceStore& devices() { return devices_; }
  uint32_t port() const { return simulator_.port(); }

 private:
  RadioStore radios_;
  WpanDeviceStore devices_;
  McpsFamily mcps_family_;
  Nl802154Family nl802154_family_;
  // Last: its thread stops before the families it serves go.
  DriverSimulator simulator_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
