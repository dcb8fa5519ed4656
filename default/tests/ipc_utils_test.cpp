#include "ipc_utils.h"

#include <cstdint>
#include <string>
#include <vector>

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
      {CheckUwbChannelRange(16), "Incorrect channel value 16"},
      {CheckUwbChannelRange(-1), "Incorrect channel value -1"},
      {CheckUwbChannelRange(INT32_MIN), "Incorrect channel value -2147483648"},
      {IllegalArgument("%s", x.substr(0, 1023).c_str()), x.substr(0, 1023)},
      {IllegalArgument("%s", x.c_str()), x.substr(0, 1023)},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.message.substr(0, 40));
    EXPECT_EQ(c.message.empty() ? EX_NONE : EX_ILLEGAL_ARGUMENT, c.status.getExceptionCode());
    EXPECT_EQ(c.message, c.status.getMessage());
    if (!c.message.empty()) {
      EXPECT_TRUE(log.Contains(android::base::ERROR, c.message, "dalix.uwb.IpcUtils"));
    }
  }
  EXPECT_EQ(5u, log.Entries().size()) << log.Text();
}

TEST(IpcUtilsTest, OnlyTwoBytesMakeAShortAddress) {
  const struct {
    std::vector<uint8_t> bytes;
    bool ok;
    uint16_t address;
  } cases[] = {
      {{0x12, 0x34}, true, 0x1234}, {{0xff, 0x00}, true, 0xff00},
      {{0x00, 0xff}, true, 0x00ff}, {{}, false, 0},
      {{0x12}, false, 0},           {{0x12, 0x34, 0x56}, false, 0},
  };
  for (const auto& c : cases) {
    bool ok = !c.ok;
    EXPECT_EQ(c.address, ToShortAddress(c.bytes, &ok)) << "size " << c.bytes.size();
    EXPECT_EQ(c.ok, ok) << "size " << c.bytes.size();
  }
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
