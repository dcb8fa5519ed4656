#include <fstream>
#include <string>
#include <type_traits>
#include <vector>

#include <android/binder_enums.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "uwb_aidl.h"

namespace {

namespace uwb = ::aidl::aidl::hardware::dalix::uwb;

// What the platform's back end makes of the package, checked at build time.
static_assert(std::is_same_v<std::underlying_type_t<uwb::AoaType>, int8_t>);
static_assert(uwb::IFiraController::TRANSACTION_reset == FIRST_CALL_TRANSACTION + 14);

// The forms the service's session log line is made of: every field in
// declaration order, enumerations by name, bytes signed, byte arrays unsigned,
// nested parcelables and lists. The service's refusals print unnamed values.
TEST(GeneratedTypesTest, EnumerationsAndParcelablesPrintAndCompareFieldByField) {
  std::vector<std::string> names;
  for (uwb::RframeConfig value : ndk::enum_range<uwb::RframeConfig>()) {
    names.push_back(toString(value));
  }
  EXPECT_EQ((std::vector<std::string>{"SPO", "SP1", "SP3"}), names);
  const uwb::RangingRoundControl control{true, uwb::MeasurementReportType::RESPONDER_TO_INITIATOR};
  EXPECT_EQ(
      "RangingRoundControl{hasResultReportPhase: true, "
      "measurementReportType: RESPONDER_TO_INITIATOR, hasDeferredMode: false}",
      control.toString());

  uwb::FiraTwrMeasurement a, b{uwb::UwbAddress{{0x12, 0xff}}, -5, 0, 300, -1, {{}}};
  EXPECT_EQ(
      "FiraTwrMeasurement{address: UwbAddress{address: [18, 255]}, timestampNs: -5, status: 0, "
      "distance: 300, lineOfSight: -1, antennaMeasurements: [FiraAntennaMeasurement{kind: 0, "
      "firstAngleRad: 0.000000, figureOfMerit: 0.000000, secondAngleRad: 0.000000}], "
      "azimuthRad: 0.000000, azimuthFigureOfMerit: 0.000000, elevationRad: 0.000000, "
      "elevationFigureOfMerit: 0.000000}",
      b.toString());
  EXPECT_EQ(a, uwb::FiraTwrMeasurement{});
  b.antennaMeasurements.clear();
  EXPECT_NE(a, b);
}

// The descriptor names the package; the hash is the one recorded at freezing.
template <typename... Interfaces>
void ExpectFrozenIdentity(const std::string& hash) {
  (..., [&] {
    static_assert(Interfaces::version == 1);
    EXPECT_THAT(Interfaces::descriptor,
                testing::MatchesRegex("aidl\\.hardware\\.dalix\\.uwb\\.I[A-Za-z]+"));
    EXPECT_EQ(hash, Interfaces::hash) << Interfaces::descriptor;
  }());
}

TEST(GeneratedTypesTest, InterfacesCarryTheFrozenVersionAndHash) {
  std::ifstream file(DALIX_AIDL_HASH_FILE);
  std::string recorded;
  file >> recorded;
  ASSERT_EQ(40u, recorded.size());
  ExpectFrozenIdentity<uwb::IUwb, uwb::IUwbIface, uwb::IFiraController, uwb::ICccController,
                       uwb::ISimpleRangingController, uwb::IUwbClientCallback,
                       uwb::IFiraStateCallback, uwb::IFiraSessionCallback,
                       uwb::ISimpleRangingCallback>(recorded);
}

}  // namespace
