#pragma once

#include <gmock/gmock.h>

#include "net/ieee_utils.h"
#include "net/interface_tool.h"
#include "net/mcps_utils.h"

namespace hardware {
namespace dalix {

// Doubles of the driver clients that the HAL objects borrow. Only the
// operations the HAL objects call are mocked; the others keep the real
// behaviour, which needs a socket factory and so must not be reached.
class MockMcpsUtils : public McpsUtils {
 public:
  MockMcpsUtils() : McpsUtils(nullptr) {}
  MOCK_METHOD(bool, Start, (), (override));
  MOCK_METHOD(std::vector<McpsHwInfo>, ListHardware, (bool* ok), (override));
  MOCK_METHOD(McpsHwInfo, GetHardwareInfo, (uint32_t hw_index, bool* ok), (override));
  MOCK_METHOD(bool, SetScheduler,
              (uint32_t hw_index, McpsScheduler scheduler, SlotDuration slot_duration,
               NodeType node_type, bool params_only),
              (override));
  MOCK_METHOD(bool, SetFiraRegion, (uint32_t hw_index), (override));
  MOCK_METHOD(bool, SetCalibration, (uint32_t hw_index, ConfigUtils* config), (override));
};

class MockInterfaceTool : public InterfaceTool {
 public:
  MOCK_METHOD(bool, GetUpState, (const char* iface), (override));
  MOCK_METHOD(bool, SetUpState, (const char* iface, bool up), (override));
  MOCK_METHOD(bool, SetMacAddress, (const char* iface, const MacAddress& mac), (override));
  MOCK_METHOD(MacAddress, GetFactoryMacAddress, (const char* iface), (override));
};

class MockIeeeUtils : public IeeeUtils {
 public:
  MockIeeeUtils() : IeeeUtils(nullptr) {}
  MOCK_METHOD(bool, Setup, (), (override));
  MOCK_METHOD(std::vector<DevInfo>, ListDevices, (bool* ok), (override));
  MOCK_METHOD(bool, SetShortMacAddress, (const char* iface, const std::vector<uint8_t>& address),
              (override));
};

}  // namespace dalix
}  // namespace hardware
