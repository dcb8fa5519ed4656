#include "net/ccc_region_utils.h"

#include <optional>

#include <gtest/gtest.h>

#include "net/mcps802154.h"
#include "sim/ccc_test_mode_sim.h"
#include "sim/driver_simulator.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using ::android::base::ERROR;

constexpr uint32_t kFamily = 0x1c;
constexpr char kTag[] = "dalix.uwb.CccRegionUtils";

// A reply as the simulated driver makes it, or with the hardware index only.
UniqueNlMsg Reply(std::optional<uint8_t> code, bool with_testdata = true) {
  UniqueNlMsg msg = sim::DriverSimulator::NewEvent(kFamily, MCPS802154_CMD_TESTMODE);
  if (with_testdata) sim::CccTestModeSim::EncodeTestModeReply(msg.get(), 0, code);
  if (!with_testdata) nla_put_u32(msg.get(), MCPS802154_ATTR_HW, 0);
  return msg;
}

// The accepted start, whatever the driver's code, is proven end to end.
TEST(CccRegionUtilsTest, OnlyANonZeroCodeIsSuccessAndEachFaultLogsOnce) {
  LogCapture log;
  uint32_t value = 5;
  EXPECT_FALSE(CccRegionUtils(nullptr).StartCccSession(0, 1, 2, 9, &value));
  EXPECT_EQ(value, 5u);
  EXPECT_TRUE(log.Contains(ERROR, "StartRegionMessage: MCPS netlink id is not resolved", kTag));

  const struct {
    UniqueNlMsg reply;
    bool verdict;
    const char* error;
  } cases[] = {
      {Reply(1), true, nullptr},
      {Reply(0), false, "ParseTestModeCmdResponse: Error on the command"},
      {Reply(std::nullopt), false, "ParseTestModeCmdResponse: Missing KX7200_TM_ATTR_CCC_CMD_RC"},
      {Reply(1, false), false, "ParseTestModeCmdResponse: Missing MCPS802154_ATTR_TESTDATA"},
  };
  for (const auto& c : cases) {
    log.Reset();
    EXPECT_EQ(CccRegionUtils::ParseTestModeCmdResponse(c.reply.get()), c.verdict);
    EXPECT_EQ(log.Count(ERROR, c.error ? c.error : "", kTag), c.error ? 1 : 0) << log.Text();
  }
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
