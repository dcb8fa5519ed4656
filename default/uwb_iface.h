#pragma once

#include <stdint.h>

#include <memory>
#include <string>

#include "ccc_controller.h"
#include "fira_controller.h"
#include "net/interface_tool.h"
#include "net/mcps_utils.h"
#include "simple_ranging_controller.h"
#include "uwb_aidl.h"

namespace hardware {
namespace dalix {

// One UWB radio: the network interface driven by one MCPS hardware index.
// Hands out the radio's three controllers, made once when the HAL is opened,
// and lets the root service load the radio's calibration and HAL properties
// and take it down at close. Runs on the service thread.
class UwbIface : public aidl::hardware::dalix::uwb::BnUwbIface {
 public:
  UwbIface(std::string name, unsigned int hw_index, InterfaceTool* interface_tool,
           McpsUtils* mcps_utils, std::shared_ptr<FiraController> fira_controller,
           std::shared_ptr<CccController> ccc_controller,
           std::shared_ptr<SimpleRangingController> simple_ranging_controller);
  ~UwbIface() override;

  ndk::ScopedAStatus firaController(
      std::shared_ptr<aidl::hardware::dalix::uwb::IFiraController>* controller) override;
  ndk::ScopedAStatus cccController(
      std::shared_ptr<aidl::hardware::dalix::uwb::ICccController>* controller) override;
  ndk::ScopedAStatus simpleRangingController(
      std::shared_ptr<aidl::hardware::dalix::uwb::ISimpleRangingController>* controller)
      override;

  unsigned int hw_index() const { return hw_index_; }
  const std::string& name() const { return name_; }

  // Resets the FiRa controller (whatever it answers) and takes the network
  // interface down; the result is whether the interface went down.
  bool Stop();
  // Sends the key/value file at |path| to the driver as this radio's
  // calibration. Nothing of the file is kept, so each call reads it afresh.
  bool LoadCalibration(const char* path);
  // Gives the key/value file at |path| to the FiRa controller as the radio's
  // antenna properties.
  bool LoadHalProperties(const char* path);

  // Appends what a dump shows of this radio: its scheduler and up state as
  // the driver tells them now, the files loaded and the FiRa sessions.
  void Dump(std::string* out);

 private:
  const std::string name_;
  const unsigned int hw_index_;
  InterfaceTool* const interface_tool_;
  McpsUtils* const mcps_utils_;
  std::shared_ptr<FiraController> fira_controller_;
  std::shared_ptr<CccController> ccc_controller_;
  std::shared_ptr<SimpleRangingController> simple_ranging_controller_;
  // The last load of each kind: the path and whether it went through.
  std::string calibration_load_ = "none";
  std::string properties_load_ = "none";
};

}  // namespace dalix
}  // namespace hardware
