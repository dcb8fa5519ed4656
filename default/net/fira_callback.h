#pragma once

#include <stdint.h>

#include <vector>

#include "uwb_aidl.h"

namespace hardware {
namespace dalix {

// FiraAntennaMeasurement::kind of an entry: angle data of the radio's
// azimuth antenna pair, or of its elevation pair.
inline constexpr int8_t kFiraAntennaKindAzimuth = 0;
inline constexpr int8_t kFiraAntennaKindElevation = 1;

// Receives the decoded FiRa session notifications of one radio, as registered
// with FiraRegionUtils::SubscribeCallback. Called on the service thread, from
// the ranging socket's watch or from inside FiraRegionUtils::StartSession
// while it awaits the driver's acknowledgement. The registry never owns a
// callback, hence no deletion through this interface.
class FiraCallback {
 public:
  using FiraRangingData = aidl::hardware::dalix::uwb::FiraRangingData;
  using FiraTwrMeasurement = aidl::hardware::dalix::uwb::FiraTwrMeasurement;

  // One ranging round of a session: its counter and one entry per peer.
  virtual void OnTwrResult(const FiraRangingData& ranging_data,
                           const std::vector<FiraTwrMeasurement>& measurements) = 0;
  // The driver ended the session.
  virtual void OnSessionStopped(uint32_t session_id) = 0;

 protected:
  ~FiraCallback() = default;
};

}  // namespace dalix
}  // namespace hardware
