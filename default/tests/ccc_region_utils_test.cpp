#include "net/ccc_region_utils.h"

#include <optional>
#include <string>

#include <gtest/gtest.h>

#include "net/mcps802154.h"
#include "sim/ccc_test_mode_sim.h"
#include "sim/driver_simulator.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using ::android::base::ERROR;

// Replies with a code, zero included, are proven end to end; these lack one.
TEST(CccRegionUtilsTest, EachFaultIsRefusedWithOneErrorLine) {
  constexpr char kTag[] = "dalix.uwb.CccRegionUtils";
  LogCapture log;
  uint32_t value = 5;
  EXPECT_FALSE(CccRegionUtils(nullptr).StartCccSession(0, 1, 2, 9, &value));
  EXPECT_EQ(value, 5u);
  EXPECT_EQ(log.Count(ERROR, "StartRegionMessage: MCPS netlink id is not resolved", kTag), 1);
  for (bool with_testdata : {true, false}) {
    log.Reset();
    UniqueNlMsg reply = sim::DriverSimulator::NewEvent(0x1c, MCPS802154_CMD_TESTMODE);
    if (with_testdata) sim::CccTestModeSim::EncodeTestModeReply(reply.get(), 0, std::nullopt);
    EXPECT_FALSE(CccRegionUtils::ParseTestModeCmdResponse(reply.get()));
    const char* missing = with_testdata ? "KX7200_TM_ATTR_CCC_CMD_RC" : "MCPS802154_ATTR_TESTDATA";
    EXPECT_EQ(log.Count(ERROR, std::string("ParseTestModeCmdResponse: Missing ") + missing, kTag),
              1)
        << log.Text();
  }
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
