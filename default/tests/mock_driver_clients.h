#pragma once

#include <string>

#include <gmock/gmock.h>

#include "net/ccc_region_utils.h"
#include "net/ieee_utils.h"
#include "net/interface_tool.h"
#include "net/mcps_utils.h"

namespace hardware {
namespace dalix {

// Doubles of the driver clients, for the HAL objects' tests: the operations
// the controllers call. The others keep the real behaviour, which needs a
// socket factory and so must not be reached.
class MockInterfaceTool : public InterfaceTool {
 public:
  MOCK_METHOD(bool, GetUpState, (const char* iface), (override));
  MOCK_METHOD(bool, SetUpState, (const char* iface, bool up), (override));
  MOCK_METHOD(bool, SetMacAddress, (const char* iface, const MacAddress& mac), (override));
};

class MockMcpsUtils : public McpsUtils {
 public:
  MockMcpsUtils() : McpsUtils(nullptr) {}
  MOCK_METHOD(McpsHwInfo, GetHardwareInfo, (uint32_t hw_index, bool* ok), (override));
  MOCK_METHOD(bool, SetScheduler,
              (uint32_t hw_index, McpsScheduler scheduler, SlotDuration slot_duration,
               NodeType node_type, bool params_only),
              (override));
  MOCK_METHOD(bool, SetFiraRegion, (uint32_t hw_index), (override));
  MOCK_METHOD(bool, SetRangingRequests,
              (uint32_t hw_index, const std::vector<RangingRequest>& requests), (override));
  MOCK_METHOD(void, SubscribeRangingResults, (RangingResultHandler handler), (override));
};

// A GetHardwareInfo answer: the exchange's verdict and the radio's scheduler.
inline auto HardwareInfo(bool ok, const std::string& scheduler = "default") {
  McpsHwInfo info;
  info.scheduler = scheduler;
  return ::testing::DoAll(::testing::SetArgPointee<1>(ok), ::testing::Return(info));
}

class MockIeeeUtils : public IeeeUtils {
 public:
  MockIeeeUtils() : IeeeUtils(nullptr) {}
  MOCK_METHOD(bool, SetPanId, (const char* iface, uint16_t pan_id), (override));
  MOCK_METHOD(bool, GetPhyInfo, (const char* iface, PhyInfo* info), (override));
  MOCK_METHOD(bool, SetChannel, (const char* iface, int channel), (override));
  MOCK_METHOD(bool, SetShortMacAddress, (const char* iface, const std::vector<uint8_t>& address),
              (override));
};

class MockCccRegionUtils : public CccRegionUtils {
 public:
  MockCccRegionUtils() : CccRegionUtils(nullptr) {}
  MOCK_METHOD(bool, StartCccSession,
              (uint32_t hw_index, uint32_t first, uint64_t timeref, uint8_t channel,
               uint32_t* u32_param),
              (override));
};

}  // namespace dalix
}  // namespace hardware
