#include <fstream>
#include <memory>
#include <optional>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include <android/binder_enums.h>
#include <gtest/gtest.h>

#include "uwb_aidl.h"

// Service code names the types through the alias of uwb_aidl.h, from inside
// its own namespace.
namespace hardware::dalix {
static_assert(std::is_same_v<aidl::hardware::dalix::uwb::FiraTwrSession,
                             ::aidl::aidl::hardware::dalix::uwb::FiraTwrSession>);
}  // namespace hardware::dalix

namespace {

namespace uwb = ::aidl::aidl::hardware::dalix::uwb;

// The signatures service code is written against, checked at build time.
static_assert(std::is_same_v<std::underlying_type_t<uwb::AoaType>, int8_t>);
static_assert(std::is_same_v<decltype(&uwb::IFiraController::addControlees),
                             ndk::ScopedAStatus (uwb::IFiraController::*)(
                                 int32_t, const std::vector<uwb::UwbAddress>&,
                                 const std::optional<std::vector<int32_t>>&)>);
static_assert(std::is_same_v<decltype(&uwb::IUwb::getIface),
                             ndk::ScopedAStatus (uwb::IUwb::*)(const std::string&,
                                                               std::shared_ptr<uwb::IUwbIface>*)>);
static_assert(std::is_same_v<decltype(&uwb::ICccController::startCccSession),
                             ndk::ScopedAStatus (uwb::ICccController::*)(int32_t, int64_t, int32_t,
                                                                         int64_t*)>);
static_assert(uwb::IFiraController::TRANSACTION_reset == FIRST_CALL_TRANSACTION + 14);

uwb::UwbAddress Address(std::vector<uint8_t> bytes) {
  uwb::UwbAddress address;
  address.address = std::move(bytes);
  return address;
}

TEST(GeneratedTypesTest, EnumerationsPrintNamesOrSignedNumbers) {
  const struct {
    std::string text;
    std::string expected;
  } cases[] = {
      {toString(uwb::DeviceType(1)), "CONTROLEE"},
      {toString(uwb::DeviceRole(1)), "INITIATOR"},
      {toString(uwb::RangingRoundUsage(2)), "DS_TWR"},
      {toString(uwb::MultiNodeMode(2)), "MANY_TO_MANY"},
      {toString(uwb::RframeConfig(0)), "SPO"},
      {toString(uwb::RframeConfig(2)), "2"},
      {toString(uwb::RframeConfig(3)), "SP3"},
      {toString(uwb::PrfMode(1)), "HPRF"},
      {toString(uwb::PreambleDuration(1)), "T64_SYMBOLS"},
      {toString(uwb::PsduDataRate(3)), "RATE_31M2"},
      {toString(uwb::BprfPhrDataRate(1)), "RATE_6M81"},
      {toString(uwb::FcsType(1)), "CRC_32"},
      {toString(uwb::PsduDataRate(-1)), "-1"},
      {toString(uwb::AoaType(2)), "AZIMUTH_AND_ELEVATION"},
      {toString(uwb::AoaType(-128)), "-128"},
      {toString(uwb::FiraStsConfig(2)), "DYNAMIC_FOR_CONTROLEE_INDIVIDUAL_KEY"},
      {toString(uwb::MeasurementReportType(1)), "RESPONDER_TO_INITIATOR"},
      {toString(uwb::AoaResultRequest(1)), "REQ_AOA_RESULTS"},
  };
  for (const auto& c : cases) EXPECT_EQ(c.expected, c.text);

  std::vector<std::string> names;
  for (uwb::RframeConfig value : ndk::enum_range<uwb::RframeConfig>()) {
    names.push_back(toString(value));
  }
  EXPECT_EQ((std::vector<std::string>{"SPO", "SP1", "SP3"}), names);
}

TEST(GeneratedTypesTest, SmallParcelablesPrintAndCompareEachField) {
  uwb::RangingRoundControl control;
  control.measurementReportType = uwb::MeasurementReportType::RESPONDER_TO_INITIATOR;
  control.hasDeferredMode = true;
  EXPECT_EQ("UwbAddress{address: [0, 128, 255]}", Address({0x00, 0x80, 0xff}).toString());
  EXPECT_EQ("UwbAddress{address: []}", Address({}).toString());
  EXPECT_EQ(
      "RangingRoundControl{hasResultReportPhase: false, measurementReportType: "
      "RESPONDER_TO_INITIATOR, hasDeferredMode: true}",
      control.toString());

  uwb::FiraTwrMeasurement a, b;
  EXPECT_EQ(a, b);
  b.distance = -1;
  EXPECT_NE(a, b);
}

TEST(GeneratedTypesTest, FullSessionPrintsEveryFieldInOrder) {
  using uwb::UwbAddress;
  // In declaration order; the expected text names each field.
  const uwb::FiraTwrSession session{
      -123456, uwb::DeviceType::CONTROLEE, uwb::DeviceRole::INITIATOR,
      uwb::RangingRoundUsage::DS_TWR, uwb::MultiNodeMode::MANY_TO_MANY, UwbAddress{{0x12, 0x34}},
      {UwbAddress{{0xab, 0xcd}}, UwbAddress{{0x00, 0xff}}}, 7, 2400, 25, 200, 3, 9, true, false,
      -56, {true, uwb::MeasurementReportType::RESPONDER_TO_INITIATOR, false}, 10, 9, 11,
      uwb::RframeConfig::SPO, uwb::PrfMode::HPRF, uwb::PreambleDuration::T64_SYMBOLS, -3, 2,
      uwb::PsduDataRate::RATE_27M2, uwb::BprfPhrDataRate::RATE_6M81, uwb::FcsType::CRC_32, true,
      uwb::AoaType::AZIMUTH_AND_ELEVATION, uwb::FiraStsConfig::DYNAMIC_FOR_CONTROLEE_INDIVIDUAL_KEY,
      2147483647, {0x07, 0xff}, {1, 2, 3, 4, 5, 128}, false, 127,
      uwb::AoaResultRequest::REQ_AOA_RESULTS, {true, false, true, false}};
  EXPECT_EQ(
      "FiraTwrSession{id: -123456, deviceType: CONTROLEE, deviceRole: INITIATOR, "
      "rangingRoundUsage: DS_TWR, multiNodeMode: MANY_TO_MANY, "
      "deviceAddress: UwbAddress{address: [18, 52]}, "
      "destAddressList: [UwbAddress{address: [171, 205]}, UwbAddress{address: [0, 255]}], "
      "initiationTimeMs: 7, slotDurationRstu: 2400, slotsPerRangingRound: 25, "
      "rangingBlockDurationMs: 200, blockStridingValue: 3, maxRangingRoundRetries: 9, "
      "isHoppingEnabled: true, isBlockStridingEnabled: false, sessionPriority: -56, "
      "rangingRoundControl: RangingRoundControl{hasResultReportPhase: true, "
      "measurementReportType: RESPONDER_TO_INITIATOR, hasDeferredMode: false}, "
      "inBandTerminationAttemptCount: 10, channelNumber: 9, preambleCodeIndex: 11, "
      "rframeConfig: SPO, prfMode: HPRF, preambleDuration: T64_SYMBOLS, sfdId: -3, "
      "stsSegmentCount: 2, psduDataRate: RATE_27M2, bprfPhrDataRate: RATE_6M81, "
      "fcsType: CRC_32, isTxAdaptivePayloadPowerEnabled: true, aoaType: AZIMUTH_AND_ELEVATION, "
      "stsConfig: DYNAMIC_FOR_CONTROLEE_INDIVIDUAL_KEY, subSessionId: 2147483647, "
      "vendorId: [7, 255], staticStsIV: [1, 2, 3, 4, 5, 128], isKeyRotationEnabled: false, "
      "keyRotationRate: 127, aoaResultRequest: REQ_AOA_RESULTS, "
      "resultReportConfig: ResultReportConfig{hasTimeOfFlightReport: true, "
      "hasAngleOfArrivalAzimuthReport: false, hasAngleOfArrivalElevationReport: true, "
      "hasAngleOfArrivalFigureOfMeritReport: false}}",
      session.toString());
}

template <typename Interface>
void ExpectIdentity(const char* name, const std::string& hash) {
  EXPECT_EQ(std::string("aidl.hardware.dalix.uwb.") + name, Interface::descriptor);
  static_assert(Interface::version == 1);
  EXPECT_EQ(hash, Interface::hash) << name;
}

TEST(GeneratedTypesTest, InterfacesCarryDescriptorVersionAndTheFrozenHash) {
  std::ifstream file(DALIX_AIDL_HASH_FILE);
  std::string recorded;
  file >> recorded;
  ASSERT_EQ(40u, recorded.size());
  ExpectIdentity<uwb::IUwb>("IUwb", recorded);
  ExpectIdentity<uwb::IUwbIface>("IUwbIface", recorded);
  ExpectIdentity<uwb::IFiraController>("IFiraController", recorded);
  ExpectIdentity<uwb::ICccController>("ICccController", recorded);
  ExpectIdentity<uwb::ISimpleRangingController>("ISimpleRangingController", recorded);
  ExpectIdentity<uwb::IUwbClientCallback>("IUwbClientCallback", recorded);
  ExpectIdentity<uwb::IFiraStateCallback>("IFiraStateCallback", recorded);
  ExpectIdentity<uwb::IFiraSessionCallback>("IFiraSessionCallback", recorded);
  ExpectIdentity<uwb::ISimpleRangingCallback>("ISimpleRangingCallback", recorded);
}

}  // namespace
