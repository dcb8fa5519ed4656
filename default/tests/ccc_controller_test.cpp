#include "ccc_controller.h"

#include <functional>
#include <memory>

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
using ::testing::StrictMock;

constexpr uint32_t kHw = 2;
constexpr char kIface[] = "wpan2";

// Clients see every CCC failure as this code; it must not drift.
static_assert(CccController::kCccIllegalState == -7);

class CccControllerTest : public ::testing::Test {
 protected:
  void ExpectHardware(bool ok, const char* scheduler) {
    EXPECT_CALL(mcps_, GetHardwareInfo(kHw, _)).WillOnce(HardwareInfo(ok, scheduler));
  }
  void ExpectUp(bool up) { EXPECT_CALL(tool_, GetUpState(StrEq(kIface))).WillOnce(Return(up)); }
  void ExpectSetUp(bool up, bool ok) {
    EXPECT_CALL(tool_, SetUpState(StrEq(kIface), up)).WillOnce(Return(ok));
  }
  void ExpectDefaultScheduler(bool ok) {
    EXPECT_CALL(mcps_, SetScheduler(kHw, McpsScheduler::kDefault, McpsUtils::kNoSlotDuration,
                                    McpsUtils::kNoNodeType, false))
        .WillOnce(Return(ok));
  }
  void ExpectStart(bool ok, uint32_t value) {
    EXPECT_CALL(ccc_, StartCccSession(kHw, 0xfffffff0u, 77u, 9, _))
        .WillOnce(DoAll(SetArgPointee<4>(value), Return(ok)));
  }

  StrictMock<MockInterfaceTool> tool_;
  StrictMock<MockMcpsUtils> mcps_;
  StrictMock<MockCccRegionUtils> ccc_;
  std::shared_ptr<CccController> controller_ =
      ndk::SharedRefBase::make<CccController>(kIface, kHw, &tool_, &mcps_, &ccc_);
};

TEST_F(CccControllerTest, EveryDriverOrInterfaceFailureIsMinusSeven) {
  int64_t result = -1;
  auto open = [&] { return controller_->openCccSession(); };
  auto start = [&](int64_t timeref, int32_t channel) {
    return [&, timeref, channel] {
      return controller_->startCccSession(-16, timeref, channel, &result);
    };
  };
  const struct {
    const char* name;
    std::function<void()> expect;
    std::function<ndk::ScopedAStatus()> call;
    binder_exception_t exception;
    const char* message;
    int64_t result;
  } cases[] = {
      {"no radio", [&] { ExpectHardware(false, ""); }, open, -7, "", -1},
      {"already default, interface up",
       [&] {
         ExpectHardware(true, "default");
         ExpectUp(true);
       },
       open, EX_NONE, "", -1},
      {"no scheduler name, interface raised",
       [&] {
         ExpectHardware(true, "");
         ExpectUp(false);
         ExpectSetUp(true, true);
       },
       open, EX_NONE, "", -1},
      {"interface will not rise",
       [&] {
         ExpectHardware(true, "default");
         ExpectUp(false);
         ExpectSetUp(true, false);
       },
       open, -7, "", -1},
      {"other scheduler, interface will not go down",
       [&] {
         ExpectHardware(true, "simple-ranging");
         ExpectUp(true);
         ExpectSetUp(false, false);
       },
       open, -7, "", -1},
      {"scheduler refused",
       [&] {
         ExpectHardware(true, "endless");
         ExpectUp(false);
         ExpectDefaultScheduler(false);
       },
       open, -7, "", -1},
      {"negative timeref", [] {}, start(-1, 9), EX_ILLEGAL_ARGUMENT, "Timeref cannot be negative",
       -1},
      {"channel out of range", [] {}, start(77, 16), EX_ILLEGAL_ARGUMENT,
       "Incorrect channel value 16", -1},
      {"start refused",
       [&] {
         ExpectHardware(true, "default");
         ExpectUp(true);
         ExpectStart(false, 5);
       },
       start(77, 9), -7, "", -1},
      {"started after a scheduler change",
       [&] {
         ExpectHardware(true, "endless");
         ExpectUp(true);
         ExpectSetUp(false, true);
         ExpectDefaultScheduler(true);
         ExpectUp(false);
         ExpectSetUp(true, true);
         ExpectStart(true, 0xfffffff0u);
       },
       start(77, 9), EX_NONE, "", 0xfffffff0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    testing::InSequence in_order;
    c.expect();
    ndk::ScopedAStatus status = c.call();
    EXPECT_EQ(status.getExceptionCode(), c.exception);
    EXPECT_STREQ(status.getMessage(), c.message);
    // Out-parameters are written on success only, zero-extended.
    EXPECT_EQ(result, c.result);
    testing::Mock::VerifyAndClearExpectations(&tool_);
  }
  EXPECT_TRUE(controller_->onOpenCccSessionDone().isOk());
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
