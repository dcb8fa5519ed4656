#include "sim/world.h"

#include <time.h>

#include <algorithm>
#include <cmath>

namespace hardware {
namespace dalix {
namespace sim {
namespace {

uint64_t MonotonicNowNs() {
  timespec now = {};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<uint64_t>(now.tv_sec) * 1000000000ull + static_cast<uint64_t>(now.tv_nsec);
}

double Length(const Vector3& v) { return std::sqrt(v.x * v.x + v.y * v.y + v.z * v.z); }

// The angle folded back into (-pi, pi] after noise pushed it out.
double WrapAngle(double angle) {
  angle = std::remainder(angle, 2 * M_PI);
  return angle == -M_PI ? M_PI : angle;
}

}  // namespace

Motion Motion::Standing(const Vector3& position) {
  Motion motion;
  motion.origin = position;
  return motion;
}

Motion Motion::Line(const Vector3& start, const Vector3& direction, double speed_mps) {
  Motion motion;
  motion.kind = Kind::kLine;
  motion.origin = start;
  double length = Length(direction);
  if (length > 0) {
    motion.direction = {direction.x / length, direction.y / length, direction.z / length};
  }
  motion.speed_mps = speed_mps;
  return motion;
}

Motion Motion::Circle(const Vector3& centre, double radius_m, double speed_mps, double phase_rad) {
  Motion motion;
  motion.kind = Kind::kCircle;
  motion.origin = centre;
  motion.radius_m = radius_m;
  motion.speed_mps = speed_mps;
  motion.phase_rad = phase_rad;
  return motion;
}

Vector3 Motion::PositionAt(double time_s) const {
  switch (kind) {
    case Kind::kStanding:
      return origin;
    case Kind::kLine: {
      double travelled = speed_mps * time_s;
      return {origin.x + direction.x * travelled, origin.y + direction.y * travelled,
              origin.z + direction.z * travelled};
    }
    case Kind::kCircle: {
      double angle = phase_rad + (radius_m > 0 ? speed_mps * time_s / radius_m : 0);
      return {origin.x + radius_m * std::cos(angle), origin.y + radius_m * std::sin(angle),
              origin.z};
    }
  }
  return origin;
}

World::World() : noise_(0), epoch_ns_(MonotonicNowNs()) {}

void World::PlaceRadio(uint32_t hw_index, const Pose& pose) {
  std::lock_guard<std::mutex> lock(mutex_);
  radios_[hw_index] = pose;
}

void World::AddPeer(const Peer& peer) {
  std::lock_guard<std::mutex> lock(mutex_);
  peers_[peer.short_address] = peer;
}

bool World::RemovePeer(uint16_t short_address) {
  std::lock_guard<std::mutex> lock(mutex_);
  return peers_.erase(short_address) > 0;
}

std::vector<Peer> World::Peers() const {
  std::lock_guard<std::mutex> lock(mutex_);
  std::vector<Peer> peers;
  for (const auto& entry : peers_) peers.push_back(entry.second);
  return peers;
}

std::optional<Peer> World::FindPeer(uint16_t short_address) const {
  std::lock_guard<std::mutex> lock(mutex_);
  auto found = peers_.find(short_address);
  if (found == peers_.end()) return std::nullopt;
  return found->second;
}

std::optional<Peer> World::FindPeerByExtendedAddress(uint64_t extended_address) const {
  std::lock_guard<std::mutex> lock(mutex_);
  for (const auto& entry : peers_) {
    if (entry.second.extended_address == extended_address) return entry.second;
  }
  return std::nullopt;
}

Peer* World::FindLocked(uint16_t short_address) {
  auto found = peers_.find(short_address);
  return found == peers_.end() ? nullptr : &found->second;
}

bool World::SetLineOfSight(uint16_t short_address, bool line_of_sight) {
  std::lock_guard<std::mutex> lock(mutex_);
  Peer* peer = FindLocked(short_address);
  if (peer != nullptr) peer->line_of_sight = line_of_sight;
  return peer != nullptr;
}

bool World::SetStopped(uint16_t short_address, bool stopped) {
  std::lock_guard<std::mutex> lock(mutex_);
  Peer* peer = FindLocked(short_address);
  if (peer != nullptr) peer->stopped = stopped;
  return peer != nullptr;
}

bool World::SetSpeed(uint16_t short_address, double speed_mps) {
  std::lock_guard<std::mutex> lock(mutex_);
  Peer* peer = FindLocked(short_address);
  if (peer != nullptr) peer->motion.speed_mps = speed_mps;
  return peer != nullptr;
}

bool World::SetMotion(uint16_t short_address, const Motion& motion) {
  std::lock_guard<std::mutex> lock(mutex_);
  Peer* peer = FindLocked(short_address);
  if (peer != nullptr) peer->motion = motion;
  return peer != nullptr;
}

void World::SetRangeLimit(double metres) {
  std::lock_guard<std::mutex> lock(mutex_);
  range_limit_m_ = metres;
}

void World::SetNoise(double distance_sigma_m, double angle_sigma_rad, uint32_t seed) {
  std::lock_guard<std::mutex> lock(mutex_);
  distance_sigma_m_ = distance_sigma_m;
  angle_sigma_rad_ = angle_sigma_rad;
  noise_.seed(seed);
}

void World::SetEpochNs(uint64_t monotonic_ns) {
  std::lock_guard<std::mutex> lock(mutex_);
  epoch_ns_ = monotonic_ns;
}

uint64_t World::epoch_ns() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return epoch_ns_;
}

double World::SecondsAt(uint64_t monotonic_ns) const {
  std::lock_guard<std::mutex> lock(mutex_);
  // Signed, so that an instant before the epoch counts backwards.
  return static_cast<double>(static_cast<int64_t>(monotonic_ns - epoch_ns_)) / 1e9;
}

Observation World::View(const Pose& pose, const Vector3& point) {
  Vector3 d = {point.x - pose.position.x, point.y - pose.position.y, point.z - pose.position.z};
  // Into the antenna frame: undo the yaw, then the pitch, then the roll.
  double cy = std::cos(pose.yaw_rad), sy = std::sin(pose.yaw_rad);
  double x1 = cy * d.x + sy * d.y;
  double y1 = -sy * d.x + cy * d.y;
  double cp = std::cos(pose.pitch_rad), sp = std::sin(pose.pitch_rad);
  double x2 = cp * x1 + sp * d.z;
  double z2 = -sp * x1 + cp * d.z;
  double cr = std::cos(pose.roll_rad), sr = std::sin(pose.roll_rad);
  double y3 = cr * y1 + sr * z2;
  double z3 = -sr * y1 + cr * z2;

  Observation view;
  view.distance_m = Length(d);
  view.azimuth_rad = std::atan2(y3, x2);
  view.elevation_rad = std::atan2(z3, std::hypot(x2, y3));
  return view;
}

std::optional<Observation> World::TruthLocked(uint32_t hw_index, uint16_t short_address,
                                              double time_s) const {
  auto peer = peers_.find(short_address);
  if (peer == peers_.end()) return std::nullopt;
  auto radio = radios_.find(hw_index);
  Pose pose = radio == radios_.end() ? Pose() : radio->second;
  Observation view = View(pose, peer->second.motion.PositionAt(time_s));
  view.line_of_sight = peer->second.line_of_sight;
  view.stopped = peer->second.stopped;
  view.in_range = view.distance_m <= range_limit_m_;
  return view;
}

std::optional<Observation> World::Truth(uint32_t hw_index, uint16_t short_address,
                                        double time_s) const {
  std::lock_guard<std::mutex> lock(mutex_);
  return TruthLocked(hw_index, short_address, time_s);
}

std::optional<Observation> World::Measure(uint32_t hw_index, uint16_t short_address,
                                          double time_s) {
  std::lock_guard<std::mutex> lock(mutex_);
  std::optional<Observation> view = TruthLocked(hw_index, short_address, time_s);
  if (!view) return view;
  if (distance_sigma_m_ > 0) {
    std::normal_distribution<double> error(0, distance_sigma_m_);
    view->distance_m = std::max(0.0, view->distance_m + error(noise_));
  }
  if (angle_sigma_rad_ > 0) {
    std::normal_distribution<double> error(0, angle_sigma_rad_);
    view->azimuth_rad = WrapAngle(view->azimuth_rad + error(noise_));
    view->elevation_rad = std::clamp(view->elevation_rad + error(noise_), -M_PI / 2, M_PI / 2);
  }
  return view;
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
