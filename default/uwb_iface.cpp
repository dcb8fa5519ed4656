#define LOG_TAG "dalix.uwb.UwbIface"

#include "uwb_iface.h"

#include <stdio.h>

#include <string>
#include <utility>

#include <android-base/logging.h>

#include "net/config_utils.h"

namespace hardware {
namespace dalix {

namespace uwb = aidl::hardware::dalix::uwb;

UwbIface::UwbIface(std::string name, unsigned int hw_index, InterfaceTool* interface_tool,
                   McpsUtils* mcps_utils, std::shared_ptr<FiraController> fira_controller,
                   std::shared_ptr<CccController> ccc_controller,
                   std::shared_ptr<SimpleRangingController> simple_ranging_controller)
    : name_(std::move(name)),
      hw_index_(hw_index),
      interface_tool_(interface_tool),
      mcps_utils_(mcps_utils),
      fira_controller_(std::move(fira_controller)),
      ccc_controller_(std::move(ccc_controller)),
      simple_ranging_controller_(std::move(simple_ranging_controller)) {}

// Stopping is the root service's decision (at close); a client may still hold
// this object, or its controllers, long after that.
UwbIface::~UwbIface() = default;

ndk::ScopedAStatus UwbIface::firaController(std::shared_ptr<uwb::IFiraController>* controller) {
  LOG(INFO) << "firaController";
  *controller = fira_controller_;
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus UwbIface::cccController(std::shared_ptr<uwb::ICccController>* controller) {
  LOG(INFO) << "cccController";
  *controller = ccc_controller_;
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus UwbIface::simpleRangingController(
    std::shared_ptr<uwb::ISimpleRangingController>* controller) {
  LOG(INFO) << "simpleRangingController";
  *controller = simple_ranging_controller_;
  return ndk::ScopedAStatus::ok();
}

bool UwbIface::Stop() {
  LOG(INFO) << "Stop";
  // A radio that refuses the reset must still go down: the HAL is closing.
  (void)fira_controller_->reset();
  return interface_tool_->SetUpState(name_.c_str(), false);
}

bool UwbIface::LoadCalibration(const char* path) {
  LOG(INFO) << "Load calibration on " << name_ << ", hw index: " << hw_index_;
  ConfigUtils calibration;
  const bool loaded =
      calibration.Load(path) && mcps_utils_->SetCalibration(hw_index_, &calibration);
  calibration_load_ = std::string(path) + (loaded ? ": loaded" : ": failed");
  return loaded;
}

bool UwbIface::LoadHalProperties(const char* path) {
  LOG(INFO) << "Load properties on " << name_ << ", hw index: " << hw_index_;
  ConfigUtils properties;
  const bool loaded = properties.Load(path) && fira_controller_->SetProperties(properties);
  properties_load_ = std::string(path) + (loaded ? ": loaded" : ": failed");
  return loaded;
}

void UwbIface::Dump(std::string* out) {
  bool ok = false;
  const McpsHwInfo hw = mcps_utils_->GetHardwareInfo(hw_index_, &ok);
  char line[160];
  snprintf(line, sizeof(line), "radio %s: hw index %u, phy %s, scheduler %s, interface %s\n",
           name_.c_str(), hw_index_, ok ? std::to_string(hw.phy_index).c_str() : "?",
           ok ? (hw.scheduler.empty() ? "(none)" : hw.scheduler.c_str()) : "? (no answer)",
           interface_tool_->GetUpState(name_.c_str()) ? "up" : "down");
  *out += line;
  *out += "  calibration: " + calibration_load_ + "\n";
  *out += "  HAL properties: " + properties_load_ + "\n";
  fira_controller_->Dump(out);
}

}  // namespace dalix
}  // namespace hardware
