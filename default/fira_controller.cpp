#define LOG_TAG "dalix.uwb.FiraController"

#include "fira_controller.h"

#include <stdio.h>

#include <utility>

#include <android-base/logging.h>

#include "ipc_utils.h"
#include "net/mcps802154.h"

namespace hardware {
namespace dalix {
namespace {

using aidl::hardware::dalix::uwb::AoaType;
using aidl::hardware::dalix::uwb::DeviceType;
using aidl::hardware::dalix::uwb::FiraStsConfig;

// The controller only configures sessions with 2-byte short addresses.
constexpr size_t kShortAddressSize = 2;
constexpr size_t kVendorIdSize = 2;
constexpr size_t kStaticStsIvSize = 6;
// Highest accepted values of the bounded session fields.
constexpr uint32_t kMaxSessionPriority = 100;
constexpr int kMinInBandTerminationAttemptCount = 1;
constexpr int kMaxInBandTerminationAttemptCount = 10;
constexpr int kSfdIdLimit = 5;
constexpr uint8_t kAoaTypeLimit = 3;
// Service-specific error of a block striding update the driver refused.
constexpr int32_t kNetlinkFailure = 1;

ndk::ScopedAStatus Unsupported() {
  return ndk::ScopedAStatus::fromExceptionCode(EX_UNSUPPORTED_OPERATION);
}

ndk::ScopedAStatus IllegalState(const char* message) {
  return ndk::ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_STATE, message);
}

ndk::ScopedAStatus UnknownSession(uint32_t session_id) {
  return IllegalArgument("Unknown session id %u", session_id);
}

}  // namespace

FiraController::FiraController(std::string name, uint32_t hw_index, InterfaceTool* interface_tool,
                               McpsUtils* mcps_utils, IeeeUtils* ieee_utils,
                               FiraRegionUtils* fira_region_utils, EventLoop* event_loop)
    : name_(std::move(name)),
      hw_index_(hw_index),
      interface_tool_(interface_tool),
      mcps_utils_(mcps_utils),
      ieee_utils_(ieee_utils),
      event_loop_(event_loop),
      fira_region_utils_(fira_region_utils) {}

FiraController::~FiraController() {
  // Sessions may still run when the last client lets go of the controller;
  // the region client must not report to it afterwards.
  if (running_count_ != 0) fira_region_utils_->UnsubscribeCallback(hw_index_);
}

ndk::ScopedAStatus FiraController::setStateCallback(
    const std::shared_ptr<IFiraStateCallback>& callback) {
  LOG(INFO) << __func__;
  state_callback_ = callback;
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::clearStateCallback() {
  LOG(INFO) << __func__;
  state_callback_.reset();
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::setSessionCallback(
    const std::shared_ptr<IFiraSessionCallback>& callback) {
  LOG(INFO) << __func__;
  session_callback_ = callback;
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::clearSessionCallback() {
  LOG(INFO) << __func__;
  session_callback_.reset();
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::getCapabilities(FiraCapabilities* /*capabilities*/) {
  LOG(INFO) << __func__;
  return Unsupported();
}

ndk::ScopedAStatus FiraController::initNewTwrSession(const FiraTwrSession& session) {
  LOG(INFO) << __func__ << ":" << session.toString();
  const uint32_t id = static_cast<uint32_t>(session.id);
  if (sessions_.count(id) != 0) return IllegalArgument("Session with id %u already exist", id);
  ndk::ScopedAStatus status = CheckTwrSessionFields(session);
  if (!status.isOk()) return status;
  status = SetFiraRegion();
  if (!status.isOk()) return status;

  // A failure from here on leaves the driver's session as it is; only the
  // controller's map stays unchanged.
  if (!fira_region_utils_->InitSession(hw_index_, id) ||
      !fira_region_utils_->ConfigTwrSession(hw_index_, session)) {
    return Unsupported();
  }
  // The short address cannot change while the interface is up.
  if (interface_tool_->GetUpState(name_.c_str()) &&
      !interface_tool_->SetUpState(name_.c_str(), false)) {
    return Unsupported();
  }
  if (!ieee_utils_->SetShortMacAddress(name_.c_str(), session.deviceAddress.address)) {
    return Unsupported();
  }
  if (session.deviceType == DeviceType::CONTROLLER &&
      !fira_region_utils_->AddControlees(hw_index_, id, session.destAddressList, nullptr)) {
    return Unsupported();
  }
  sessions_[id] = kInitialized;
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::updateTwrSession(const FiraTwrSession& session) {
  LOG(INFO) << __func__;
  const uint32_t id = static_cast<uint32_t>(session.id);
  auto it = sessions_.find(id);
  if (it == sessions_.end()) return UnknownSession(id);
  if (it->second == kRunning) return IllegalState("Running session cannot be updated");
  ndk::ScopedAStatus status = CheckFiraRegionSet();
  if (!status.isOk()) return status;
  if (!fira_region_utils_->ConfigTwrSession(hw_index_, session)) return Unsupported();
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::startRangingSession(int32_t session_id) {
  LOG(INFO) << __func__;
  if (session_callback_ == nullptr) {
    return ndk::ScopedAStatus::fromExceptionCodeWithMessage(
        EX_UNSUPPORTED_OPERATION, "You need to register callbacks on the controller first.");
  }
  const uint32_t id = static_cast<uint32_t>(session_id);
  auto it = sessions_.find(id);
  if (it == sessions_.end()) return UnknownSession(id);
  if (it->second == kRunning) return IllegalState("The session is already running");
  ndk::ScopedAStatus status = CheckFiraRegionSet();
  if (!status.isOk()) return status;
  // CheckFiraRegionSet() succeeded, so the map is as it was.
  if (!interface_tool_->GetUpState(name_.c_str()) &&
      !interface_tool_->SetUpState(name_.c_str(), true)) {
    LOG(ERROR) << __func__ << ": Failed to up iface " << name_;
    return Unsupported();
  }

  it->second = kRunning;
  if (running_count_++ == 0) fira_region_utils_->SubscribeCallback(hw_index_, this);
  if (!fira_region_utils_->StartSession(hw_index_, id)) {
    // The start may have delivered a report that changed the map.
    sessions_[id] = kInitialized;
    --running_count_;
    UnsubscribeRangingCallbackIfNecessary();
    return Unsupported();
  }
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::updateTwoWayRangingBlockStriding(int32_t session_id,
                                                                    int32_t block_striding_value) {
  LOG(INFO) << __func__;
  if (block_striding_value < 0) return IllegalArgument("Block striding value cannot be negative");
  const uint32_t id = static_cast<uint32_t>(session_id);
  if (sessions_.count(id) == 0) return UnknownSession(id);
  if (!fira_region_utils_->UpdateBlockStriding(hw_index_, id, block_striding_value)) {
    return ndk::ScopedAStatus::fromServiceSpecificErrorWithMessage(kNetlinkFailure,
                                                                   "Netlink failure");
  }
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::addControlees(
    int32_t session_id, const std::vector<UwbAddress>& controlees,
    const std::optional<std::vector<int32_t>>& sub_session_ids) {
  LOG(INFO) << __func__;
  const uint32_t id = static_cast<uint32_t>(session_id);
  if (sessions_.count(id) == 0) return UnknownSession(id);
  if (sub_session_ids.has_value() && sub_session_ids->size() != controlees.size()) {
    return IllegalArgument("Controlees size and sub-session id size do not match");
  }
  const bool added = fira_region_utils_->AddControlees(
      hw_index_, id, controlees, sub_session_ids.has_value() ? &*sub_session_ids : nullptr);
  // The client hears of the outcome only after this call has returned to it.
  if (session_callback_ != nullptr) {
    event_loop_->PostTask([callback = session_callback_, session_id, controlees, added] {
      if (added) {
        (void)callback->onControleesAdded(session_id, controlees);
      } else {
        (void)callback->onControleesAddFailed(session_id, controlees, 0);
      }
    });
  }
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::removeControlees(int32_t session_id,
                                                    const std::vector<UwbAddress>& controlees) {
  LOG(INFO) << __func__;
  const uint32_t id = static_cast<uint32_t>(session_id);
  if (sessions_.count(id) == 0) return UnknownSession(id);
  const bool removed = fira_region_utils_->RemoveControlees(hw_index_, id, controlees);
  if (session_callback_ != nullptr) {
    event_loop_->PostTask([callback = session_callback_, session_id, controlees, removed] {
      if (removed) {
        (void)callback->onControleesRemoved(session_id, controlees);
      } else {
        (void)callback->onControleesRemoveFailed(session_id, controlees, 0);
      }
    });
  }
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::stopRangingSession(int32_t session_id) {
  LOG(INFO) << __func__;
  const uint32_t id = static_cast<uint32_t>(session_id);
  auto it = sessions_.find(id);
  if (it == sessions_.end()) return UnknownSession(id);
  if (it->second == kInitialized) return IllegalState("The session isn't started.");
  ndk::ScopedAStatus status = CheckFiraRegionSet();
  if (!status.isOk()) return status;
  // The session stays running until the driver reports the stop.
  if (!fira_region_utils_->StopSession(hw_index_, id)) return Unsupported();
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::getSessionCount(int32_t* count) {
  LOG(INFO) << __func__;
  *count = static_cast<int32_t>(sessions_.size());
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::deinitSession(int32_t session_id) {
  LOG(INFO) << __func__;
  const uint32_t id = static_cast<uint32_t>(session_id);
  auto it = sessions_.find(id);
  if (it == sessions_.end()) return UnknownSession(id);
  if (it->second == kRunning) return IllegalState("The session is started, call stop first.");
  bool has_region = false;
  ndk::ScopedAStatus status = HasFiraRegion(&has_region);
  if (!status.isOk()) return status;
  if (!has_region) {
    // The driver dropped every session along with the region.
    DropAllSessions();
    return ndk::ScopedAStatus::ok();
  }
  if (!fira_region_utils_->DeinitSession(hw_index_, id)) return Unsupported();
  sessions_.erase(id);
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::reset() {
  LOG(INFO) << __func__;
  if (interface_tool_->GetUpState(name_.c_str()) &&
      !interface_tool_->SetUpState(name_.c_str(), false)) {
    return Unsupported();
  }
  bool ok = false;
  const McpsHwInfo info = mcps_utils_->GetHardwareInfo(hw_index_, &ok);
  if (!ok) return Unsupported();
  if (info.scheduler != kMcpsSchedulerDefault &&
      !mcps_utils_->SetScheduler(hw_index_, McpsScheduler::kDefault, McpsUtils::kNoSlotDuration,
                                 McpsUtils::kNoNodeType, false)) {
    return Unsupported();
  }
  DropAllSessions();
  return ndk::ScopedAStatus::ok();
}

void FiraController::OnTwrResult(const FiraRangingData& data,
                                 const std::vector<FiraTwrMeasurement>& measurements) {
  Notifications& seen = notifications_[static_cast<uint32_t>(data.sessionId)];
  ++seen.received;
  seen.last_index = data.index;
  seen.last_time = std::chrono::steady_clock::now();
  // A client may clear its callback while its sessions run.
  if (session_callback_ == nullptr) return;
  (void)session_callback_->onTwrResult(data, measurements);
}

void FiraController::OnSessionStopped(uint32_t session_id) {
  if (session_callback_ != nullptr) {
    (void)session_callback_->onSessionStopped(static_cast<int32_t>(session_id));
  }
  // A report for an id this controller does not know still leaves it
  // initialised in the driver, so it is recorded as such.
  sessions_[session_id] = kInitialized;
  --running_count_;
  UnsubscribeRangingCallbackIfNecessary();
}

bool FiraController::SetProperties(ConfigUtils& config) {
  return fira_region_utils_->SetProperties(hw_index_, config);
}

ndk::ScopedAStatus FiraController::CheckTwrSessionFields(const FiraTwrSession& session) {
  LOG(INFO) << __func__;
  if (session.deviceAddress.address.size() != kShortAddressSize) {
    return IllegalArgument(
        "deviceAddress has incorrect size, only short addresses are supported in Fira 1.1");
  }
  if (session.initiationTimeMs < 0) return IllegalArgument("initiationTimeMs cannot be negative.");
  if (session.slotDurationRstu < 0) return IllegalArgument("slotDurationRstu cannot be negative.");
  if (session.slotsPerRangingRound < 0) {
    return IllegalArgument("slotsPerRangingRound cannot be negative.");
  }
  if (session.rangingBlockDurationMs < 0) {
    return IllegalArgument("rangingBlockDurationMs cannot be negative.");
  }
  if (session.blockStridingValue < 0) {
    return IllegalArgument("blockStridingValue cannot be negative.");
  }
  if (session.maxRangingRoundRetries < 0) {
    return IllegalArgument("maxRangingRoundRetries cannot be negative.");
  }
  // Compared as an unsigned byte so that negative values are refused too.
  if (static_cast<uint8_t>(session.aoaType) >= kAoaTypeLimit) {
    return IllegalArgument("Unsupported AoaType: %s", toString(session.aoaType).c_str());
  }
  // Signed bytes widen with their sign, so -1 reads as 4294967295 and fails.
  const uint32_t priority = static_cast<uint32_t>(static_cast<int32_t>(session.sessionPriority));
  if (priority > kMaxSessionPriority) {
    return IllegalArgument("Incorrect sessionPriority value %u", priority);
  }
  const int attempts = session.inBandTerminationAttemptCount;
  if (attempts < kMinInBandTerminationAttemptCount ||
      attempts > kMaxInBandTerminationAttemptCount) {
    return IllegalArgument("Incorrect inBandTerminationAttemptCount value %u",
                           static_cast<uint32_t>(attempts));
  }
  ndk::ScopedAStatus status = CheckUwbChannelRange(session.channelNumber);
  if (!status.isOk()) return status;
  // Compared signed, so negative identifiers pass on to the encoder.
  if (session.sfdId >= kSfdIdLimit) {
    return IllegalArgument("Incorrect sfdId value %u", static_cast<uint8_t>(session.sfdId));
  }
  // Checked whatever the device type: a controlee names its controller here.
  if (session.destAddressList.empty()) {
    return IllegalArgument(
        "The device is controller of the session, destAddressList should not be empty");
  }
  for (const UwbAddress& destination : session.destAddressList) {
    if (destination.address.size() != kShortAddressSize) {
      return IllegalArgument(
          "destAddressList contains an incorrect address, only short addresses are supported "
          "in Fira 1.1");
    }
  }
  if (session.stsConfig == FiraStsConfig::STATIC) {
    // Both sizes are reported with the vendorId wording, as clients expect.
    if (session.vendorId.size() != kVendorIdSize) {
      return IllegalArgument("Session with static STS needs to pass vendorId value with size of %u",
                             static_cast<unsigned>(kVendorIdSize));
    }
    if (session.staticStsIV.size() != kStaticStsIvSize) {
      return IllegalArgument("Session with static STS needs to pass vendorId value with size of %u",
                             static_cast<unsigned>(kStaticStsIvSize));
    }
  } else {
    if (!session.vendorId.empty()) {
      return IllegalArgument("Session without static STS should not pass vendorId value");
    }
    if (!session.staticStsIV.empty()) {
      return IllegalArgument("Session without static STS should not pass staticStsIV value");
    }
  }
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::SetFiraRegion() {
  bool ok = false;
  const bool has_region = IsFiraScheduler(&ok);
  if (!ok) return Unsupported();
  if (has_region) return ndk::ScopedAStatus::ok();
  // The driver changes its scheduler only while the interface is down.
  if (interface_tool_->GetUpState(name_.c_str()) &&
      !interface_tool_->SetUpState(name_.c_str(), false)) {
    return Unsupported();
  }
  if (!mcps_utils_->SetFiraRegion(hw_index_)) return Unsupported();
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::HasFiraRegion(bool* has_region) {
  bool ok = false;
  const bool is_fira = IsFiraScheduler(&ok);
  if (!ok) return Unsupported();
  *has_region = is_fira;
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus FiraController::CheckFiraRegionSet() {
  bool ok = false;
  const bool has_region = IsFiraScheduler(&ok);
  if (!ok) return Unsupported();
  if (has_region) return ndk::ScopedAStatus::ok();
  LOG(ERROR) << __func__ << ": Fira has been stopped, all session are lost.";
  DropAllSessions();
  return Unsupported();
}

void FiraController::UnsubscribeRangingCallbackIfNecessary() {
  LOG(INFO) << __func__;
  if (running_count_ != 0) return;
  fira_region_utils_->UnsubscribeCallback(hw_index_);
  if (interface_tool_->GetUpState(name_.c_str()) &&
      !interface_tool_->SetUpState(name_.c_str(), false)) {
    LOG(ERROR) << "things gone bad, can't down fira iface";
  }
}

void FiraController::DropAllSessions() {
  sessions_.clear();
  running_count_ = 0;
  UnsubscribeRangingCallbackIfNecessary();
}

bool FiraController::IsFiraScheduler(bool* ok) {
  const McpsHwInfo info = mcps_utils_->GetHardwareInfo(hw_index_, ok);
  return *ok && info.scheduler == kMcpsSchedulerEndless;
}

}  // namespace dalix
}  // namespace hardware

namespace hardware {
namespace dalix {

void FiraController::Dump(std::string* out) const {
  *out += "  FiRa: " + std::to_string(sessions_.size()) + " session(s), " +
          std::to_string(running_count_) + " running, session callback " +
          (session_callback_ != nullptr ? "set" : "not set") + "\n";
  const auto now = std::chrono::steady_clock::now();
  for (const auto& [id, state] : sessions_) {
    *out += "    session " + std::to_string(id) + ": " +
            (state == kRunning ? "running" : "initialized");
    auto seen = notifications_.find(id);
    if (seen == notifications_.end()) {
      *out += ", no notification\n";
      continue;
    }
    const std::chrono::duration<double> age = now - seen->second.last_time;
    char last[96];
    snprintf(last, sizeof(last), ", last index %u, %.3f s ago\n",
             static_cast<uint32_t>(seen->second.last_index), age.count());
    *out += ", " + std::to_string(seen->second.received) + " notification(s)" + last;
  }
}

}  // namespace dalix
}  // namespace hardware
