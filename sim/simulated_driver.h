#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "sim/ccc_test_mode_sim.h"
#include "sim/driver_simulator.h"
#include "sim/mcps_family.h"
#include "sim/nl802154_family.h"
#include "sim/peer_angle_source.h"
#include "sim/radio_store.h"
#include "sim/simple_ranging_sim.h"
#include "sim/world.h"
#include "sim/wpan_device_store.h"

namespace hardware {
namespace dalix {
namespace sim {

// The whole simulated driver that a host run of the service talks to: both
// netlink families served from one set of radios and network interfaces,
// with simple ranging and the CCC test mode measuring the peers of one
// world. What runs it (a test, the demo) configures it from its own thread;
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

  DriverSimulator& simulator() { return simulator_; }
  RadioStore& radios() { return radios_; }
  WpanDeviceStore& devices() { return devices_; }
  World& world() { return world_; }
  const World& world() const { return world_; }
  SimpleRangingSim& simple_ranging() { return simple_ranging_; }
  CccTestModeSim& ccc_test_mode() { return ccc_test_mode_; }
  uint32_t port() const { return simulator_.port(); }

 private:
  // Simple ranging sees the world's peers by their extended address, with
  // the world's noise, at the moment of the report.
  class WorldPeers : public PeerAngleSource {
   public:
    explicit WorldPeers(World* world) : world_(world) {}
    std::optional<PeerObservation> Observe(uint32_t hw_index, uint64_t peer_address) override;

   private:
    World* const world_;
  };

  RadioStore radios_;
  WpanDeviceStore devices_;
  World world_;
  WorldPeers world_peers_{&world_};
  McpsFamily mcps_family_;
  Nl802154Family nl802154_family_;
  // Stopped first, by the destructor, so that its thread never runs a
  // handler that is gone.
  DriverSimulator simulator_;
  SimpleRangingSim simple_ranging_;
  CccTestModeSim ccc_test_mode_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
