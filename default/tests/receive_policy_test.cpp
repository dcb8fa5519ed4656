#include <cstdint>
#include <iterator>
#include <map>
#include <vector>

#include <gtest/gtest.h>
#include <netlink/attr.h>

#include "net/fira_region.h"
#include "net/mcps802154.h"
#include "net/nl802154.h"
#include "net/unique_nl_msg.h"
#include "sim/test_family_defs.h"

namespace hardware {
namespace dalix {
namespace {

// Bytes that nla_get_* reads for an integer type; 0 for anything else.
int Width(uint16_t type) {
  const std::map<uint16_t, int> widths = {{NLA_U8, 1},  {NLA_S8, 1},  {NLA_U16, 2}, {NLA_S16, 2},
                                          {NLA_U32, 4}, {NLA_S32, 4}, {NLA_U64, 8}, {NLA_S64, 8}};
  auto width = widths.find(type);
  return width == widths.end() ? 0 : width->second;
}

// A policy indexed by attribute id, its last entry the nest's maximum id.
struct Policy {
  template <typename Entries>
  Policy(const char* name, const Entries& entries)
      : name(name), entries(std::data(entries)), max_id(std::size(entries) - 1) {}
  const char* name;
  const nla_policy* entries;
  int max_id;
};

// Every policy that a parser of received messages uses, on either side.
TEST(ReceivePolicyTest, EveryIntegerIsReadOnlyAtItsFullWidth) {
  const Policy policies[] = {
      {"NewHw", kMcpsNewHwPolicy},
      {"Calibration", kMcpsCalibrationPolicy},
      {"RangingReport", kMcpsRangingReportPolicy},
      {"RangingResult", kMcpsRangingResultPolicy},
      {"TestDataReply", kMcpsTestDataReplyPolicy},
      {"Request", kMcpsRequestPolicy},
      {"SchedulerParams", kMcpsSchedulerParamsPolicy},
      {"Region", kMcpsRegionPolicy},
      {"CalibrationRequest", kMcpsCalibrationRequestPolicy},
      {"TestDataRequest", kMcpsTestDataRequestPolicy},
      {"RangingRequest", kMcpsRangingRequestPolicy},
      {"FiraRegionCallMessage", kFiraRegionCallMessagePolicy},
      {"FiraRegionCall", kFiraRegionCallPolicy},
      {"FiraSessionNtf", kFiraSessionNtfPolicy},
      {"FiraRangingData", kFiraRangingDataPolicy},
      {"FiraMeasurement", kFiraMeasurementPolicy},
      {"FiraAoa", kFiraAoaPolicy},
      {"FiraCall", kFiraCallPolicy},
      {"FiraSessionParams", kFiraSessionParamsPolicy},
      {"FiraControlee", kFiraControleePolicy},
      {"Nl802154", Nl802154AttributePolicy()},
      {"Nl802154Capability", Nl802154CapabilityAttributePolicy()},
      {"TestFamily", sim::kTestPolicy},
  };
  int integers = 0;
  for (const Policy& policy : policies) {
    for (int id = 1; id <= policy.max_id; ++id) {
      const int width = Width(policy.entries[id].type);
      if (width == 0) continue;
      ++integers;
      for (int length = 0; length <= width + 1; ++length) {
        UniqueNlMsg msg;
        nlattr* nest = nla_nest_start(msg.get(), 1);
        std::vector<uint8_t> bytes(length, 0xA5);
        ASSERT_EQ(0, nla_put(msg.get(), id, length, bytes.data()));
        nla_nest_end(msg.get(), nest);
        std::vector<nlattr*> attrs(policy.max_id + 1);
        int result = nla_parse_nested(attrs.data(), policy.max_id, nest,
                                      const_cast<nla_policy*>(policy.entries));
        EXPECT_EQ(length == width, result == 0)
            << policy.name << " attribute " << id << " of " << length << " bytes";
      }
    }
  }
  EXPECT_GE(integers, 40);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
