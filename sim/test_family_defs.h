#pragma once

#include <cstdint>

#include <netlink/attr.h>

namespace hardware {
namespace dalix {
namespace sim {

// Wire format of "dalix_test", the family the simulator's own tests and the
// transport's tests talk to. Its builders, its handler and the tests all use
// these definitions.
constexpr char kTestFamilyName[] = "dalix_test";

enum TestCommand : uint8_t {
  kTestCmdUnspec = 0,
  // Stores kTestAttrValue; answered by the acknowledgement alone.
  kTestCmdSet = 1,
  // Answered by one kTestCmdValue carrying the stored value.
  kTestCmdGet = 2,
  // The reply and event command: one kTestAttrValue.
  kTestCmdValue = 3,
  // A dump of kTestAttrCount kTestCmdValue entries holding 1, 2, ...
  kTestCmdList = 4,
  // After the acknowledgement, kTestAttrCount kTestCmdValue events holding
  // 1, 2, ... go to the requesting port with sequence 0.
  kTestCmdSubscribe = 5,
};

enum TestAttribute : int {
  kTestAttrUnspec = 0,
  kTestAttrValue = 1,  // u32
  kTestAttrCount = 2,  // u32
  kTestAttrMax = kTestAttrCount,
};

inline const nla_policy kTestPolicy[kTestAttrMax + 1] = {
    {},
    {NLA_U32, sizeof(uint32_t), sizeof(uint32_t)},
    {NLA_U32, sizeof(uint32_t), sizeof(uint32_t)},
};

constexpr uint8_t kTestFamilyVersion = 1;

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
