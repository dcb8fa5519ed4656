#include <fstream>
#include <iterator>
#include <optional>
#include <string>
#include <type_traits>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/FiraTwrMeasurement.h>
#include <aidl/aidl/hardware/dalix/uwb/FiraTwrSession.h>
#include <aidl/aidl/hardware/dalix/uwb/ICccController.h>
#include <aidl/aidl/hardware/dalix/uwb/IFiraController.h>
#include <aidl/aidl/hardware/dalix/uwb/IFiraSessionCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/IFiraStateCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/ISimpleRangingCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/ISimpleRangingController.h>
#include <aidl/aidl/hardware/dalix/uwb/IUwb.h>
#include <aidl/aidl/hardware/dalix/uwb/IUwbClientCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/IUwbIface.h>
#include <android/binder_enums.h>
#include <gtest/gtest.h>

#include "uwb_aidl.h"

// Service code names the types through the alias of uwb_aidl.h, from inside
// its own namespace.
namespace hardware::dalix {
using AliasedSession = aidl::hardware::dalix::uwb::FiraTwrSession;
static_assert(std::is_same_v<AliasedSession, ::aidl::aidl::hardware::dalix::uwb::FiraTwrSession>);
}  // namespace hardware::dalix

namespace {

namespace uwb = ::aidl::aidl::hardware::dalix::uwb;

// The signatures service code is written against, checked at build time.
static_assert(std::is_same_v<decltype(uwb::UwbAddress::address), std::vector<uint8_t>>);
static_assert(std::is_same_v<decltype(uwb::FiraTwrSession::sessionPriority), int8_t>);
static_assert(std::is_same_v<decltype(uwb::FiraTwrSession::destAddressList),
                             std::vector<uwb::UwbAddress>>);
static_assert(sizeof(uwb::RframeConfig) == 1 &&
              std::is_same_v<std::underlying_type_t<uwb::AoaType>, int8_t>);
static_assert(std::is_same_v<decltype(&uwb::IFiraController::addControlees),
                             ndk::ScopedAStatus (uwb::IFiraController::*)(
                                 int32_t, const std::vector<uwb::UwbAddress>&,
                                 const std::optional<std::vector<int32_t>>&)>);
static_assert(std::is_same_v<decltype(&uwb::IUwb::getIface),
                             ndk::ScopedAStatus (uwb::IUwb::*)(
                                 const std::string&, std::shared_ptr<uwb::IUwbIface>*)>);
static_assert(std::is_same_v<decltype(&uwb::IUwb::open),
                             ndk::ScopedAStatus (uwb::IUwb::*)(
                                 const std::shared_ptr<uwb::IUwbClientCallback>&)>);
static_assert(std::is_same_v<decltype(&uwb::IUwb::listHardwareIndex),
                             ndk::ScopedAStatus (uwb::IUwb::*)(std::vector<int64_t>*)>);
static_assert(std::is_same_v<decltype(&uwb::ICccController::startCccSession),
                             ndk::ScopedAStatus (uwb::ICccController::*)(int32_t, int64_t,
                                                                         int32_t, int64_t*)>);
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
      {toString(uwb::DeviceType::CONTROLLER), "CONTROLLER"},
      {toString(uwb::DeviceType::CONTROLEE), "CONTROLEE"},
      {toString(uwb::DeviceRole::RESPONDER), "RESPONDER"},
      {toString(uwb::DeviceRole::INITIATOR), "INITIATOR"},
      {toString(uwb::RangingRoundUsage::OWR), "OWR"},
      {toString(uwb::RangingRoundUsage::DS_TWR), "DS_TWR"},
      {toString(uwb::MultiNodeMode::ONE_TO_MANY), "ONE_TO_MANY"},
      {toString(uwb::RframeConfig(0)), "SPO"},
      {toString(uwb::RframeConfig(1)), "SP1"},
      {toString(uwb::RframeConfig(2)), "2"},
      {toString(uwb::RframeConfig(3)), "SP3"},
      {toString(uwb::PrfMode::HPRF), "HPRF"},
      {toString(uwb::PreambleDuration::T32_SYMBOLS), "T32_SYMBOLS"},
      {toString(uwb::PsduDataRate(1)), "RATE_7M80"},
      {toString(uwb::PsduDataRate(3)), "RATE_31M2"},
      {toString(uwb::PsduDataRate(4)), "4"},
      {toString(uwb::PsduDataRate(-1)), "-1"},
      {toString(uwb::BprfPhrDataRate::RATE_850K), "RATE_850K"},
      {toString(uwb::FcsType::CRC_32), "CRC_32"},
      {toString(uwb::AoaType(2)), "AZIMUTH_AND_ELEVATION"},
      {toString(uwb::AoaType(3)), "3"},
      {toString(uwb::AoaType(-128)), "-128"},
      {toString(uwb::FiraStsConfig(2)), "DYNAMIC_FOR_CONTROLEE_INDIVIDUAL_KEY"},
      {toString(uwb::AoaResultRequest::REQ_AOA_RESULTS), "REQ_AOA_RESULTS"},
      {toString(uwb::MeasurementReportType(1)), "RESPONDER_TO_INITIATOR"},
  };
  for (const auto& c : cases) EXPECT_EQ(c.expected, c.text);
}

TEST(GeneratedTypesTest, EnumRangeListsDeclaredValuesInOrder) {
  std::vector<std::string> names;
  for (uwb::RframeConfig value : ndk::enum_range<uwb::RframeConfig>()) {
    names.push_back(toString(value));
  }
  EXPECT_EQ((std::vector<std::string>{"SPO", "SP1", "SP3"}), names);
  EXPECT_EQ(4, std::distance(ndk::enum_range<uwb::PsduDataRate>().begin(),
                             ndk::enum_range<uwb::PsduDataRate>().end()));
}

TEST(GeneratedTypesTest, SmallParcelablesPrintEachField) {
  uwb::RangingRoundControl control;
  control.measurementReportType = uwb::MeasurementReportType::RESPONDER_TO_INITIATOR;
  control.hasDeferredMode = true;
  uwb::ResultReportConfig report;
  report.hasAngleOfArrivalElevationReport = true;
  const struct {
    std::string text;
    std::string expected;
  } cases[] = {
      {Address({0x12, 0x34}).toString(), "UwbAddress{address: [18, 52]}"},
      {Address({0x00, 0x80, 0xff}).toString(), "UwbAddress{address: [0, 128, 255]}"},
      {Address({}).toString(), "UwbAddress{address: []}"},
      {control.toString(),
       "RangingRoundControl{hasResultReportPhase: false, measurementReportType: "
       "RESPONDER_TO_INITIATOR, hasDeferredMode: true}"},
      {report.toString(),
       "ResultReportConfig{hasTimeOfFlightReport: false, hasAngleOfArrivalAzimuthReport: false, "
       "hasAngleOfArrivalElevationReport: true, hasAngleOfArrivalFigureOfMeritReport: false}"},
  };
  for (const auto& c : cases) EXPECT_EQ(c.expected, c.text);
}

TEST(GeneratedTypesTest, FullSessionPrintsEveryFieldInOrder) {
  uwb::FiraTwrSession s;
  s.id = -123456;
  s.deviceType = uwb::DeviceType::CONTROLEE;
  s.deviceRole = uwb::DeviceRole::INITIATOR;
  s.rangingRoundUsage = uwb::RangingRoundUsage::DS_TWR;
  s.multiNodeMode = uwb::MultiNodeMode::MANY_TO_MANY;
  s.deviceAddress = Address({0x12, 0x34});
  s.destAddressList = {Address({0xab, 0xcd}), Address({0x00, 0xff})};
  s.initiationTimeMs = 7;
  s.slotDurationRstu = 2400;
  s.slotsPerRangingRound = 25;
  s.rangingBlockDurationMs = 200;
  s.blockStridingValue = 3;
  s.maxRangingRoundRetries = 9;
  s.isHoppingEnabled = true;
  s.isBlockStridingEnabled = false;
  s.sessionPriority = static_cast<int8_t>(200);
  s.rangingRoundControl.hasResultReportPhase = true;
  s.rangingRoundControl.measurementReportType = uwb::MeasurementReportType::RESPONDER_TO_INITIATOR;
  s.inBandTerminationAttemptCount = 10;
  s.channelNumber = 9;
  s.preambleCodeIndex = 11;
  s.rframeConfig = uwb::RframeConfig::SPO;
  s.prfMode = uwb::PrfMode::HPRF;
  s.preambleDuration = uwb::PreambleDuration::T64_SYMBOLS;
  s.sfdId = -3;
  s.stsSegmentCount = 2;
  s.psduDataRate = uwb::PsduDataRate::RATE_27M2;
  s.bprfPhrDataRate = uwb::BprfPhrDataRate::RATE_6M81;
  s.fcsType = uwb::FcsType::CRC_32;
  s.isTxAdaptivePayloadPowerEnabled = true;
  s.aoaType = uwb::AoaType::AZIMUTH_AND_ELEVATION;
  s.stsConfig = uwb::FiraStsConfig::DYNAMIC_FOR_CONTROLEE_INDIVIDUAL_KEY;
  s.subSessionId = 2147483647;
  s.vendorId = {0x07, 0xff};
  s.staticStsIV = {1, 2, 3, 4, 5, 128};
  s.isKeyRotationEnabled = false;
  s.keyRotationRate = 127;
  s.aoaResultRequest = uwb::AoaResultRequest::REQ_AOA_RESULTS;
  s.resultReportConfig.hasTimeOfFlightReport = true;
  s.resultReportConfig.hasAngleOfArrivalElevationReport = true;

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
      s.toString());
}

TEST(GeneratedTypesTest, DefaultSessionIsZeroedWithEmptyLists) {
  const std::string text = uwb::FiraTwrSession().toString();
  for (const char* expected :
       {"{id: 0, deviceType: CONTROLLER, deviceRole: RESPONDER, rangingRoundUsage: OWR, ",
        "deviceAddress: UwbAddress{address: []}, destAddressList: [], ",
        "sessionPriority: 0, ", "rframeConfig: SPO, ", "vendorId: [], staticStsIV: [], ",
        "stsConfig: STATIC, "}) {
    EXPECT_NE(std::string::npos, text.find(expected)) << expected << " in " << text;
  }
}

TEST(GeneratedTypesTest, ParcelablesCompareFieldByField) {
  uwb::FiraTwrMeasurement a, b;
  EXPECT_EQ(a, b);
  b.address = Address({1, 2});
  EXPECT_NE(a, b);
  EXPECT_LT(a, b);
  a.address = Address({1, 2});
  a.distance = -1;
  EXPECT_GT(b, a);
  EXPECT_EQ(0.0, uwb::FiraTwrMeasurement().azimuthFigureOfMerit);
}

TEST(GeneratedTypesTest, InterfacesCarryDescriptorVersionAndTheFrozenHash) {
  std::ifstream file(DALIX_AIDL_HASH_FILE);
  std::string recorded;
  file >> recorded;
  ASSERT_EQ(40u, recorded.size());
  EXPECT_EQ(std::string::npos, recorded.find_first_not_of("0123456789abcdef"));

  const struct {
    const char* descriptor;
    int32_t version;
    const std::string& hash;
    const char* expected_descriptor;
  } cases[] = {
      {uwb::IUwb::descriptor, uwb::IUwb::version, uwb::IUwb::hash, "aidl.hardware.dalix.uwb.IUwb"},
      {uwb::IUwbIface::descriptor, uwb::IUwbIface::version, uwb::IUwbIface::hash,
       "aidl.hardware.dalix.uwb.IUwbIface"},
      {uwb::IFiraController::descriptor, uwb::IFiraController::version,
       uwb::IFiraController::hash, "aidl.hardware.dalix.uwb.IFiraController"},
      {uwb::ICccController::descriptor, uwb::ICccController::version, uwb::ICccController::hash,
       "aidl.hardware.dalix.uwb.ICccController"},
      {uwb::ISimpleRangingController::descriptor, uwb::ISimpleRangingController::version,
       uwb::ISimpleRangingController::hash, "aidl.hardware.dalix.uwb.ISimpleRangingController"},
      {uwb::IUwbClientCallback::descriptor, uwb::IUwbClientCallback::version,
       uwb::IUwbClientCallback::hash, "aidl.hardware.dalix.uwb.IUwbClientCallback"},
      {uwb::IFiraStateCallback::descriptor, uwb::IFiraStateCallback::version,
       uwb::IFiraStateCallback::hash, "aidl.hardware.dalix.uwb.IFiraStateCallback"},
      {uwb::IFiraSessionCallback::descriptor, uwb::IFiraSessionCallback::version,
       uwb::IFiraSessionCallback::hash, "aidl.hardware.dalix.uwb.IFiraSessionCallback"},
      {uwb::ISimpleRangingCallback::descriptor, uwb::ISimpleRangingCallback::version,
       uwb::ISimpleRangingCallback::hash, "aidl.hardware.dalix.uwb.ISimpleRangingCallback"},
  };
  for (const auto& c : cases) {
    EXPECT_STREQ(c.expected_descriptor, c.descriptor);
    EXPECT_EQ(1, c.version);
    EXPECT_EQ(recorded, c.hash) << c.descriptor;
  }
  EXPECT_STREQ("aidl.hardware.dalix.uwb.FiraTwrSession", uwb::FiraTwrSession::descriptor);
}

}  // namespace
