#pragma once

#include <cstdint>
#include <limits>
#include <map>
#include <mutex>
#include <optional>
#include <random>
#include <vector>

namespace hardware {
namespace dalix {
namespace sim {

// A point or direction in the world, in metres. z is up.
struct Vector3 {
  double x = 0;
  double y = 0;
  double z = 0;
};

// Where a radio stands and where it looks. Its antenna frame has x along the
// boresight, y to the left and z up; the frame is the world's turned by yaw
// about z (counter-clockwise seen from above), then pitched nose-up by
// |pitch_rad|, then rolled by |roll_rad| about the boresight.
struct Pose {
  Vector3 position;
  double yaw_rad = 0;
  double pitch_rad = 0;
  double roll_rad = 0;
};

// How a peer moves, as a function of world time.
struct Motion {
  enum class Kind { kStanding, kLine, kCircle };

  // Stays at |position|.
  static Motion Standing(const Vector3& position);
  // Leaves |start| along |direction| (any length but zero) at |speed_mps|.
  static Motion Line(const Vector3& start, const Vector3& direction, double speed_mps);
  // Goes round |centre| in its horizontal plane, counter-clockwise at
  // |speed_mps| along the circle, from the point at |phase_rad|.
  static Motion Circle(const Vector3& centre, double radius_m, double speed_mps,
                       double phase_rad = 0);

  Vector3 PositionAt(double time_s) const;

  Kind kind = Kind::kStanding;
  // Standing: the position; line: the start; circle: the centre.
  Vector3 origin;
  // Line only: unit direction.
  Vector3 direction;
  double radius_m = 0;
  double phase_rad = 0;
  double speed_mps = 0;
};

// A device the radios range with.
struct Peer {
  uint16_t short_address = 0;
  uint64_t extended_address = 0;
  Motion motion;
  bool line_of_sight = true;
  // Told to stop ranging: it answers no more, and says so.
  bool stopped = false;
};

// What a radio sees of a peer at one instant.
struct Observation {
  double distance_m = 0;
  // Counter-clockwise from the boresight, in (-pi, pi].
  double azimuth_rad = 0;
  // Above the antenna plane, in [-pi/2, pi/2].
  double elevation_rad = 0;
  bool line_of_sight = true;
  bool stopped = false;
  // False beyond the world's range limit: the measurement fails.
  bool in_range = true;
};

// The simulated physical world: where the radios are, and the peers that move
// around them. Gives the true distance and angles of each peer as seen by each
// radio at a given world time, and the same with seeded measurement noise, so
// that runs are reproducible. Configured from tests on their thread while the
// simulator's families read it on theirs: every method locks.
class World {
 public:
  World();

  // Places radio |hw_index|. A radio never placed stands at the origin,
  // looking along x.
  void PlaceRadio(uint32_t hw_index, const Pose& pose);
  // Adds a peer, or replaces the one with the same short address.
  void AddPeer(const Peer& peer);
  bool RemovePeer(uint16_t short_address);
  std::vector<Peer> Peers() const;
  std::optional<Peer> FindPeer(uint16_t short_address) const;
  std::optional<Peer> FindPeerByExtendedAddress(uint64_t extended_address) const;
  // False when no such peer.
  bool SetLineOfSight(uint16_t short_address, bool line_of_sight);
  bool SetStopped(uint16_t short_address, bool stopped);
  bool SetSpeed(uint16_t short_address, double speed_mps);
  bool SetMotion(uint16_t short_address, const Motion& motion);

  // Peers farther than this are out of range. Unlimited by default.
  void SetRangeLimit(double metres);
  // Gaussian noise added by Measure(): standard deviations of the distance
  // and of both angles; the generator restarts from |seed|. Zero: exact.
  void SetNoise(double distance_sigma_m, double angle_sigma_rad, uint32_t seed);

  // World time is counted from the epoch, a CLOCK_MONOTONIC instant (the
  // world's creation unless set), so that timestamps of the simulated driver
  // translate to world time.
  void SetEpochNs(uint64_t monotonic_ns);
  uint64_t epoch_ns() const;
  double SecondsAt(uint64_t monotonic_ns) const;

  // The exact view of |short_address| from |hw_index| at |time_s|; nullopt
  // for an unknown peer.
  std::optional<Observation> Truth(uint32_t hw_index, uint16_t short_address, double time_s) const;
  // Truth() with the configured noise: what a radio would measure.
  std::optional<Observation> Measure(uint32_t hw_index, uint16_t short_address, double time_s);

  // The view of a point from a pose, without any peer bookkeeping.
  static Observation View(const Pose& pose, const Vector3& point);

 private:
  std::optional<Observation> TruthLocked(uint32_t hw_index, uint16_t short_address,
                                         double time_s) const;
  Peer* FindLocked(uint16_t short_address);

  mutable std::mutex mutex_;
  std::map<uint32_t, Pose> radios_;
  std::map<uint16_t, Peer> peers_;
  double range_limit_m_ = std::numeric_limits<double>::infinity();
  double distance_sigma_m_ = 0;
  double angle_sigma_rad_ = 0;
  std::mt19937 noise_;
  uint64_t epoch_ns_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
