#include "sim/world.h"

#include <cmath>

#include <gtest/gtest.h>

namespace hardware {
namespace dalix {
namespace sim {
namespace {

constexpr double kEps = 1e-9;

TEST(WorldTest, ViewGivesDistanceAndAnglesInTheRadiosFrame) {
  const struct {
    const char* name;
    Pose pose;
    Vector3 point;
    double distance, azimuth, elevation;
  } cases[] = {
      {"ahead", {}, {3, 0, 0}, 3, 0, 0},
      {"left is positive", {}, {0, 2, 0}, 2, M_PI / 2, 0},
      {"right", {}, {1, -1, 0}, std::sqrt(2), -M_PI / 4, 0},
      {"above", {}, {1, 0, 1}, std::sqrt(2), 0, M_PI / 4},
      {"behind", {{1, 0, 0}}, {-1, 0, 0}, 2, M_PI, 0},
      {"turned left", {{0, 0, 0}, M_PI / 2}, {0, 5, 0}, 5, 0, 0},
      {"pitched up", {{0, 0, 0}, 0, M_PI / 4}, {1, 0, 1}, std::sqrt(2), 0, 0},
      {"rolled onto its side", {{0, 0, 0}, 0, 0, M_PI / 2}, {0, 0, 1}, 1, M_PI / 2, 0},
      {"offset and turned", {{1, 1, 1}, M_PI}, {0, 1, 2}, std::sqrt(2), 0, M_PI / 4},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    Observation view = World::View(c.pose, c.point);
    EXPECT_NEAR(view.distance_m, c.distance, kEps);
    EXPECT_NEAR(view.azimuth_rad, c.azimuth, kEps);
    EXPECT_NEAR(view.elevation_rad, c.elevation, kEps);
  }
}

TEST(WorldTest, PeersMoveStandStillAndKeepTheirFlags) {
  World world;
  world.AddPeer({0x1001, 1, Motion::Standing({2, 0, 0})});
  world.AddPeer({0x1002, 2, Motion::Line({1, 0, 0}, {0, 2, 0}, 0.5)});
  world.AddPeer({0x1003, 3, Motion::Circle({0, 0, 0}, 2, M_PI)});
  world.PlaceRadio(7, {{0, 0, 0}, M_PI / 2});

  // After 2 s: the line walker 1 m along y; the circler a half turn round.
  EXPECT_NEAR(world.Truth(0, 0x1001, 2)->distance_m, 2, kEps);
  EXPECT_NEAR(world.Truth(0, 0x1002, 2)->azimuth_rad, M_PI / 4, kEps);
  EXPECT_NEAR(world.Truth(0, 0x1003, 2)->azimuth_rad, M_PI, kEps);
  EXPECT_NEAR(world.Truth(0, 0x1003, 0.5)->azimuth_rad, M_PI / 4, kEps);
  EXPECT_NEAR(world.Truth(7, 0x1001, 0)->azimuth_rad, -M_PI / 2, kEps);
  EXPECT_FALSE(world.Truth(0, 0x9999, 0));

  ASSERT_TRUE(world.SetSpeed(0x1002, 0));
  EXPECT_NEAR(world.Truth(0, 0x1002, 10)->distance_m, 1, kEps);
  ASSERT_TRUE(world.SetLineOfSight(0x1001, false));
  ASSERT_TRUE(world.SetStopped(0x1001, true));
  world.SetRangeLimit(1.5);
  Observation far = *world.Truth(0, 0x1001, 0);
  EXPECT_FALSE(far.line_of_sight);
  EXPECT_TRUE(far.stopped);
  EXPECT_FALSE(far.in_range);
  EXPECT_TRUE(world.Truth(0, 0x1002, 0)->in_range);
  EXPECT_FALSE(world.SetStopped(0x4242, true));
  EXPECT_EQ(world.FindPeerByExtendedAddress(3)->short_address, 0x1003);
}

TEST(WorldTest, NoiseIsReproducibleFromItsSeedAndTruthStaysExact) {
  World world;
  world.AddPeer({0x1001, 1, Motion::Standing({10, 0, 0})});
  auto series = [&world](uint32_t seed) {
    world.SetNoise(0.1, 0.05, seed);
    std::vector<double> values;
    for (int i = 0; i < 4; ++i) {
      Observation view = *world.Measure(0, 0x1001, 0);
      values.insert(values.end(), {view.distance_m, view.azimuth_rad, view.elevation_rad});
    }
    return values;
  };
  std::vector<double> first = series(42);
  EXPECT_EQ(series(42), first);
  EXPECT_NE(series(43), first);
  EXPECT_NE(first[0], 10);
  EXPECT_EQ(world.Truth(0, 0x1001, 0)->distance_m, 10);
  world.SetNoise(0, 0, 1);
  EXPECT_EQ(world.Measure(0, 0x1001, 0)->distance_m, 10);
}

TEST(WorldTest, WorldTimeCountsFromTheEpoch) {
  World world;
  world.SetEpochNs(5'000'000'000);
  EXPECT_DOUBLE_EQ(world.SecondsAt(6'500'000'000), 1.5);
  EXPECT_DOUBLE_EQ(world.SecondsAt(4'000'000'000), -1);
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
