#include "simple_ranging_controller.h"

#include <memory>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/mock_driver_clients.h"

namespace hardware {
namespace dalix {
namespace {

using ::testing::Return;
using ::testing::StrEq;

constexpr auto kUnknown = EX_TRANSACTION_FAILED;

class SimpleRangingControllerTest : public DriverClientsTest {
 protected:
  Step Phy(bool ok) {
    return [=] {
      EXPECT_CALL(ieee_, GetPhyInfo(StrEq(kIface), ::testing::_))
          .WillOnce(::testing::DoAll(::testing::SetArgPointee<1>(PhyInfo{0, {5, 9}}), Return(ok)));
    };
  }
  Step Requests(size_t count, bool ok) {
    return [=] {
      EXPECT_CALL(mcps_, SetRangingRequests(kHw, ::testing::SizeIs(count))).WillOnce(Return(ok));
    };
  }

  std::shared_ptr<SimpleRangingController> controller_ =
      ndk::SharedRefBase::make<SimpleRangingController>(kIface, kHw, &tool_, &mcps_, &ieee_);
};

// Both modes, and the start that succeeds, are proven end to end.
TEST_F(SimpleRangingControllerTest, StartEndsAtTheFirstFailingStep) {
  // The steps in order, the i-th failing when |fail| is i; 7 runs them all.
  auto steps = [&](int fail, int32_t channel) {
    std::vector<Step> all = {
        Up(false, fail != 0),
        [=] {
          EXPECT_CALL(mcps_, SetScheduler(kHw, McpsScheduler::kSimpleRanging,
                                          McpsUtils::kSimpleRangingSlotDuration,
                                          McpsUtils::kInitiator, false))
              .WillOnce(Return(fail != 1));
        },
        [=] {
          EXPECT_CALL(tool_, SetMacAddress(StrEq(kIface),
                                           InterfaceTool::MacAddress{1, 2, 3, 4, 5, 6, 7, 8}))
              .WillOnce(Return(fail != 2));
        },
        // The PAN id is narrowed to 16 bits.
        [=] { EXPECT_CALL(ieee_, SetPanId(StrEq(kIface), 0x1234)).WillOnce(Return(fail != 3)); },
        Phy(fail != 4),
        [=] { EXPECT_CALL(ieee_, SetChannel(StrEq(kIface), channel)).WillOnce(Return(fail != 5)); },
        Up(true, fail != 6)};
    all.resize(channel == 6 ? 5 : fail + 1);
    return all;
  };
  auto start = [&](int32_t channel) {
    return [=] { return controller_->startInitiatorMode(0x51234, 0x0102030405060708, channel); };
  };
  for (int fail : {0, 1, 2, 3, 5, 6}) Run(steps(fail, 9), start(9), kUnknown);
  Run(steps(4, 9), start(9), EX_ILLEGAL_ARGUMENT, "Incorrect channel value");
  Run(steps(7, 6), start(6), EX_ILLEGAL_ARGUMENT, "Incorrect channel value");
}

TEST_F(SimpleRangingControllerTest, RangingsStopAndCapabilitiesAnswerAsTheDriverAllows) {
  const std::vector<SimpleRangingController::RangingRequest> thirteen(13), fourteen(14);
  auto set = [&](const auto& list) { return [&] { return controller_->setRangings(list); }; };
  auto stop = [&] { return controller_->stop(); };
  SimpleRangingController::UwbCapabilities capabilities;
  auto get = [&] { return controller_->getCapabilities(&capabilities); };

  Run({IsUp(false)}, set(thirteen), EX_ILLEGAL_STATE, "Interface is not running");
  Run({IsUp(true)}, set(fourteen), EX_ILLEGAL_ARGUMENT, "Max ranging request size is 14");
  Run({IsUp(true), Requests(13, true)}, set(thirteen), EX_NONE);
  Run({IsUp(true), Requests(13, false)}, set(thirteen), kUnknown);
  Run({Hw(false)}, stop, EX_ILLEGAL_STATE);
  Run({Hw(true), Requests(0, false)}, stop, EX_ILLEGAL_STATE);
  // Whether the interface went down does not matter.
  Run({Hw(true), Requests(0, true), Up(false, false)}, stop, EX_NONE);
  Run({Phy(false)}, get, kUnknown);
  EXPECT_TRUE(capabilities.supportedChannels.empty());
  Run({Phy(true)}, get, EX_NONE);
  EXPECT_EQ(capabilities.supportedChannels, (std::vector<int32_t>{5, 9}));
  Run(
      {}, [&] { return controller_->setCallback(nullptr); }, EX_ILLEGAL_ARGUMENT, "null client");
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
