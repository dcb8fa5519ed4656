#pragma once

#include <android/binder_status.h>
#include <stdint.h>

#include <string>

#include "net/ccc_region_utils.h"
#include "net/interface_tool.h"
#include "net/mcps_utils.h"
#include "uwb_aidl.h"

namespace hardware {
namespace dalix {

// The ICccController of one radio: puts the radio back on the default
// scheduler with its interface up, and starts CCC sessions through the
// driver's test mode. Keeps no session state. Runs on the service's
// event-loop thread, which openCccSession blocks for the settle time.
class CccController : public aidl::hardware::dalix::uwb::BnCccController {
 public:
  // The controller's "illegal state" answer, given for every failure of the
  // driver or the interface. It is deliberately the unsupported-operation
  // code (-7), not EX_ILLEGAL_STATE (-5): that is what CCC clients receive
  // and tell CCC failures apart by.
  static constexpr binder_exception_t kCccIllegalState = EX_UNSUPPORTED_OPERATION;
  // How long a freshly raised interface is given before a session is opened.
  static constexpr unsigned kInterfaceSettleMicros = 100000;

  CccController(std::string iface_name, uint32_t hw_index, InterfaceTool* interface_tool,
                McpsUtils* mcps_utils, CccRegionUtils* ccc_region_utils);

  ndk::ScopedAStatus openCccSession() override;
  ndk::ScopedAStatus onOpenCccSessionDone() override;
  ndk::ScopedAStatus startCccSession(int32_t first, int64_t timeref, int32_t channel,
                                     int64_t* result) override;

 private:
  // Leaves the radio on the default scheduler, taking the interface down
  // first when a change is needed.
  ndk::ScopedAStatus SetDefaultScheduler();
  // Brings the interface up unless it already is.
  bool EnsureInterfaceUp();
  static ndk::ScopedAStatus Failure();

  std::string iface_name_;
  uint32_t hw_index_;
  InterfaceTool* interface_tool_;
  McpsUtils* mcps_utils_;
  CccRegionUtils* ccc_region_utils_;
};

}  // namespace dalix
}  // namespace hardware
