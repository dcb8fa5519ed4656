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

}  // namespace dalix
}  // namespace hardware
