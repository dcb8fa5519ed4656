#pragma once

#include <gmock/gmock.h>

#include "net/ieee_utils.h"
#include "net/interface_tool.h"
#include "net/mcps_utils.h"

namespace hardware {
namespace dalix {

// Doubles of the driver clients that the FiRa controller borrows, with the
// operations it calls. The others keep the real behaviour, which needs a
// socket factory and so must not be reached.
class MockMcpsUtils : public McpsUtils {
 public:
  MockMcpsUtils() : McpsUtils(nullptr) {}
  MOCK_METHOD(McpsHwInfo, GetHardwareInfo, (uint32_t hw_index, bool* ok), (override));
  MOCK_METHOD(bool, SetScheduler,
              (uint32_t hw_index, McpsScheduler scheduler, SlotDuration slot_duration,
               NodeType node_type, bool params_only),
              (override));
  MOCK_METHOD(bool, SetFiraRegion, (uint32_t hw_index), (override));
};

class MockInterfaceTool : public InterfaceTool {
 public:
  MOCK_METHOD(bool, GetUpState, (const char* iface), (override));
  MOCK_METHOD(bool, SetUpState, (const char* iface, bool up), (override));
};

class MockIeeeUtils : public IeeeUtils {
 public:
  MockIeeeUtils() : IeeeUtils(nullptr) {}
  MOCK_METHOD(bool, SetShortMacAddress, (const char* iface, const std::vector<uint8_t>& address),
              (override));
};

}  // namespace dalix
}  // namespace hardware
