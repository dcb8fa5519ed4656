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

// Every policy that a parser of received messages uses, on either side.
TEST(ReceivePolicyTest, EveryIntegerIsReadOnlyAtItsFullWidth) {
  int integers = 0;
  // |entries| is indexed by attribute id, its last entry the nest's maximum id.
  auto check = [&](const char* name, const auto& entries) {
    const int max_id = static_cast<int>(std::size(entries)) - 1;
    for (int id = 1; id <= max_id; ++id) {
      const int width = Width(entries[id].type);
      if (width == 0) continue;
      ++integers;
      for (int length = 0; length <= width + 1; ++length) {
        UniqueNlMsg msg;
        nlattr* nest = nla_nest_start(msg.get(), 1);
        std::vector<uint8_t> bytes(length, 0xA5);
        ASSERT_EQ(0, nla_put(msg.get(), id, length, bytes.data()));
        nla_nest_end(msg.get(), nest);
        std::vector<nlattr*> attrs(max_id + 1);
        int result = nla_parse_nested(attrs.data(), max_id, nest,
                                      const_cast<nla_policy*>(std::data(entries)));
        EXPECT_EQ(length == width, result == 0)
            << name << " attribute " << id << " of " << length << " bytes";
      }
    }
  };
  check("NewHw", kMcpsNewHwPolicy);
  check("Calibration", kMcpsCalibrationPolicy);
  check("RangingReport", kMcpsRangingReportPolicy);
  check("RangingResult", kMcpsRangingResultPolicy);
  check("TestDataReply", kMcpsTestDataReplyPolicy);
  check("Request", kMcpsRequestPolicy);
  check("SchedulerParams", kMcpsSchedulerParamsPolicy);
  check("Region", kMcpsRegionPolicy);
  check("CalibrationRequest", kMcpsCalibrationRequestPolicy);
  check("TestDataRequest", kMcpsTestDataRequestPolicy);
  check("RangingRequest", kMcpsRangingRequestPolicy);
  check("FiraRegionCallMessage", kFiraRegionCallMessagePolicy);
  check("FiraRegionCall", kFiraRegionCallPolicy);
  check("FiraSessionNtf", kFiraSessionNtfPolicy);
  check("FiraRangingData", kFiraRangingDataPolicy);
  check("FiraMeasurement", kFiraMeasurementPolicy);
  check("FiraAoa", kFiraAoaPolicy);
  check("FiraCall", kFiraCallPolicy);
  check("FiraSessionParams", kFiraSessionParamsPolicy);
  check("FiraControlee", kFiraControleePolicy);
  check("Nl802154", Nl802154AttributePolicy());
  check("Nl802154Capability", Nl802154CapabilityAttributePolicy());
  check("TestFamily", sim::kTestPolicy);
  EXPECT_GE(integers, 40);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
