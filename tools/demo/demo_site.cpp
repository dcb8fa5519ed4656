#include "tools/demo/demo_site.h"

#include <math.h>
#include <time.h>

#include <random>

namespace hardware {
namespace dalix {
namespace demo {
namespace {

constexpr uint32_t kFiraHw = 0;
constexpr uint32_t kSimpleRangingHw = 1;
constexpr uint16_t kFirstShortAddress = 0x1001;
constexpr uint64_t kFirstExtendedAddress = 0x00d1a1c5a0000001;
// A few centimetres of distance noise, about a degree of angle noise.
constexpr double kDistanceSigmaM = 0.04;
constexpr double kAngleSigmaRad = 0.02;
// Noise beyond five sigma is not expected in a run; the distance travels in
// whole centimetres.
constexpr double kErrorBoundM = 5 * kDistanceSigmaM + 0.01;
constexpr double kHalfWidthM = 7;
// Simple ranging reports come at the rate of FiRa notifications.
constexpr int32_t kSimpleRangingPeriodPerPeerMs = DemoSite::kFiraBlockMs;
// Simple ranging results carry no time: they are compared with the truth
// when they arrive, a few report periods late (more on a loaded machine),
// and the peers walk at up to 1.2 m/s.
constexpr double kSimpleRangingLagM = 1.2 * 0.5;

// Both radios stand a little apart, looking the same way (along y, the
// top of the map), at desk height.
const sim::Pose kRadioPoses[] = {
    {{-0.5, 0, 1}, M_PI / 2, 0, 0},
    {{0.5, 0, 1}, M_PI / 2, 0, 0},
};

uint64_t MonotonicNs() {
  timespec now;
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<uint64_t>(now.tv_sec) * 1000000000u + now.tv_nsec;
}

}  // namespace

struct DemoSite::World {
  std::vector<sim::Peer> peers;
};

DemoSite::DemoSite(int peers, uint32_t seed)
    : peers_(peers), seed_(seed), world_(std::make_unique<World>()) {}

DemoSite::~DemoSite() = default;

bool DemoSite::Start(std::string* error) {
  if (!driver_.AddRadio(kFiraHw, 0, kFiraRadio, error) ||
      !driver_.AddRadio(kSimpleRangingHw, 1, kSimpleRangingRadio, error)) {
    return false;
  }
  sim::World& world = driver_.world();
  world.PlaceRadio(kFiraHw, kRadioPoses[0]);
  world.PlaceRadio(kSimpleRangingHw, kRadioPoses[1]);
  world.SetNoise(kDistanceSigmaM, kAngleSigmaRad, seed_);
  // The service's one thread reads one simple ranging report each time the
  // FiRa socket it also watches delivers a notification; reports must come
  // slower than that, or they queue up and age.
  driver_.SetSimpleRangingPeriod(kSimpleRangingPeriodPerPeerMs * peers_);

  // Peers walk circles in front of the radios, each its own size, speed and
  // height; the seed picks them.
  std::mt19937 random(seed_);
  std::uniform_real_distribution<double> unit(0, 1);
  for (int i = 0; i < peers_; ++i) {
    sim::Peer peer;
    peer.short_address = static_cast<uint16_t>(kFirstShortAddress + i);
    peer.extended_address = kFirstExtendedAddress + i;
    const double bearing = M_PI / 2 + (unit(random) - 0.5) * 1.6;
    const double reach = 2.5 + 2.5 * unit(random);
    const sim::Vector3 centre = {reach * cos(bearing), reach * sin(bearing),
                                 0.5 + 1.5 * unit(random)};
    const double radius = 0.6 + 1.4 * unit(random);
    const double speed = (0.4 + 0.8 * unit(random)) * (i % 2 == 0 ? 1 : -1);
    peer.motion = sim::Motion::Circle(centre, radius, speed, 2 * M_PI * unit(random));
    // Every third peer is behind something.
    peer.line_of_sight = i % 3 != 2;
    world.AddPeer(peer);
    world_->peers.push_back(peer);
  }
  if (!driver_.Start()) {
    *error = "the simulator's netlink port cannot be bound";
    return false;
  }
  return true;
}

std::vector<uint16_t> DemoSite::ShortAddresses() const {
  std::vector<uint16_t> addresses;
  for (const sim::Peer& peer : world_->peers) addresses.push_back(peer.short_address);
  return addresses;
}

std::vector<int64_t> DemoSite::ExtendedAddresses() const {
  std::vector<int64_t> addresses;
  for (const sim::Peer& peer : world_->peers) {
    addresses.push_back(static_cast<int64_t>(peer.extended_address));
  }
  return addresses;
}

char DemoSite::MarkOf(const tools::PeerReading& reading) const {
  for (size_t i = 0; i < world_->peers.size(); ++i) {
    const sim::Peer& peer = world_->peers[i];
    const bool same = reading.mode == tools::RangingMode::kFira
                          ? reading.address == peer.short_address
                          : reading.address == peer.extended_address;
    if (same) return static_cast<char>('A' + i);
  }
  return '?';
}

std::optional<Truth> DemoSite::TruthOf(const tools::PeerReading& reading) const {
  const char mark = MarkOf(reading);
  if (mark == '?') return std::nullopt;
  const sim::Peer& peer = world_->peers[mark - 'A'];
  const uint32_t hw = reading.radio == kFiraRadio ? kFiraHw : kSimpleRangingHw;
  // At the moment of the measurement when the result tells it, else now.
  const uint64_t when_ns =
      reading.timestamp_ns > 0 ? static_cast<uint64_t>(reading.timestamp_ns) : MonotonicNs();
  const double time_s = driver_.world().SecondsAt(when_ns);
  std::optional<sim::Observation> seen = driver_.world().Truth(hw, peer.short_address, time_s);
  if (!seen) return std::nullopt;
  Truth truth;
  truth.distance_m = seen->distance_m;
  truth.azimuth_rad = seen->azimuth_rad;
  truth.elevation_rad = seen->elevation_rad;
  truth.line_of_sight = seen->line_of_sight;
  const sim::Vector3 position = peer.motion.PositionAt(time_s);
  truth.position = {position.x, position.y};
  return truth;
}

std::optional<Point> DemoSite::MeasuredPosition(const tools::PeerReading& reading) const {
  if (!reading.measured || isnan(reading.azimuth_rad)) return std::nullopt;
  const sim::Pose& pose = kRadioPoses[reading.radio == kFiraRadio ? 0 : 1];
  const double elevation = isnan(reading.elevation_rad) ? 0 : reading.elevation_rad;
  const double across = reading.distance_m * cos(elevation);
  const double bearing = pose.yaw_rad + reading.azimuth_rad;
  return Point{pose.position.x + across * cos(bearing), pose.position.y + across * sin(bearing)};
}

std::vector<Point> DemoSite::RadioPositions() const {
  std::vector<Point> points;
  for (const sim::Pose& pose : kRadioPoses) points.push_back({pose.position.x, pose.position.y});
  return points;
}

Point DemoSite::MapCentre() const { return {0, kHalfWidthM / 2}; }

double DemoSite::HalfWidth() const { return kHalfWidthM; }

double DemoSite::ErrorBound(tools::RangingMode mode) const {
  return mode == tools::RangingMode::kFira ? kErrorBoundM : kErrorBoundM + kSimpleRangingLagM;
}

}  // namespace demo
}  // namespace dalix
}  // namespace hardware
