#define LOG_TAG "dalix.uwb.FiraRegionUtils"

#include "net/fira_region_utils.h"

#include <stdlib.h>
#include <string.h>
#include <time.h>

#include <utility>

#include <android-base/logging.h>
#include <netlink/attr.h>
#include <netlink/genl/genl.h>

#include "ipc_utils.h"
#include "net/fira_region.h"
#include "net/mcps802154.h"
#include "net/unique_nl_msg.h"

namespace hardware {
namespace dalix {
namespace {

using ::aidl::hardware::dalix::uwb::FiraRangingData;

constexpr char kErrorCreating[] = ": Error creating MCPS message";
constexpr char kIncorrectAddress[] =
    ": Incorrect deviceAddress size, Fira 1.1 only supports short address.";

// The driver's session roles are numbered the other way round from the
// interface's DeviceType: the driver's controller is the interface's 1.
constexpr int kDriverControllerDeviceType = 1;
constexpr int kDriverControleeDeviceType = 0;

// The antenna keys of the HAL property file, with the first value each does
// not accept.
struct AntennaKey {
  const char* key;
  uint32_t FiraRegionUtils::HwConfig::*field;
  uint32_t limit;
};
constexpr AntennaKey kAntennaKeys[] = {
    {"antenna_pair_azimuth", &FiraRegionUtils::HwConfig::antenna_pair_azimuth,
     kFiraMaxAntennaPair + 1},
    {"antenna_pair_elevation", &FiraRegionUtils::HwConfig::antenna_pair_elevation,
     kFiraMaxAntennaPair + 1},
    {"tx_antenna", &FiraRegionUtils::HwConfig::tx_antenna, kFiraMaxTxAntenna + 1},
};

// Opens a nest whose type word carries no NLA_F_NESTED: libnl's
// nla_nest_start sets the flag, and the driver reads these nests by their
// plain type.
nlattr* StartPlainNest(nl_msg* msg, int type) {
  nlattr* nest = nla_nest_start(msg, type);
  if (nest != nullptr) nest->nla_type &= ~NLA_F_NESTED;
  return nest;
}

// Puts attributes in order and remembers whether any failed, so that a
// builder checks once after its last attribute.
class AttrWriter {
 public:
  explicit AttrWriter(nl_msg* msg) : msg_(msg) {}

  void U8(int attr, uint8_t value) { ok_ = ok_ && nla_put_u8(msg_, attr, value) == 0; }
  void U32(int attr, uint32_t value) { ok_ = ok_ && nla_put_u32(msg_, attr, value) == 0; }
  void Bytes(int attr, const std::vector<uint8_t>& bytes) {
    ok_ = ok_ && nla_put(msg_, attr, static_cast<int>(bytes.size()), bytes.data()) == 0;
  }
  bool ok() const { return ok_; }

 private:
  nl_msg* msg_;
  bool ok_ = true;
};

template <typename Enum>
int Value(Enum value) {
  return static_cast<int>(value);
}

// Enum bytes compared as unsigned, so that a negative byte is out of range too.
template <typename Enum>
unsigned UnsignedValue(Enum value) {
  return static_cast<uint8_t>(value);
}

double FigureOfMerit(uint8_t raw) { return raw > 1 ? raw / kFiraFigureOfMeritScale : 0.0; }

uint64_t MonotonicNowNs() {
  timespec now = {};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<uint64_t>(now.tv_sec) * 1000000000ull + static_cast<uint64_t>(now.tv_nsec);
}

}  // namespace

FiraRegionUtils::HwConfig FiraRegionUtils::DefaultHwConfig() {
  HwConfig config;
  config.antenna_pair_elevation = kFiraNoAntennaPair;
  return config;
}

FiraRegionUtils::FiraRegionUtils(NlSocketFactory* socket_factory)
    : socket_factory_(socket_factory), mcps_net_id_(0) {}

FiraRegionUtils::~FiraRegionUtils() = default;

void FiraRegionUtils::SetMcpsNetId(uint32_t id) { mcps_net_id_ = id; }

std::optional<FiraRegionUtils::HwConfig> FiraRegionUtils::GetHwConfig(uint32_t hw_index) const {
  auto found = hw_configs_.find(hw_index);
  if (found == hw_configs_.end()) return std::nullopt;
  return found->second;
}

FiraRegionUtils::HwConfig FiraRegionUtils::HwConfigOrDefault(uint32_t hw_index) const {
  return GetHwConfig(hw_index).value_or(DefaultHwConfig());
}

// ---- Framing --------------------------------------------------------------

bool FiraRegionUtils::SetMcpsCommand(nl_msg* msg, uint32_t hw_index, uint8_t cmd, int flags) {
  if (mcps_net_id_ == 0) {
    LOG(ERROR) << __func__ << ": MCPS netlink id is not resolved";
    return false;
  }
  genlmsg_put(msg, NL_AUTO_PORT, NL_AUTO_SEQ, mcps_net_id_, 0, flags, cmd, 0);
  if (nla_put_u32(msg, MCPS802154_ATTR_HW, hw_index) != 0) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  return true;
}

bool FiraRegionUtils::StartCallMessage(nl_msg* msg, uint32_t hw_index, uint8_t call,
                                       nlattr** region_nest, nlattr** params_nest) {
  if (!SetMcpsCommand(msg, hw_index, MCPS802154_CMD_CALL_REGION, 0)) return false;
  bool built = nla_put_string(msg, MCPS802154_ATTR_SCHEDULER_NAME, kMcpsSchedulerEndless) == 0 &&
               (*region_nest = StartPlainNest(msg, MCPS802154_ATTR_SCHEDULER_REGION_CALL)) &&
               nla_put_string(msg, MCPS802154_REGION_CALL_ATTR_REGION_NAME, kMcpsRegionFira) == 0 &&
               nla_put_u32(msg, MCPS802154_REGION_CALL_ATTR_CALL, call) == 0 &&
               (*params_nest = StartPlainNest(msg, MCPS802154_REGION_CALL_ATTR_CALL_PARAMS));
  if (!built) {
    LOG(ERROR) << __func__ << " Error creating MCPS message";
    return false;
  }
  return true;
}

bool FiraRegionUtils::EndCallMessage(nl_msg* msg, nlattr* region_nest, nlattr* params_nest) {
  if (nla_nest_end(msg, params_nest) != 0 || nla_nest_end(msg, region_nest) != 0) {
    LOG(ERROR) << __func__ << " Error creating MCPS message";
    return false;
  }
  return true;
}

bool FiraRegionUtils::CreateSessionStateMsg(nl_msg* msg, uint32_t hw_index, uint8_t call,
                                            uint32_t session_id) {
  LOG(INFO) << __func__;
  nlattr* region_nest = nullptr;
  nlattr* params_nest = nullptr;
  if (!StartCallMessage(msg, hw_index, call, &region_nest, &params_nest)) return false;
  if (nla_put_u32(msg, FIRA_CALL_ATTR_SESSION_ID, session_id) != 0) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  return EndCallMessage(msg, region_nest, params_nest);
}

nlattr* FiraRegionUtils::GetCallContent(nl_msg* msg, uint32_t* hw_index, uint8_t* call) {
  nlmsghdr* header = nlmsg_hdr(msg);
  // Anything shorter than a generic netlink header carries no command to read.
  if (!genlmsg_valid_hdr(header, 0)) {
    LOG(ERROR) << __func__ << ": Message doesn't respect policy";
    return nullptr;
  }
  uint8_t cmd = genlmsg_hdr(header)->cmd;
  if (cmd != MCPS802154_CMD_CALL_REGION) {
    LOG(WARNING) << __func__ << ": Incorrect command received: " << static_cast<int>(cmd);
    return nullptr;
  }
  nlattr* attrs[MCPS802154_ATTR_MAX + 1] = {};
  if (genlmsg_parse(header, 0, attrs, MCPS802154_ATTR_MAX, kFiraRegionCallMessagePolicy.data()) !=
      0) {
    LOG(ERROR) << __func__ << ": Message doesn't respect policy";
    return nullptr;
  }
  if (attrs[MCPS802154_ATTR_HW] == nullptr ||
      attrs[MCPS802154_ATTR_SCHEDULER_REGION_CALL] == nullptr) {
    LOG(ERROR) << __func__
               << ": Missing MCPS802154_ATTR_HW or MCPS802154_ATTR_SCHEDULER_REGION_CALL";
    return nullptr;
  }
  *hw_index = nla_get_u32(attrs[MCPS802154_ATTR_HW]);

  nlattr* fields[MCPS802154_REGION_CALL_ATTR_MAX + 1] = {};
  if (nla_parse_nested(fields, MCPS802154_REGION_CALL_ATTR_MAX,
                       attrs[MCPS802154_ATTR_SCHEDULER_REGION_CALL],
                       kFiraRegionCallPolicy.data()) != 0) {
    LOG(ERROR) << __func__ << ": Incorrect MCPS802154_ATTR_SCHEDULER_REGION_CALL nested message";
    return nullptr;
  }
  nlattr* name = fields[MCPS802154_REGION_CALL_ATTR_REGION_NAME];
  // Byte for byte, terminator included: "fira\0x" is another region.
  if (name == nullptr || nla_len(name) != sizeof(kMcpsRegionFira) ||
      memcmp(nla_data(name), kMcpsRegionFira, sizeof(kMcpsRegionFira)) != 0) {
    LOG(ERROR) << __func__ << ": Missing Fira region name in mcps message";
    return nullptr;
  }
  if (fields[MCPS802154_REGION_CALL_ATTR_CALL] == nullptr) {
    LOG(ERROR) << __func__ << ": Missing Fira call in mcps message";
    return nullptr;
  }
  *call = static_cast<uint8_t>(nla_get_u32(fields[MCPS802154_REGION_CALL_ATTR_CALL]));
  if (fields[MCPS802154_REGION_CALL_ATTR_CALL_PARAMS] == nullptr) {
    LOG(ERROR) << __func__ << ": Missing Fira call params in mcps message";
  }
  return fields[MCPS802154_REGION_CALL_ATTR_CALL_PARAMS];
}

// ---- Session state --------------------------------------------------------

bool FiraRegionUtils::SendSessionState(uint32_t hw_index, uint8_t call, uint32_t session_id) {
  UniqueNlMsg msg;
  if (!CreateSessionStateMsg(msg.get(), hw_index, call, session_id)) return false;
  return socket_factory_->SendAndAwaitAck(msg.get());
}

bool FiraRegionUtils::InitSession(uint32_t hw_index, uint32_t session_id) {
  LOG(INFO) << __func__;
  return SendSessionState(hw_index, FIRA_CALL_SESSION_INIT, session_id);
}

bool FiraRegionUtils::StopSession(uint32_t hw_index, uint32_t session_id) {
  LOG(INFO) << __func__;
  return SendSessionState(hw_index, FIRA_CALL_SESSION_STOP, session_id);
}

bool FiraRegionUtils::DeinitSession(uint32_t hw_index, uint32_t session_id) {
  LOG(INFO) << __func__;
  return SendSessionState(hw_index, FIRA_CALL_SESSION_DEINIT, session_id);
}

bool FiraRegionUtils::StartSession(uint32_t hw_index, uint32_t session_id) {
  LOG(INFO) << __func__;
  auto callback = callbacks_.find(hw_index);
  if (callback == callbacks_.end() || callback->second == nullptr) {
    LOG(ERROR) << __func__ << ": Fira callback needs to be set for this hw_index.";
    return false;
  }
  UniqueNlMsg msg;
  if (!CreateSessionStateMsg(msg.get(), hw_index, FIRA_CALL_SESSION_START, session_id)) {
    return false;
  }
  std::shared_ptr<NlSocket> socket = ranging_socket_;
  const bool fresh = socket == nullptr;
  if (fresh) {
    socket = socket_factory_->Create();
    if (socket == nullptr) {
      LOG(ERROR) << __func__ << ": BAD_ALLOC: cannot allocate NlSocket";
      return false;
    }
  }
  // Whatever arrives while the acknowledgement is awaited is a notification
  // of a running session, the one being started included.
  auto on_notification = [this](nl_msg* notification) { return OnRangingResult(notification); };
  if (!socket->SendAndAwaitAck(msg.get(), on_notification)) return false;
  if (fresh) {
    // Notifications carry sequence 0, which libnl only lets through once
    // auto-ack is off.
    socket->DisableAutoAck();
    if (!socket->WatchNetlinkSocket(socket, on_notification)) return false;
    ranging_socket_ = std::move(socket);
  }
  return true;
}

// ---- Antenna properties ---------------------------------------------------

bool FiraRegionUtils::SetProperties(uint32_t hw_index, ConfigUtils& config) {
  HwConfig updated = HwConfigOrDefault(hw_index);
  bool all_valid = true;
  for (const AntennaKey& key : kAntennaKeys) {
    uint32_t value = kFiraNoAntennaPair;
    if (const char* text = config.GetValue(key.key)) {
      char* end = nullptr;
      // Base 0: decimal, 0x hexadecimal or leading-0 octal.
      unsigned long number = strtoul(text, &end, 0);
      // Only the low byte is checked and kept, so 257 reads as 1.
      uint32_t low = static_cast<uint8_t>(number);
      if (*end == '\0' && low < key.limit) value = low;
    }
    if (value == kFiraNoAntennaPair) {
      all_valid = false;
    } else {
      updated.*key.field = value;
    }
  }
  hw_configs_[hw_index] = updated;
  return all_valid;
}

// ---- Session parameters ---------------------------------------------------

bool FiraRegionUtils::ConfigTwrSession(uint32_t hw_index, const FiraTwrSession& session) {
  LOG(INFO) << __func__;
  UniqueNlMsg msg;
  const HwConfig hw_config = HwConfigOrDefault(hw_index);
  nlattr* region_nest = nullptr;
  nlattr* params_nest = nullptr;
  if (!StartCallMessage(msg.get(), hw_index, FIRA_CALL_SESSION_SET_PARAMS, &region_nest,
                        &params_nest)) {
    return false;
  }
  nlattr* session_params = nullptr;
  if (nla_put_u32(msg.get(), FIRA_CALL_ATTR_SESSION_ID, static_cast<uint32_t>(session.id)) != 0 ||
      (session_params = StartPlainNest(msg.get(), FIRA_CALL_ATTR_SESSION_PARAMS)) == nullptr) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  if (!PutMainSessionParams(msg.get(), session) || !PutTimingsParams(msg.get(), session) ||
      !PutBehaviorParams(msg.get(), session) || !PutRadioParams(msg.get(), session) ||
      !PutAntennaParams(msg.get(), session, hw_config) || !PutCryptoParams(msg.get(), session) ||
      !PutReportParams(msg.get(), session)) {
    return false;
  }
  if (nla_nest_end(msg.get(), session_params) != 0) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  if (!EndCallMessage(msg.get(), region_nest, params_nest)) return false;
  return socket_factory_->SendAndAwaitAck(msg.get());
}

bool FiraRegionUtils::PutMainSessionParams(nl_msg* msg, const FiraTwrSession& session) {
  LOG(INFO) << __func__;
  const int usage = Value(session.rangingRoundUsage);
  if (usage != 1 && usage != 2) {
    LOG(ERROR) << __func__ << ": Unsupported rangingRoundUsage "
               << toString(session.rangingRoundUsage);
    return false;
  }
  const int multi_node_mode = Value(session.multiNodeMode);
  if (multi_node_mode != 0 && multi_node_mode != 1) {
    LOG(ERROR) << __func__ << ": Unsupported multiNodeMode " << toString(session.multiNodeMode);
    return false;
  }
  const bool driver_controller = Value(session.deviceType) == kDriverControllerDeviceType;
  AttrWriter writer(msg);
  writer.U8(FIRA_SESSION_PARAM_ATTR_DEVICE_TYPE, driver_controller ? 0 : 1);
  writer.U8(FIRA_SESSION_PARAM_ATTR_DEVICE_ROLE, Value(session.deviceRole) != 0 ? 1 : 0);
  writer.U8(FIRA_SESSION_PARAM_ATTR_RANGING_ROUND_USAGE, static_cast<uint8_t>(usage));
  writer.U8(FIRA_SESSION_PARAM_ATTR_MULTI_NODE_MODE, static_cast<uint8_t>(multi_node_mode));
  if (!writer.ok()) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  if (!PutShortAddress(msg, FIRA_SESSION_PARAM_ATTR_SHORT_ADDR, session.deviceAddress) ||
      (driver_controller && (session.destAddressList.empty() ||
                             !PutShortAddress(msg, FIRA_SESSION_PARAM_ATTR_DESTINATION_SHORT_ADDR,
                                              session.destAddressList[0])))) {
    LOG(ERROR) << __func__ << kIncorrectAddress;
    return false;
  }
  return true;
}

bool FiraRegionUtils::PutTimingsParams(nl_msg* msg, const FiraTwrSession& session) {
  LOG(INFO) << __func__;
  AttrWriter writer(msg);
  writer.U32(FIRA_SESSION_PARAM_ATTR_INITIATION_TIME_MS,
             static_cast<uint32_t>(session.initiationTimeMs));
  writer.U32(FIRA_SESSION_PARAM_ATTR_SLOT_DURATION_RSTU,
             static_cast<uint32_t>(session.slotDurationRstu));
  writer.U32(FIRA_SESSION_PARAM_ATTR_RANGING_BLOCK_DURATION_MS,
             static_cast<uint32_t>(session.rangingBlockDurationMs));
  writer.U32(FIRA_SESSION_PARAM_ATTR_SLOTS_PER_RANGING_ROUND,
             static_cast<uint32_t>(session.slotsPerRangingRound));
  if (session.isBlockStridingEnabled) {
    writer.U32(FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_VALUE,
               static_cast<uint32_t>(session.blockStridingValue));
  }
  if (!writer.ok()) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  return true;
}

bool FiraRegionUtils::PutBehaviorParams(nl_msg* msg, const FiraTwrSession& session) {
  LOG(INFO) << __func__;
  const bool driver_controlee = Value(session.deviceType) == kDriverControleeDeviceType;
  const auto& control = session.rangingRoundControl;
  // Settings whose driver default is the other value go out only when they
  // differ from it.
  AttrWriter writer(msg);
  if (session.maxRangingRoundRetries >= 1) {
    writer.U32(FIRA_SESSION_PARAM_ATTR_MAX_RANGING_ROUND_RETRIES,
               static_cast<uint32_t>(session.maxRangingRoundRetries));
  }
  if (session.isHoppingEnabled) writer.U8(FIRA_SESSION_PARAM_ATTR_HOPPING_ENABLED, 1);
  if (session.isBlockStridingEnabled) writer.U8(FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_ENABLED, 1);
  writer.U8(FIRA_SESSION_PARAM_ATTR_SESSION_PRIORITY,
            static_cast<uint8_t>(session.sessionPriority));
  if (driver_controlee && !control.hasResultReportPhase) {
    writer.U8(FIRA_SESSION_PARAM_ATTR_RESULT_REPORT_PHASE, 0);
  }
  if (driver_controlee && Value(control.measurementReportType) == 1) {
    writer.U8(FIRA_SESSION_PARAM_ATTR_MEASUREMENT_REPORT_TYPE, 1);
  }
  if (!control.hasDeferredMode) writer.U8(FIRA_SESSION_PARAM_ATTR_DEFERRED_MODE, 0);
  // The signed byte widened as such: -1 goes out as 0xffffffff.
  writer.U32(FIRA_SESSION_PARAM_ATTR_IN_BAND_TERMINATION_ATTEMPT_COUNT,
             static_cast<uint32_t>(static_cast<int32_t>(session.inBandTerminationAttemptCount)));
  if (!writer.ok()) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  return true;
}

bool FiraRegionUtils::PutRadioParams(nl_msg* msg, const FiraTwrSession& session) {
  LOG(INFO) << __func__;
  const int rframe = Value(session.rframeConfig);
  // 2 exists on the air but not in this driver.
  if (rframe != 0 && rframe != 1 && rframe != 3) {
    LOG(ERROR) << __func__ << ": Unsupported Rframe config " << toString(session.rframeConfig);
    return false;
  }
  if (UnsignedValue(session.psduDataRate) > 3) {
    LOG(ERROR) << __func__ << ": Unsupported PSDU data rate " << toString(session.psduDataRate);
    return false;
  }
  AttrWriter writer(msg);
  writer.U8(FIRA_SESSION_PARAM_ATTR_CHANNEL_NUMBER, static_cast<uint8_t>(session.channelNumber));
  writer.U8(FIRA_SESSION_PARAM_ATTR_PREAMBLE_CODE_INDEX,
            static_cast<uint8_t>(session.preambleCodeIndex));
  writer.U8(FIRA_SESSION_PARAM_ATTR_RFRAME_CONFIG, static_cast<uint8_t>(rframe));
  if (Value(session.prfMode) == 0) writer.U8(FIRA_SESSION_PARAM_ATTR_PRF_MODE, 0);
  if (Value(session.preambleDuration) == 0) writer.U8(FIRA_SESSION_PARAM_ATTR_PREAMBLE_DURATION, 0);
  writer.U8(FIRA_SESSION_PARAM_ATTR_SFD_ID, static_cast<uint8_t>(session.sfdId));
  writer.U8(FIRA_SESSION_PARAM_ATTR_STS_SEGMENT_COUNT,
            static_cast<uint8_t>(session.stsSegmentCount));
  writer.U8(FIRA_SESSION_PARAM_ATTR_PSDU_DATA_RATE, UnsignedValue(session.psduDataRate));
  if (Value(session.bprfPhrDataRate) == 1) writer.U8(FIRA_SESSION_PARAM_ATTR_BPRF_PHR_DATA_RATE, 1);
  if (Value(session.fcsType) == 1) writer.U8(FIRA_SESSION_PARAM_ATTR_FCS_TYPE, 1);
  if (session.isTxAdaptivePayloadPowerEnabled) {
    writer.U8(FIRA_SESSION_PARAM_ATTR_TX_ADAPTIVE_PAYLOAD_POWER, 1);
  }
  if (!writer.ok()) {
    LOG(ERROR) << __func__ << " Error creating MCPS message";
    return false;
  }
  return true;
}

bool FiraRegionUtils::PutAntennaParams(nl_msg* msg, const FiraTwrSession& session,
                                       const HwConfig& hw_config) {
  LOG(INFO) << __func__;
  AttrWriter writer(msg);
  writer.U8(FIRA_SESSION_PARAM_ATTR_TX_ANTENNA_MASK,
            static_cast<uint8_t>(1u << (hw_config.tx_antenna % 32)));
  const auto azimuth_pair = static_cast<uint8_t>(hw_config.antenna_pair_azimuth);
  const auto elevation_pair = static_cast<uint8_t>(hw_config.antenna_pair_elevation);
  if (Value(session.aoaResultRequest) == 0) {
    // Without angle reports the type does not matter, valid or not.
    writer.U8(FIRA_SESSION_PARAM_ATTR_AZIMUTH_ANTENNA_PAIR, azimuth_pair);
  } else {
    switch (UnsignedValue(session.aoaType)) {
      case 0:
        writer.U8(FIRA_SESSION_PARAM_ATTR_AZIMUTH_ANTENNA_PAIR, azimuth_pair);
        break;
      case 1:
        writer.U8(FIRA_SESSION_PARAM_ATTR_ELEVATION_ANTENNA_PAIR, elevation_pair);
        break;
      case 2: {
        const bool pair_mode = Value(session.deviceRole) == 0 &&
                               Value(session.rangingRoundUsage) == 2 &&
                               Value(session.deviceType) == kDriverControllerDeviceType;
        writer.U8(FIRA_SESSION_PARAM_ATTR_AZIMUTH_ANTENNA_PAIR, azimuth_pair);
        writer.U8(FIRA_SESSION_PARAM_ATTR_ELEVATION_ANTENNA_PAIR, elevation_pair);
        writer.U8(FIRA_SESSION_PARAM_ATTR_AOA_PAIR_MODE, pair_mode ? 1 : 0);
        break;
      }
      default:
        LOG(ERROR) << __func__ << ": Unsupported AoaType: " << toString(session.aoaType);
        return false;
    }
  }
  if (!writer.ok()) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  return true;
}

bool FiraRegionUtils::PutCryptoParams(nl_msg* msg, const FiraTwrSession& session) {
  LOG(INFO) << __func__;
  const unsigned sts_config = UnsignedValue(session.stsConfig);
  if (sts_config > 2) {
    LOG(ERROR) << __func__ << ": Unsupported STS configuration: " << toString(session.stsConfig);
    return false;
  }
  AttrWriter writer(msg);
  writer.U8(FIRA_SESSION_PARAM_ATTR_STS_CONFIG, static_cast<uint8_t>(sts_config));
  if (sts_config == 2 && Value(session.deviceType) == kDriverControllerDeviceType) {
    writer.U32(FIRA_SESSION_PARAM_ATTR_SUB_SESSION_ID, static_cast<uint32_t>(session.subSessionId));
  }
  if (sts_config == 0) {
    std::vector<uint8_t> key = session.staticStsIV;
    key.insert(key.end(), session.vendorId.begin(), session.vendorId.end());
    writer.Bytes(FIRA_SESSION_PARAM_ATTR_STATIC_STS_KEY, key);
  }
  if (session.isKeyRotationEnabled) {
    writer.U8(FIRA_SESSION_PARAM_ATTR_KEY_ROTATION, 1);
    writer.U8(FIRA_SESSION_PARAM_ATTR_KEY_ROTATION_RATE,
              static_cast<uint8_t>(session.keyRotationRate));
  }
  if (!writer.ok()) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  return true;
}

bool FiraRegionUtils::PutReportParams(nl_msg* msg, const FiraTwrSession& session) {
  LOG(INFO) << __func__;
  const auto& report = session.resultReportConfig;
  AttrWriter writer(msg);
  if (Value(session.aoaResultRequest) == 1)
    writer.U8(FIRA_SESSION_PARAM_ATTR_AOA_RESULT_REQUEST, 1);
  if (report.hasTimeOfFlightReport) writer.U8(FIRA_SESSION_PARAM_ATTR_REPORT_TOF, 1);
  if (report.hasAngleOfArrivalAzimuthReport) {
    writer.U8(FIRA_SESSION_PARAM_ATTR_REPORT_AOA_AZIMUTH, 1);
  }
  if (report.hasAngleOfArrivalElevationReport) {
    writer.U8(FIRA_SESSION_PARAM_ATTR_REPORT_AOA_ELEVATION, 1);
  }
  if (report.hasAngleOfArrivalFigureOfMeritReport) {
    writer.U8(FIRA_SESSION_PARAM_ATTR_REPORT_AOA_FOM, 1);
  }
  if (!writer.ok()) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  return true;
}

bool FiraRegionUtils::PutShortAddress(nl_msg* msg, int attr, const UwbAddress& address) {
  LOG(INFO) << __func__;
  bool converted = false;
  uint16_t short_address = ToShortAddress(address.address, &converted);
  if (!converted) return false;
  if (nla_put_u16(msg, attr, short_address) != 0) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  return true;
}

// ---- Controlees and block striding ---------------------------------------

bool FiraRegionUtils::PutControlees(nl_msg* msg, const std::vector<UwbAddress>& controlees,
                                    const std::vector<int32_t>* sub_session_ids) {
  LOG(INFO) << __func__;
  nlattr* list = StartPlainNest(msg, FIRA_CALL_ATTR_CONTROLEES);
  if (list == nullptr) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  const auto count = static_cast<int32_t>(controlees.size());
  for (int32_t i = 0; i < count; ++i) {
    nlattr* entry = StartPlainNest(msg, i + 1);
    if (entry == nullptr) {
      LOG(ERROR) << __func__ << kErrorCreating;
      return false;
    }
    if (!PutShortAddress(msg, FIRA_CALL_CONTROLEE_ATTR_SHORT_ADDR, controlees[i])) {
      LOG(ERROR) << __func__ << kIncorrectAddress;
      return false;
    }
    if (sub_session_ids != nullptr) {
      // The controller matches both lists' sizes before it gets here.
      CHECK_LT(static_cast<size_t>(i), sub_session_ids->size())
          << "sub-session id list shorter than the controlee list";
      if (nla_put_u32(msg, FIRA_CALL_CONTROLEE_ATTR_SUB_SESSION_ID,
                      static_cast<uint32_t>((*sub_session_ids)[i])) != 0) {
        LOG(ERROR) << __func__ << kErrorCreating;
        return false;
      }
    }
    if (nla_nest_end(msg, entry) != 0) {
      LOG(ERROR) << __func__ << kErrorCreating;
      return false;
    }
  }
  if (nla_nest_end(msg, list) != 0) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  return true;
}

bool FiraRegionUtils::SendControlees(const char* caller, uint32_t hw_index, uint8_t call,
                                     uint32_t session_id, const std::vector<UwbAddress>& controlees,
                                     const std::vector<int32_t>* sub_session_ids) {
  if (controlees.empty()) {
    LOG(ERROR) << caller << ": Empty controlees";
    return false;
  }
  UniqueNlMsg msg;
  nlattr* region_nest = nullptr;
  nlattr* params_nest = nullptr;
  if (!StartCallMessage(msg.get(), hw_index, call, &region_nest, &params_nest)) return false;
  if (nla_put_u32(msg.get(), FIRA_CALL_ATTR_SESSION_ID, session_id) != 0) {
    LOG(ERROR) << caller << kErrorCreating;
    return false;
  }
  if (!PutControlees(msg.get(), controlees, sub_session_ids) ||
      !EndCallMessage(msg.get(), region_nest, params_nest)) {
    return false;
  }
  return socket_factory_->SendAndAwaitAck(msg.get());
}

bool FiraRegionUtils::AddControlees(uint32_t hw_index, uint32_t session_id,
                                    const std::vector<UwbAddress>& controlees,
                                    const std::vector<int32_t>* sub_session_ids) {
  LOG(INFO) << __func__;
  return SendControlees(__func__, hw_index, FIRA_CALL_NEW_CONTROLEE, session_id, controlees,
                        sub_session_ids);
}

bool FiraRegionUtils::RemoveControlees(uint32_t hw_index, uint32_t session_id,
                                       const std::vector<UwbAddress>& controlees) {
  LOG(INFO) << __func__;
  return SendControlees(__func__, hw_index, FIRA_CALL_DEL_CONTROLEE, session_id, controlees,
                        nullptr);
}

bool FiraRegionUtils::UpdateBlockStriding(uint32_t hw_index, uint32_t session_id, uint32_t value) {
  LOG(INFO) << __func__;
  UniqueNlMsg msg;
  nlattr* region_nest = nullptr;
  nlattr* params_nest = nullptr;
  if (!StartCallMessage(msg.get(), hw_index, FIRA_CALL_SESSION_SET_PARAMS, &region_nest,
                        &params_nest)) {
    return false;
  }
  nlattr* session_params = nullptr;
  bool built = nla_put_u32(msg.get(), FIRA_CALL_ATTR_SESSION_ID, session_id) == 0 &&
               (session_params = StartPlainNest(msg.get(), FIRA_CALL_ATTR_SESSION_PARAMS)) &&
               nla_put_u32(msg.get(), FIRA_SESSION_PARAM_ATTR_BLOCK_STRIDING_VALUE, value) == 0 &&
               nla_nest_end(msg.get(), session_params) == 0;
  if (!built) {
    LOG(ERROR) << __func__ << kErrorCreating;
    return false;
  }
  if (!EndCallMessage(msg.get(), region_nest, params_nest)) return false;
  return socket_factory_->SendAndAwaitAck(msg.get());
}

// ---- Notifications --------------------------------------------------------

void FiraRegionUtils::SubscribeCallback(uint32_t hw_index, FiraCallback* callback) {
  LOG(INFO) << __func__;
  callbacks_[hw_index] = callback;
}

void FiraRegionUtils::UnsubscribeCallback(uint32_t hw_index) {
  LOG(INFO) << __func__;
  callbacks_.erase(hw_index);
  if (callbacks_.empty()) CloseRangingSocket();
}

void FiraRegionUtils::CloseRangingSocket() {
  if (ranging_socket_ == nullptr) return;
  LOG(INFO) << __func__ << ": Close ranging socket";
  ranging_socket_.reset();
}

int FiraRegionUtils::OnRangingResult(nl_msg* msg) {
  uint32_t hw_index = 0;
  uint8_t call = 0;
  nlattr* params = GetCallContent(msg, &hw_index, &call);
  if (params == nullptr) return NL_STOP;
  if (call != FIRA_CALL_SESSION_NOTIFICATION) {
    LOG(INFO) << __func__ << ": Not a ranging notification message.";
    return NL_STOP;
  }
  const HwConfig hw_config = HwConfigOrDefault(hw_index);
  auto subscriber = callbacks_.find(hw_index);
  if (subscriber == callbacks_.end() || subscriber->second == nullptr) {
    LOG(INFO) << __func__ << ": No callback for hw index: " << hw_index;
    return NL_STOP;
  }
  FiraCallback* callback = subscriber->second;

  nlattr* fields[FIRA_SESSION_NTF_ATTR_MAX + 1] = {};
  if (nla_parse_nested(fields, FIRA_SESSION_NTF_ATTR_MAX, params, kFiraSessionNtfPolicy.data()) !=
      0) {
    LOG(WARNING) << __func__ << ": Failed to parse session ntf call attr";
    return NL_STOP;
  }
  if (fields[FIRA_SESSION_NTF_ATTR_SESSION_ID] == nullptr ||
      fields[FIRA_SESSION_NTF_ATTR_RANGING_DATA] == nullptr) {
    LOG(WARNING) << __func__ << ": Missing session ntf call attrs";
    return NL_STOP;
  }
  nlattr* data[FIRA_RANGING_DATA_ATTR_MAX + 1] = {};
  if (nla_parse_nested(data, FIRA_RANGING_DATA_ATTR_MAX, fields[FIRA_SESSION_NTF_ATTR_RANGING_DATA],
                       kFiraRangingDataPolicy.data()) != 0) {
    LOG(WARNING) << __func__ << ": Failed to parse session ntf call attr";
    return NL_STOP;
  }
  const uint32_t session_id = nla_get_u32(fields[FIRA_SESSION_NTF_ATTR_SESSION_ID]);
  if (data[FIRA_RANGING_DATA_ATTR_STOPPED] != nullptr) {
    callback->OnSessionStopped(session_id);
    return NL_STOP;
  }
  if (data[FIRA_RANGING_DATA_ATTR_INDEX] == nullptr ||
      data[FIRA_RANGING_DATA_ATTR_MEASUREMENTS] == nullptr) {
    LOG(WARNING) << __func__ << ": Missing ranging data attr";
    return NL_STOP;
  }
  FiraRangingData ranging_data;
  ranging_data.sessionId = static_cast<int32_t>(session_id);
  ranging_data.index = static_cast<int32_t>(nla_get_u32(data[FIRA_RANGING_DATA_ATTR_INDEX]));
  const uint64_t timestamp_ns = data[FIRA_RANGING_DATA_ATTR_TIMESTAMP_NS] != nullptr
                                    ? nla_get_u64(data[FIRA_RANGING_DATA_ATTR_TIMESTAMP_NS])
                                    : MonotonicNowNs();
  callback->OnTwrResult(ranging_data, ParseMeasurements(hw_config, data, timestamp_ns));
  return NL_STOP;
}

std::vector<FiraRegionUtils::FiraTwrMeasurement> FiraRegionUtils::ParseMeasurements(
    const HwConfig& hw_config, nlattr** ranging_data_attrs, uint64_t timestamp_ns) {
  std::vector<FiraTwrMeasurement> measurements;
  nlattr* list = ranging_data_attrs[FIRA_RANGING_DATA_ATTR_MEASUREMENTS];
  nlattr* entry;
  int remaining;
  // One allocation for the list, not one per doubling.
  size_t count = 0;
  nla_for_each_nested(entry, list, remaining)++ count;
  measurements.reserve(count);
  nla_for_each_nested(entry, list, remaining) {
    nlattr* fields[FIRA_MEASUREMENT_ATTR_MAX + 1] = {};
    if (nla_parse_nested(fields, FIRA_MEASUREMENT_ATTR_MAX, entry, kFiraMeasurementPolicy.data()) !=
        0) {
      LOG(ERROR) << __func__ << ": Failed to parse ranging measurement";
      continue;
    }
    if (fields[FIRA_MEASUREMENT_ATTR_STOPPED] != nullptr) {
      LOG(INFO) << __func__ << ": Stop ranging with peer.";
      continue;
    }
    if (fields[FIRA_MEASUREMENT_ATTR_SHORT_ADDR] == nullptr ||
        fields[FIRA_MEASUREMENT_ATTR_STATUS] == nullptr) {
      LOG(ERROR) << __func__ << ": Missing addr or status in ranging measurement";
      continue;
    }
    FiraTwrMeasurement measurement;
    // The address goes out as the value's two bytes in memory order.
    const uint16_t short_address = nla_get_u16(fields[FIRA_MEASUREMENT_ATTR_SHORT_ADDR]);
    const auto* address_bytes = reinterpret_cast<const uint8_t*>(&short_address);
    measurement.address.address.assign(address_bytes, address_bytes + sizeof(short_address));
    measurement.timestampNs = static_cast<int64_t>(timestamp_ns);
    measurement.status = static_cast<int8_t>(nla_get_u8(fields[FIRA_MEASUREMENT_ATTR_STATUS]));

    if (measurement.status == 0) {
      if (fields[FIRA_MEASUREMENT_ATTR_DISTANCE] == nullptr) {
        LOG(ERROR) << __func__ << ": Missing fields in ranging measurement";
        continue;
      }
      measurement.distance =
          static_cast<int32_t>(nla_get_u32(fields[FIRA_MEASUREMENT_ATTR_DISTANCE]));
      measurement.lineOfSight = fields[FIRA_MEASUREMENT_ATTR_NLOS] != nullptr ? 0
                                : fields[FIRA_MEASUREMENT_ATTR_LOS] != nullptr
                                    ? 1
                                    : static_cast<int8_t>(0xff);

      FiraAntennaMeasurement angles;
      uint8_t pair = kFiraNoAntennaPair;
      const int angle_nests = (fields[FIRA_MEASUREMENT_ATTR_AOA] != nullptr) +
                              (fields[FIRA_MEASUREMENT_ATTR_AOA_AZIMUTH] != nullptr) +
                              (fields[FIRA_MEASUREMENT_ATTR_AOA_ELEVATION] != nullptr);
      if (angle_nests > 0) measurement.antennaMeasurements.reserve(angle_nests);
      if (nlattr* azimuth = fields[FIRA_MEASUREMENT_ATTR_AOA_AZIMUTH];
          azimuth != nullptr && ParseAntennaMeasurement(azimuth, &angles, &pair)) {
        angles.kind = kFiraAntennaKindAzimuth;
        measurement.antennaMeasurements.push_back(angles);
      }
      if (nlattr* elevation = fields[FIRA_MEASUREMENT_ATTR_AOA_ELEVATION];
          elevation != nullptr && ParseAntennaMeasurement(elevation, &angles, &pair)) {
        angles.kind = kFiraAntennaKindElevation;
        measurement.antennaMeasurements.push_back(angles);
      }
      if (nlattr* named = fields[FIRA_MEASUREMENT_ATTR_AOA];
          named != nullptr && ParseAntennaMeasurement(named, &angles, &pair) &&
          pair != kFiraNoAntennaPair) {
        // Classified by the pair it names; angle data of any other pair is
        // not this radio's concern.
        if (pair == hw_config.antenna_pair_azimuth) {
          angles.kind = kFiraAntennaKindAzimuth;
          measurement.antennaMeasurements.push_back(angles);
        } else if (pair == hw_config.antenna_pair_elevation) {
          angles.kind = kFiraAntennaKindElevation;
          measurement.antennaMeasurements.push_back(angles);
        }
      }
      if (nlattr* azimuth = fields[FIRA_MEASUREMENT_ATTR_AZIMUTH]) {
        measurement.azimuthRad = nla_get_s16(azimuth) * kFiraAzimuthScale;
        if (nlattr* fom = fields[FIRA_MEASUREMENT_ATTR_AZIMUTH_FOM]) {
          measurement.azimuthFigureOfMerit = FigureOfMerit(nla_get_u8(fom));
        }
      }
      if (nlattr* elevation = fields[FIRA_MEASUREMENT_ATTR_ELEVATION]) {
        measurement.elevationRad = nla_get_s16(elevation) * kFiraElevationScale;
        if (nlattr* fom = fields[FIRA_MEASUREMENT_ATTR_ELEVATION_FOM]) {
          measurement.elevationFigureOfMerit = FigureOfMerit(nla_get_u8(fom));
        }
      }
    }
    measurements.push_back(std::move(measurement));
  }
  return measurements;
}

bool FiraRegionUtils::ParseAntennaMeasurement(nlattr* attr, FiraAntennaMeasurement* measurement,
                                              uint8_t* antenna_pair) {
  nlattr* fields[FIRA_AOA_ATTR_MAX + 1] = {};
  if (nla_parse_nested(fields, FIRA_AOA_ATTR_MAX, attr, kFiraAoaPolicy.data()) != 0) {
    LOG(ERROR) << __func__ << ": Failed to parse aoa data measurement";
    return false;
  }
  if (fields[FIRA_AOA_ATTR_FIRST_ANGLE] == nullptr ||
      fields[FIRA_AOA_ATTR_SECOND_ANGLE] == nullptr) {
    LOG(ERROR) << __func__ << ": Missing aoa data measurement fields";
    return false;
  }
  measurement->firstAngleRad = nla_get_s16(fields[FIRA_AOA_ATTR_FIRST_ANGLE]) * kFiraAzimuthScale;
  measurement->figureOfMerit = fields[FIRA_AOA_ATTR_FOM] != nullptr
                                   ? FigureOfMerit(nla_get_u8(fields[FIRA_AOA_ATTR_FOM]))
                                   : 0.0;
  measurement->secondAngleRad = nla_get_s16(fields[FIRA_AOA_ATTR_SECOND_ANGLE]) * kFiraAzimuthScale;
  *antenna_pair = fields[FIRA_AOA_ATTR_ANTENNA_PAIR] != nullptr
                      ? nla_get_u8(fields[FIRA_AOA_ATTR_ANTENNA_PAIR])
                      : kFiraNoAntennaPair;
  return true;
}

}  // namespace dalix
}  // namespace hardware
