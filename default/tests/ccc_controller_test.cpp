#include "ccc_controller.h"

#include <functional>
#include <memory>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/mock_driver_clients.h"

namespace hardware {
namespace dalix {
namespace {

using ::testing::_;
using ::testing::DoAll;
using ::testing::Return;
using ::testing::SetArgPointee;
using ::testing::StrEq;

class CccControllerTest : public DriverClientsTest {
 protected:
  Step Default(bool ok) {
    return [=] {
      EXPECT_CALL(mcps_, SetScheduler(kHw, McpsScheduler::kDefault, McpsUtils::kNoSlotDuration,
                                      McpsUtils::kNoNodeType, false))
          .WillOnce(Return(ok));
    };
  }
  Step Start(bool ok) {
    // |first| goes on as its 32-bit pattern.
    return [=] {
      EXPECT_CALL(ccc_, StartCccSession(kHw, 0xfffffff0u, 77u, 9, _))
          .WillOnce(DoAll(SetArgPointee<4>(0xfffffff0u), Return(ok)));
    };
  }
  std::function<ndk::ScopedAStatus()> StartCall(int64_t timeref, int32_t channel) {
    return [=] { return controller_->startCccSession(-16, timeref, channel, &result_); };
  }

  std::shared_ptr<CccController> controller_ =
      ndk::SharedRefBase::make<CccController>(kIface, kHw, &tool_, &mcps_, &ccc_);
  int64_t result_ = -1;
};

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
  Run({Hw(true, "default"), IsUp(true), Start(false)}, StartCall(77, 9), -7);
  EXPECT_EQ(result_, -1);  // written on success only, zero-extended
  Run({Hw(true, "endless"), IsUp(true), Up(false, true), Default(true), IsUp(false), Up(true, true),
       Start(true)},
      StartCall(77, 9), EX_NONE);
  EXPECT_EQ(result_, 0xfffffff0);
  EXPECT_TRUE(controller_->onOpenCccSessionDone().isOk());
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
