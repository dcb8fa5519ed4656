#include "sim/wpan_device_store.h"

#include <algorithm>

namespace hardware {
namespace dalix {
namespace sim {

bool WpanDeviceStore::AddDevice(const WpanDeviceConfig& config, std::string* error) {
  std::lock_guard<std::mutex> lock(mutex_);
  for (const Entry& entry : entries_) {
    if (entry.device.config.name == config.name) {
      *error = "interface " + config.name + " exists already";
      return false;
    }
  }
  std::unique_ptr<VethPair> veth = VethPair::Create(config.name, error);
  if (!veth) return false;
  Entry entry;
  entry.device.config = config;
  entry.device.ifindex = veth->ifindex();
  entry.veth = std::move(veth);
  entries_.push_back(std::move(entry));
  return true;
}

bool WpanDeviceStore::RemoveDevice(const std::string& name) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = std::find_if(entries_.begin(), entries_.end(),
                         [&name](const Entry& entry) { return entry.device.config.name == name; });
  if (it == entries_.end()) return false;
  entries_.erase(it);
  return true;
}

std::vector<WpanDevice> WpanDeviceStore::Devices() const {
  std::lock_guard<std::mutex> lock(mutex_);
  std::vector<WpanDevice> devices;
  for (const Entry& entry : entries_) devices.push_back(Snapshot(entry));
  return devices;
}

std::optional<WpanDevice> WpanDeviceStore::FindByName(const std::string& name) const {
  std::lock_guard<std::mutex> lock(mutex_);
  for (const Entry& entry : entries_) {
    if (entry.device.config.name == name) return Snapshot(entry);
  }
  return std::nullopt;
}

std::optional<WpanDevice> WpanDeviceStore::FindByIndex(uint32_t ifindex) const {
  std::lock_guard<std::mutex> lock(mutex_);
  for (const Entry& entry : entries_) {
    if (entry.device.ifindex == ifindex) return Snapshot(entry);
  }
  return std::nullopt;
}

int WpanDeviceStore::SetChannel(uint32_t ifindex, uint8_t page, uint8_t channel) {
  std::lock_guard<std::mutex> lock(mutex_);
  Entry* entry = Find(ifindex);
  if (entry == nullptr) return ENODEV;
  for (const auto& [listed_page, channels] : entry->device.config.pages) {
    if (listed_page != page) continue;
    if (std::find(channels.begin(), channels.end(), channel) == channels.end()) break;
    entry->device.page = page;
    entry->device.channel = channel;
    return 0;
  }
  return EINVAL;
}

int WpanDeviceStore::SetPanId(uint32_t ifindex, uint16_t pan_id) {
  std::lock_guard<std::mutex> lock(mutex_);
  Entry* entry = Find(ifindex);
  if (entry == nullptr) return ENODEV;
  if (entry->veth->IsUp()) return EBUSY;
  entry->device.pan_id = pan_id;
  return 0;
}

int WpanDeviceStore::SetShortAddress(uint32_t ifindex, uint16_t short_address) {
  std::lock_guard<std::mutex> lock(mutex_);
  Entry* entry = Find(ifindex);
  if (entry == nullptr) return ENODEV;
  if (entry->veth->IsUp()) return EBUSY;
  entry->device.short_address = short_address;
  return 0;
}

int WpanDeviceStore::SetExtendedAddress(const std::string& name,
                                        const InterfaceTool::MacAddress& address) {
  std::lock_guard<std::mutex> lock(mutex_);
  for (Entry& entry : entries_) {
    if (entry.device.config.name != name) continue;
    if (entry.veth->IsUp()) return EBUSY;
    entry.device.extended_address = address;
    return 0;
  }
  return ENODEV;
}

WpanDevice WpanDeviceStore::Snapshot(const Entry& entry) {
  WpanDevice device = entry.device;
  device.up = entry.veth->IsUp();
  return device;
}

WpanDeviceStore::Entry* WpanDeviceStore::Find(uint32_t ifindex) {
  for (Entry& entry : entries_) {
    if (entry.device.ifindex == ifindex) return &entry;
  }
  return nullptr;
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
