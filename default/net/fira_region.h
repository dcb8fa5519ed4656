#pragma once

// Wire format of the FiRa region of the UWB MAC driver, reached through
// MCPS802154_CMD_CALL_REGION: region-call framing, call ids, call parameters,
// session parameters, controlee lists, session notifications with their
// ranging data, and the receive policies of the service's parsers. The
// service, the driver simulator and the tests all take their numbers from here.

#include <stddef.h>
#include <stdint.h>

#include <netlink/attr.h>

#include "net/mcps802154.h"

namespace hardware {
namespace dalix {

// Inside MCPS802154_ATTR_SCHEDULER_REGION_CALL. 1 and 3 are not used.
enum McpsRegionCallAttr : int {
  MCPS802154_REGION_CALL_ATTR_UNSPEC = 0,
  MCPS802154_REGION_CALL_ATTR_REGION_NAME = 2,
  MCPS802154_REGION_CALL_ATTR_CALL = 4,
  MCPS802154_REGION_CALL_ATTR_CALL_PARAMS = 5,
  MCPS802154_REGION_CALL_ATTR_MAX = 5,
};

// Longest region name accepted in a received region call, NUL included.
constexpr uint16_t kMcpsRegionNameMaxLen = 20;

// Value of MCPS802154_REGION_CALL_ATTR_CALL (32 bits on the wire, 8 used).
enum FiraCall : uint8_t {
  FIRA_CALL_SESSION_INIT = 1,
  FIRA_CALL_SESSION_START = 2,
  FIRA_CALL_SESSION_STOP = 3,
  FIRA_CALL_SESSION_DEINIT = 4,
  FIRA_CALL_SESSION_SET_PARAMS = 5,
  FIRA_CALL_NEW_CONTROLEE = 6,
  FIRA_CALL_DEL_CONTROLEE = 7,
  // Sent by the driver only: ranging results and the end of a session.
  FIRA_CALL_SESSION_NOTIFICATION = 8,
};

// Inside MCPS802154_REGION_CALL_ATTR_CALL_PARAMS of a request.
enum FiraCallAttr : int {
  FIRA_CALL_ATTR_UNSPEC = 0,
  FIRA_CALL_ATTR_SESSION_ID = 1,
  FIRA_CALL_ATTR_SESSION_PARAMS = 2,
  FIRA_CALL_ATTR_CONTROLEES = 3,
  FIRA_CALL_ATTR_MAX = 3,
};

// Inside FIRA_CALL_ATTR_SESSION_PARAMS. Widths: u8, u16 and u32 in host byte
// order; STATIC_STS_KEY is raw bytes. 31, 39 and 40 are never sent.
enum FiraSessionParamAttr : int {
  FIRA_SESSION_PARAM_ATTR_UNSPEC = 0,
  FIRA_SESSION_PARAM_ATTR_DEVICE_TYPE = 1,                         // u8
  FIRA_SESSION_PARAM_ATTR_DEVICE_ROLE = 2,                         // u8
  FIRA_SESSION_PARAM_ATTR_RANGING_ROUND_USAGE = 3,                 // u8
  FIRA_SESSION_PARAM_ATTR_MULTI_NODE_MODE = 4,                     // u8
  FIRA_SESSION_PARAM_ATTR_SHORT_ADDR = 5,                          // u16
  FIRA_SESSION_PARAM_ATTR_DESTINATION_SHORT_ADDR = 6,              // u16
  FIRA_SESSION_PARAM_ATTR_INITIATION_TIME_MS = 7,                  // u32
  FIRA_SESSION_PARAM_ATTR_SLOT_DURATION_RSTU = 8,                  // u32
  FIRA_SESSION_PARAM_ATTR_RANGING_BLOCK_DURATION_MS = 9,           // u32
  FIRA_SESSION_PARAM_ATTR_SLOTS_PER_RANGING_ROUND = 10,            // u32
  FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_VALUE = 11,               // u32
  FIRA_SESSION_PARAM_ATTR_MAX_RANGING_ROUND_RETRIES = 12,          // u32
  FIRA_SESSION_PARAM_ATTR_HOPPING_ENABLED = 13,                    // u8
  FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_ENABLED = 14,             // u8
  FIRA_SESSION_PARAM_ATTR_SESSION_PRIORITY = 15,                   // u8
  FIRA_SESSION_PARAM_ATTR_RESULT_REPORT_PHASE = 16,                // u8
  FIRA_SESSION_PARAM_ATTR_MEASUREMENT_REPORT_TYPE = 17,            // u8
  FIRA_SESSION_PARAM_ATTR_DEFERRED_MODE = 18,                      // u8
  FIRA_SESSION_PARAM_ATTR_IN_BAND_TERMINATION_ATTEMPT_COUNT = 19,  // u32
  FIRA_SESSION_PARAM_ATTR_CHANNEL_NUMBER = 20,                     // u8
  FIRA_SESSION_PARAM_ATTR_PREAMBLE_CODE_INDEX = 21,                // u8
  FIRA_SESSION_PARAM_ATTR_RFRAME_CONFIG = 22,                      // u8
  FIRA_SESSION_PARAM_ATTR_PRF_MODE = 23,                           // u8
  FIRA_SESSION_PARAM_ATTR_PREAMBLE_DURATION = 24,                  // u8
  FIRA_SESSION_PARAM_ATTR_SFD_ID = 25,                             // u8
  FIRA_SESSION_PARAM_ATTR_STS_SEGMENT_COUNT = 26,                  // u8
  FIRA_SESSION_PARAM_ATTR_PSDU_DATA_RATE = 27,                     // u8
  FIRA_SESSION_PARAM_ATTR_BPRF_PHR_DATA_RATE = 28,                 // u8
  FIRA_SESSION_PARAM_ATTR_FCS_TYPE = 29,                           // u8
  FIRA_SESSION_PARAM_ATTR_TX_ADAPTIVE_PAYLOAD_POWER = 30,          // u8
  FIRA_SESSION_PARAM_ATTR_AZIMUTH_ANTENNA_PAIR = 32,               // u8
  FIRA_SESSION_PARAM_ATTR_ELEVATION_ANTENNA_PAIR = 33,             // u8
  FIRA_SESSION_PARAM_ATTR_TX_ANTENNA_MASK = 34,                    // u8
  FIRA_SESSION_PARAM_ATTR_AOA_PAIR_MODE = 35,                      // u8
  FIRA_SESSION_PARAM_ATTR_STS_CONFIG = 36,                         // u8
  FIRA_SESSION_PARAM_ATTR_SUB_SESSION_ID = 37,                     // u32
  FIRA_SESSION_PARAM_ATTR_STATIC_STS_KEY = 38,                     // bytes
  FIRA_SESSION_PARAM_ATTR_KEY_ROTATION = 41,                       // u8
  FIRA_SESSION_PARAM_ATTR_KEY_ROTATION_RATE = 42,                  // u8
  FIRA_SESSION_PARAM_ATTR_AOA_RESULT_REQUEST = 43,                 // u8
  FIRA_SESSION_PARAM_ATTR_REPORT_TOF = 44,                         // u8
  FIRA_SESSION_PARAM_ATTR_REPORT_AOA_AZIMUTH = 45,                 // u8
  FIRA_SESSION_PARAM_ATTR_REPORT_AOA_ELEVATION = 46,               // u8
  FIRA_SESSION_PARAM_ATTR_REPORT_AOA_FOM = 47,                     // u8
  FIRA_SESSION_PARAM_ATTR_MAX = 47,
};

// Width in bytes of a fixed-size session parameter: 1, 2 or 4; 0 for the
// static STS key (raw bytes) and for ids that are not parameters.
constexpr int FiraSessionParamWidth(int attr) {
  switch (attr) {
    case FIRA_SESSION_PARAM_ATTR_SHORT_ADDR:
    case FIRA_SESSION_PARAM_ATTR_DESTINATION_SHORT_ADDR:
      return 2;
    case FIRA_SESSION_PARAM_ATTR_INITIATION_TIME_MS:
    case FIRA_SESSION_PARAM_ATTR_SLOT_DURATION_RSTU:
    case FIRA_SESSION_PARAM_ATTR_RANGING_BLOCK_DURATION_MS:
    case FIRA_SESSION_PARAM_ATTR_SLOTS_PER_RANGING_ROUND:
    case FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_VALUE:
    case FIRA_SESSION_PARAM_ATTR_MAX_RANGING_ROUND_RETRIES:
    case FIRA_SESSION_PARAM_ATTR_IN_BAND_TERMINATION_ATTEMPT_COUNT:
    case FIRA_SESSION_PARAM_ATTR_SUB_SESSION_ID:
      return 4;
    case FIRA_SESSION_PARAM_ATTR_UNSPEC:
    case 31:
    case FIRA_SESSION_PARAM_ATTR_STATIC_STS_KEY:
    case 39:
    case 40:
      return 0;
    default:
      return attr > 0 && attr <= FIRA_SESSION_PARAM_ATTR_MAX ? 1 : 0;
  }
}

// The static STS key: a 6-byte IV followed by a 2-byte vendor id. The driver
// takes at most this much.
inline constexpr uint16_t kFiraStaticStsKeyMaxLen = 16;

// FIRA_CALL_ATTR_CONTROLEES holds one nest per controlee, typed by its
// 1-based position in the list, each holding these.
enum FiraCallControleeAttr : int {
  FIRA_CALL_CONTROLEE_ATTR_UNSPEC = 0,
  FIRA_CALL_CONTROLEE_ATTR_SHORT_ADDR = 1,      // u16
  FIRA_CALL_CONTROLEE_ATTR_SUB_SESSION_ID = 2,  // u32
  FIRA_CALL_CONTROLEE_ATTR_MAX = 2,
};

// Inside MCPS802154_REGION_CALL_ATTR_CALL_PARAMS of a session notification.
// 2 and 3 are not read.
enum FiraSessionNtfAttr : int {
  FIRA_SESSION_NTF_ATTR_UNSPEC = 0,
  FIRA_SESSION_NTF_ATTR_SESSION_ID = 1,    // u32
  FIRA_SESSION_NTF_ATTR_RANGING_DATA = 4,  // nest
  FIRA_SESSION_NTF_ATTR_MAX = 4,
};

// Inside FIRA_SESSION_NTF_ATTR_RANGING_DATA. 2 is not read.
enum FiraRangingDataAttr : int {
  FIRA_RANGING_DATA_ATTR_UNSPEC = 0,
  // Present (whatever its value): the session stopped.
  FIRA_RANGING_DATA_ATTR_STOPPED = 1,       // u8
  FIRA_RANGING_DATA_ATTR_TIMESTAMP_NS = 3,  // u64
  FIRA_RANGING_DATA_ATTR_INDEX = 4,         // u32
  // One nest per measurement; their types carry nothing.
  FIRA_RANGING_DATA_ATTR_MEASUREMENTS = 5,
  FIRA_RANGING_DATA_ATTR_MAX = 5,
};

// Inside one measurement nest.
enum FiraMeasurementAttr : int {
  FIRA_MEASUREMENT_ATTR_UNSPEC = 0,
  FIRA_MEASUREMENT_ATTR_SHORT_ADDR = 1,      // u16
  FIRA_MEASUREMENT_ATTR_STOPPED = 2,         // flag: the peer stopped ranging
  FIRA_MEASUREMENT_ATTR_STATUS = 3,          // u8, 0 = success
  FIRA_MEASUREMENT_ATTR_UNREAD = 4,          // u8
  FIRA_MEASUREMENT_ATTR_LOS = 5,             // flag
  FIRA_MEASUREMENT_ATTR_NLOS = 6,            // flag, wins over LOS
  FIRA_MEASUREMENT_ATTR_DISTANCE = 7,        // u32
  FIRA_MEASUREMENT_ATTR_AOA = 8,             // angle nest of the pair named inside
  FIRA_MEASUREMENT_ATTR_AOA_AZIMUTH = 9,     // angle nest of the azimuth pair
  FIRA_MEASUREMENT_ATTR_AOA_ELEVATION = 10,  // angle nest of the elevation pair
  FIRA_MEASUREMENT_ATTR_AZIMUTH = 11,        // s16, kFiraAzimuthScale
  FIRA_MEASUREMENT_ATTR_ELEVATION = 12,      // s16, kFiraElevationScale
  FIRA_MEASUREMENT_ATTR_AZIMUTH_FOM = 13,    // u8, kFiraFigureOfMeritScale
  FIRA_MEASUREMENT_ATTR_ELEVATION_FOM = 14,  // u8
  FIRA_MEASUREMENT_ATTR_MAX = 14,
};

// Inside an angle nest (FIRA_MEASUREMENT_ATTR_AOA*).
enum FiraAoaAttr : int {
  FIRA_AOA_ATTR_UNSPEC = 0,
  FIRA_AOA_ATTR_ANTENNA_PAIR = 1,  // u8; absent means kFiraNoAntennaPair
  FIRA_AOA_ATTR_FIRST_ANGLE = 2,   // s16, kFiraAzimuthScale
  FIRA_AOA_ATTR_FOM = 3,           // u8
  FIRA_AOA_ATTR_SECOND_ANGLE = 4,  // s16, kFiraAzimuthScale
  FIRA_AOA_ATTR_MAX = 4,
};

// Fixed-point units of the notification. An angle in radians is the raw
// signed value times its scale; elevation (attribute 12 only) counts half
// the azimuth step. A figure of merit is raw / 255, except that the driver's
// raw 0 and 1 both mean "no confidence".
inline constexpr double kFiraPi = 3.14159265358979323846;
inline constexpr double kFiraAzimuthScale = kFiraPi / 32767.5;
inline constexpr double kFiraElevationScale = kFiraPi / 65535.0;
inline constexpr double kFiraFigureOfMeritScale = 255.0;

// An antenna pair or transmit antenna that is not configured, and the pair
// number of angle data that names none.
inline constexpr uint8_t kFiraNoAntennaPair = 255;
// Highest valid values of the per-radio antenna configuration.
inline constexpr uint32_t kFiraMaxAntennaPair = 6;
inline constexpr uint32_t kFiraMaxTxAntenna = 4;

// Receive policies. Every fixed-size entry bounds its length both ways (libnl
// would let a short signed value through); each parser declares only what it
// reads, every other id up to the nest's maximum stays unconstrained. Index an
// array by attribute id.
namespace fira_internal {

constexpr nla_policy Exact(uint16_t type, uint16_t size) {
  nla_policy policy{};
  policy.type = type;
  policy.minlen = size;
  policy.maxlen = size;
  return policy;
}

constexpr nla_policy Of(uint16_t type, uint16_t maxlen = 0) {
  nla_policy policy{};
  policy.type = type;
  policy.maxlen = maxlen;
  return policy;
}

constexpr McpsPolicy<MCPS802154_ATTR_MAX> RegionCallMessagePolicy() {
  McpsPolicy<MCPS802154_ATTR_MAX> policy{};
  policy[MCPS802154_ATTR_HW] = Exact(NLA_U32, sizeof(uint32_t));
  policy[MCPS802154_ATTR_SCHEDULER_REGION_CALL] = Of(NLA_NESTED);
  return policy;
}

constexpr McpsPolicy<MCPS802154_REGION_CALL_ATTR_MAX> RegionCallPolicy() {
  McpsPolicy<MCPS802154_REGION_CALL_ATTR_MAX> policy{};
  policy[MCPS802154_REGION_CALL_ATTR_REGION_NAME] = Of(NLA_STRING, kMcpsRegionNameMaxLen);
  policy[MCPS802154_REGION_CALL_ATTR_CALL] = Exact(NLA_U32, sizeof(uint32_t));
  policy[MCPS802154_REGION_CALL_ATTR_CALL_PARAMS] = Of(NLA_NESTED);
  return policy;
}

constexpr McpsPolicy<FIRA_SESSION_NTF_ATTR_MAX> SessionNtfPolicy() {
  McpsPolicy<FIRA_SESSION_NTF_ATTR_MAX> policy{};
  policy[FIRA_SESSION_NTF_ATTR_SESSION_ID] = Exact(NLA_U32, sizeof(uint32_t));
  policy[FIRA_SESSION_NTF_ATTR_RANGING_DATA] = Of(NLA_NESTED);
  return policy;
}

constexpr McpsPolicy<FIRA_RANGING_DATA_ATTR_MAX> RangingDataPolicy() {
  McpsPolicy<FIRA_RANGING_DATA_ATTR_MAX> policy{};
  policy[FIRA_RANGING_DATA_ATTR_STOPPED] = Exact(NLA_U8, sizeof(uint8_t));
  policy[FIRA_RANGING_DATA_ATTR_TIMESTAMP_NS] = Exact(NLA_U64, sizeof(uint64_t));
  policy[FIRA_RANGING_DATA_ATTR_INDEX] = Exact(NLA_U32, sizeof(uint32_t));
  policy[FIRA_RANGING_DATA_ATTR_MEASUREMENTS] = Of(NLA_NESTED);
  return policy;
}

constexpr McpsPolicy<FIRA_MEASUREMENT_ATTR_MAX> MeasurementPolicy() {
  McpsPolicy<FIRA_MEASUREMENT_ATTR_MAX> policy{};
  policy[FIRA_MEASUREMENT_ATTR_SHORT_ADDR] = Exact(NLA_U16, sizeof(uint16_t));
  policy[FIRA_MEASUREMENT_ATTR_STOPPED] = Of(NLA_FLAG);
  policy[FIRA_MEASUREMENT_ATTR_STATUS] = Exact(NLA_U8, sizeof(uint8_t));
  policy[FIRA_MEASUREMENT_ATTR_UNREAD] = Exact(NLA_U8, sizeof(uint8_t));
  policy[FIRA_MEASUREMENT_ATTR_LOS] = Of(NLA_FLAG);
  policy[FIRA_MEASUREMENT_ATTR_NLOS] = Of(NLA_FLAG);
  policy[FIRA_MEASUREMENT_ATTR_DISTANCE] = Exact(NLA_U32, sizeof(uint32_t));
  policy[FIRA_MEASUREMENT_ATTR_AOA] = Of(NLA_NESTED);
  policy[FIRA_MEASUREMENT_ATTR_AOA_AZIMUTH] = Of(NLA_NESTED);
  policy[FIRA_MEASUREMENT_ATTR_AOA_ELEVATION] = Of(NLA_NESTED);
  policy[FIRA_MEASUREMENT_ATTR_AZIMUTH] = Exact(NLA_S16, sizeof(int16_t));
  policy[FIRA_MEASUREMENT_ATTR_ELEVATION] = Exact(NLA_S16, sizeof(int16_t));
  policy[FIRA_MEASUREMENT_ATTR_AZIMUTH_FOM] = Exact(NLA_U8, sizeof(uint8_t));
  policy[FIRA_MEASUREMENT_ATTR_ELEVATION_FOM] = Exact(NLA_U8, sizeof(uint8_t));
  return policy;
}

constexpr McpsPolicy<FIRA_AOA_ATTR_MAX> AoaPolicy() {
  McpsPolicy<FIRA_AOA_ATTR_MAX> policy{};
  policy[FIRA_AOA_ATTR_ANTENNA_PAIR] = Exact(NLA_U8, sizeof(uint8_t));
  policy[FIRA_AOA_ATTR_FIRST_ANGLE] = Exact(NLA_S16, sizeof(int16_t));
  policy[FIRA_AOA_ATTR_FOM] = Exact(NLA_U8, sizeof(uint8_t));
  policy[FIRA_AOA_ATTR_SECOND_ANGLE] = Exact(NLA_S16, sizeof(int16_t));
  return policy;
}

constexpr McpsPolicy<FIRA_CALL_ATTR_MAX> CallPolicy() {
  McpsPolicy<FIRA_CALL_ATTR_MAX> policy{};
  policy[FIRA_CALL_ATTR_SESSION_ID] = Exact(NLA_U32, sizeof(uint32_t));
  policy[FIRA_CALL_ATTR_SESSION_PARAMS] = Of(NLA_NESTED);
  policy[FIRA_CALL_ATTR_CONTROLEES] = Of(NLA_NESTED);
  return policy;
}

constexpr McpsPolicy<FIRA_SESSION_PARAM_ATTR_MAX> SessionParamsPolicy() {
  McpsPolicy<FIRA_SESSION_PARAM_ATTR_MAX> policy{};
  for (int id = 1; id <= FIRA_SESSION_PARAM_ATTR_MAX; ++id) {
    const int width = FiraSessionParamWidth(id);
    if (width == 1) policy[id] = Exact(NLA_U8, 1);
    if (width == 2) policy[id] = Exact(NLA_U16, 2);
    if (width == 4) policy[id] = Exact(NLA_U32, 4);
  }
  policy[FIRA_SESSION_PARAM_ATTR_STATIC_STS_KEY] = Of(NLA_BINARY, kFiraStaticStsKeyMaxLen);
  return policy;
}

constexpr McpsPolicy<FIRA_CALL_CONTROLEE_ATTR_MAX> ControleePolicy() {
  McpsPolicy<FIRA_CALL_CONTROLEE_ATTR_MAX> policy{};
  policy[FIRA_CALL_CONTROLEE_ATTR_SHORT_ADDR] = Exact(NLA_U16, sizeof(uint16_t));
  policy[FIRA_CALL_CONTROLEE_ATTR_SUB_SESSION_ID] = Exact(NLA_U32, sizeof(uint32_t));
  return policy;
}

}  // namespace fira_internal

// A received region call, top level: the hardware index and the call nest.
inline constexpr McpsPolicy<MCPS802154_ATTR_MAX> kFiraRegionCallMessagePolicy =
    fira_internal::RegionCallMessagePolicy();
// Inside MCPS802154_ATTR_SCHEDULER_REGION_CALL.
inline constexpr McpsPolicy<MCPS802154_REGION_CALL_ATTR_MAX> kFiraRegionCallPolicy =
    fira_internal::RegionCallPolicy();
// CALL_PARAMS of a session notification.
inline constexpr McpsPolicy<FIRA_SESSION_NTF_ATTR_MAX> kFiraSessionNtfPolicy =
    fira_internal::SessionNtfPolicy();
inline constexpr McpsPolicy<FIRA_RANGING_DATA_ATTR_MAX> kFiraRangingDataPolicy =
    fira_internal::RangingDataPolicy();
inline constexpr McpsPolicy<FIRA_MEASUREMENT_ATTR_MAX> kFiraMeasurementPolicy =
    fira_internal::MeasurementPolicy();
inline constexpr McpsPolicy<FIRA_AOA_ATTR_MAX> kFiraAoaPolicy = fira_internal::AoaPolicy();

// The driver's side: what it accepts inside a FiRa region call's parameters,
// the session parameters and one controlee entry.
inline constexpr McpsPolicy<FIRA_CALL_ATTR_MAX> kFiraCallPolicy = fira_internal::CallPolicy();
inline constexpr McpsPolicy<FIRA_SESSION_PARAM_ATTR_MAX> kFiraSessionParamsPolicy =
    fira_internal::SessionParamsPolicy();
inline constexpr McpsPolicy<FIRA_CALL_CONTROLEE_ATTR_MAX> kFiraControleePolicy =
    fira_internal::ControleePolicy();

}  // namespace dalix
}  // namespace hardware
