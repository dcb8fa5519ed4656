#define LOG_TAG "dalix.Uwb"

#include "uwb.h"

#include <stdio.h>

#include <algorithm>
#include <utility>

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android/binder_ibinder.h>

namespace hardware {
namespace dalix {

namespace uwb = aidl::hardware::dalix::uwb;

namespace {

// The HAL's one client, process-wide: there is one radio set, so there is
// at most one client in the process, whichever Uwb it opened. Empty while
// the HAL is closed; only the service thread touches either.
std::shared_ptr<uwb::IUwbClientCallback> g_client;
// Watches g_client's binder; null while closed.
AIBinder_DeathRecipient* g_death_recipient = nullptr;

// The binder layer calls this (on the service thread) with the Uwb that
// linked the client. A stale notification, for a client that a close has
// already replaced, finds the current client alive and changes nothing.
void LambdaOnDeath(void* cookie) {
  if (g_client == nullptr || AIBinder_isAlive(g_client->asBinder().get())) return;
  LOG(INFO) << "LambdaOnDeath Uwb service has died";
  static_cast<Uwb*>(cookie)->InternalClose();
}

}  // namespace

Uwb::Uwb(InterfaceTool* interface_tool, McpsUtils* mcps_utils, IeeeUtils* ieee_utils,
         CccRegionUtils* ccc_region_utils, FiraRegionUtils* fira_region_utils,
         EventLoop* event_loop)
    : interface_tool_(interface_tool),
      mcps_utils_(mcps_utils),
      ieee_utils_(ieee_utils),
      ccc_region_utils_(ccc_region_utils),
      fira_region_utils_(fira_region_utils),
      event_loop_(event_loop) {}

Uwb::~Uwb() = default;

ndk::ScopedAStatus Uwb::open(const std::shared_ptr<uwb::IUwbClientCallback>& client) {
  LOG(INFO) << "open";
  if (client == nullptr) {
    return ndk::ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_STATE, "null client");
  }
  if (g_client != nullptr) {
    if (AIBinder_isAlive(g_client->asBinder().get())) {
      LOG(INFO) << "Cannot accept two clients";
      return ndk::ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_STATE,
                                                              "HAL is already open");
    }
    LOG(INFO) << "Previous client is dead";
    InternalClose();
  }

  if (!mcps_utils_->Start()) {
    LOG(ERROR) << "Failed to start mcps utils";
    return ndk::ScopedAStatus::fromServiceSpecificErrorWithMessage(
        1, "Failed to find MCPS netlink, check the kernel module");
  }
  ccc_region_utils_->SetMcpsNetId(mcps_utils_->GetNetId());
  fira_region_utils_->SetMcpsNetId(mcps_utils_->GetNetId());
  if (!ieee_utils_->Setup()) {
    LOG(ERROR) << "Failed to setup ieee utils";
    return ndk::ScopedAStatus::fromServiceSpecificErrorWithMessage(
        1, "Failed to find IEEE netlink, check the kernel module");
  }

  g_client = client;
  g_death_recipient = AIBinder_DeathRecipient_new(LambdaOnDeath);
  const binder_status_t linked =
      AIBinder_linkToDeath(client->asBinder().get(), g_death_recipient, this);
  if (linked != STATUS_OK) LOG(WARNING) << "open: linkToDeath failed: " << linked;

  // Zero radios is still an open HAL: the client learns it from the names.
  SetupIfaces();
  return ndk::ScopedAStatus::ok();
}

void Uwb::SetupIfaces() {
  bool ok = false;
  const std::vector<McpsHwInfo> radios = mcps_utils_->ListHardware(&ok);
  if (!ok) return;
  const std::vector<DevInfo> devices = ieee_utils_->ListDevices(&ok);
  if (!ok) return;

  for (const DevInfo& dev : devices) {
    auto radio = std::find_if(radios.begin(), radios.end(), [&dev](const McpsHwInfo& hw) {
      return hw.phy_index == dev.phy_index;
    });
    // An 802.15.4 device that no UWB radio drives is not ours.
    if (radio == radios.end()) continue;
    std::shared_ptr<UwbIface> iface = CreateUwbIface(dev, *radio);
    if (!iface->LoadCalibration(kCalibrationFile)) LOG(ERROR) << "Failed to load calibration";
    if (!iface->LoadHalProperties(kHalPropertiesFile)) {
      LOG(ERROR) << "Failed to load HAL properties";
    }
    ifaces_[dev.name] = std::move(iface);
  }
}

std::shared_ptr<UwbIface> Uwb::CreateUwbIface(const DevInfo& dev, const McpsHwInfo& hw) {
  auto fira = ndk::SharedRefBase::make<FiraController>(dev.name, hw.hw_index, interface_tool_,
                                                       mcps_utils_, ieee_utils_,
                                                       fira_region_utils_, event_loop_);
  auto ccc = ndk::SharedRefBase::make<CccController>(dev.name, hw.hw_index, interface_tool_,
                                                     mcps_utils_, ccc_region_utils_);
  auto simple_ranging = ndk::SharedRefBase::make<SimpleRangingController>(
      dev.name, hw.hw_index, interface_tool_, mcps_utils_, ieee_utils_);
  return ndk::SharedRefBase::make<UwbIface>(dev.name, hw.hw_index, interface_tool_, mcps_utils_,
                                            std::move(fira), std::move(ccc),
                                            std::move(simple_ranging));
}

ndk::ScopedAStatus Uwb::listIfaceNames(std::vector<std::string>* names) {
  for (const auto& [name, iface] : ifaces_) names->push_back(name);
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus Uwb::getIface(const std::string& name,
                                 std::shared_ptr<uwb::IUwbIface>* iface) {
  LOG(INFO) << "getIface";
  auto found = ifaces_.find(name);
  if (found == ifaces_.end()) {
    LOG(WARNING) << "getIface: Unknown iface " << name;
    return ndk::ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT,
                                                            ("Unknown iface " + name).c_str());
  }
  *iface = found->second;
  return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus Uwb::close() {
  InternalClose();
  return ndk::ScopedAStatus::ok();
}

void Uwb::InternalClose() {
  LOG(INFO) << "InternalClose";
  for (auto& [name, iface] : ifaces_) iface->Stop();
  // A client that kept an interface or a controller keeps it alive; it is
  // just no longer reachable from here.
  ifaces_.clear();
  g_client.reset();
  // Deleting the recipient also drops its link, and a notification of it
  // that may still be queued.
  AIBinder_DeathRecipient_delete(g_death_recipient);
  g_death_recipient = nullptr;
}

ndk::ScopedAStatus Uwb::loadCalibration(int64_t hw_index, const std::string& path) {
  if (g_client == nullptr) {
    return ndk::ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_STATE,
                                                            "UWB HAL is not opened");
  }
  for (auto& [name, iface] : ifaces_) {
    // Widened without sign, so a negative index never matches.
    if (static_cast<int64_t>(iface->hw_index()) != hw_index) continue;
    if (iface->LoadCalibration(path.c_str())) return ndk::ScopedAStatus::ok();
    // The plain exception-code form: a service-specific status whose code is
    // 0, which is what clients of this HAL have always seen.
    return ndk::ScopedAStatus::fromExceptionCodeWithMessage(EX_SERVICE_SPECIFIC,
                                                            "Failed to load calibration");
  }
  return ndk::ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT,
                                                          "Unkown hw index");
}

binder_status_t Uwb::dump(int fd, const char** /*args*/, uint32_t /*num_args*/) {
  std::string text = "UWB HAL: ";
  if (g_client == nullptr) {
    text += "closed\n";
  } else {
    text += std::string("open, client ") +
            (AIBinder_isAlive(g_client->asBinder().get()) ? "alive" : "dead") + ", " +
            std::to_string(ifaces_.size()) + " radio(s)\n";
  }
  for (auto& [name, iface] : ifaces_) iface->Dump(&text);
  // One request list serves the whole driver, whichever radio installed it.
  const std::vector<uwb::RangingRequest> requests = mcps_utils_->InstalledRangingRequests();
  text += "simple ranging: " + std::to_string(requests.size()) + " request(s) installed\n";
  for (const uwb::RangingRequest& request : requests) {
    char line[96];
    snprintf(line, sizeof(line), "  request %d: peer %016llx, parameter %d\n", request.id,
             static_cast<unsigned long long>(request.peerAddress), request.parameter);
    text += line;
  }
  return android::base::WriteStringToFd(text, fd) ? STATUS_OK : STATUS_FAILED_TRANSACTION;
}

ndk::ScopedAStatus Uwb::listHardwareIndex(std::vector<int64_t>* hw_indices) {
  LOG(INFO) << "listHardwareIndex";
  bool ok = false;
  const std::vector<McpsHwInfo> radios = mcps_utils_->ListHardware(&ok);
  if (!ok) return ndk::ScopedAStatus::fromStatus(STATUS_UNKNOWN_ERROR);
  for (const McpsHwInfo& radio : radios) hw_indices->push_back(radio.hw_index);
  return ndk::ScopedAStatus::ok();
}

}  // namespace dalix
}  // namespace hardware
