#define LOG_TAG "dalix.uwb.SimpleRangingController"

#include "simple_ranging_controller.h"

#include <algorithm>
#include <utility>

#include <android-base/logging.h>

#include "ipc_utils.h"

namespace hardware {
namespace dalix {
namespace {

ndk::ScopedAStatus UnknownError() { return ndk::ScopedAStatus::fromStatus(STATUS_UNKNOWN_ERROR); }

ndk::ScopedAStatus IllegalState(const char* message = nullptr) {
  return message == nullptr
             ? ndk::ScopedAStatus::fromExceptionCode(EX_ILLEGAL_STATE)
             : ndk::ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_STATE, message);
}

// The extended address as the interface takes it: most significant byte first.
InterfaceTool::MacAddress ToMacAddress(int64_t address) {
  InterfaceTool::MacAddress mac;
  auto value = static_cast<uint64_t>(address);
  for (size_t i = mac.size(); i > 0; --i) {
    mac[i - 1] = static_cast<unsigned char>(value & 0xff);
    value >>= 8;
  }
  return mac;
}

}  // namespace

SimpleRangingController::SimpleRangingController(std::string iface_name, uint32_t hw_index,
                                                 InterfaceTool* interface_tool,
                                                 McpsUtils* mcps_utils, IeeeUtils* ieee_utils)
    : iface_name_(std::move(iface_name)),
      hw_index_(hw_index),
      interface_tool_(interface_tool),
      mcps_utils_(mcps_utils),
      ieee_utils_(ieee_utils) {}

ndk::ScopedAStatus SimpleRangingController::startInitiatorMode(int32_t pan_id, int64_t address,
                                                               int32_t channel) {
  LOG(INFO) << __func__;
  return Start(McpsUtils::kInitiator, pan_id, address, channel);
}

ndk::ScopedAStatus SimpleRangingController::startResponderMode(int32_t pan_id, int64_t address,
                                                               int32_t channel) {
  LOG(INFO) << __func__;
  return Start(McpsUtils::kResponder, pan_id, address, channel);
}

ndk::ScopedAStatus SimpleRangingController::Start(McpsUtils::NodeType node_type, int32_t pan_id,
                                                  int64_t address, int32_t channel) {
  // Nothing is undone when a later step fails: the interface may stay down.
  const char* iface = iface_name_.c_str();
  if (!interface_tool_->SetUpState(iface, false) ||
      !mcps_utils_->SetScheduler(hw_index_, McpsScheduler::kSimpleRanging,
                                 McpsUtils::kSimpleRangingSlotDuration, node_type, false) ||
      !interface_tool_->SetMacAddress(iface, ToMacAddress(address)) ||
      !ieee_utils_->SetPanId(iface, static_cast<uint16_t>(pan_id))) {
    return UnknownError();
  }
  PhyInfo phy;
  if (!ieee_utils_->GetPhyInfo(iface, &phy) ||
      std::find(phy.channels.begin(), phy.channels.end(), channel) == phy.channels.end()) {
    return IllegalArgument("Incorrect channel value");
  }
  if (!ieee_utils_->SetChannel(iface, channel) || !interface_tool_->SetUpState(iface, true)) {
    return UnknownError();
  }
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus SimpleRangingController::stop() {
  LOG(INFO) << __func__;
  bool ok = false;
  mcps_utils_->GetHardwareInfo(hw_index_, &ok);
  if (!ok || !mcps_utils_->SetRangingRequests(hw_index_, {})) return IllegalState();
  interface_tool_->SetUpState(iface_name_.c_str(), false);
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus SimpleRangingController::getCapabilities(UwbCapabilities* capabilities) {
  LOG(INFO) << __func__;
  PhyInfo phy;
  if (!ieee_utils_->GetPhyInfo(iface_name_.c_str(), &phy)) return UnknownError();
  capabilities->supportedChannels = std::move(phy.channels);
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus SimpleRangingController::setRangings(
    const std::vector<RangingRequest>& requests) {
  LOG(INFO) << __func__;
  if (!interface_tool_->GetUpState(iface_name_.c_str())) {
    return IllegalState("Interface is not running");
  }
  if (requests.size() >= kMaxRangingRequests) {
    return IllegalArgument("Max ranging request size is %d", kMaxRangingRequests);
  }
  if (!mcps_utils_->SetRangingRequests(hw_index_, requests)) return UnknownError();
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus SimpleRangingController::setCallback(
    const std::shared_ptr<ISimpleRangingCallback>& callback) {
  LOG(INFO) << __func__;
  if (callback == nullptr) return IllegalArgument("null client");
  callback_ = callback;
  // The driver client may outlive this controller; a weak reference lets
  // late results fall on the floor instead of on a freed object.
  std::weak_ptr<SimpleRangingController> self = ref<SimpleRangingController>();
  mcps_utils_->SubscribeRangingResults([self](const McpsUtils::RangingResult& result) {
    std::shared_ptr<SimpleRangingController> controller = self.lock();
    if (controller == nullptr || controller->callback_ == nullptr) return;
    // A client that cannot take a result does not stop the others.
    (void)controller->callback_->onRangingResult(result);
  });
  return ndk::ScopedAStatus::ok();
}

}  // namespace dalix
}  // namespace hardware
