#include "ipc_utils.h"

#include <cstdint>
#include <string>

#include <gtest/gtest.h>

#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

TEST(IpcUtilsTest, ArgumentChecksGiveIllegalArgumentWithLoggedMessage) {
  LogCapture log;
  const std::string x(1024, 'x');
  const struct {
    ndk::ScopedAStatus status;
    std::string message;  // empty when the check passes
  } cases[] = {
      {CheckUwbChannelRange(0), ""},
      {CheckUwbChannelRange(15), ""},
      {CheckUwbChannelRange(INT32_MIN), "Incorrect channel value -2147483648"},
      {IllegalArgument("%s", x.substr(0, 1023).c_str()), x.substr(0, 1023)},
      {IllegalArgument("%s", x.c_str()), x.substr(0, 1023)},
  };
  for (const auto& c : cases) {
    EXPECT_EQ(c.message.empty() ? EX_NONE : EX_ILLEGAL_ARGUMENT, c.status.getExceptionCode());
    EXPECT_EQ(c.message, c.status.getMessage());
    if (!c.message.empty()) {
      EXPECT_TRUE(log.Contains(android::base::ERROR, c.message, "dalix.uwb.IpcUtils"));
    }
  }
  EXPECT_EQ(3u, log.Entries().size()) << log.Text();
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
