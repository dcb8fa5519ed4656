#include "simple_ranging_controller.h"

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/mock_driver_clients.h"

namespace hardware {
namespace dalix {
namespace {

using ::testing::_;
using ::testing::DoAll;
using ::testing::InSequence;
using ::testing::Return;
using ::testing::SetArgPointee;
using ::testing::StrEq;
using ::testing::StrictMock;

constexpr uint32_t kHw = 4;
constexpr char kIface[] = "wpan4";
constexpr int64_t kAddress = 0x0102030405060708;
constexpr InterfaceTool::MacAddress kMac = {1, 2, 3, 4, 5, 6, 7, 8};

// What a call ends with: OK, an exception with its message, or the plain
// unknown-error status (exception EX_TRANSACTION_FAILED).
struct Outcome {
  binder_exception_t exception;
  const char* message;
};
constexpr Outcome kOk = {EX_NONE, ""};
constexpr Outcome kUnknownError = {EX_TRANSACTION_FAILED, ""};

class SimpleRangingControllerTest : public ::testing::Test {
 protected:
  void Check(const ndk::ScopedAStatus& status, const Outcome& expected) {
    EXPECT_EQ(status.getExceptionCode(), expected.exception);
    EXPECT_STREQ(status.getMessage(), expected.message);
    if (expected.exception == EX_TRANSACTION_FAILED) {
      EXPECT_EQ(status.getStatus(), STATUS_UNKNOWN_ERROR);
    }
  }

  StrictMock<MockInterfaceTool> tool_;
  StrictMock<MockMcpsUtils> mcps_;
  StrictMock<MockIeeeUtils> ieee_;
  std::shared_ptr<SimpleRangingController> controller_ =
      ndk::SharedRefBase::make<SimpleRangingController>(kIface, kHw, &tool_, &mcps_, &ieee_);
};

TEST_F(SimpleRangingControllerTest, StartEndsAtTheFirstFailingStep) {
  enum Step { kDown, kScheduler, kMacAddress, kPanId, kPhy, kChannel, kUp };
  // Each case runs the steps up to |last|, which answers |last_ok|.
  const struct {
    Step last;
    bool last_ok;
    bool responder;
    int32_t channel;
    Outcome outcome;
  } cases[] = {
      {kUp, true, false, 9, kOk},
      {kUp, true, true, 5, kOk},
      {kDown, false, false, 9, kUnknownError},
      {kScheduler, false, true, 9, kUnknownError},
      {kMacAddress, false, false, 9, kUnknownError},
      {kPanId, false, false, 9, kUnknownError},
      {kPhy, false, false, 9, {EX_ILLEGAL_ARGUMENT, "Incorrect channel value"}},
      {kPhy, true, false, 6, {EX_ILLEGAL_ARGUMENT, "Incorrect channel value"}},
      {kChannel, false, false, 9, kUnknownError},
      {kUp, false, true, 9, kUnknownError},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << "last step " << c.last << ", channel " << c.channel);
    const std::function<void(bool)> steps[] = {
        [&](bool ok) { EXPECT_CALL(tool_, SetUpState(StrEq(kIface), false)).WillOnce(Return(ok)); },
        [&](bool ok) {
          EXPECT_CALL(mcps_,
                      SetScheduler(
                          kHw, McpsScheduler::kSimpleRanging, McpsUtils::kSimpleRangingSlotDuration,
                          c.responder ? McpsUtils::kResponder : McpsUtils::kInitiator, false))
              .WillOnce(Return(ok));
        },
        [&](bool ok) {
          EXPECT_CALL(tool_, SetMacAddress(StrEq(kIface), kMac)).WillOnce(Return(ok));
        },
        // The PAN id is narrowed to 16 bits.
        [&](bool ok) { EXPECT_CALL(ieee_, SetPanId(StrEq(kIface), 0x1234)).WillOnce(Return(ok)); },
        [&](bool ok) {
          EXPECT_CALL(ieee_, GetPhyInfo(StrEq(kIface), _))
              .WillOnce(DoAll(SetArgPointee<1>(PhyInfo{0, {5, 9}}), Return(ok)));
        },
        [&](bool ok) {
          EXPECT_CALL(ieee_, SetChannel(StrEq(kIface), c.channel)).WillOnce(Return(ok));
        },
        [&](bool ok) { EXPECT_CALL(tool_, SetUpState(StrEq(kIface), true)).WillOnce(Return(ok)); },
    };
    InSequence in_order;
    for (int step = kDown; step <= c.last; ++step) steps[step](step < c.last || c.last_ok);
    Check(c.responder ? controller_->startResponderMode(0x51234, kAddress, c.channel)
                      : controller_->startInitiatorMode(0x51234, kAddress, c.channel),
          c.outcome);
    testing::Mock::VerifyAndClearExpectations(&tool_);
    testing::Mock::VerifyAndClearExpectations(&mcps_);
    testing::Mock::VerifyAndClearExpectations(&ieee_);
  }
}

TEST_F(SimpleRangingControllerTest, RangingsStopAndCapabilitiesAnswerAsTheDriverAllows) {
  const std::vector<SimpleRangingController::RangingRequest> thirteen(13), fourteen(14);
  std::vector<int32_t> channels;
  const struct {
    const char* name;
    std::function<void()> expect;
    std::function<ndk::ScopedAStatus()> call;
    Outcome outcome;
  } cases[] = {
      {"setRangings while down",
       [&] { EXPECT_CALL(tool_, GetUpState(StrEq(kIface))).WillOnce(Return(false)); },
       [&] { return controller_->setRangings(thirteen); },
       {EX_ILLEGAL_STATE, "Interface is not running"}},
      {"setRangings of 14",
       [&] { EXPECT_CALL(tool_, GetUpState(StrEq(kIface))).WillOnce(Return(true)); },
       [&] { return controller_->setRangings(fourteen); },
       {EX_ILLEGAL_ARGUMENT, "Max ranging request size is 14"}},
      {"setRangings of 13",
       [&] {
         EXPECT_CALL(tool_, GetUpState(StrEq(kIface))).WillOnce(Return(true));
         EXPECT_CALL(mcps_, SetRangingRequests(kHw, thirteen)).WillOnce(Return(true));
       },
       [&] { return controller_->setRangings(thirteen); }, kOk},
      {"setRangings refused",
       [&] {
         EXPECT_CALL(tool_, GetUpState(StrEq(kIface))).WillOnce(Return(true));
         EXPECT_CALL(mcps_, SetRangingRequests(kHw, thirteen)).WillOnce(Return(false));
       },
       [&] { return controller_->setRangings(thirteen); }, kUnknownError},
      {"stop without the radio",
       [&] { EXPECT_CALL(mcps_, GetHardwareInfo(kHw, _)).WillOnce(HardwareInfo(false)); },
       [&] { return controller_->stop(); },
       {EX_ILLEGAL_STATE, ""}},
      {"stop refused",
       [&] {
         EXPECT_CALL(mcps_, GetHardwareInfo(kHw, _)).WillOnce(HardwareInfo(true));
         EXPECT_CALL(mcps_, SetRangingRequests(kHw, testing::IsEmpty())).WillOnce(Return(false));
       },
       [&] { return controller_->stop(); },
       {EX_ILLEGAL_STATE, ""}},
      {"stop",
       [&] {
         EXPECT_CALL(mcps_, GetHardwareInfo(kHw, _)).WillOnce(HardwareInfo(true));
         EXPECT_CALL(mcps_, SetRangingRequests(kHw, testing::IsEmpty())).WillOnce(Return(true));
         // Whether the interface went down does not matter.
         EXPECT_CALL(tool_, SetUpState(StrEq(kIface), false)).WillOnce(Return(false));
       },
       [&] { return controller_->stop(); }, kOk},
      {"capabilities unreadable",
       [&] { EXPECT_CALL(ieee_, GetPhyInfo(StrEq(kIface), _)).WillOnce(Return(false)); },
       [&] {
         SimpleRangingController::UwbCapabilities capabilities;
         return controller_->getCapabilities(&capabilities);
       },
       kUnknownError},
      {"capabilities",
       [&] {
         EXPECT_CALL(ieee_, GetPhyInfo(StrEq(kIface), _))
             .WillOnce(DoAll(SetArgPointee<1>(PhyInfo{0, {5, 9}}), Return(true)));
       },
       [&] {
         SimpleRangingController::UwbCapabilities capabilities;
         ndk::ScopedAStatus status = controller_->getCapabilities(&capabilities);
         channels = capabilities.supportedChannels;
         return status;
       },
       kOk},
      {"null callback",
       [] {},
       [&] { return controller_->setCallback(nullptr); },
       {EX_ILLEGAL_ARGUMENT, "null client"}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    c.expect();
    Check(c.call(), c.outcome);
  }
  EXPECT_EQ(channels, (std::vector<int32_t>{5, 9}));
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
