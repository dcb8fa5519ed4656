#include "sim/world.h"

#include <cmath>

#include <gtest/gtest.h>

namespace hardware {
namespace dalix {
namespace sim {
namespace {

TEST(WorldTest, ViewGivesDistanceAndAnglesInTheRadiosFrame) {
  const struct {
    Pose pose;
    Vector3 point;
    double distance, azimuth, elevation;
  } cases[] = {
      {{}, {0, 2, 0}, 2, M_PI / 2, 0},  // left is positive
      {{}, {1, -1, 0}, std::sqrt(2), -M_PI / 4, 0},
      {{{1, 0, 0}}, {-1, 0, 0}, 2, M_PI, 0},
      {{{0, 0, 0}, 0, M_PI / 4}, {1, 0, 1}, std::sqrt(2), 0, 0},  // pitched up
      {{{0, 0, 0}, 0, 0, M_PI / 2}, {0, 0, 1}, 1, M_PI / 2, 0},   // rolled
      {{{1, 1, 1}, M_PI}, {0, 1, 2}, std::sqrt(2), 0, M_PI / 4},  // turned round
  };
  for (const auto& c : cases) {
    Observation view = World::View(c.pose, c.point);
    EXPECT_NEAR(view.distance_m, c.distance, 1e-9);
    EXPECT_NEAR(view.azimuth_rad, c.azimuth, 1e-9);
    EXPECT_NEAR(view.elevation_rad, c.elevation, 1e-9);
  }
}

TEST(WorldTest, PeersMoveAndNoiseRepeatsFromItsSeed) {
  World world;
  world.AddPeer({1, 11, Motion::Line({1, 0, 0}, {0, 2, 0}, 0.5)});
  world.AddPeer({2, 12, Motion::Circle({0, 0, 0}, 2, M_PI)});
  // After 2 s: the walker 1 m along y, the circler half way round.
  EXPECT_NEAR(world.Truth(0, 1, 2)->azimuth_rad, M_PI / 4, 1e-9);
  EXPECT_NEAR(world.Truth(0, 2, 2)->azimuth_rad, M_PI, 1e-9);
  world.SetRangeLimit(1.5);
  EXPECT_FALSE(world.Truth(0, 2, 0)->in_range);
  EXPECT_FALSE(world.Truth(0, 3, 0));
  world.SetNoise(0.1, 0.05, 42);
  const double first = world.Measure(0, 2, 0)->distance_m;
  for (uint32_t seed : {42, 43}) {
    world.SetNoise(0.1, 0.05, seed);
    EXPECT_EQ(seed == 42, world.Measure(0, 2, 0)->distance_m == first) << seed;
  }
  EXPECT_EQ(world.Truth(0, 2, 0)->distance_m, 2);
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
