#define LOG_TAG "dalix.uwb.McpsUtils"

#include "net/mcps_utils.h"

#include <errno.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <memory>

#include <android-base/logging.h>
#include <netlink/attr.h>
#include <netlink/genl/genl.h>

#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"

namespace hardware {
namespace dalix {
namespace {

// Room that every calibration element takes besides its key attribute: the
// element's own header and the 4-byte value.
int CalibrationElementOverhead() { return nla_total_size(0) + nla_total_size(sizeof(uint32_t)); }

// Parses a calibration value as decimal, then as hexadecimal (with or without
// 0x). Anything else, even with a valid prefix, is refused; so is an empty
// value, which would otherwise reach the radio as 0.
bool ParseCalibrationValue(const char* text, uint32_t* value) {
  if (*text == '\0') return false;
  char* end = nullptr;
  long parsed = strtol(text, &end, 10);
  if (*end != '\0') parsed = strtol(text, &end, 16);
  if (*end != '\0') return false;
  *value = static_cast<uint32_t>(parsed);
  return true;
}

// Opens a nest whose type word must not carry NLA_F_NESTED: libnl's
// nla_nest_start always sets the flag, and the driver tells these nests apart
// by the plain type.
nlattr* StartPlainNest(nl_msg* msg, int type) {
  nlattr* nest = nla_nest_start(msg, type);
  if (nest != nullptr) nest->nla_type &= ~NLA_F_NESTED;
  return nest;
}

// Applies a SET_CALIBRATIONS reply to the transfer's |status|.
void OnCalibrationReply(nl_msg* msg, int* status) {
  nlattr* attrs[MCPS802154_ATTR_MAX + 1] = {};
  int err = genlmsg_parse(nlmsg_hdr(msg), 0, attrs, MCPS802154_ATTR_MAX, nullptr);
  if (err != 0) {
    LOG(ERROR) << "Error parsing response for calibration " << err;
    // Any non-zero status ends the transfer; this one marks a reply we could not read.
    *status = EIO;
    return;
  }
  nlattr* calibrations = attrs[MCPS802154_ATTR_CALIBRATIONS];
  if (calibrations == nullptr) return;
  nlattr* element;
  int remaining;
  nla_for_each_nested(element, calibrations, remaining) {
    nlattr* fields[MCPS802154_CALIBRATION_ATTR_MAX + 1] = {};
    if (nla_parse_nested(fields, MCPS802154_CALIBRATION_ATTR_MAX, element,
                         kMcpsCalibrationPolicy.data()) != 0) {
      break;
    }
    if (fields[MCPS802154_CALIBRATION_ATTR_KEY] != nullptr) {
      LOG(ERROR) << "Error on key " << nla_get_string(fields[MCPS802154_CALIBRATION_ATTR_KEY]);
    }
    if (fields[MCPS802154_CALIBRATION_ATTR_STATUS] != nullptr) {
      *status = nla_get_s32(fields[MCPS802154_CALIBRATION_ATTR_STATUS]);
    }
  }
}

// A reported phase difference (radians, fixed point) as an angle of arrival:
// asin(phase * wavelength / (2 pi * antenna spacing)). The steps and their
// precisions are part of the result clients compare against: single
// precision except for the division by 2 pi.
float phase_to_rad(int32_t phase) {
  constexpr float kFixedPointScale = 0.00048828125f;  // 2^-11
  constexpr double kTwoPi = 6.283185307179586;
  static_assert(kFixedPointScale == 1.0f / (1 << kMcpsPdoaFractionalBits));

  // The absent-value marker, and anything else below the smallest phase.
  if (phase < -32767) return std::numeric_limits<float>::quiet_NaN();
  float x = static_cast<float>(phase) * kFixedPointScale;
  x *= kMcpsCarrierWavelengthMetres;
  x = static_cast<float>(static_cast<double>(x) / kTwoPi);
  x /= kMcpsAntennaSpacingMetres;
  x = std::clamp(x, -1.0f, 1.0f);
  return asinf(x);
}

}  // namespace

McpsUtils::McpsUtils(NlSocketFactory* socket_factory) : socket_factory_(socket_factory) {}

McpsUtils::~McpsUtils() = default;

bool McpsUtils::Start() {
  std::unique_ptr<NlSocket> socket = socket_factory_->Create();
  if (!socket) return false;
  int id = socket->Resolve(kMcpsFamilyName);
  net_id_ = static_cast<uint32_t>(id);
  if (id < 0) {
    LOG(ERROR) << __func__ << ": Generic netlink mcps802154 not found.";
    return false;
  }
  return true;
}

uint32_t McpsUtils::GetNetId() const { return net_id_; }

std::vector<McpsHwInfo> McpsUtils::ListHardware(bool* ok) {
  LOG(INFO) << __func__;
  std::vector<McpsHwInfo> radios;
  UniqueNlMsg msg;
  // A dump request carries no hardware index, so SetMcpsCommand does not apply.
  genlmsg_put(msg.get(), NL_AUTO_PORT, NL_AUTO_SEQ, net_id_, 0, NLM_F_DUMP,
              MCPS802154_CMD_GET_HW, 0);
  *ok = socket_factory_->SendAndAwaitResponse(
      msg.get(),
      [&radios](nl_msg* reply) {
        McpsHwInfo info;
        if (ParseHwInfo(reply, &info)) radios.push_back(info);
      },
      MCPS802154_CMD_NEW_HW);
  return radios;
}

McpsHwInfo McpsUtils::GetHardwareInfo(uint32_t hw_index, bool* ok) {
  LOG(INFO) << __func__;
  McpsHwInfo info;
  UniqueNlMsg msg;
  if (!SetMcpsCommand(msg.get(), hw_index, MCPS802154_CMD_GET_HW, 0)) {
    *ok = false;
    return info;
  }
  // A partial reply still counts: callers go by the exchange's result.
  *ok = socket_factory_->SendAndAwaitResponse(
      msg.get(), [&info](nl_msg* reply) { ParseHwInfo(reply, &info); }, MCPS802154_CMD_NEW_HW);
  return info;
}

std::string McpsUtils::SchedulerName(McpsScheduler scheduler) {
  switch (scheduler) {
    case McpsScheduler::kDefault:
      return kMcpsSchedulerDefault;
    case McpsScheduler::kSimpleRanging:
      return kMcpsSchedulerSimpleRanging;
    case McpsScheduler::kEndless:
      return kMcpsSchedulerEndless;
  }
  return std::to_string(static_cast<int>(scheduler));
}

bool McpsUtils::SetScheduler(uint32_t hw_index, McpsScheduler scheduler,
                             SlotDuration slot_duration, NodeType node_type, bool params_only) {
  LOG(INFO) << __func__;
  UniqueNlMsg msg;
  uint8_t cmd = params_only ? MCPS802154_CMD_SET_SCHEDULER_PARAMS : MCPS802154_CMD_SET_SCHEDULER;
  if (!SetMcpsCommand(msg.get(), hw_index, cmd, 0)) return false;

  auto put_attributes = [&]() {
    if (nla_put_string(msg.get(), MCPS802154_ATTR_SCHEDULER_NAME,
                       SchedulerName(scheduler).c_str()) != 0) {
      return false;
    }
    if (slot_duration == kNoSlotDuration && node_type == kNoNodeType) return true;
    nlattr* params = nla_nest_start(msg.get(), MCPS802154_ATTR_SCHEDULER_PARAMS | NLA_F_NESTED);
    if (params == nullptr) return false;
    if (slot_duration != kNoSlotDuration &&
        nla_put_u32(msg.get(), MCPS802154_SCHEDULER_PARAMS_ATTR_SLOT_DURATION,
                    static_cast<uint32_t>(slot_duration)) != 0) {
      return false;
    }
    if (node_type != kNoNodeType &&
        nla_put_u32(msg.get(), MCPS802154_SCHEDULER_PARAMS_ATTR_NODE_TYPE,
                    static_cast<uint32_t>(node_type)) != 0) {
      return false;
    }
    return nla_nest_end(msg.get(), params) == 0;
  };
  if (!put_attributes()) {
    LOG(ERROR) << __func__ << " Error creating MCPS message";
    return false;
  }
  return socket_factory_->SendAndAwaitAck(msg.get());
}

bool McpsUtils::SetFiraRegion(uint32_t hw_index) {
  LOG(INFO) << __func__;
  UniqueNlMsg msg;
  if (!SetMcpsCommand(msg.get(), hw_index, MCPS802154_CMD_SET_SCHEDULER, 0)) return false;

  auto put_attributes = [&]() {
    if (nla_put_string(msg.get(), MCPS802154_ATTR_SCHEDULER_NAME, kMcpsSchedulerEndless) != 0) {
      return false;
    }
    nlattr* regions = StartPlainNest(msg.get(), MCPS802154_ATTR_SCHEDULER_REGIONS);
    if (regions == nullptr) return false;
    nlattr* region = StartPlainNest(msg.get(), MCPS802154_SCHEDULER_REGIONS_ATTR_REGION);
    if (region == nullptr) return false;
    if (nla_put_string(msg.get(), MCPS802154_REGION_ATTR_NAME, kMcpsRegionFira) != 0) return false;
    return nla_nest_end(msg.get(), region) == 0 && nla_nest_end(msg.get(), regions) == 0;
  };
  if (!put_attributes()) {
    LOG(ERROR) << __func__ << ": Error creating MCPS message";
    return false;
  }
  return socket_factory_->SendAndAwaitAck(msg.get());
}

int McpsUtils::CalibrationPayloadBudget() { return getpagesize() - NLMSG_HDRLEN; }

bool McpsUtils::SetCalibration(uint32_t hw_index, ConfigUtils* config) {
  if (config == nullptr) {
    LOG(ERROR) << __func__ << " Bad argument";
    return false;
  }
  ConfigUtils::Map::iterator key = config->GetIterator();
  ConfigUtils::Map::iterator end = config->GetEnd();
  // One socket for the whole transfer: the driver sees one client.
  std::shared_ptr<NlSocket> socket = socket_factory_->Create();
  if (!socket) {
    LOG(ERROR) << __func__ << ": BAD_ALLOC: cannot allocate NlSocket";
    return false;
  }
  const int budget = CalibrationPayloadBudget();
  const int overhead = CalibrationElementOverhead();
  bool skipped = false;
  int status = 0;

  while (key != end && status == 0) {
    UniqueNlMsg msg;
    if (!SetMcpsCommand(msg.get(), hw_index, MCPS802154_CMD_SET_CALIBRATIONS, 0)) return false;
    nlattr* calibrations =
        nla_nest_start(msg.get(), MCPS802154_ATTR_CALIBRATIONS | NLA_F_NESTED);
    if (calibrations == nullptr) {
      LOG(ERROR) << __func__ << ": Error creating MCPS message";
      return false;
    }
    const int base = static_cast<int>(nlmsg_datalen(nlmsg_hdr(msg.get())));
    const int key_room = budget - base - overhead;
    int length = base;
    int added = 0;

    for (; key != end; ++key) {
      const char* name = key->first.c_str();
      const int key_size = nla_total_size(static_cast<int>(strlen(name)) + 1);
      if (key_size > key_room) {
        LOG(ERROR) << "Skip incorrect key " << name;
        skipped = true;
        continue;
      }
      if (length + overhead + key_size > budget) break;  // starts the next message
      const char* text = config->GetValue(name);
      uint32_t value = 0;
      if (text == nullptr || !ParseCalibrationValue(text, &value)) {
        LOG(WARNING) << "Skip incorrect key " << name;
        skipped = true;
        continue;
      }
      nlattr* element = nla_nest_start(msg.get(), MCPS802154_CALIBRATIONS_ATTR_CALIBRATION |
                                                      NLA_F_NESTED);
      if (element == nullptr || nla_put_string(msg.get(), MCPS802154_CALIBRATION_ATTR_KEY, name) ||
          nla_put_u32(msg.get(), MCPS802154_CALIBRATION_ATTR_VALUE, value) ||
          nla_nest_end(msg.get(), element)) {
        LOG(ERROR) << "PutCalibrationKeys: Error creating MCPS message";
        return false;
      }
      length += overhead + key_size;
      ++added;
    }

    if (nla_nest_end(msg.get(), calibrations) != 0) {
      LOG(ERROR) << __func__ << ": Error creating MCPS message";
      return false;
    }
    if (added == 0) continue;  // every key of this round was skipped
    bool sent = socket->SendAndAwaitResponse(
        msg.get(), [&status](nl_msg* reply) { OnCalibrationReply(reply, &status); },
        MCPS802154_CMD_SET_CALIBRATIONS);
    if (!sent) return false;
  }
  return !skipped && status == 0;
}

bool McpsUtils::SetRangingRequests(uint32_t hw_index, const std::vector<RangingRequest>& requests) {
  LOG(INFO) << __func__;
  if (!ranging_handler_) {
    LOG(WARNING) << __func__ << ": The ranging result handler needs to be set first";
    return false;
  }
  CloseRangingSocket();
  ranging_requests_.clear();
  if (requests.empty()) {
    LOG(INFO) << __func__ << ": requests empty";
    return true;
  }
  std::shared_ptr<NlSocket> socket = socket_factory_->Create();
  if (!socket) return false;
  UniqueNlMsg msg;
  if (!RangingRequestsToNlMsg(msg.get(), hw_index, requests)) return false;
  if (!socket->SendAndAwaitAck(msg.get(), nullptr)) return false;
  // Reports come unasked, with sequence 0: nothing to acknowledge or match.
  socket->DisableAutoAck();
  if (!socket->WatchNetlinkSocket(socket,
                                  [this](nl_msg* report) { return OnRangingResult(report); })) {
    return false;
  }
  ranging_socket_ = std::move(socket);
  ranging_requests_ = requests;
  return true;
}

void McpsUtils::SubscribeRangingResults(RangingResultHandler handler) {
  ranging_handler_ = std::move(handler);
}

void McpsUtils::UnsubscribeRangingResults() {
  LOG(INFO) << __func__;
  CloseRangingSocket();
  std::vector<RangingRequest>().swap(ranging_requests_);
  ranging_handler_ = nullptr;
}

void McpsUtils::CloseRangingSocket() {
  if (!ranging_socket_) return;
  LOG(INFO) << __func__ << ": Close ranging socket";
  ranging_socket_.reset();
}

int McpsUtils::OnRangingResult(nl_msg* msg) {
  LOG(INFO) << __func__;
  nlmsghdr* header = nlmsg_hdr(msg);
  // A message too short for the generic header cannot be a report.
  int cmd = genlmsg_valid_hdr(header, 0) ? static_cast<int>(genlmsg_hdr(header)->cmd)
                                         : static_cast<int>(MCPS802154_CMD_UNSPEC);
  if (cmd != MCPS802154_CMD_RANGING_REPORT) {
    LOG(WARNING) << __func__ << ": Incorrect command received: " << cmd;
    return NL_STOP;
  }
  if (ranging_requests_.empty() || !ranging_handler_) return NL_STOP;

  nlattr* attrs[MCPS802154_ATTR_MAX + 1] = {};
  if (genlmsg_parse(header, 0, attrs, MCPS802154_ATTR_MAX, kMcpsRangingReportPolicy.data()) != 0) {
    LOG(WARNING) << __func__ << ": Failed to parse attr";
    return NL_STOP;
  }
  if (attrs[MCPS802154_ATTR_HW] == nullptr || attrs[MCPS802154_ATTR_RANGING_RESULT] == nullptr) {
    LOG(WARNING) << __func__ << ": Missing HW or RANGING_RESULT";
    return NL_STOP;
  }
  nlattr* fields[MCPS802154_RANGING_RESULT_ATTR_MAX + 1] = {};
  if (nla_parse_nested(fields, MCPS802154_RANGING_RESULT_ATTR_MAX,
                       attrs[MCPS802154_ATTR_RANGING_RESULT],
                       kMcpsRangingResultPolicy.data()) != 0) {
    LOG(WARNING) << __func__ << ": Failed to parse nested attr";
    return NL_STOP;
  }
  if (fields[MCPS802154_RANGING_RESULT_ATTR_REQUEST_ID] == nullptr) return NL_STOP;
  auto value_or_absent = [&fields](int id, bool is_signed) -> int32_t {
    nlattr* attr = fields[id];
    if (attr == nullptr) return kMcpsRangingValueAbsent;
    return is_signed ? nla_get_s32(attr) : static_cast<int32_t>(nla_get_u32(attr));
  };
  const auto id =
      static_cast<int32_t>(nla_get_u32(fields[MCPS802154_RANGING_RESULT_ATTR_REQUEST_ID]));
  auto request = std::find_if(ranging_requests_.begin(), ranging_requests_.end(),
                              [id](const RangingRequest& r) { return r.id == id; });
  if (request == ranging_requests_.end()) {
    LOG(WARNING) << __func__ << ": Received result for unknown request";
    return NL_STOP;
  }
  RangingResult result;
  result.id = id;
  result.peerAddress = request->peerAddress;
  result.measurement = value_or_absent(MCPS802154_RANGING_RESULT_ATTR_MEASUREMENT, false);
  result.firstAngleRad = phase_to_rad(value_or_absent(MCPS802154_RANGING_RESULT_ATTR_PDOA_1, true));
  result.secondAngleRad =
      phase_to_rad(value_or_absent(MCPS802154_RANGING_RESULT_ATTR_PDOA_2, true));
  ranging_handler_(result);
  return NL_STOP;
}

bool McpsUtils::SetMcpsCommand(nl_msg* msg, uint32_t hw_index, uint8_t cmd, int flags) {
  // The header cannot fail on an empty message, and an unresolved family id is
  // left for the driver to refuse.
  genlmsg_put(msg, NL_AUTO_PORT, NL_AUTO_SEQ, net_id_, 0, flags, cmd, 0);
  if (nla_put_u32(msg, MCPS802154_ATTR_HW, hw_index) != 0) {
    LOG(ERROR) << __func__ << ": Error creating MCPS message";
    return false;
  }
  return true;
}

bool McpsUtils::RangingRequestsToNlMsg(nl_msg* msg, uint32_t hw_index,
                                       const std::vector<RangingRequest>& requests) {
  if (!SetMcpsCommand(msg, hw_index, MCPS802154_CMD_SET_RANGING_REQUESTS, 0)) return false;
  auto put_requests = [&]() {
    nlattr* list = nla_nest_start(msg, MCPS802154_ATTR_RANGING_REQUESTS | NLA_F_NESTED);
    if (list == nullptr) return false;
    for (const RangingRequest& request : requests) {
      nlattr* element =
          nla_nest_start(msg, MCPS802154_RANGING_REQUESTS_ATTR_REQUEST | NLA_F_NESTED);
      if (element == nullptr ||
          nla_put_u32(msg, MCPS802154_RANGING_REQUEST_ATTR_ID, static_cast<uint32_t>(request.id)) ||
          nla_put_u32(msg, MCPS802154_RANGING_REQUEST_ATTR_PARAMETER,
                      static_cast<uint32_t>(request.parameter)) ||
          nla_put_u64(msg, MCPS802154_RANGING_REQUEST_ATTR_PEER,
                      static_cast<uint64_t>(request.peerAddress)) ||
          nla_nest_end(msg, element)) {
        return false;
      }
    }
    return nla_nest_end(msg, list) == 0;
  };
  if (!put_requests()) {
    LOG(ERROR) << __func__ << ": Error creating MCPS message";
    return false;
  }
  return true;
}

bool McpsUtils::ParseHwInfo(nl_msg* msg, McpsHwInfo* info) {
  nlattr* attrs[MCPS802154_ATTR_MAX + 1] = {};
  if (genlmsg_parse(nlmsg_hdr(msg), 0, attrs, MCPS802154_ATTR_MAX, kMcpsNewHwPolicy.data()) !=
      0) {
    LOG(WARNING) << __func__ << ": Failed to parse mcps attributes";
    return false;
  }
  if (attrs[MCPS802154_ATTR_HW] == nullptr || attrs[MCPS802154_ATTR_WPAN_PHY_NAME] == nullptr) {
    LOG(WARNING) << __func__ << ": Missing mcps attribute";
    return false;
  }
  info->hw_index = nla_get_u32(attrs[MCPS802154_ATTR_HW]);
  info->scheduler = attrs[MCPS802154_ATTR_SCHEDULER_NAME] != nullptr
                        ? nla_get_string(attrs[MCPS802154_ATTR_SCHEDULER_NAME])
                        : kMcpsSchedulerDefault;

  const char* phy_name = nla_get_string(attrs[MCPS802154_ATTR_WPAN_PHY_NAME]);
  const size_t prefix_length = strlen(kMcpsPhyNamePrefix);
  if (strncmp(phy_name, kMcpsPhyNamePrefix, prefix_length) != 0) return false;
  // Same reading as std::stoul (leading blanks skipped, stops at the first
  // non-digit), but a name with no number is refused instead of throwing.
  const char* number = phy_name + prefix_length;
  char* end = nullptr;
  const int saved_errno = errno;
  errno = 0;
  unsigned long phy_index = strtoul(number, &end, 10);
  const bool parsed = end != number && errno != ERANGE;
  errno = saved_errno;
  if (!parsed) return false;
  info->phy_index = static_cast<uint32_t>(phy_index);
  return true;
}

}  // namespace dalix
}  // namespace hardware
