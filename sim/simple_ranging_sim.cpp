#define LOG_TAG "dalix.sim.SimpleRangingSim"

#include "sim/simple_ranging_sim.h"

#include <time.h>

#include <cerrno>
#include <chrono>
#include <cmath>
#include <utility>

#include <android-base/logging.h>
#include <netlink/genl/genl.h>

#include "net/mcps802154.h"

namespace hardware {
namespace dalix {
namespace sim {

SimpleRangingSim::SimpleRangingSim(DriverSimulator* simulator, RadioStore* radios,
                                   WpanDeviceStore* devices, World* world)
    : simulator_(simulator), radios_(radios), devices_(devices), world_(world) {}

int32_t SimpleRangingSim::AngleToPhase(double angle_rad) {
  const double pdoa_rad =
      std::sin(angle_rad) * 2 * M_PI * kMcpsAntennaSpacingMetres / kMcpsCarrierWavelengthMetres;
  const double fixed = std::round(pdoa_rad * (1 << kMcpsPdoaFractionalBits));
  return static_cast<int32_t>(std::fmax(-32767.0, std::fmin(32767.0, fixed)));
}

bool SimpleRangingSim::EncodeRangingReport(nl_msg* msg, uint32_t hw_index,
                                           const RangingReport& report) {
  if (nla_put_u32(msg, MCPS802154_ATTR_HW, hw_index) != 0) return false;
  nlattr* result = nla_nest_start(msg, MCPS802154_ATTR_RANGING_RESULT);
  if (result == nullptr) return false;
  auto put_u32 = [msg](int type, const std::optional<uint32_t>& value) {
    return !value || nla_put_u32(msg, type, *value) == 0;
  };
  auto put_s32 = [msg](int type, const std::optional<int32_t>& value) {
    return !value || nla_put_s32(msg, type, *value) == 0;
  };
  return put_u32(MCPS802154_RANGING_RESULT_ATTR_REQUEST_ID, report.request_id) &&
         put_u32(MCPS802154_RANGING_RESULT_ATTR_MEASUREMENT, report.measurement) &&
         put_s32(MCPS802154_RANGING_RESULT_ATTR_PDOA_1, report.pdoa_1) &&
         put_s32(MCPS802154_RANGING_RESULT_ATTR_PDOA_2, report.pdoa_2) &&
         nla_nest_end(msg, result) == 0;
}

void SimpleRangingSim::SetRangingRequests(const sim::Request& request, nlattr** attrs,
                                          Responder& responder) {
  nlattr* list = attrs[MCPS802154_ATTR_RANGING_REQUESTS];
  if (attrs[MCPS802154_ATTR_HW] == nullptr || list == nullptr) {
    responder.Refuse(EINVAL);
    return;
  }
  const uint32_t hw_index = nla_get_u32(attrs[MCPS802154_ATTR_HW]);
  std::optional<SimRadio> radio = radios_->Radio(hw_index);
  if (!radio) {
    responder.Refuse(ENODEV);
    return;
  }
  // Only the simple ranging scheduler carries out requests.
  if (radio->scheduler != kMcpsSchedulerSimpleRanging) {
    responder.Refuse(EINVAL);
    return;
  }
  std::vector<Request> requests;
  nlattr* element;
  int remaining;
  nla_for_each_nested(element, list, remaining) {
    nlattr* fields[MCPS802154_RANGING_REQUEST_ATTR_MAX + 1] = {};
    if (nla_type(element) != MCPS802154_RANGING_REQUESTS_ATTR_REQUEST ||
        nla_parse_nested(fields, MCPS802154_RANGING_REQUEST_ATTR_MAX, element,
                         kMcpsRangingRequestPolicy.data()) != 0 ||
        fields[MCPS802154_RANGING_REQUEST_ATTR_ID] == nullptr ||
        fields[MCPS802154_RANGING_REQUEST_ATTR_PEER] == nullptr) {
      responder.Refuse(EINVAL);
      return;
    }
    Request installed;
    installed.id = nla_get_u32(fields[MCPS802154_RANGING_REQUEST_ATTR_ID]);
    if (nlattr* parameter = fields[MCPS802154_RANGING_REQUEST_ATTR_PARAMETER]) {
      installed.parameter = nla_get_u32(parameter);
    }
    installed.peer = nla_get_u64(fields[MCPS802154_RANGING_REQUEST_ATTR_PEER]);
    requests.push_back(installed);
  }

  uint64_t generation;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    Ranging& ranging = ranging_[hw_index];
    ranging.port = request.port;
    ranging.family_id = request.family_id;
    ranging.slot_ms = radio->slot_duration > 0 ? radio->slot_duration : 1;
    ranging.requests = std::move(requests);
    generation = ++ranging.generation;
    if (ranging.requests.empty()) return;  // stopped
  }
  simulator_->Post([this, hw_index, generation] { Tick(hw_index, generation); });
}

void SimpleRangingSim::Tick(uint32_t hw_index, uint64_t generation) {
  Ranging ranging;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = ranging_.find(hw_index);
    if (it == ranging_.end() || it->second.generation != generation) return;
    ranging = it->second;
  }
  if (InterfaceUp(hw_index)) {
    for (const Request& request : ranging.requests) {
      RangingReport report = Measure(hw_index, request);
      UniqueNlMsg msg = DriverSimulator::NewEvent(ranging.family_id, MCPS802154_CMD_RANGING_REPORT);
      if (!EncodeRangingReport(msg.get(), hw_index, report)) continue;
      if (!simulator_->SendEvent(ranging.port, msg.get())) {
        // The driver forgets the requests of a socket that went away.
        LOG(INFO) << "Tick: port " << ranging.port << " gone, ranging stopped on " << hw_index;
        std::lock_guard<std::mutex> lock(mutex_);
        if (ranging_[hw_index].generation == generation) ranging_[hw_index].requests.clear();
        return;
      }
      std::lock_guard<std::mutex> lock(mutex_);
      ++reports_sent_;
    }
  }
  simulator_->Post([this, hw_index, generation] { Tick(hw_index, generation); },
                   std::chrono::milliseconds(ranging.slot_ms));
}

RangingReport SimpleRangingSim::Measure(uint32_t hw_index, const Request& request) {
  RangingReport report;
  report.request_id = request.id;
  std::optional<Peer> peer = world_->FindPeerByExtendedAddress(request.peer);
  if (!peer) return report;
  timespec now = {};
  clock_gettime(CLOCK_MONOTONIC, &now);
  const uint64_t now_ns = static_cast<uint64_t>(now.tv_sec) * 1000000000u + now.tv_nsec;
  std::optional<Observation> seen =
      world_->Measure(hw_index, peer->short_address, world_->SecondsAt(now_ns));
  if (!seen || !seen->in_range || seen->stopped) return report;
  report.measurement = static_cast<uint32_t>(std::lround(seen->distance_m * 100));  // cm
  report.pdoa_1 = AngleToPhase(seen->azimuth_rad);
  report.pdoa_2 = AngleToPhase(seen->elevation_rad);
  return report;
}

bool SimpleRangingSim::InterfaceUp(uint32_t hw_index) const {
  if (devices_ == nullptr) return true;
  std::optional<SimRadio> radio = radios_->Radio(hw_index);
  if (!radio || !radio->phy_name) return false;
  for (const WpanDevice& device : devices_->Devices()) {
    if (*radio->phy_name == "phy" + std::to_string(device.config.phy_index)) return device.up;
  }
  return false;
}

std::vector<SimpleRangingSim::Request> SimpleRangingSim::Installed(uint32_t hw_index) const {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = ranging_.find(hw_index);
  return it == ranging_.end() ? std::vector<Request>() : it->second.requests;
}

int SimpleRangingSim::ReportsSent() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return reports_sent_;
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
