#pragma once

// WpanDeviceStore: the simulated driver's 802.15.4 interfaces, each backed by
// a veth of its name in the process's network namespace. Tests configure and
// inspect it from their thread while the simulator thread serves requests
// from it, so every access is guarded and state is handed out by copy.

#include <stdint.h>

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "net/interface_tool.h"
#include "sim/veth_pair.h"

namespace hardware {
namespace dalix {
namespace sim {

// What a test chooses about one simulated IEEE 802.15.4 interface.
struct WpanDeviceConfig {
  std::string name;
  // The wpan phy the interface belongs to: radio "phyN" drives phy N.
  uint32_t phy_index = 0;
  // Channel pages as the phy lists them, each with its channels in order.
  // Page 4 holds the UWB channels.
  std::vector<std::pair<uint8_t, std::vector<uint8_t>>> pages = {{4, {5, 6, 8, 9}}};
  InterfaceTool::MacAddress factory_address = {};
  // Leave the name or the phy out of the interface dump, as a broken driver
  // would.
  bool dump_without_name = false;
  bool dump_without_phy = false;
};

// A simulated interface as it stands: its configuration, the real interface
// behind it and everything the service has set on it.
struct WpanDevice {
  WpanDeviceConfig config;
  uint32_t ifindex = 0;
  // Nothing selected yet: page and channel 0, the broadcast PAN id and the
  // "no short address" value, the kernel's own defaults.
  uint8_t page = 0;
  uint8_t channel = 0;
  uint16_t pan_id = 0xffff;
  uint16_t short_address = 0xffff;
  InterfaceTool::MacAddress extended_address = {};
  bool up = false;
};

class WpanDeviceStore {
 public:
  WpanDeviceStore() = default;
  WpanDeviceStore(const WpanDeviceStore&) = delete;
  WpanDeviceStore& operator=(const WpanDeviceStore&) = delete;

  // Creates the interface and its veth; false, with the reason in |error|,
  // when the name is taken or the kernel refuses.
  bool AddDevice(const WpanDeviceConfig& config, std::string* error);
  // Removes the interface and its veth; false if there is none of that name.
  bool RemoveDevice(const std::string& name);

  // Every interface, in the order they were added.
  std::vector<WpanDevice> Devices() const;
  std::optional<WpanDevice> FindByName(const std::string& name) const;
  std::optional<WpanDevice> FindByIndex(uint32_t ifindex) const;

  // Changes that the driver makes when asked. Each returns 0 or the positive
  // errno the kernel would answer with: ENODEV for an unknown interface,
  // EINVAL for a channel the phy does not list, EBUSY for an address or PAN
  // id change while the interface is up.
  int SetChannel(uint32_t ifindex, uint8_t page, uint8_t channel);
  int SetPanId(uint32_t ifindex, uint16_t pan_id);
  int SetShortAddress(uint32_t ifindex, uint16_t short_address);
  int SetExtendedAddress(const std::string& name, const InterfaceTool::MacAddress& address);

 private:
  struct Entry {
    WpanDevice device;
    std::unique_ptr<VethPair> veth;
  };

  // The up state is the veth's; it is read when the device is handed out.
  static WpanDevice Snapshot(const Entry& entry);
  Entry* Find(uint32_t ifindex);

  mutable std::mutex mutex_;
  std::vector<Entry> entries_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
