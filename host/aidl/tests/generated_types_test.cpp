#include <fstream>
#include <string>
#include <type_traits>
#include <vector>

#include <android/binder_enums.h>
#include <gtest/gtest.h>

#include "uwb_aidl.h"

namespace {

namespace uwb = ::aidl::aidl::hardware::dalix::uwb;

// What the platform's back end makes of the package, checked at build time.
static_assert(std::is_same_v<std::underlying_type_t<uwb::AoaType>, int8_t>);
static_assert(uwb::IFiraController::TRANSACTION_reset == FIRST_CALL_TRANSACTION + 14);

// The full session below prints one named value of each enumeration; the
// service's refusals print values without a name.
TEST(GeneratedTypesTest, EnumerationsListTheirValuesAndParcelablesCompare) {
  std::vector<std::string> names;
  for (uwb::RframeConfig value : ndk::enum_range<uwb::RframeConfig>()) {
    names.push_back(toString(value));
  }
  EXPECT_EQ((std::vector<std::string>{"SPO", "SP1", "SP3"}), names);
  EXPECT_EQ("UwbAddress{address: []}", uwb::UwbAddress{}.toString());

  uwb::FiraTwrMeasurement a, b;
  EXPECT_EQ(a, b);
  b.distance = -1;
  EXPECT_NE(a, b);
}

TEST(GeneratedTypesTest, FullSessionPrintsEveryFieldInOrder) {
  using uwb::UwbAddress;
  // In declaration order; the expected text names each field.
  // clang-format off
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
  // clang-format on
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
