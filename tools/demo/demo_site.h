#pragma once

#include <stdint.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "sim/simulated_driver.h"
#include "tools/demo/screen.h"
#include "tools/ranging_client.h"

namespace hardware {
namespace dalix {
namespace demo {

// The demo's simulated site: the driver with its two radios, and the world
// of moving peers they range. Built on the demo's main thread; TruthOf may
// be called from any thread.
class DemoSite {
 public:
  static constexpr char kFiraRadio[] = "uwb0";
  static constexpr char kSimpleRangingRadio[] = "uwb1";
  // Short blocks keep the service's loop turning: each FiRa notification is
  // also a turn for the other sockets it watches.
  static constexpr int32_t kFiraBlockMs = 50;

  DemoSite(int peers, uint32_t seed);
  ~DemoSite();

  // Makes the radios and the peers and starts the simulated driver.
  bool Start(std::string* error);
  sim::SimulatedDriver& driver() { return driver_; }

  std::vector<uint16_t> ShortAddresses() const;
  std::vector<int64_t> ExtendedAddresses() const;
  // The peer's letter on the map, or '?' for an address of no peer.
  char MarkOf(const tools::PeerReading& reading) const;
  // Where the peer of |reading| is now, seen from the radio that ranged it.
  std::optional<Truth> TruthOf(const tools::PeerReading& reading) const;
  // Where |reading| puts the peer on the site's map.
  std::optional<Point> MeasuredPosition(const tools::PeerReading& reading) const;
  std::vector<Point> RadioPositions() const;
  // The middle of the map and half its width: the area the peers walk.
  Point MapCentre() const;
  double HalfWidth() const;
  // The largest distance error that the simulated noise and the encoding's
  // resolution allow, and for simple ranging the lag of its results.
  double ErrorBound(tools::RangingMode mode) const;

 private:
  struct World;
  const int peers_;
  const uint32_t seed_;
  sim::SimulatedDriver driver_;
  std::unique_ptr<World> world_;
};

}  // namespace demo
}  // namespace dalix
}  // namespace hardware
