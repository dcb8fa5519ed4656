#include "ipc_utils.h"

#include <string>
#include <vector>

#include <android-base/logging.h>
#include <gtest/gtest.h>

#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

constexpr char kTag[] = "dalix.uwb.IpcUtils";

class IpcUtilsTest : public ::testing::Test {
 protected:
  LogCapture log_;
};

TEST_F(IpcUtilsTest, ArgumentChecksGiveIllegalArgumentWithLoggedMessage) {
  const std::string long_text(1500, 'x');
  const struct {
    const char* what;
    ndk::ScopedAStatus status;
    // Empty when the check passes.
    std::string message;
  } cases[] = {
      {"channel 0", CheckUwbChannelRange(0), ""},
      {"channel 15", CheckUwbChannelRange(15), ""},
      {"channel 16", CheckUwbChannelRange(16), "Incorrect channel value 16"},
      {"channel -1", CheckUwbChannelRange(-1), "Incorrect channel value -1"},
      {"channel INT_MIN", CheckUwbChannelRange(-2147483647 - 1),
       "Incorrect channel value -2147483648"},
      {"formatted", IllegalArgument("Unsupported AoaType: %s", "3"), "Unsupported AoaType: 3"},
      {"unsigned conversion", IllegalArgument("value %u", static_cast<unsigned>(-1)),
       "value 4294967295"},
      {"1023 characters kept", IllegalArgument("%s", long_text.substr(0, 1023).c_str()),
       long_text.substr(0, 1023)},
      {"1024 characters cut", IllegalArgument("%s", long_text.substr(0, 1024).c_str()),
       long_text.substr(0, 1023)},
      {"1500 characters cut", IllegalArgument("%s!", long_text.c_str()),
       long_text.substr(0, 1023)},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    if (c.message.empty()) {
      EXPECT_TRUE(c.status.isOk());
      continue;
    }
    EXPECT_EQ(EX_ILLEGAL_ARGUMENT, c.status.getExceptionCode());
    EXPECT_EQ(c.message, c.status.getMessage());
    EXPECT_TRUE(log_.Contains(android::base::ERROR, c.message, kTag)) << log_.Text();
  }
  // One ERROR line per failure and nothing for the passing channels.
  EXPECT_EQ(8u, log_.Entries().size()) << log_.Text();
}

TEST_F(IpcUtilsTest, NothingIsLoggedWhenErrorsAreFilteredOut) {
  android::base::SetMinimumLogSeverity(android::base::FATAL);
  ndk::ScopedAStatus status = IllegalArgument("quiet %d", 1);
  EXPECT_EQ(EX_ILLEGAL_ARGUMENT, status.getExceptionCode());
  EXPECT_STREQ("quiet 1", status.getMessage());
  EXPECT_TRUE(log_.Entries().empty()) << log_.Text();
}

TEST(ToShortAddressTest, OnlyTwoBytesMakeAShortAddress) {
  const struct {
    std::vector<uint8_t> bytes;
    bool ok;
    uint16_t address;
  } cases[] = {
      {{0x12, 0x34}, true, 0x1234},
      {{0xff, 0x00}, true, 0xff00},
      {{0x00, 0xff}, true, 0x00ff},
      {{}, false, 0},
      {{0x12}, false, 0},
      {{0x12, 0x34, 0x56}, false, 0},
      {{1, 2, 3, 4, 5, 6, 7, 8}, false, 0},
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
