#pragma once

#include <functional>
#include <vector>

#include <android/binder_auto_utils.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

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
};

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

class DriverClientsTest : public ::testing::Test {
 protected:
  using Step = std::function<void()>;
  static constexpr uint32_t kHw = 4;
  static constexpr char kIface[] = "wpan4";

  // Expects the listed driver calls in this order, runs |call| and checks the
  // status it ends with. EX_TRANSACTION_FAILED stands for the plain
  // STATUS_UNKNOWN_ERROR.
  void Run(const std::vector<Step>& steps, const std::function<ndk::ScopedAStatus()>& call,
           binder_exception_t exception, const char* message = "") {
    ::testing::InSequence in_order;
    for (const Step& step : steps) step();
    ndk::ScopedAStatus status = call();
    EXPECT_EQ(status.getExceptionCode(), exception);
    EXPECT_STREQ(status.getMessage(), message);
    EXPECT_EQ(status.getStatus(),
              exception == EX_TRANSACTION_FAILED ? STATUS_UNKNOWN_ERROR : STATUS_OK);
    ::testing::Mock::VerifyAndClearExpectations(&mcps_);
  }

  Step Hw(bool ok, const char* scheduler = "default") {
    McpsHwInfo info;
    info.scheduler = scheduler;
    return [=] {
      EXPECT_CALL(mcps_, GetHardwareInfo(kHw, ::testing::_))
          .WillOnce(::testing::DoAll(::testing::SetArgPointee<1>(ok), ::testing::Return(info)));
    };
  }
  Step IsUp(bool up) {
    return [=] {
      EXPECT_CALL(tool_, GetUpState(::testing::StrEq(kIface))).WillOnce(::testing::Return(up));
    };
  }
  Step Up(bool up, bool ok) {
    return [=] {
      EXPECT_CALL(tool_, SetUpState(::testing::StrEq(kIface), up)).WillOnce(::testing::Return(ok));
    };
  }

  ::testing::StrictMock<MockInterfaceTool> tool_;
  ::testing::StrictMock<MockMcpsUtils> mcps_;
  ::testing::StrictMock<MockIeeeUtils> ieee_;
  ::testing::StrictMock<MockCccRegionUtils> ccc_;
};

}  // namespace dalix
}  // namespace hardware
