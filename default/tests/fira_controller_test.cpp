#include "fira_controller.h"

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include <android-base/logging.h>
#include <gtest/gtest.h>

#include "tests/fira_session_builder.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using aidl::hardware::dalix::uwb::AoaType;
using aidl::hardware::dalix::uwb::DeviceType;
using aidl::hardware::dalix::uwb::FiraStsConfig;
using aidl::hardware::dalix::uwb::FiraTwrSession;

TEST(CheckTwrSessionFieldsTest, FirstFailedCheckNamesTheField) {
  using Change = std::function<void(FiraTwrSession&)>;
  const std::string kStaticSize = "Session with static STS needs to pass vendorId value with size of ";
  const struct {
    const char* what;
    Change change;
    std::string message;  // empty when the session passes
  } cases[] = {
      {"valid", [](FiraTwrSession&) {}, ""},
      {"long device address", [](FiraTwrSession& s) { s.deviceAddress.address = {1, 2, 3}; },
       "deviceAddress has incorrect size, only short addresses are supported in Fira 1.1"},
      // The address is checked first, so the negative time goes unreported.
      {"two faults",
       [](FiraTwrSession& s) {
         s.deviceAddress.address = {1};
         s.initiationTimeMs = -1;
       },
       "deviceAddress has incorrect size, only short addresses are supported in Fira 1.1"},
      {"initiation", [](FiraTwrSession& s) { s.initiationTimeMs = -1; },
       "initiationTimeMs cannot be negative."},
      {"slot", [](FiraTwrSession& s) { s.slotDurationRstu = -1; },
       "slotDurationRstu cannot be negative."},
      {"slots", [](FiraTwrSession& s) { s.slotsPerRangingRound = INT32_MIN; },
       "slotsPerRangingRound cannot be negative."},
      {"block", [](FiraTwrSession& s) { s.rangingBlockDurationMs = -1; },
       "rangingBlockDurationMs cannot be negative."},
      {"striding", [](FiraTwrSession& s) { s.blockStridingValue = -1; },
       "blockStridingValue cannot be negative."},
      {"retries", [](FiraTwrSession& s) { s.maxRangingRoundRetries = -1; },
       "maxRangingRoundRetries cannot be negative."},
      {"aoa 2", [](FiraTwrSession& s) { s.aoaType = AoaType::AZIMUTH_AND_ELEVATION; }, ""},
      {"aoa 3", [](FiraTwrSession& s) { s.aoaType = AoaType(3); }, "Unsupported AoaType: 3"},
      {"aoa -1", [](FiraTwrSession& s) { s.aoaType = AoaType(-1); }, "Unsupported AoaType: -1"},
      {"priority 100", [](FiraTwrSession& s) { s.sessionPriority = 100; }, ""},
      {"priority 101", [](FiraTwrSession& s) { s.sessionPriority = 101; },
       "Incorrect sessionPriority value 101"},
      {"priority -1", [](FiraTwrSession& s) { s.sessionPriority = -1; },
       "Incorrect sessionPriority value 4294967295"},
      {"attempts 0", [](FiraTwrSession& s) { s.inBandTerminationAttemptCount = 0; },
       "Incorrect inBandTerminationAttemptCount value 0"},
      {"attempts 10", [](FiraTwrSession& s) { s.inBandTerminationAttemptCount = 10; }, ""},
      {"attempts 11", [](FiraTwrSession& s) { s.inBandTerminationAttemptCount = 11; },
       "Incorrect inBandTerminationAttemptCount value 11"},
      {"attempts -2", [](FiraTwrSession& s) { s.inBandTerminationAttemptCount = -2; },
       "Incorrect inBandTerminationAttemptCount value 4294967294"},
      {"channel 15", [](FiraTwrSession& s) { s.channelNumber = 15; }, ""},
      {"channel 16", [](FiraTwrSession& s) { s.channelNumber = 16; },
       "Incorrect channel value 16"},
      {"channel -1", [](FiraTwrSession& s) { s.channelNumber = -1; },
       "Incorrect channel value -1"},
      {"sfd 4", [](FiraTwrSession& s) { s.sfdId = 4; }, ""},
      {"sfd -3", [](FiraTwrSession& s) { s.sfdId = -3; }, ""},
      {"sfd 5", [](FiraTwrSession& s) { s.sfdId = 5; }, "Incorrect sfdId value 5"},
      {"sfd 127", [](FiraTwrSession& s) { s.sfdId = 127; }, "Incorrect sfdId value 127"},
      // Whatever the device type, and with the controller wording.
      {"no destination",
       [](FiraTwrSession& s) {
         s.deviceType = DeviceType::CONTROLEE;
         s.destAddressList.clear();
       },
       "The device is controller of the session, destAddressList should not be empty"},
      {"bad second destination",
       [](FiraTwrSession& s) { s.destAddressList.push_back({{1, 2, 3, 4, 5, 6, 7, 8}}); },
       "destAddressList contains an incorrect address, only short addresses are supported in "
       "Fira 1.1"},
      {"static ok",
       [](FiraTwrSession& s) {
         s.stsConfig = FiraStsConfig::STATIC;
         s.vendorId = {1, 2};
         s.staticStsIV = {1, 2, 3, 4, 5, 6};
       },
       ""},
      {"static no vendor", [](FiraTwrSession& s) { s.stsConfig = FiraStsConfig::STATIC; },
       kStaticSize + "2"},
      {"static short iv",
       [](FiraTwrSession& s) {
         s.stsConfig = FiraStsConfig::STATIC;
         s.vendorId = {1, 2};
         s.staticStsIV = {1, 2, 3, 4, 5};
       },
       kStaticSize + "6"},
      {"dynamic vendor", [](FiraTwrSession& s) { s.vendorId = {1, 2}; },
       "Session without static STS should not pass vendorId value"},
      {"dynamic iv",
       [](FiraTwrSession& s) {
         s.stsConfig = FiraStsConfig::DYNAMIC_FOR_CONTROLEE_INDIVIDUAL_KEY;
         s.staticStsIV = {1};
       },
       "Session without static STS should not pass staticStsIV value"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    LogCapture log;
    FiraTwrSession session = ValidFiraSession(1);
    c.change(session);
    const ndk::ScopedAStatus status = FiraController::CheckTwrSessionFields(session);
    EXPECT_EQ(c.message.empty() ? EX_NONE : EX_ILLEGAL_ARGUMENT, status.getExceptionCode());
    EXPECT_EQ(c.message, status.getMessage());
    EXPECT_TRUE(log.Contains(android::base::INFO, "CheckTwrSessionFields",
                             "dalix.uwb.FiraController"));
  }
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
