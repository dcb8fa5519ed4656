#include <android/binder_auto_utils.h>
#include <android/binder_status.h>

#include <string>
#include <utility>

#include <gtest/gtest.h>

namespace {

using ndk::ScopedAStatus;

TEST(StatusTest, EachConstructorReportsItsParts) {
  const struct {
    const char* what;
    ScopedAStatus status;
    bool ok;
    binder_exception_t exception;
    int32_t service_specific;
    binder_status_t transport;
    std::string message;
  } cases[] = {
      {"ok", ScopedAStatus::ok(), true, EX_NONE, 0, STATUS_OK, ""},
      {"exception", ScopedAStatus::fromExceptionCode(EX_ILLEGAL_STATE), false, EX_ILLEGAL_STATE,
       0, STATUS_OK, ""},
      {"exception with message",
       ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT, "bad channel"), false,
       EX_ILLEGAL_ARGUMENT, 0, STATUS_OK, "bad channel"},
      {"null message", ScopedAStatus::fromExceptionCodeWithMessage(EX_UNSUPPORTED_OPERATION, nullptr),
       false, EX_UNSUPPORTED_OPERATION, 0, STATUS_OK, ""},
      {"EX_NONE is ok", ScopedAStatus::fromExceptionCode(EX_NONE), true, EX_NONE, 0, STATUS_OK, ""},
      {"service-specific exception without code",
       ScopedAStatus::fromExceptionCode(EX_SERVICE_SPECIFIC), false, EX_SERVICE_SPECIFIC, 0,
       STATUS_OK, ""},
      {"transaction failed exception", ScopedAStatus::fromExceptionCode(EX_TRANSACTION_FAILED),
       false, EX_TRANSACTION_FAILED, 0, STATUS_FAILED_TRANSACTION, ""},
      {"service-specific", ScopedAStatus::fromServiceSpecificError(1), false, EX_SERVICE_SPECIFIC,
       1, STATUS_OK, ""},
      {"service-specific with message",
       ScopedAStatus::fromServiceSpecificErrorWithMessage(1, "Netlink failure"), false,
       EX_SERVICE_SPECIFIC, 1, STATUS_OK, "Netlink failure"},
      {"negative service-specific", ScopedAStatus::fromServiceSpecificError(-7), false,
       EX_SERVICE_SPECIFIC, -7, STATUS_OK, ""},
      {"status OK", ScopedAStatus::fromStatus(STATUS_OK), true, EX_NONE, 0, STATUS_OK, ""},
      {"unknown error", ScopedAStatus::fromStatus(STATUS_UNKNOWN_ERROR), false,
       EX_TRANSACTION_FAILED, 0, STATUS_UNKNOWN_ERROR, ""},
      {"dead object", ScopedAStatus::fromStatus(STATUS_DEAD_OBJECT), false, EX_TRANSACTION_FAILED,
       0, STATUS_DEAD_OBJECT, ""},
      {"empty", ScopedAStatus(), false, EX_TRANSACTION_FAILED, 0, STATUS_UNEXPECTED_NULL, ""},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    EXPECT_EQ(c.ok, c.status.isOk());
    EXPECT_EQ(c.exception, c.status.getExceptionCode());
    EXPECT_EQ(c.service_specific, c.status.getServiceSpecificError());
    EXPECT_EQ(c.transport, c.status.getStatus());
    EXPECT_EQ(c.message, c.status.getMessage());
  }
}

TEST(StatusTest, CodesHaveThePlatformValues) {
  EXPECT_EQ(-3, EX_ILLEGAL_ARGUMENT);
  EXPECT_EQ(-5, EX_ILLEGAL_STATE);
  EXPECT_EQ(-7, EX_UNSUPPORTED_OPERATION);
  EXPECT_EQ(-8, EX_SERVICE_SPECIFIC);
  EXPECT_EQ(-129, EX_TRANSACTION_FAILED);
  EXPECT_EQ(static_cast<int32_t>(0x80000000u), STATUS_UNKNOWN_ERROR);
  EXPECT_EQ(STATUS_UNKNOWN_ERROR + 2, STATUS_FAILED_TRANSACTION);
  EXPECT_EQ(-EPIPE, STATUS_DEAD_OBJECT);
}

TEST(StatusTest, DescriptionNamesExceptionDetailAndMessage) {
  EXPECT_EQ("No error", ScopedAStatus::ok().getDescription());
  EXPECT_EQ("Status(-3, EX_ILLEGAL_ARGUMENT): 'bad'",
            ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT, "bad")
                .getDescription());
  EXPECT_EQ("Status(-8, EX_SERVICE_SPECIFIC): '1: Netlink failure'",
            ScopedAStatus::fromServiceSpecificErrorWithMessage(1, "Netlink failure")
                .getDescription());
  EXPECT_EQ("Status(-129, EX_TRANSACTION_FAILED): '-32: '",
            ScopedAStatus::fromStatus(STATUS_DEAD_OBJECT).getDescription());
}

TEST(StatusTest, MoveTransfersOwnershipAndLeavesSourceEmpty) {
  ScopedAStatus source = ScopedAStatus::fromServiceSpecificError(1);
  ScopedAStatus target = std::move(source);
  EXPECT_EQ(nullptr, source.get());
  EXPECT_FALSE(source.isOk());
  EXPECT_EQ(1, target.getServiceSpecificError());

  target = ScopedAStatus::ok();
  EXPECT_TRUE(target.isOk());
  AStatus* raw = target.release();
  EXPECT_EQ(nullptr, target.get());
  EXPECT_TRUE(AStatus_isOk(raw));
  AStatus_delete(raw);
}

}  // namespace
