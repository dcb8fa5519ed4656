#include "ccc_controller.h"

#include <functional>
#include <memory>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/mock_driver_clients.h"

namespace hardware {
namespace dalix {
namespace {

using ::testing::Return;

class CccControllerTest : public DriverClientsTest {
 protected:
  Step Default(bool ok) {
    return [=] {
      EXPECT_CALL(mcps_, SetScheduler(kHw, McpsScheduler::kDefault, McpsUtils::kNoSlotDuration,
                                      McpsUtils::kNoNodeType, false))
          .WillOnce(Return(ok));
    };
  }
  std::function<ndk::ScopedAStatus()> StartCall(int64_t timeref, int32_t channel) {
    return [=] { return controller_->startCccSession(-16, timeref, channel, &result_); };
  }

  std::shared_ptr<CccController> controller_ =
      ndk::SharedRefBase::make<CccController>(kIface, kHw, &tool_, &mcps_, &ccc_);
  int64_t result_ = -1;
};

// The start through the driver, its refusal included, is proven end to end.
TEST_F(CccControllerTest, EveryDriverOrInterfaceFailureIsMinusSeven) {
  // Clients tell CCC failures apart by this exact code.
  static_assert(CccController::kCccIllegalState == -7);
  auto open = [&] { return controller_->openCccSession(); };
  Run({Hw(false, "")}, open, -7);
  // Already on the default scheduler (or naming none): nothing is changed.
  Run({Hw(true, "default"), IsUp(true)}, open, EX_NONE);
  Run({Hw(true, ""), IsUp(false), Up(true, true)}, open, EX_NONE);
  Run({Hw(true, "default"), IsUp(false), Up(true, false)}, open, -7);
  Run({Hw(true, "simple-ranging"), IsUp(true), Up(false, false)}, open, -7);
  Run({Hw(true, "endless"), IsUp(false), Default(false)}, open, -7);
  Run({}, StartCall(-1, 9), EX_ILLEGAL_ARGUMENT, "Timeref cannot be negative");
  Run({}, StartCall(77, 16), EX_ILLEGAL_ARGUMENT, "Incorrect channel value 16");
  // |first| goes on as its 32-bit pattern; the driver's value comes back zero-extended.
  auto start = [this] {
    EXPECT_CALL(ccc_, StartCccSession(kHw, 0xfffffff0u, 77u, 9, ::testing::_))
        .WillOnce(::testing::DoAll(::testing::SetArgPointee<4>(0xfffffff0u), Return(true)));
  };
  Run({Hw(true, "endless"), IsUp(true), Up(false, true), Default(true), IsUp(false), Up(true, true),
       start},
      StartCall(77, 9), EX_NONE);
  EXPECT_EQ(result_, 0xfffffff0);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
