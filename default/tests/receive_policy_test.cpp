#include <cstdint>
#include <vector>

#include <gtest/gtest.h>
#include <netlink/attr.h>

#include "net/mcps802154.h"
#include "net/nl802154.h"
#include "net/unique_nl_msg.h"
#include "sim/test_family_defs.h"

namespace hardware {
namespace dalix {
namespace {

// clang-format off
// Bytes that nla_get_* reads for an integer type; 0 for anything else.
int Width(uint16_t type) {
  switch (type) {
    case NLA_U8: case NLA_S8: return 1;
    case NLA_U16: case NLA_S16: return 2;
    case NLA_U32: case NLA_S32: return 4;
    case NLA_U64: case NLA_S64: return 8;
  }
  return 0;
}
// clang-format on

struct PolicyCase {
  const char* name;
  const nla_policy* policy;
  int max_id;
};

// Every policy that a parser of received messages uses, on either side.
TEST(ReceivePolicyTest, EveryIntegerIsReadOnlyAtItsFullWidth) {
  const PolicyCase cases[] = {
      {"NewHw", kMcpsNewHwPolicy.data(), MCPS802154_ATTR_MAX},
      {"Calibration", kMcpsCalibrationPolicy.data(), MCPS802154_CALIBRATION_ATTR_MAX},
      {"RangingReport", kMcpsRangingReportPolicy.data(), MCPS802154_ATTR_MAX},
      {"RangingResult", kMcpsRangingResultPolicy.data(), MCPS802154_RANGING_RESULT_ATTR_MAX},
      {"Request", kMcpsRequestPolicy.data(), MCPS802154_ATTR_MAX},
      {"SchedulerParams", kMcpsSchedulerParamsPolicy.data(),
       MCPS802154_SCHEDULER_PARAMS_ATTR_MAX},
      {"Region", kMcpsRegionPolicy.data(), MCPS802154_REGION_ATTR_MAX},
      {"CalibrationRequest", kMcpsCalibrationRequestPolicy.data(),
       MCPS802154_CALIBRATION_ATTR_MAX},
      {"Nl802154", Nl802154AttributePolicy().data(), NL802154_ATTR_MAX},
      {"Nl802154Capability", Nl802154CapabilityAttributePolicy().data(), NL802154_CAP_ATTR_MAX},
      {"TestFamily", sim::kTestPolicy, sim::kTestAttrMax},
  };
  int integers = 0;
  for (const PolicyCase& c : cases) {
    for (int id = 1; id <= c.max_id; ++id) {
      const int width = Width(c.policy[id].type);
      if (width == 0) continue;
      ++integers;
      for (int length = 0; length <= width + 1; ++length) {
        UniqueNlMsg msg;
        nlattr* nest = nla_nest_start(msg.get(), 1);
        std::vector<uint8_t> bytes(length, 0xA5);
        ASSERT_EQ(0, nla_put(msg.get(), id, length, bytes.data()));
        nla_nest_end(msg.get(), nest);
        std::vector<nlattr*> attrs(c.max_id + 1);
        int result = nla_parse_nested(attrs.data(), c.max_id, nest,
                                      const_cast<nla_policy*>(c.policy));
        EXPECT_EQ(length == width, result == 0)
            << c.name << " attribute " << id << " of " << length << " bytes";
      }
    }
  }
  EXPECT_GE(integers, 15);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
