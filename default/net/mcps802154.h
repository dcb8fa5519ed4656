#pragma once

// Wire format of the UWB MAC driver's generic netlink family: commands,
// attributes, nested attributes and the receive policies of the service's
// parsers. The service, the driver simulator and the tests all take their
// numbers from here.

#include <stddef.h>
#include <stdint.h>

#include <climits>

#include <array>

#include <netlink/attr.h>

namespace hardware {
namespace dalix {

constexpr char kMcpsFamilyName[] = "mcps802154";

// Generic netlink command byte. 5, 6, 9 and 10 are neither sent nor expected.
enum Mcps802154Command : uint8_t {
  MCPS802154_CMD_UNSPEC = 0,
  MCPS802154_CMD_GET_HW = 1,
  MCPS802154_CMD_NEW_HW = 2,
  MCPS802154_CMD_SET_SCHEDULER = 3,
  MCPS802154_CMD_SET_SCHEDULER_PARAMS = 4,
  MCPS802154_CMD_CALL_REGION = 7,
  MCPS802154_CMD_SET_CALIBRATIONS = 8,
  MCPS802154_CMD_TESTMODE = 11,
  MCPS802154_CMD_SET_RANGING_REQUESTS = 12,
  MCPS802154_CMD_RANGING_REPORT = 13,
};

// Top-level attributes. 6, 7 and 13 are not used.
enum Mcps802154Attr : int {
  MCPS802154_ATTR_UNSPEC = 0,
  MCPS802154_ATTR_HW = 1,
  MCPS802154_ATTR_WPAN_PHY_NAME = 2,
  MCPS802154_ATTR_SCHEDULER_NAME = 3,
  MCPS802154_ATTR_SCHEDULER_PARAMS = 4,     // sent with NLA_F_NESTED
  MCPS802154_ATTR_SCHEDULER_REGIONS = 5,    // sent without NLA_F_NESTED
  MCPS802154_ATTR_SCHEDULER_REGION_CALL = 8,  // sent without NLA_F_NESTED
  MCPS802154_ATTR_TESTDATA = 9,             // sent with NLA_F_NESTED
  MCPS802154_ATTR_CALIBRATIONS = 10,        // sent with NLA_F_NESTED
  MCPS802154_ATTR_RANGING_REQUESTS = 11,    // sent with NLA_F_NESTED
  MCPS802154_ATTR_RANGING_RESULT = 12,
  MCPS802154_ATTR_MAX = 13,
};

// Longest phy and scheduler name accepted in a reply, NUL included.
constexpr uint16_t kMcpsNameMaxLen = 20;

// Inside MCPS802154_ATTR_SCHEDULER_PARAMS.
enum Mcps802154SchedulerParamsAttr : int {
  MCPS802154_SCHEDULER_PARAMS_ATTR_UNSPEC = 0,
  MCPS802154_SCHEDULER_PARAMS_ATTR_SLOT_DURATION = 1,
  MCPS802154_SCHEDULER_PARAMS_ATTR_NODE_TYPE = 2,
  MCPS802154_SCHEDULER_PARAMS_ATTR_MAX = 2,
};

// Inside MCPS802154_ATTR_SCHEDULER_REGIONS: one nest per region...
enum Mcps802154SchedulerRegionsAttr : int {
  MCPS802154_SCHEDULER_REGIONS_ATTR_UNSPEC = 0,
  MCPS802154_SCHEDULER_REGIONS_ATTR_REGION = 1,
  MCPS802154_SCHEDULER_REGIONS_ATTR_MAX = 1,
};

// ...which holds the region's name.
enum Mcps802154RegionAttr : int {
  MCPS802154_REGION_ATTR_UNSPEC = 0,
  MCPS802154_REGION_ATTR_NAME = 2,
  MCPS802154_REGION_ATTR_MAX = 2,
};

// Inside MCPS802154_ATTR_CALIBRATIONS: one nest per key...
enum Mcps802154CalibrationsAttr : int {
  MCPS802154_CALIBRATIONS_ATTR_UNSPEC = 0,
  MCPS802154_CALIBRATIONS_ATTR_CALIBRATION = 1,
  MCPS802154_CALIBRATIONS_ATTR_MAX = 1,
};

// ...holding the key, its 4-byte value (requests) or its status (replies).
enum Mcps802154CalibrationAttr : int {
  MCPS802154_CALIBRATION_ATTR_UNSPEC = 0,
  MCPS802154_CALIBRATION_ATTR_KEY = 1,
  MCPS802154_CALIBRATION_ATTR_VALUE = 2,
  MCPS802154_CALIBRATION_ATTR_STATUS = 3,
  MCPS802154_CALIBRATION_ATTR_MAX = 3,
};

// Longest calibration key accepted in a reply, NUL included.
constexpr uint16_t kMcpsCalibrationKeyMaxLen = 20;

// Inside MCPS802154_ATTR_RANGING_REQUESTS: one nest per request...
enum Mcps802154RangingRequestsAttr : int {
  MCPS802154_RANGING_REQUESTS_ATTR_UNSPEC = 0,
  MCPS802154_RANGING_REQUESTS_ATTR_REQUEST = 1,
  MCPS802154_RANGING_REQUESTS_ATTR_MAX = 1,
};

// ...holding its id (4 bytes), parameter (4 bytes) and peer address (8 bytes).
enum Mcps802154RangingRequestAttr : int {
  MCPS802154_RANGING_REQUEST_ATTR_UNSPEC = 0,
  MCPS802154_RANGING_REQUEST_ATTR_ID = 1,
  MCPS802154_RANGING_REQUEST_ATTR_PARAMETER = 2,
  MCPS802154_RANGING_REQUEST_ATTR_PEER = 3,
  MCPS802154_RANGING_REQUEST_ATTR_MAX = 3,
};

// Inside MCPS802154_ATTR_RANGING_RESULT. The phase differences are radians in
// fixed point with kMcpsPdoaFractionalBits fractional bits; 5 and 6 are not read.
enum Mcps802154RangingResultAttr : int {
  MCPS802154_RANGING_RESULT_ATTR_UNSPEC = 0,
  MCPS802154_RANGING_RESULT_ATTR_REQUEST_ID = 1,
  MCPS802154_RANGING_RESULT_ATTR_MEASUREMENT = 2,
  MCPS802154_RANGING_RESULT_ATTR_PDOA_1 = 3,
  MCPS802154_RANGING_RESULT_ATTR_PDOA_2 = 4,
  MCPS802154_RANGING_RESULT_ATTR_MAX = 6,
};

constexpr int kMcpsPdoaFractionalBits = 11;
// The radio geometry that relates a phase difference to an angle of arrival:
// angle = asin(phase difference * wavelength / (2 pi * antenna spacing)).
constexpr float kMcpsCarrierWavelengthMetres = 0.046108086f;
constexpr float kMcpsAntennaSpacingMetres = 0.0208f;
// What a ranging report carries for a value the driver did not measure.
constexpr int32_t kMcpsRangingValueAbsent = INT32_MIN;

// Inside MCPS802154_ATTR_TESTDATA, request and reply.
enum Kx7200TestModeAttr : int {
  KX7200_TM_ATTR_UNSPEC = 0,
  KX7200_TM_ATTR_CMD = 1,            // u32, one of Kx7200TestModeCommand
  KX7200_TM_ATTR_CCC_U32_PARAM = 8,  // u32
  KX7200_TM_ATTR_CCC_CHANNEL = 9,    // u8
  KX7200_TM_ATTR_CCC_CMD_RC = 12,    // u8, reply only
  KX7200_TM_ATTR_MAX = 12,
};

enum Kx7200TestModeCommand : uint32_t {
  KX7200_TM_CMD_CCC_START_SESSION = 9,
};

// Scheduler and region names the driver knows.
constexpr char kMcpsSchedulerDefault[] = "default";
constexpr char kMcpsSchedulerSimpleRanging[] = "simple-ranging";
constexpr char kMcpsSchedulerEndless[] = "endless";
constexpr char kMcpsRegionFira[] = "fira";

// Prefix of the 802.15.4 phy name in MCPS802154_ATTR_WPAN_PHY_NAME; the
// decimal number after it is the phy index.
constexpr char kMcpsPhyNamePrefix[] = "phy";

// Receive policies. Each parser declares only what it reads; every other id up
// to the nest's maximum stays unconstrained. Index an array by attribute id.
template <size_t kMaxId>
using McpsPolicy = std::array<nla_policy, kMaxId + 1>;

namespace mcps_internal {

constexpr nla_policy Policy(uint16_t type, uint16_t maxlen = 0) {
  nla_policy policy{};
  policy.type = type;
  policy.maxlen = maxlen;
  return policy;
}

// An exact length for a type that libnl would read past a short attribute.
constexpr nla_policy SignedPolicy(uint16_t type, uint16_t length) {
  nla_policy policy = Policy(type, length);
  policy.minlen = length;
  return policy;
}

constexpr McpsPolicy<MCPS802154_ATTR_MAX> NewHwPolicy() {
  McpsPolicy<MCPS802154_ATTR_MAX> policy{};
  policy[MCPS802154_ATTR_HW] = Policy(NLA_U32);
  policy[MCPS802154_ATTR_WPAN_PHY_NAME] = Policy(NLA_STRING, kMcpsNameMaxLen);
  policy[MCPS802154_ATTR_SCHEDULER_NAME] = Policy(NLA_STRING, kMcpsNameMaxLen);
  return policy;
}

constexpr McpsPolicy<MCPS802154_CALIBRATION_ATTR_MAX> CalibrationPolicy() {
  McpsPolicy<MCPS802154_CALIBRATION_ATTR_MAX> policy{};
  policy[MCPS802154_CALIBRATION_ATTR_KEY] = Policy(NLA_STRING, kMcpsCalibrationKeyMaxLen);
  policy[MCPS802154_CALIBRATION_ATTR_STATUS] = Policy(NLA_S32);
  return policy;
}

constexpr McpsPolicy<MCPS802154_ATTR_MAX> RangingReportPolicy() {
  McpsPolicy<MCPS802154_ATTR_MAX> policy{};
  policy[MCPS802154_ATTR_HW] = Policy(NLA_U32);
  policy[MCPS802154_ATTR_RANGING_RESULT] = Policy(NLA_NESTED);
  return policy;
}

constexpr McpsPolicy<MCPS802154_RANGING_RESULT_ATTR_MAX> RangingResultPolicy() {
  McpsPolicy<MCPS802154_RANGING_RESULT_ATTR_MAX> policy{};
  policy[MCPS802154_RANGING_RESULT_ATTR_REQUEST_ID] = Policy(NLA_U32);
  policy[MCPS802154_RANGING_RESULT_ATTR_MEASUREMENT] = Policy(NLA_U32);
  // Read as signed: libnl bounds no signed type by itself.
  policy[MCPS802154_RANGING_RESULT_ATTR_PDOA_1] = SignedPolicy(NLA_S32, sizeof(int32_t));
  policy[MCPS802154_RANGING_RESULT_ATTR_PDOA_2] = SignedPolicy(NLA_S32, sizeof(int32_t));
  return policy;
}

constexpr McpsPolicy<MCPS802154_ATTR_MAX> TestModeReplyPolicy() {
  McpsPolicy<MCPS802154_ATTR_MAX> policy{};
  policy[MCPS802154_ATTR_TESTDATA] = Policy(NLA_NESTED);
  return policy;
}

constexpr McpsPolicy<KX7200_TM_ATTR_MAX> TestDataReplyPolicy() {
  McpsPolicy<KX7200_TM_ATTR_MAX> policy{};
  policy[KX7200_TM_ATTR_CCC_CMD_RC] = Policy(NLA_U8);
  return policy;
}

// What the driver accepts inside a test-mode request.
constexpr McpsPolicy<KX7200_TM_ATTR_MAX> TestDataRequestPolicy() {
  McpsPolicy<KX7200_TM_ATTR_MAX> policy{};
  policy[KX7200_TM_ATTR_CMD] = Policy(NLA_U32, sizeof(uint32_t));
  policy[KX7200_TM_ATTR_CCC_U32_PARAM] = Policy(NLA_U32, sizeof(uint32_t));
  policy[KX7200_TM_ATTR_CCC_CHANNEL] = Policy(NLA_U8, sizeof(uint8_t));
  return policy;
}

// What the driver accepts in one ranging request element.
constexpr McpsPolicy<MCPS802154_RANGING_REQUEST_ATTR_MAX> RangingRequestPolicy() {
  McpsPolicy<MCPS802154_RANGING_REQUEST_ATTR_MAX> policy{};
  policy[MCPS802154_RANGING_REQUEST_ATTR_ID] = Policy(NLA_U32, sizeof(uint32_t));
  policy[MCPS802154_RANGING_REQUEST_ATTR_PARAMETER] = Policy(NLA_U32, sizeof(uint32_t));
  policy[MCPS802154_RANGING_REQUEST_ATTR_PEER] = Policy(NLA_U64, sizeof(uint64_t));
  return policy;
}

// What the driver accepts in requests.
constexpr McpsPolicy<MCPS802154_ATTR_MAX> RequestPolicy() {
  McpsPolicy<MCPS802154_ATTR_MAX> policy{};
  policy[MCPS802154_ATTR_HW] = Policy(NLA_U32);
  policy[MCPS802154_ATTR_SCHEDULER_NAME] = Policy(NLA_STRING, kMcpsNameMaxLen);
  policy[MCPS802154_ATTR_SCHEDULER_PARAMS] = Policy(NLA_NESTED);
  policy[MCPS802154_ATTR_SCHEDULER_REGIONS] = Policy(NLA_NESTED);
  policy[MCPS802154_ATTR_SCHEDULER_REGION_CALL] = Policy(NLA_NESTED);
  policy[MCPS802154_ATTR_TESTDATA] = Policy(NLA_NESTED);
  policy[MCPS802154_ATTR_CALIBRATIONS] = Policy(NLA_NESTED);
  policy[MCPS802154_ATTR_RANGING_REQUESTS] = Policy(NLA_NESTED);
  return policy;
}

constexpr McpsPolicy<MCPS802154_SCHEDULER_PARAMS_ATTR_MAX> SchedulerParamsPolicy() {
  McpsPolicy<MCPS802154_SCHEDULER_PARAMS_ATTR_MAX> policy{};
  policy[MCPS802154_SCHEDULER_PARAMS_ATTR_SLOT_DURATION] = Policy(NLA_U32, sizeof(uint32_t));
  policy[MCPS802154_SCHEDULER_PARAMS_ATTR_NODE_TYPE] = Policy(NLA_U32, sizeof(uint32_t));
  return policy;
}

constexpr McpsPolicy<MCPS802154_REGION_ATTR_MAX> RegionPolicy() {
  McpsPolicy<MCPS802154_REGION_ATTR_MAX> policy{};
  policy[MCPS802154_REGION_ATTR_NAME] = Policy(NLA_STRING, kMcpsNameMaxLen);
  return policy;
}

constexpr McpsPolicy<MCPS802154_CALIBRATION_ATTR_MAX> CalibrationRequestPolicy() {
  McpsPolicy<MCPS802154_CALIBRATION_ATTR_MAX> policy{};
  policy[MCPS802154_CALIBRATION_ATTR_KEY] = Policy(NLA_STRING);
  policy[MCPS802154_CALIBRATION_ATTR_VALUE] = Policy(NLA_U32, sizeof(uint32_t));
  return policy;
}

}  // namespace mcps_internal

// MCPS802154_CMD_NEW_HW: the hardware index and the two names.
inline constexpr McpsPolicy<MCPS802154_ATTR_MAX> kMcpsNewHwPolicy = mcps_internal::NewHwPolicy();
// One element of a calibration reply.
inline constexpr McpsPolicy<MCPS802154_CALIBRATION_ATTR_MAX> kMcpsCalibrationPolicy =
    mcps_internal::CalibrationPolicy();
// MCPS802154_CMD_RANGING_REPORT, top level.
inline constexpr McpsPolicy<MCPS802154_ATTR_MAX> kMcpsRangingReportPolicy =
    mcps_internal::RangingReportPolicy();
// Inside MCPS802154_ATTR_RANGING_RESULT.
inline constexpr McpsPolicy<MCPS802154_RANGING_RESULT_ATTR_MAX> kMcpsRangingResultPolicy =
    mcps_internal::RangingResultPolicy();

// Test-mode reply: top level, and inside MCPS802154_ATTR_TESTDATA.
inline constexpr McpsPolicy<MCPS802154_ATTR_MAX> kMcpsTestModeReplyPolicy =
    mcps_internal::TestModeReplyPolicy();
inline constexpr McpsPolicy<KX7200_TM_ATTR_MAX> kMcpsTestDataReplyPolicy =
    mcps_internal::TestDataReplyPolicy();

// The driver's side: what it accepts in requests (top level, scheduler
// parameters, one region, one calibration element).
inline constexpr McpsPolicy<MCPS802154_ATTR_MAX> kMcpsRequestPolicy =
    mcps_internal::RequestPolicy();
inline constexpr McpsPolicy<MCPS802154_SCHEDULER_PARAMS_ATTR_MAX> kMcpsSchedulerParamsPolicy =
    mcps_internal::SchedulerParamsPolicy();
inline constexpr McpsPolicy<MCPS802154_REGION_ATTR_MAX> kMcpsRegionPolicy =
    mcps_internal::RegionPolicy();
inline constexpr McpsPolicy<MCPS802154_CALIBRATION_ATTR_MAX> kMcpsCalibrationRequestPolicy =
    mcps_internal::CalibrationRequestPolicy();
inline constexpr McpsPolicy<KX7200_TM_ATTR_MAX> kMcpsTestDataRequestPolicy =
    mcps_internal::TestDataRequestPolicy();
inline constexpr McpsPolicy<MCPS802154_RANGING_REQUEST_ATTR_MAX> kMcpsRangingRequestPolicy =
    mcps_internal::RangingRequestPolicy();

}  // namespace dalix
}  // namespace hardware
