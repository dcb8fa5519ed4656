#define LOG_TAG "dalix.sim.McpsFamily"

#include "sim/mcps_family.h"

#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include <android-base/logging.h>
#include <netlink/attr.h>
#include <netlink/genl/genl.h>

#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"
#include "sim/fira_region_sim.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

// What one SET_SCHEDULER or SET_SCHEDULER_PARAMS asks for, as read from the
// request. -1 for a parameter that is not given.
struct SchedulerRequest {
  std::string name;
  bool has_params = false;
  int32_t slot_duration = -1;
  int32_t node_type = -1;
  bool has_regions = false;
  std::vector<std::string> regions;
};

// Reads the scheduler attributes; an errno when they are malformed.
int ReadSchedulerRequest(nlattr** attrs, SchedulerRequest* out) {
  if (attrs[MCPS802154_ATTR_SCHEDULER_NAME] == nullptr) return EINVAL;
  out->name = nla_get_string(attrs[MCPS802154_ATTR_SCHEDULER_NAME]);
  if (nlattr* params = attrs[MCPS802154_ATTR_SCHEDULER_PARAMS]) {
    nlattr* fields[MCPS802154_SCHEDULER_PARAMS_ATTR_MAX + 1] = {};
    if (nla_parse_nested(fields, MCPS802154_SCHEDULER_PARAMS_ATTR_MAX, params,
                         kMcpsSchedulerParamsPolicy.data()) != 0) {
      return EINVAL;
    }
    out->has_params = true;
    if (nlattr* slot = fields[MCPS802154_SCHEDULER_PARAMS_ATTR_SLOT_DURATION]) {
      out->slot_duration = static_cast<int32_t>(nla_get_u32(slot));
    }
    if (nlattr* node = fields[MCPS802154_SCHEDULER_PARAMS_ATTR_NODE_TYPE]) {
      out->node_type = static_cast<int32_t>(nla_get_u32(node));
    }
  }
  if (nlattr* regions = attrs[MCPS802154_ATTR_SCHEDULER_REGIONS]) {
    out->has_regions = true;
    nlattr* region;
    int remaining;
    nla_for_each_nested(region, regions, remaining) {
      if (nla_type(region) != MCPS802154_SCHEDULER_REGIONS_ATTR_REGION) return EINVAL;
      nlattr* fields[MCPS802154_REGION_ATTR_MAX + 1] = {};
      if (nla_parse_nested(fields, MCPS802154_REGION_ATTR_MAX, region, kMcpsRegionPolicy.data()) !=
              0 ||
          fields[MCPS802154_REGION_ATTR_NAME] == nullptr) {
        return EINVAL;
      }
      out->regions.emplace_back(nla_get_string(fields[MCPS802154_REGION_ATTR_NAME]));
    }
  }
  return 0;
}

bool IsKnownScheduler(const std::string& name) {
  return name == kMcpsSchedulerDefault || name == kMcpsSchedulerSimpleRanging ||
         name == kMcpsSchedulerEndless;
}

// What each scheduler needs once its parameters are settled: simple ranging
// a slot duration and a node type and no region; endless exactly the FiRa
// region and no parameter; default nothing at all.
int CheckScheduler(const std::string& name, int32_t slot_duration, int32_t node_type,
                   const std::vector<std::string>& regions) {
  if (name == kMcpsSchedulerSimpleRanging) {
    bool valid_node = node_type == 0 || node_type == 1;
    return slot_duration > 0 && valid_node && regions.empty() ? 0 : EINVAL;
  }
  if (slot_duration != -1 || node_type != -1) return EINVAL;
  if (name == kMcpsSchedulerEndless) {
    return regions.size() == 1 && regions[0] == kMcpsRegionFira ? 0 : EINVAL;
  }
  return regions.empty() ? 0 : EINVAL;
}

// One element of the calibration verdict: a refused key is named, when its
// name fits in a reply.
bool PutVerdict(nl_msg* reply, const std::string* refused_key, int32_t status) {
  nlattr* element = nla_nest_start(reply, MCPS802154_CALIBRATIONS_ATTR_CALIBRATION);
  if (element == nullptr) return false;
  if (refused_key != nullptr &&
      nla_put_string(reply, MCPS802154_CALIBRATION_ATTR_KEY, refused_key->c_str()) != 0) {
    return false;
  }
  if (nla_put_s32(reply, MCPS802154_CALIBRATION_ATTR_STATUS, status) != 0) return false;
  return nla_nest_end(reply, element) == 0;
}

}  // namespace

McpsFamily::McpsFamily(RadioStore* radios)
    : radios_(radios), max_payload_(getpagesize() - NLMSG_HDRLEN) {}

void McpsFamily::SetCommandHandler(uint8_t cmd, CommandHandler handler) {
  command_handlers_[cmd] = std::move(handler);
}

void McpsFamily::HandleRequest(const Request& request, Responder& responder) {
  nlmsghdr* header = nlmsg_hdr(request.msg);
  if (static_cast<int>(nlmsg_datalen(header)) > max_payload_) {
    responder.Refuse(EMSGSIZE);
    return;
  }
  nlattr* attrs[MCPS802154_ATTR_MAX + 1] = {};
  if (genlmsg_parse(header, 0, attrs, MCPS802154_ATTR_MAX, kMcpsRequestPolicy.data()) != 0) {
    responder.Refuse(EINVAL);
    return;
  }
  switch (request.cmd) {
    case MCPS802154_CMD_GET_HW:
      GetHw(request, attrs, responder);
      return;
    case MCPS802154_CMD_SET_SCHEDULER:
    case MCPS802154_CMD_SET_SCHEDULER_PARAMS:
      SetScheduler(request, attrs, responder);
      return;
    case MCPS802154_CMD_SET_CALIBRATIONS:
      SetCalibrations(attrs, responder);
      return;
    case MCPS802154_CMD_CALL_REGION:
      // Only the FiRa region is simulated.
      if (fira_ != nullptr) {
        fira_->HandleCall(request, attrs, responder);
      } else {
        responder.Refuse(EOPNOTSUPP);
      }
      return;
    default:
      if (auto handler = command_handlers_.find(request.cmd); handler != command_handlers_.end()) {
        handler->second(request, attrs, responder);
        return;
      }
      LOG(WARNING) << "HandleRequest: unsupported command " << static_cast<int>(request.cmd);
      responder.Refuse(EOPNOTSUPP);
      return;
  }
}

void McpsFamily::GetHw(const Request& request, nlattr** attrs, Responder& responder) {
  std::vector<SimRadio> radios;
  if (request.IsDump()) {
    radios = radios_->Radios();
  } else {
    if (attrs[MCPS802154_ATTR_HW] == nullptr) {
      responder.Refuse(EINVAL);
      return;
    }
    std::optional<SimRadio> radio = radios_->Radio(nla_get_u32(attrs[MCPS802154_ATTR_HW]));
    if (!radio) {
      responder.Refuse(ENODEV);
      return;
    }
    radios.push_back(*radio);
  }
  for (const SimRadio& radio : radios) {
    UniqueNlMsg reply = responder.NewReply(MCPS802154_CMD_NEW_HW);
    nla_put_u32(reply.get(), MCPS802154_ATTR_HW, radio.hw_index);
    if (radio.phy_name) {
      nla_put_string(reply.get(), MCPS802154_ATTR_WPAN_PHY_NAME, radio.phy_name->c_str());
    }
    if (radio.reports_scheduler) {
      nla_put_string(reply.get(), MCPS802154_ATTR_SCHEDULER_NAME, radio.scheduler.c_str());
    }
    if (!responder.Reply(reply.get())) return;  // the client went away
  }
}

void McpsFamily::SetScheduler(const Request& request, nlattr** attrs, Responder& responder) {
  if (attrs[MCPS802154_ATTR_HW] == nullptr) {
    responder.Refuse(EINVAL);
    return;
  }
  uint32_t hw_index = nla_get_u32(attrs[MCPS802154_ATTR_HW]);
  std::optional<SimRadio> radio = radios_->Radio(hw_index);
  if (!radio) {
    responder.Refuse(ENODEV);
    return;
  }
  SchedulerRequest wanted;
  if (int error = ReadSchedulerRequest(attrs, &wanted)) {
    responder.Refuse(error);
    return;
  }
  if (!IsKnownScheduler(wanted.name)) {
    responder.Refuse(ENOENT);
    return;
  }
  int32_t slot_duration = wanted.slot_duration;
  int32_t node_type = wanted.node_type;
  std::vector<std::string> regions = wanted.regions;
  if (request.cmd == MCPS802154_CMD_SET_SCHEDULER_PARAMS) {
    // Retunes the running scheduler: what is not given is kept.
    if (wanted.name != radio->scheduler || wanted.has_regions) {
      responder.Refuse(EINVAL);
      return;
    }
    if (slot_duration == -1) slot_duration = radio->slot_duration;
    if (node_type == -1) node_type = radio->node_type;
    regions = radio->regions;
  }
  if (int error = CheckScheduler(wanted.name, slot_duration, node_type, regions)) {
    responder.Refuse(error);
    return;
  }
  if (!radios_->SetScheduler(hw_index, wanted.name, slot_duration, node_type, regions)) {
    responder.Refuse(ENODEV);  // removed meanwhile
    return;
  }
  // A new scheduler brings new regions: the old sessions are gone.
  if (request.cmd == MCPS802154_CMD_SET_SCHEDULER && fira_ != nullptr) {
    fira_->DropSessions(hw_index);
  }
}

void McpsFamily::SetCalibrations(nlattr** attrs, Responder& responder) {
  nlattr* calibrations = attrs[MCPS802154_ATTR_CALIBRATIONS];
  if (attrs[MCPS802154_ATTR_HW] == nullptr || calibrations == nullptr) {
    responder.Refuse(EINVAL);
    return;
  }
  uint32_t hw_index = nla_get_u32(attrs[MCPS802154_ATTR_HW]);
  if (!radios_->HasRadio(hw_index)) {
    responder.Refuse(ENODEV);
    return;
  }
  radios_->CountCalibrationMessage(hw_index);

  UniqueNlMsg reply = responder.NewReply(MCPS802154_CMD_SET_CALIBRATIONS);
  nla_put_u32(reply.get(), MCPS802154_ATTR_HW, hw_index);
  nlattr* verdicts = nla_nest_start(reply.get(), MCPS802154_ATTR_CALIBRATIONS);
  bool built = verdicts != nullptr;
  nlattr* element;
  int remaining;
  nla_for_each_nested(element, calibrations, remaining) {
    if (!built) break;
    nlattr* fields[MCPS802154_CALIBRATION_ATTR_MAX + 1] = {};
    if (nla_type(element) != MCPS802154_CALIBRATIONS_ATTR_CALIBRATION ||
        nla_parse_nested(fields, MCPS802154_CALIBRATION_ATTR_MAX, element,
                         kMcpsCalibrationRequestPolicy.data()) != 0 ||
        fields[MCPS802154_CALIBRATION_ATTR_KEY] == nullptr ||
        fields[MCPS802154_CALIBRATION_ATTR_VALUE] == nullptr) {
      built = PutVerdict(reply.get(), nullptr, -EINVAL);
      continue;
    }
    std::string key = nla_get_string(fields[MCPS802154_CALIBRATION_ATTR_KEY]);
    uint32_t value = nla_get_u32(fields[MCPS802154_CALIBRATION_ATTR_VALUE]);
    // Accepted keys go unmentioned: the reply names only what was refused,
    // so the status the service keeps (the last one) is never masked by a
    // later success.
    if (radios_->ReceiveCalibration(hw_index, key, value)) continue;
    if (key.size() + 1 <= kMcpsCalibrationKeyMaxLen) {
      built = PutVerdict(reply.get(), &key, -ENOENT);
    } else {
      // Too long to be named back within the reply's key limit.
      built = PutVerdict(reply.get(), nullptr, -ENAMETOOLONG);
    }
  }
  if (!built || nla_nest_end(reply.get(), verdicts) != 0) {
    responder.Refuse(EMSGSIZE);
    return;
  }
  responder.Reply(reply.get());
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
