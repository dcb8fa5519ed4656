#include "sim/simulated_driver.h"

#include "net/mcps802154.h"
#include "net/nl802154.h"

namespace hardware {
namespace dalix {
namespace sim {

SimulatedDriver::SimulatedDriver()
    : mcps_family_(&radios_),
      nl802154_family_(&devices_),
      fira_region_(&simulator_, &radios_, &world_),
      simple_ranging_(&simulator_, &radios_, &devices_, &world_),
      ccc_test_mode_(&radios_) {
  mcps_family_.SetCommandHandler(
      MCPS802154_CMD_SET_RANGING_REQUESTS,
      [this](const Request& request, nlattr** attrs, Responder& responder) {
        // Simple ranging paces its reports by the radio's slot duration.
        const int32_t period_ms = simple_ranging_period_ms_;
        std::optional<SimRadio> radio;
        if (period_ms > 0 && attrs[MCPS802154_ATTR_HW] != nullptr &&
            (radio = radios_.Radio(nla_get_u32(attrs[MCPS802154_ATTR_HW])))) {
          radios_.SetScheduler(radio->hw_index, radio->scheduler, period_ms, radio->node_type,
                               radio->regions);
        }
        simple_ranging_.SetRangingRequests(request, attrs, responder);
      });
  mcps_family_.SetCommandHandler(
      MCPS802154_CMD_TESTMODE, [this](const Request& request, nlattr** attrs, Responder& responder) {
        ccc_test_mode_.TestMode(request, attrs, responder);
      });
  fira_region_.SetRadioUpCheck([this](uint32_t hw_index) { return InterfaceUp(hw_index); });
  mcps_family_.AttachFiraRegion(&fira_region_);
  simulator_.RegisterFamily(kMcpsFamilyName, &mcps_family_);
  simulator_.RegisterFamily(kNl802154FamilyName, &nl802154_family_);
}

SimulatedDriver::~SimulatedDriver() { simulator_.Stop(); }

bool SimulatedDriver::InterfaceUp(uint32_t hw_index) const {
  std::optional<SimRadio> radio = radios_.Radio(hw_index);
  if (!radio || !radio->phy_name) return false;
  for (const WpanDevice& device : devices_.Devices()) {
    if (*radio->phy_name == kMcpsPhyNamePrefix + std::to_string(device.config.phy_index)) {
      return device.up;
    }
  }
  return false;
}

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
