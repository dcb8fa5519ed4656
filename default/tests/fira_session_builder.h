#pragma once

#include <cstdint>
#include <vector>

#include "uwb_aidl.h"

namespace hardware {
namespace dalix {

// A controller session that passes every check of the FiRa controller and
// that the region encoder accepts: short address 0x0001 ranging with the
// short addresses in |peers| on channel 9, dynamic STS.
inline aidl::hardware::dalix::uwb::FiraTwrSession ValidFiraSession(
    int32_t id, const std::vector<uint16_t>& peers = {0x0002}) {
  namespace uwb = aidl::hardware::dalix::uwb;
  uwb::FiraTwrSession session;
  session.id = id;
  session.deviceType = uwb::DeviceType::CONTROLLER;
  session.rangingRoundUsage = uwb::RangingRoundUsage::DS_TWR;
  session.deviceAddress.address = {0x00, 0x01};
  for (uint16_t peer : peers) {
    session.destAddressList.push_back(
        {{static_cast<uint8_t>(peer >> 8), static_cast<uint8_t>(peer & 0xff)}});
  }
  session.slotDurationRstu = 2400;
  session.slotsPerRangingRound = 25;
  session.rangingBlockDurationMs = 200;
  session.inBandTerminationAttemptCount = 1;
  session.channelNumber = 9;
  session.preambleCodeIndex = 10;
  session.stsConfig = uwb::FiraStsConfig::DYNAMIC;
  return session;
}

// A driver controller (value 1) ranging with 0x5678 and 0x9abc, most switches set.
inline aidl::hardware::dalix::uwb::FiraTwrSession FullFiraSession(int32_t id) {
  namespace uwb = aidl::hardware::dalix::uwb;
  uwb::FiraTwrSession s = ValidFiraSession(id, {0x5678, 0x9abc});
  s.deviceType = uwb::DeviceType(1);
  s.deviceRole = uwb::DeviceRole(1);
  s.multiNodeMode = uwb::MultiNodeMode(1);
  s.initiationTimeMs = 10;
  s.blockStridingValue = 3;
  s.maxRangingRoundRetries = 5;
  s.isHoppingEnabled = true;
  s.sessionPriority = 50;
  s.rangingRoundControl.hasResultReportPhase = true;
  s.rframeConfig = uwb::RframeConfig(3);
  s.preambleDuration = uwb::PreambleDuration(1);
  s.sfdId = 2;
  s.stsSegmentCount = 1;
  s.bprfPhrDataRate = uwb::BprfPhrDataRate(1);
  s.subSessionId = 7;
  s.aoaResultRequest = uwb::AoaResultRequest(1);
  s.resultReportConfig = {true, true, false, true};
  return s;
}

}  // namespace dalix
}  // namespace hardware
