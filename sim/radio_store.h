#pragma once

#include <cstdint>
#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "net/mcps802154.h"

namespace hardware {
namespace dalix {
namespace sim {

// One simulated UWB radio as the MAC driver sees it.
struct SimRadio {
  uint32_t hw_index = 0;
  // The 802.15.4 phy the radio drives ("phy0"); absent or odd names are
  // allowed so that tests can make the driver misbehave.
  std::optional<std::string> phy_name;
  std::string scheduler = kMcpsSchedulerDefault;
  // Whether NEW_HW names the scheduler.
  bool reports_scheduler = true;
  // Scheduler parameters; -1 when not given.
  int32_t slot_duration = -1;
  int32_t node_type = -1;
  std::vector<std::string> regions;
  // Calibration values the driver accepted, by key.
  std::map<std::string, uint32_t> calibration;
  // Every key of every SET_CALIBRATIONS, accepted or not, in arrival order.
  std::vector<std::string> calibration_keys_received;
  int calibration_messages = 0;
};

// The simulated driver's radios and the calibration keys it knows. Tests
// configure and inspect it from their own thread while the simulator thread
// serves requests from it, so every method locks.
class RadioStore {
 public:
  RadioStore();

  // Adds a radio, or resets the one of that index.
  void AddRadio(uint32_t hw_index, std::optional<std::string> phy_name);
  // Adds a radio named "phy<phy_index>".
  void AddRadio(uint32_t hw_index, uint32_t phy_index);
  bool RemoveRadio(uint32_t hw_index);
  // Copies of every radio, by ascending index, or of one.
  std::vector<SimRadio> Radios() const;
  std::optional<SimRadio> Radio(uint32_t hw_index) const;
  bool HasRadio(uint32_t hw_index) const;
  void SetReportsScheduler(uint32_t hw_index, bool reports);

  // Installs a scheduler with its parameters and regions (false: no radio).
  bool SetScheduler(uint32_t hw_index, const std::string& scheduler, int32_t slot_duration,
                    int32_t node_type, const std::vector<std::string>& regions);

  bool IsCalibrationKey(const std::string& key) const;
  void AddCalibrationKey(const std::string& key);
  // Records one received key; stores the value only for a known key. False
  // when the key is not known (or the radio does not exist).
  bool ReceiveCalibration(uint32_t hw_index, const std::string& key, uint32_t value);
  void CountCalibrationMessage(uint32_t hw_index);

 private:
  mutable std::mutex mutex_;
  std::map<uint32_t, SimRadio> radios_;
  std::set<std::string> calibration_keys_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
