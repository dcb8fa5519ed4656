#pragma once

#include <cstdint>
#include <optional>

namespace hardware {
namespace dalix {
namespace sim {

// What one simulated radio measures of one peer at one moment.
struct PeerObservation {
  uint32_t distance_cm = 0;
  // Angle of arrival in the radio's frame, radians.
  double azimuth_rad = 0;
  double elevation_rad = 0;
};

// Where the simulated driver's ranging takes its peers from. Called on the
// simulator thread.
class PeerAngleSource {
 public:
  virtual ~PeerAngleSource() = default;
  // Nothing when the radio cannot range with that peer (unknown, out of reach).
  virtual std::optional<PeerObservation> Observe(uint32_t hw_index, uint64_t peer_address) = 0;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
