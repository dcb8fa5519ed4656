#pragma once

#include <stdint.h>

#include <memory>
#include <string>
#include <vector>

#include "net/ieee_utils.h"
#include "net/interface_tool.h"
#include "net/mcps_utils.h"
#include "uwb_aidl.h"

namespace hardware {
namespace dalix {

// The ISimpleRangingController of one radio: readies the radio's interface and
// scheduler for initiator or responder ranging, installs the client's ranging
// requests and hands every result to the client's callback. Binder calls and
// result deliveries both run on the service's event-loop thread.
class SimpleRangingController : public aidl::hardware::dalix::uwb::BnSimpleRangingController {
 public:
  using ISimpleRangingCallback = aidl::hardware::dalix::uwb::ISimpleRangingCallback;
  using RangingRequest = aidl::hardware::dalix::uwb::RangingRequest;
  using UwbCapabilities = aidl::hardware::dalix::uwb::UwbCapabilities;

  // The driver takes at most this many requests less one: a list of this size
  // is already refused, although the refusal names this number.
  static constexpr int kMaxRangingRequests = 14;

  SimpleRangingController(std::string iface_name, uint32_t hw_index, InterfaceTool* interface_tool,
                          McpsUtils* mcps_utils, IeeeUtils* ieee_utils);

  ndk::ScopedAStatus startInitiatorMode(int32_t pan_id, int64_t address, int32_t channel) override;
  ndk::ScopedAStatus startResponderMode(int32_t pan_id, int64_t address, int32_t channel) override;
  ndk::ScopedAStatus setRangings(const std::vector<RangingRequest>& requests) override;
  ndk::ScopedAStatus getCapabilities(UwbCapabilities* capabilities) override;
  ndk::ScopedAStatus stop() override;
  ndk::ScopedAStatus setCallback(const std::shared_ptr<ISimpleRangingCallback>& callback) override;

 private:
  // Both start operations; they differ only in the node type.
  ndk::ScopedAStatus Start(McpsUtils::NodeType node_type, int32_t pan_id, int64_t address,
                           int32_t channel);

  std::shared_ptr<ISimpleRangingCallback> callback_;
  std::string iface_name_;
  uint32_t hw_index_;
  InterfaceTool* interface_tool_;
  McpsUtils* mcps_utils_;
  IeeeUtils* ieee_utils_;
};

}  // namespace dalix
}  // namespace hardware
