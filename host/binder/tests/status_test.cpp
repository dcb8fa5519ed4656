#include <android/binder_auto_utils.h>
#include <android/binder_status.h>

#include <cerrno>
#include <cstdint>
#include <string>
#include <utility>

#include <gtest/gtest.h>

namespace {

using ndk::ScopedAStatus;

// The platform's values: clients compare them numerically.
static_assert(EX_ILLEGAL_ARGUMENT == -3 && EX_ILLEGAL_STATE == -5 &&
              EX_UNSUPPORTED_OPERATION == -7 && EX_SERVICE_SPECIFIC == -8 &&
              EX_TRANSACTION_FAILED == -129);
static_assert(STATUS_UNKNOWN_ERROR == INT32_MIN && STATUS_FAILED_TRANSACTION == INT32_MIN + 2 &&
              STATUS_DEAD_OBJECT == -EPIPE);

// The descriptions are the platform's own texts, which clients and bug
// reports show.
TEST(StatusTest, EachConstructorReportsItsPartsAndDescription) {
  const struct {
    ScopedAStatus status;
    binder_exception_t exception;
    int32_t service_specific;
    binder_status_t transport;
    std::string message;
    std::string description;
  } cases[] = {
      {ScopedAStatus::ok(), EX_NONE, 0, STATUS_OK, "", "No error"},
      {ScopedAStatus::fromStatus(STATUS_OK), EX_NONE, 0, STATUS_OK, "", "No error"},
      {ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT, "bad"), EX_ILLEGAL_ARGUMENT,
       0, STATUS_OK, "bad", "Status(-3, EX_ILLEGAL_ARGUMENT): 'bad'"},
      {ScopedAStatus::fromExceptionCodeWithMessage(EX_UNSUPPORTED_OPERATION, nullptr),
       EX_UNSUPPORTED_OPERATION, 0, STATUS_OK, "", "Status(-7, EX_UNSUPPORTED_OPERATION): ''"},
      {ScopedAStatus::fromExceptionCode(EX_TRANSACTION_FAILED), EX_TRANSACTION_FAILED, 0,
       STATUS_FAILED_TRANSACTION, "",
       "Status(-129, EX_TRANSACTION_FAILED): 'FAILED_TRANSACTION: '"},
      {ScopedAStatus::fromExceptionCode(-42), -42, 0, STATUS_OK, "", "Status(-42, -42): ''"},
      {ScopedAStatus::fromStatus(-EIO), EX_TRANSACTION_FAILED, 0, -EIO, "",
       "Status(-129, EX_TRANSACTION_FAILED): '-5 (Input/output error): '"},
      {ScopedAStatus::fromServiceSpecificError(-7), EX_SERVICE_SPECIFIC, -7, STATUS_OK, "",
       "Status(-8, EX_SERVICE_SPECIFIC): '-7: '"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.description);
    EXPECT_EQ(c.exception == EX_NONE, c.status.isOk());
    EXPECT_EQ(c.exception, c.status.getExceptionCode());
    EXPECT_EQ(c.service_specific, c.status.getServiceSpecificError());
    EXPECT_EQ(c.transport, c.status.getStatus());
    EXPECT_EQ(c.message, c.status.getMessage());
    EXPECT_EQ(c.description, c.status.getDescription());
  }
}

// An empty status is not OK; reading any other part of it is a bug that
// crashes on the device, and aborts here naming the reader.
TEST(StatusDeathTest, ReadingAnEmptyStatusAborts) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  ScopedAStatus held = ScopedAStatus::fromServiceSpecificError(1);
  ScopedAStatus taken = std::move(held);
  EXPECT_FALSE(held.isOk());  // NOLINT(bugprone-use-after-move): the point of the test
  EXPECT_DEATH((void)held.getExceptionCode(), "AStatus_getExceptionCode: the status is empty");
  EXPECT_DEATH((void)held.getServiceSpecificError(), "AStatus_getServiceSpecificError: ");
  EXPECT_DEATH((void)held.getStatus(), "AStatus_getStatus: ");
  EXPECT_DEATH((void)held.getMessage(), "AStatus_getMessage: ");
  EXPECT_DEATH((void)ScopedAStatus().getDescription(), "AStatus_getDescription: ");
}

}  // namespace
