#pragma once

#include <optional>
#include <string>
#include <vector>

#include "tools/ranging_client.h"

namespace hardware {
namespace dalix {
namespace demo {

// A point of the top-down map, in metres.
struct Point {
  double x = 0;
  double y = 0;
};

// Where the simulated world says a peer is, seen from the radio ranging it.
struct Truth {
  double distance_m = 0;
  double azimuth_rad = 0;
  double elevation_rad = 0;
  bool line_of_sight = true;
  Point position;
};

// One line of the table and one mark of the map.
struct PeerRow {
  tools::PeerReading reading;
  // A single letter naming the peer on the map.
  char mark = '?';
  std::optional<Truth> truth;
  // The measured position, when the reading has a distance and an azimuth.
  std::optional<Point> measured;
};

// The text of one screen: a table of the peers and a top-down map of them,
// measured (capital letters) against true (small letters), radios as '#'.
// Pure functions of their input, so any thread may call them.
std::string RenderTable(const std::vector<PeerRow>& rows);
// |centre| is the point in the middle of the map.
std::string RenderMap(const std::vector<PeerRow>& rows, const std::vector<Point>& radios,
                      const Point& centre, double half_width_m, int columns, int lines);

}  // namespace demo
}  // namespace dalix
}  // namespace hardware
