#include "sim/simulated_driver.h"

#include "net/mcps802154.h"
#include "net/nl802154.h"

namespace hardware {
namespace dalix {
namespace sim {

SimulatedDriver::SimulatedDriver() : mcps_family_(&radios_), nl802154_family_(&devices_) {
  simulator_.RegisterFamily(kMcpsFamilyName, &mcps_family_);
  simulator_.RegisterFamily(kNl802154FamilyName, &nl802154_family_);
}

SimulatedDriver::~SimulatedDriver() { simulator_.Stop(); }

bool SimulatedDriver::AddRadio(uint32_t hw_index, uint32_t phy_index, const std::string& ifname,
                               std::string* error) {
  radios_.AddRadio(hw_index, phy_index);
  if (ifname.empty()) return true;
  WpanDeviceConfig config;
  config.name = ifname;
  config.phy_index = phy_index;
  return devices_.AddDevice(config, error);
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
