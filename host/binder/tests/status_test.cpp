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
// reports show; each names every part of its status.
TEST(StatusTest, EachConstructorDescribesItsParts) {
  const std::pair<ScopedAStatus, std::string> cases[] = {
      {ScopedAStatus::ok(), "No error"},
      {ScopedAStatus::fromStatus(STATUS_OK), "No error"},
      {ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT, "bad"),
       "Status(-3, EX_ILLEGAL_ARGUMENT): 'bad'"},
      {ScopedAStatus::fromExceptionCodeWithMessage(EX_UNSUPPORTED_OPERATION, nullptr),
       "Status(-7, EX_UNSUPPORTED_OPERATION): ''"},
      {ScopedAStatus::fromExceptionCode(EX_TRANSACTION_FAILED),
       "Status(-129, EX_TRANSACTION_FAILED): 'FAILED_TRANSACTION: '"},
      {ScopedAStatus::fromExceptionCode(-42), "Status(-42, -42): ''"},
      {ScopedAStatus::fromStatus(-EIO),
       "Status(-129, EX_TRANSACTION_FAILED): '-5 (Input/output error): '"},
      {ScopedAStatus::fromServiceSpecificError(-7), "Status(-8, EX_SERVICE_SPECIFIC): '-7: '"},
  };
  for (const auto& [status, description] : cases) {
    EXPECT_EQ(description, status.getDescription());
    EXPECT_EQ(description == "No error", status.isOk()) << description;
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
