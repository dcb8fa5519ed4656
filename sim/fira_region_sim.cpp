#define LOG_TAG "dalix.sim.FiraRegionSim"

#include "sim/fira_region_sim.h"

#include <time.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstring>
#include <string>

#include <android-base/logging.h>
#include <netlink/attr.h>

#include "net/fira_region.h"
#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

// Status of a measurement whose peer did not answer: out of range, or no
// such device.
constexpr uint8_t kStatusNoResponse = 1;
// The driver's default ranging block when the session sets none.
constexpr uint32_t kDefaultBlockDurationMs = 200;
constexpr size_t kMaxControlees = 16;
// Confidence the simulated antennas give an angle, with and without line of
// sight.
constexpr double kLineOfSightConfidence = 0.9;
constexpr double kNonLineOfSightConfidence = 0.4;
constexpr size_t kStaticStsKeyLen = 8;

uint64_t MonotonicNowNs() {
  timespec now = {};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<uint64_t>(now.tv_sec) * 1000000000ull + static_cast<uint64_t>(now.tv_nsec);
}

bool IsAntennaPair(uint32_t value) {
  return value <= kFiraMaxAntennaPair || value == kFiraNoAntennaPair;
}

// Whether the driver takes |value| for session parameter |attr|.
bool IsValidParam(int attr, uint32_t value) {
  switch (attr) {
    case FIRA_SESSION_PARAM_ATTR_DEVICE_TYPE:
    case FIRA_SESSION_PARAM_ATTR_DEVICE_ROLE:
    case FIRA_SESSION_PARAM_ATTR_HOPPING_ENABLED:
    case FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_ENABLED:
    case FIRA_SESSION_PARAM_ATTR_RESULT_REPORT_PHASE:
    case FIRA_SESSION_PARAM_ATTR_MEASUREMENT_REPORT_TYPE:
    case FIRA_SESSION_PARAM_ATTR_DEFERRED_MODE:
    case FIRA_SESSION_PARAM_ATTR_PRF_MODE:
    case FIRA_SESSION_PARAM_ATTR_PREAMBLE_DURATION:
    case FIRA_SESSION_PARAM_ATTR_BPRF_PHR_DATA_RATE:
    case FIRA_SESSION_PARAM_ATTR_FCS_TYPE:
    case FIRA_SESSION_PARAM_ATTR_TX_ADAPTIVE_PAYLOAD_POWER:
    case FIRA_SESSION_PARAM_ATTR_AOA_PAIR_MODE:
    case FIRA_SESSION_PARAM_ATTR_KEY_ROTATION:
    case FIRA_SESSION_PARAM_ATTR_AOA_RESULT_REQUEST:
    case FIRA_SESSION_PARAM_ATTR_REPORT_TOF:
    case FIRA_SESSION_PARAM_ATTR_REPORT_AOA_AZIMUTH:
    case FIRA_SESSION_PARAM_ATTR_REPORT_AOA_ELEVATION:
    case FIRA_SESSION_PARAM_ATTR_REPORT_AOA_FOM:
      return value <= 1;
    case FIRA_SESSION_PARAM_ATTR_RANGING_ROUND_USAGE:
      return value == 1 || value == 2;
    case FIRA_SESSION_PARAM_ATTR_MULTI_NODE_MODE:
    case FIRA_SESSION_PARAM_ATTR_STS_CONFIG:
    case FIRA_SESSION_PARAM_ATTR_STS_SEGMENT_COUNT:
      return value <= 2;
    case FIRA_SESSION_PARAM_ATTR_SLOT_DURATION_RSTU:
    case FIRA_SESSION_PARAM_ATTR_SLOTS_PER_RANGING_ROUND:
      return value >= 1;
    case FIRA_SESSION_PARAM_ATTR_RANGING_BLOCK_DURATION_MS:
      return value >= 1 && value <= 60000;
    case FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_VALUE:
      return value <= 255;
    case FIRA_SESSION_PARAM_ATTR_CHANNEL_NUMBER:
      return value == 5 || value == 6 || value == 8 || value == 9 || value == 10 || value == 12 ||
             value == 13 || value == 14;
    case FIRA_SESSION_PARAM_ATTR_PREAMBLE_CODE_INDEX:
      return value >= 9 && value <= 32;
    case FIRA_SESSION_PARAM_ATTR_RFRAME_CONFIG:
      return value == 0 || value == 1 || value == 3;
    case FIRA_SESSION_PARAM_ATTR_SFD_ID:
      return value <= 4;
    case FIRA_SESSION_PARAM_ATTR_PSDU_DATA_RATE:
      return value <= 3;
    case FIRA_SESSION_PARAM_ATTR_AZIMUTH_ANTENNA_PAIR:
    case FIRA_SESSION_PARAM_ATTR_ELEVATION_ANTENNA_PAIR:
      return IsAntennaPair(value);
    case FIRA_SESSION_PARAM_ATTR_TX_ANTENNA_MASK:
      return value != 0;
    case FIRA_SESSION_PARAM_ATTR_KEY_ROTATION_RATE:
      return value <= 15;
    default:
      return true;
  }
}

uint32_t ReadParam(nlattr* attr, int width) {
  switch (width) {
    case 1:
      return nla_get_u8(attr);
    case 2:
      return nla_get_u16(attr);
    default:
      return nla_get_u32(attr);
  }
}

FiraAoaData PairData(uint32_t pair, int16_t first, int16_t second, uint8_t fom) {
  FiraAoaData aoa;
  aoa.antenna_pair = static_cast<uint8_t>(pair);
  aoa.first_angle = first;
  aoa.figure_of_merit = fom;
  aoa.second_angle = second;
  return aoa;
}

}  // namespace

std::optional<uint32_t> SimFiraSession::Param(int attr) const {
  auto found = params.find(attr);
  if (found == params.end()) return std::nullopt;
  return found->second;
}

FiraRegionSim::FiraRegionSim(DriverSimulator* simulator, RadioStore* radios, World* world)
    : simulator_(simulator), radios_(radios), world_(world) {}

void FiraRegionSim::SetRadioUpCheck(std::function<bool(uint32_t)> is_up) {
  std::lock_guard<std::mutex> lock(mutex_);
  is_up_ = std::move(is_up);
}

void FiraRegionSim::SetNotifyOnStart(bool notify) {
  std::lock_guard<std::mutex> lock(mutex_);
  notify_on_start_ = notify;
}

std::optional<SimFiraSession> FiraRegionSim::Session(uint32_t hw_index, uint32_t session_id) const {
  std::lock_guard<std::mutex> lock(mutex_);
  auto found = sessions_.find({hw_index, session_id});
  if (found == sessions_.end()) return std::nullopt;
  return found->second;
}

std::vector<SimFiraSession> FiraRegionSim::Sessions() const {
  std::lock_guard<std::mutex> lock(mutex_);
  std::vector<SimFiraSession> sessions;
  for (const auto& entry : sessions_) sessions.push_back(entry.second);
  return sessions;
}

void FiraRegionSim::DropSessions(uint32_t hw_index) {
  std::lock_guard<std::mutex> lock(mutex_);
  for (auto it = sessions_.begin(); it != sessions_.end();) {
    if (it->first.first == hw_index) {
      generations_.erase(it->first);
      it = sessions_.erase(it);
    } else {
      ++it;
    }
  }
}

void FiraRegionSim::HandleCall(const Request& request, nlattr** attrs, Responder& responder) {
  if (attrs[MCPS802154_ATTR_HW] == nullptr || attrs[MCPS802154_ATTR_SCHEDULER_NAME] == nullptr ||
      attrs[MCPS802154_ATTR_SCHEDULER_REGION_CALL] == nullptr) {
    responder.Refuse(EINVAL);
    return;
  }
  const uint32_t hw_index = nla_get_u32(attrs[MCPS802154_ATTR_HW]);
  std::optional<SimRadio> radio = radios_->Radio(hw_index);
  if (!radio) {
    responder.Refuse(ENODEV);
    return;
  }
  // Calls reach a region only through the scheduler that runs it.
  if (radio->scheduler != nla_get_string(attrs[MCPS802154_ATTR_SCHEDULER_NAME])) {
    responder.Refuse(EINVAL);
    return;
  }
  nlattr* call[MCPS802154_REGION_CALL_ATTR_MAX + 1] = {};
  nlattr* params[FIRA_CALL_ATTR_MAX + 1] = {};
  if (nla_parse_nested(call, MCPS802154_REGION_CALL_ATTR_MAX,
                       attrs[MCPS802154_ATTR_SCHEDULER_REGION_CALL],
                       kFiraRegionCallPolicy.data()) != 0 ||
      call[MCPS802154_REGION_CALL_ATTR_REGION_NAME] == nullptr ||
      call[MCPS802154_REGION_CALL_ATTR_CALL] == nullptr ||
      call[MCPS802154_REGION_CALL_ATTR_CALL_PARAMS] == nullptr ||
      nla_parse_nested(params, FIRA_CALL_ATTR_MAX, call[MCPS802154_REGION_CALL_ATTR_CALL_PARAMS],
                       kFiraCallPolicy.data()) != 0 ||
      params[FIRA_CALL_ATTR_SESSION_ID] == nullptr) {
    responder.Refuse(EINVAL);
    return;
  }
  const std::string region = nla_get_string(call[MCPS802154_REGION_CALL_ATTR_REGION_NAME]);
  if (region != kMcpsRegionFira ||
      std::find(radio->regions.begin(), radio->regions.end(), region) == radio->regions.end()) {
    responder.Refuse(ENOENT);
    return;
  }
  const uint32_t call_id = nla_get_u32(call[MCPS802154_REGION_CALL_ATTR_CALL]);
  const uint32_t session_id = nla_get_u32(params[FIRA_CALL_ATTR_SESSION_ID]);

  std::lock_guard<std::mutex> lock(mutex_);
  if (call_id == FIRA_CALL_SESSION_INIT) {
    if (int error = InitSession(hw_index, session_id)) responder.Refuse(error);
    return;
  }
  auto found = sessions_.find({hw_index, session_id});
  if (found == sessions_.end()) {
    responder.Refuse(ENOENT);
    return;
  }
  SimFiraSession* session = &found->second;
  int error = 0;
  switch (call_id) {
    case FIRA_CALL_SESSION_SET_PARAMS:
      error = SetParams(session, params[FIRA_CALL_ATTR_SESSION_PARAMS]);
      break;
    case FIRA_CALL_NEW_CONTROLEE:
    case FIRA_CALL_DEL_CONTROLEE:
      error = ChangeControlees(session, params[FIRA_CALL_ATTR_CONTROLEES],
                               call_id == FIRA_CALL_NEW_CONTROLEE);
      break;
    case FIRA_CALL_SESSION_START:
      error = StartSession(session, request);
      break;
    case FIRA_CALL_SESSION_STOP:
      error = StopSession(session);
      break;
    case FIRA_CALL_SESSION_DEINIT:
      if (session->active) {
        error = EBUSY;
      } else {
        generations_.erase(found->first);
        sessions_.erase(found);
      }
      break;
    default:
      error = EOPNOTSUPP;
      break;
  }
  if (error != 0) responder.Refuse(error);
}

int FiraRegionSim::InitSession(uint32_t hw_index, uint32_t session_id) {
  Key key{hw_index, session_id};
  if (sessions_.count(key) > 0) return EBUSY;
  SimFiraSession& session = sessions_[key];
  session.hw_index = hw_index;
  session.session_id = session_id;
  return 0;
}

int FiraRegionSim::SetParams(SimFiraSession* session, nlattr* params) {
  if (params == nullptr) return EINVAL;
  nlattr* fields[FIRA_SESSION_PARAM_ATTR_MAX + 1] = {};
  if (nla_parse_nested(fields, FIRA_SESSION_PARAM_ATTR_MAX, params,
                       kFiraSessionParamsPolicy.data()) != 0) {
    return EINVAL;
  }
  std::map<int, uint32_t> values;
  for (int attr = 1; attr <= FIRA_SESSION_PARAM_ATTR_MAX; ++attr) {
    const int width = FiraSessionParamWidth(attr);
    if (fields[attr] == nullptr || width == 0) continue;
    values[attr] = ReadParam(fields[attr], width);
    if (!IsValidParam(attr, values[attr])) return EINVAL;
  }
  nlattr* key = fields[FIRA_SESSION_PARAM_ATTR_STATIC_STS_KEY];
  if (key != nullptr && static_cast<size_t>(nla_len(key)) != kStaticStsKeyLen) return EINVAL;
  // A running session takes a new block striding, and nothing else.
  if (session->active &&
      (key != nullptr || std::any_of(values.begin(), values.end(), [](const auto& value) {
         return value.first != FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_VALUE;
       }))) {
    return EBUSY;
  }
  for (const auto& value : values) session->params[value.first] = value.second;
  if (key != nullptr) {
    const auto* bytes = static_cast<const uint8_t*>(nla_data(key));
    session->static_sts_key.assign(bytes, bytes + nla_len(key));
  }
  ++session->set_params_calls;
  return 0;
}

int FiraRegionSim::ChangeControlees(SimFiraSession* session, nlattr* list, bool add) {
  if (list == nullptr) return EINVAL;
  std::vector<SimFiraControlee> requested;
  nlattr* entry;
  int remaining;
  nla_for_each_nested(entry, list, remaining) {
    nlattr* fields[FIRA_CALL_CONTROLEE_ATTR_MAX + 1] = {};
    if (nla_parse_nested(fields, FIRA_CALL_CONTROLEE_ATTR_MAX, entry,
                         kFiraControleePolicy.data()) != 0 ||
        fields[FIRA_CALL_CONTROLEE_ATTR_SHORT_ADDR] == nullptr) {
      return EINVAL;
    }
    SimFiraControlee controlee;
    controlee.short_address = nla_get_u16(fields[FIRA_CALL_CONTROLEE_ATTR_SHORT_ADDR]);
    if (nlattr* sub_session = fields[FIRA_CALL_CONTROLEE_ATTR_SUB_SESSION_ID]) {
      controlee.sub_session_id = nla_get_u32(sub_session);
    }
    requested.push_back(controlee);
  }
  if (requested.empty()) return EINVAL;

  std::vector<SimFiraControlee> updated = session->controlees;
  for (const SimFiraControlee& controlee : requested) {
    auto same = std::find_if(updated.begin(), updated.end(), [&](const SimFiraControlee& known) {
      return known.short_address == controlee.short_address;
    });
    if (add) {
      if (same != updated.end()) return EEXIST;
      updated.push_back(controlee);
    } else {
      if (same == updated.end()) return ENOENT;
      updated.erase(same);
    }
  }
  if (updated.size() > kMaxControlees) return ENOSPC;
  session->controlees = std::move(updated);
  return 0;
}

int FiraRegionSim::StartSession(SimFiraSession* session, const Request& request) {
  if (session->active) return EBUSY;
  session->active = true;
  session->port = request.port;
  session->family_id = request.family_id;
  session->rounds = 0;
  const Key key{session->hw_index, session->session_id};
  const uint64_t generation = next_generation_++;
  generations_[key] = generation;
  if (notify_on_start_) SendRound(session);
  ScheduleRound(key, generation, RoundIntervalMs(*session));
  return 0;
}

int FiraRegionSim::StopSession(SimFiraSession* session) {
  if (!session->active) return EINVAL;
  session->active = false;
  generations_.erase({session->hw_index, session->session_id});
  SendStopped(*session);
  return 0;
}

uint32_t FiraRegionSim::RoundIntervalMs(const SimFiraSession& session) {
  uint32_t block_ms = session.Param(FIRA_SESSION_PARAM_ATTR_RANGING_BLOCK_DURATION_MS)
                          .value_or(kDefaultBlockDurationMs);
  uint32_t stride = 0;
  if (session.Param(FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_ENABLED).value_or(0) == 1) {
    // A stride of N skips N blocks between two that range.
    stride = session.Param(FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_VALUE).value_or(0);
  }
  return block_ms * (stride + 1);
}

void FiraRegionSim::ScheduleRound(Key key, uint64_t generation, uint32_t delay_ms) {
  simulator_->Post([this, key, generation] { Round(key, generation); },
                   std::chrono::milliseconds(delay_ms));
}

void FiraRegionSim::Round(Key key, uint64_t generation) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto current = generations_.find(key);
  if (current == generations_.end() || current->second != generation) return;
  SimFiraSession& session = sessions_.at(key);
  if (!is_up_ || is_up_(session.hw_index)) SendRound(&session);
  // The interval is read again, so that a new block striding applies from
  // the next round on.
  ScheduleRound(key, generation, RoundIntervalMs(session));
}

FiraNotificationData FiraRegionSim::RoundData(const SimFiraSession& session,
                                              uint64_t timestamp_ns) {
  FiraNotificationData data;
  data.hw_index = session.hw_index;
  data.session_id = session.session_id;
  data.timestamp_ns = timestamp_ns;
  data.index = session.next_index;
  data.measurements.emplace();

  std::vector<uint16_t> peers;
  for (const SimFiraControlee& controlee : session.controlees) {
    peers.push_back(controlee.short_address);
  }
  if (auto destination = session.Param(FIRA_SESSION_PARAM_ATTR_DESTINATION_SHORT_ADDR)) {
    if (std::find(peers.begin(), peers.end(), *destination) == peers.end()) {
      peers.push_back(static_cast<uint16_t>(*destination));
    }
  }
  const double time_s = world_->SecondsAt(timestamp_ns);
  const bool angles = session.Param(FIRA_SESSION_PARAM_ATTR_AOA_RESULT_REQUEST).value_or(0) == 1;
  auto asked = [&session](int attr) { return session.Param(attr).value_or(0) == 1; };
  const uint32_t azimuth_pair =
      session.Param(FIRA_SESSION_PARAM_ATTR_AZIMUTH_ANTENNA_PAIR).value_or(kFiraNoAntennaPair);
  const uint32_t elevation_pair =
      session.Param(FIRA_SESSION_PARAM_ATTR_ELEVATION_ANTENNA_PAIR).value_or(kFiraNoAntennaPair);

  for (uint16_t peer : peers) {
    FiraMeasurementData& m = data.measurements->emplace_back();
    m.short_address = peer;
    std::optional<Observation> view = world_->Measure(session.hw_index, peer, time_s);
    if (view && view->stopped) {
      m.stopped = true;
      m.status = 0;
      continue;
    }
    if (!view || !view->in_range) {
      m.status = kStatusNoResponse;
      continue;
    }
    m.status = 0;
    m.line_of_sight = view->line_of_sight;
    m.non_line_of_sight = !view->line_of_sight;
    m.distance_cm = static_cast<uint32_t>(std::lround(view->distance_m * 100));
    if (!angles) continue;

    const int16_t azimuth = FiraAzimuthRaw(view->azimuth_rad);
    // Angle nests count both angles in the azimuth unit.
    const int16_t elevation_in_nest = FiraAzimuthRaw(view->elevation_rad);
    const uint8_t fom = FiraFigureOfMeritRaw(view->line_of_sight ? kLineOfSightConfidence
                                                                 : kNonLineOfSightConfidence);
    if (asked(FIRA_SESSION_PARAM_ATTR_REPORT_AOA_AZIMUTH)) {
      m.azimuth = azimuth;
      if (asked(FIRA_SESSION_PARAM_ATTR_REPORT_AOA_FOM)) m.azimuth_fom = fom;
    }
    if (asked(FIRA_SESSION_PARAM_ATTR_REPORT_AOA_ELEVATION)) {
      m.elevation = FiraElevationRaw(view->elevation_rad);
      if (asked(FIRA_SESSION_PARAM_ATTR_REPORT_AOA_FOM)) m.elevation_fom = fom;
    }
    // Each pair's nest leads with the angle the pair measures. In pair mode
    // the azimuth pair reports in the nest that names its pair.
    if (asked(FIRA_SESSION_PARAM_ATTR_AOA_PAIR_MODE) && azimuth_pair != kFiraNoAntennaPair) {
      m.aoa = PairData(azimuth_pair, azimuth, elevation_in_nest, fom);
      continue;
    }
    if (azimuth_pair != kFiraNoAntennaPair) {
      m.aoa_azimuth = PairData(azimuth_pair, azimuth, elevation_in_nest, fom);
    }
    if (elevation_pair != kFiraNoAntennaPair) {
      m.aoa_elevation = PairData(elevation_pair, elevation_in_nest, azimuth, fom);
    }
  }
  return data;
}

void FiraRegionSim::SendRound(SimFiraSession* session) {
  FiraNotificationData data = RoundData(*session, MonotonicNowNs());
  ++session->next_index;
  ++session->rounds;
  UniqueNlMsg msg;
  if (!EncodeFiraNotification(msg.get(), session->family_id, data)) {
    LOG(ERROR) << "SendRound: notification of session " << session->session_id
               << " does not fit in a message";
    return;
  }
  if (simulator_->SendEvent(session->port, msg.get())) ++session->notifications_sent;
}

void FiraRegionSim::SendStopped(const SimFiraSession& session) {
  FiraNotificationData data;
  data.hw_index = session.hw_index;
  data.session_id = session.session_id;
  data.stopped = true;
  UniqueNlMsg msg;
  if (EncodeFiraNotification(msg.get(), session.family_id, data)) {
    simulator_->SendEvent(session.port, msg.get());
  }
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
