#pragma once

#include <stdint.h>

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "looper/event_loop.h"
#include "net/ccc_region_utils.h"
#include "net/fira_region_utils.h"
#include "net/ieee_utils.h"
#include "net/interface_tool.h"
#include "net/mcps_utils.h"
#include "uwb_aidl.h"
#include "uwb_iface.h"

namespace hardware {
namespace dalix {

// The root service that main publishes. Accepts one client at a time: its
// open brings the driver clients up, pairs every 802.15.4 network device
// with the radio that drives its phy and builds one UwbIface per radio; its
// close, or the client's death, stops the radios and forgets them. Runs on
// the service thread, death notifications included.
class Uwb : public aidl::hardware::dalix::uwb::BnUwb {
 public:
  static constexpr const char kCalibrationFile[] = "/vendor/etc/UWB-calibration.conf";
  static constexpr const char kHalPropertiesFile[] = "/vendor/etc/UWB-hal.conf";

  // Every pointer is borrowed from main and outlives the service.
  Uwb(InterfaceTool* interface_tool, McpsUtils* mcps_utils, IeeeUtils* ieee_utils,
      CccRegionUtils* ccc_region_utils, FiraRegionUtils* fira_region_utils,
      EventLoop* event_loop);
  ~Uwb() override;

  ndk::ScopedAStatus open(
      const std::shared_ptr<aidl::hardware::dalix::uwb::IUwbClientCallback>& client) override;
  ndk::ScopedAStatus listIfaceNames(std::vector<std::string>* names) override;
  ndk::ScopedAStatus getIface(const std::string& name,
                              std::shared_ptr<aidl::hardware::dalix::uwb::IUwbIface>* iface)
      override;
  ndk::ScopedAStatus close() override;
  ndk::ScopedAStatus loadCalibration(int64_t hw_index, const std::string& path) override;
  ndk::ScopedAStatus listHardwareIndex(std::vector<int64_t>* hw_indices) override;
  // What dumpsys shows: whether the HAL is open and its client alive, and
  // each radio (see UwbIface::Dump) and the simple ranging requests. Asks the
  // driver for each radio's state.
  binder_status_t dump(int fd, const char** args, uint32_t num_args) override;

  // Stops every radio and forgets the client: close, the death of the
  // client, and an open that finds its predecessor dead all end here.
  void InternalClose();

 private:
  void SetupIfaces();
  std::shared_ptr<UwbIface> CreateUwbIface(const DevInfo& dev, const McpsHwInfo& hw);

  InterfaceTool* const interface_tool_;
  McpsUtils* const mcps_utils_;
  IeeeUtils* const ieee_utils_;
  CccRegionUtils* const ccc_region_utils_;
  FiraRegionUtils* const fira_region_utils_;
  EventLoop* const event_loop_;
  // By network interface name.
  std::map<std::string, std::shared_ptr<UwbIface>> ifaces_;
};

}  // namespace dalix
}  // namespace hardware
