#include "sim/fira_notification.h"

#include <algorithm>
#include <cmath>
#include <limits>

#include <netlink/attr.h>
#include <netlink/genl/genl.h>

namespace hardware {
namespace dalix {
namespace sim {
namespace {

// The driver's nests carry plain type words.
nlattr* StartPlainNest(nl_msg* msg, int type) {
  nlattr* nest = nla_nest_start(msg, type);
  if (nest != nullptr) nest->nla_type &= ~NLA_F_NESTED;
  return nest;
}

// Puts attributes in order until one fails.
class Writer {
 public:
  explicit Writer(nl_msg* msg) : msg_(msg) {}

  void Flag(int attr, bool present) {
    if (present) ok_ = ok_ && nla_put_flag(msg_, attr) == 0;
  }
  void U8(int attr, const std::optional<uint8_t>& value) {
    if (value) ok_ = ok_ && nla_put_u8(msg_, attr, *value) == 0;
  }
  void U16(int attr, const std::optional<uint16_t>& value) {
    if (value) ok_ = ok_ && nla_put_u16(msg_, attr, *value) == 0;
  }
  void S16(int attr, const std::optional<int16_t>& value) {
    if (value) ok_ = ok_ && nla_put_s16(msg_, attr, *value) == 0;
  }
  void U32(int attr, const std::optional<uint32_t>& value) {
    if (value) ok_ = ok_ && nla_put_u32(msg_, attr, *value) == 0;
  }
  void U64(int attr, const std::optional<uint64_t>& value) {
    if (value) ok_ = ok_ && nla_put_u64(msg_, attr, *value) == 0;
  }
  void String(int attr, const std::optional<std::string>& value) {
    if (value) ok_ = ok_ && nla_put_string(msg_, attr, value->c_str()) == 0;
  }
  nlattr* Open(int attr) {
    nlattr* nest = ok_ ? StartPlainNest(msg_, attr) : nullptr;
    ok_ = nest != nullptr;
    return nest;
  }
  // Kept even when empty: an empty measurement list is what the driver sends
  // for a session without peers.
  void Close(nlattr* nest) { ok_ = ok_ && nla_nest_end_keep_empty(msg_, nest) == 0; }
  bool ok() const { return ok_; }

 private:
  nl_msg* msg_;
  bool ok_ = true;
};

void PutAoa(Writer& writer, int attr, const std::optional<FiraAoaData>& aoa) {
  if (!aoa) return;
  nlattr* nest = writer.Open(attr);
  writer.U8(FIRA_AOA_ATTR_ANTENNA_PAIR, aoa->antenna_pair);
  writer.S16(FIRA_AOA_ATTR_FIRST_ANGLE, aoa->first_angle);
  writer.U8(FIRA_AOA_ATTR_FOM, aoa->figure_of_merit);
  writer.S16(FIRA_AOA_ATTR_SECOND_ANGLE, aoa->second_angle);
  writer.Close(nest);
}

void PutMeasurement(Writer& writer, int position, const FiraMeasurementData& m) {
  nlattr* nest = writer.Open(position);
  writer.U16(FIRA_MEASUREMENT_ATTR_SHORT_ADDR, m.short_address);
  writer.Flag(FIRA_MEASUREMENT_ATTR_STOPPED, m.stopped);
  writer.U8(FIRA_MEASUREMENT_ATTR_STATUS, m.status);
  writer.Flag(FIRA_MEASUREMENT_ATTR_LOS, m.line_of_sight);
  writer.Flag(FIRA_MEASUREMENT_ATTR_NLOS, m.non_line_of_sight);
  writer.U32(FIRA_MEASUREMENT_ATTR_DISTANCE, m.distance_cm);
  PutAoa(writer, FIRA_MEASUREMENT_ATTR_AOA, m.aoa);
  PutAoa(writer, FIRA_MEASUREMENT_ATTR_AOA_AZIMUTH, m.aoa_azimuth);
  PutAoa(writer, FIRA_MEASUREMENT_ATTR_AOA_ELEVATION, m.aoa_elevation);
  writer.S16(FIRA_MEASUREMENT_ATTR_AZIMUTH, m.azimuth);
  writer.S16(FIRA_MEASUREMENT_ATTR_ELEVATION, m.elevation);
  writer.U8(FIRA_MEASUREMENT_ATTR_AZIMUTH_FOM, m.azimuth_fom);
  writer.U8(FIRA_MEASUREMENT_ATTR_ELEVATION_FOM, m.elevation_fom);
  writer.Close(nest);
}

int16_t ToRaw(double value) {
  double rounded = std::round(value);
  rounded = std::clamp(rounded, static_cast<double>(std::numeric_limits<int16_t>::min()),
                       static_cast<double>(std::numeric_limits<int16_t>::max()));
  return static_cast<int16_t>(rounded);
}

}  // namespace

bool EncodeFiraNotification(nl_msg* msg, int family_id, const FiraNotificationData& data) {
  if (genlmsg_put(msg, 0, 0, family_id, 0, 0, data.cmd, 1) == nullptr) return false;
  Writer writer(msg);
  writer.U32(MCPS802154_ATTR_HW, data.hw_index);
  nlattr* region_call = writer.Open(MCPS802154_ATTR_SCHEDULER_REGION_CALL);
  writer.String(MCPS802154_REGION_CALL_ATTR_REGION_NAME, data.region);
  writer.U32(MCPS802154_REGION_CALL_ATTR_CALL, data.call);
  if (!data.has_call_params) {
    writer.Close(region_call);
    return writer.ok();
  }
  nlattr* params = writer.Open(MCPS802154_REGION_CALL_ATTR_CALL_PARAMS);
  writer.U32(FIRA_SESSION_NTF_ATTR_SESSION_ID, data.session_id);
  nlattr* ranging_data = writer.Open(FIRA_SESSION_NTF_ATTR_RANGING_DATA);
  if (data.stopped) writer.U8(FIRA_RANGING_DATA_ATTR_STOPPED, 1);
  writer.U64(FIRA_RANGING_DATA_ATTR_TIMESTAMP_NS, data.timestamp_ns);
  writer.U32(FIRA_RANGING_DATA_ATTR_INDEX, data.index);
  if (data.measurements) {
    nlattr* list = writer.Open(FIRA_RANGING_DATA_ATTR_MEASUREMENTS);
    for (size_t i = 0; i < data.measurements->size(); ++i) {
      PutMeasurement(writer, static_cast<int>(i + 1), (*data.measurements)[i]);
    }
    writer.Close(list);
  }
  writer.Close(ranging_data);
  writer.Close(params);
  writer.Close(region_call);
  return writer.ok();
}

int16_t FiraAzimuthRaw(double radians) { return ToRaw(radians / kFiraAzimuthScale); }

int16_t FiraElevationRaw(double radians) { return ToRaw(radians / kFiraElevationScale); }

uint8_t FiraFigureOfMeritRaw(double confidence) {
  return static_cast<uint8_t>(std::lround(std::clamp(confidence, 0.0, 1.0) * 255.0));
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
