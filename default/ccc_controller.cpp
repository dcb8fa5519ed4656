#define LOG_TAG "dalix.uwb.CccController"

#include "ccc_controller.h"

#include <unistd.h>

#include <utility>

#include <android-base/logging.h>

#include "ipc_utils.h"
#include "net/mcps802154.h"

namespace hardware {
namespace dalix {

CccController::CccController(std::string iface_name, uint32_t hw_index,
                             InterfaceTool* interface_tool, McpsUtils* mcps_utils,
                             CccRegionUtils* ccc_region_utils)
    : iface_name_(std::move(iface_name)),
      hw_index_(hw_index),
      interface_tool_(interface_tool),
      mcps_utils_(mcps_utils),
      ccc_region_utils_(ccc_region_utils) {}

ndk::ScopedAStatus CccController::Failure() {
  return ndk::ScopedAStatus::fromExceptionCode(kCccIllegalState);
}

ndk::ScopedAStatus CccController::SetDefaultScheduler() {
  bool ok = false;
  McpsHwInfo info = mcps_utils_->GetHardwareInfo(hw_index_, &ok);
  if (!ok) return Failure();
  if (info.scheduler.empty() || info.scheduler == kMcpsSchedulerDefault) {
    return ndk::ScopedAStatus::ok();
  }
  // The driver changes the scheduler only on a radio that is down.
  const char* iface = iface_name_.c_str();
  if (interface_tool_->GetUpState(iface) && !interface_tool_->SetUpState(iface, false)) {
    return Failure();
  }
  if (!mcps_utils_->SetScheduler(hw_index_, McpsScheduler::kDefault, McpsUtils::kNoSlotDuration,
                                 McpsUtils::kNoNodeType, false)) {
    return Failure();
  }
  return ndk::ScopedAStatus::ok();
}

bool CccController::EnsureInterfaceUp() {
  const char* iface = iface_name_.c_str();
  return interface_tool_->GetUpState(iface) || interface_tool_->SetUpState(iface, true);
}

ndk::ScopedAStatus CccController::openCccSession() {
  LOG(INFO) << __func__;
  ndk::ScopedAStatus status = SetDefaultScheduler();
  if (!status.isOk()) return status;
  if (!EnsureInterfaceUp()) return Failure();
  usleep(kInterfaceSettleMicros);
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus CccController::onOpenCccSessionDone() {
  LOG(INFO) << __func__;
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus CccController::startCccSession(int32_t first, int64_t timeref, int32_t channel,
                                                  int64_t* result) {
  LOG(INFO) << __func__;
  if (timeref < 0) return IllegalArgument("Timeref cannot be negative");
  ndk::ScopedAStatus status = CheckUwbChannelRange(channel);
  if (!status.isOk()) return status;
  status = SetDefaultScheduler();
  if (!status.isOk()) return status;
  if (!EnsureInterfaceUp()) return Failure();
  uint32_t value = 0;
  if (!ccc_region_utils_->StartCccSession(hw_index_, static_cast<uint32_t>(first),
                                          static_cast<uint64_t>(timeref),
                                          static_cast<uint8_t>(channel), &value)) {
    return Failure();
  }
  *result = static_cast<int64_t>(value);
  return ndk::ScopedAStatus::ok();
}

}  // namespace dalix
}  // namespace hardware
