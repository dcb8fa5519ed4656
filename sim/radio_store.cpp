#include "sim/radio_store.h"

#include <utility>

#include "net/mcps802154.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

// The simulated driver's calibration vocabulary: per-channel, per-antenna
// delays and power, plus a few radio-wide settings. Every key stays within the
// length the service accepts back in a reply.
std::set<std::string> DefaultCalibrationKeys() {
  std::set<std::string> keys = {"xtal_trim", "temp_comp", "coex_gpio", "tx_power_max"};
  for (int channel : {5, 9}) {
    for (int antenna = 0; antenna < 4; ++antenna) {
      std::string prefix = "ch" + std::to_string(channel) + ".ant" + std::to_string(antenna) + ".";
      for (const char* field : {"tx_delay", "rx_delay", "tx_power", "pg_delay", "pdoa_off"}) {
        keys.insert(prefix + field);
      }
    }
  }
  return keys;
}

}  // namespace

RadioStore::RadioStore() : calibration_keys_(DefaultCalibrationKeys()) {}

void RadioStore::AddRadio(uint32_t hw_index, std::optional<std::string> phy_name) {
  std::lock_guard<std::mutex> lock(mutex_);
  SimRadio radio;
  radio.hw_index = hw_index;
  radio.phy_name = std::move(phy_name);
  radios_[hw_index] = std::move(radio);
}

void RadioStore::AddRadio(uint32_t hw_index, uint32_t phy_index) {
  AddRadio(hw_index, std::string(kMcpsPhyNamePrefix) + std::to_string(phy_index));
}

bool RadioStore::RemoveRadio(uint32_t hw_index) {
  std::lock_guard<std::mutex> lock(mutex_);
  return radios_.erase(hw_index) > 0;
}

std::vector<SimRadio> RadioStore::Radios() const {
  std::lock_guard<std::mutex> lock(mutex_);
  std::vector<SimRadio> radios;
  for (const auto& entry : radios_) radios.push_back(entry.second);
  return radios;
}

std::optional<SimRadio> RadioStore::Radio(uint32_t hw_index) const {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = radios_.find(hw_index);
  if (it == radios_.end()) return std::nullopt;
  return it->second;
}

bool RadioStore::HasRadio(uint32_t hw_index) const {
  std::lock_guard<std::mutex> lock(mutex_);
  return radios_.count(hw_index) > 0;
}

void RadioStore::SetReportsScheduler(uint32_t hw_index, bool reports) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = radios_.find(hw_index);
  if (it != radios_.end()) it->second.reports_scheduler = reports;
}

bool RadioStore::SetScheduler(uint32_t hw_index, const std::string& scheduler,
                              int32_t slot_duration, int32_t node_type,
                              const std::vector<std::string>& regions) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = radios_.find(hw_index);
  if (it == radios_.end()) return false;
  SimRadio& radio = it->second;
  radio.scheduler = scheduler;
  radio.slot_duration = slot_duration;
  radio.node_type = node_type;
  radio.regions = regions;
  return true;
}

bool RadioStore::IsCalibrationKey(const std::string& key) const {
  std::lock_guard<std::mutex> lock(mutex_);
  return calibration_keys_.count(key) > 0;
}

void RadioStore::AddCalibrationKey(const std::string& key) {
  std::lock_guard<std::mutex> lock(mutex_);
  calibration_keys_.insert(key);
}

bool RadioStore::ReceiveCalibration(uint32_t hw_index, const std::string& key, uint32_t value) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = radios_.find(hw_index);
  if (it == radios_.end()) return false;
  it->second.calibration_keys_received.push_back(key);
  if (calibration_keys_.count(key) == 0) return false;
  it->second.calibration[key] = value;
  return true;
}

void RadioStore::CountCalibrationMessage(uint32_t hw_index) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = radios_.find(hw_index);
  if (it != radios_.end()) ++it->second.calibration_messages;
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
