#pragma once

#include <gmock/gmock.h>

#include "net/fira_region_utils.h"

namespace hardware {
namespace dalix {

class MockFiraRegionUtils : public FiraRegionUtils {
 public:
  MockFiraRegionUtils() : FiraRegionUtils(nullptr) {}
  MOCK_METHOD(void, SetMcpsNetId, (uint32_t id), (override));
  MOCK_METHOD(void, SubscribeCallback, (uint32_t hw_index, FiraCallback* callback), (override));
  MOCK_METHOD(void, UnsubscribeCallback, (uint32_t hw_index), (override));
  MOCK_METHOD(bool, InitSession, (uint32_t hw_index, uint32_t session_id), (override));
  MOCK_METHOD(bool, StartSession, (uint32_t hw_index, uint32_t session_id), (override));
  MOCK_METHOD(bool, StopSession, (uint32_t hw_index, uint32_t session_id), (override));
  MOCK_METHOD(bool, DeinitSession, (uint32_t hw_index, uint32_t session_id), (override));
  MOCK_METHOD(bool, ConfigTwrSession, (uint32_t hw_index, const FiraTwrSession& session),
              (override));
  MOCK_METHOD(bool, AddControlees,
              (uint32_t hw_index, uint32_t session_id, const std::vector<UwbAddress>& controlees,
               const std::vector<int32_t>* sub_session_ids),
              (override));
  MOCK_METHOD(bool, RemoveControlees,
              (uint32_t hw_index, uint32_t session_id, const std::vector<UwbAddress>& controlees),
              (override));
  MOCK_METHOD(bool, UpdateBlockStriding, (uint32_t hw_index, uint32_t session_id, uint32_t value),
              (override));
  MOCK_METHOD(bool, SetProperties, (uint32_t hw_index, ConfigUtils& config), (override));
};

}  // namespace dalix
}  // namespace hardware
