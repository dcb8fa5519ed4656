#pragma once

#include <map>
#include <optional>
#include <string>
#include <vector>

#include "tools/demo/screen.h"

namespace hardware {
namespace dalix {
namespace demo {

// Gathers every result of a run and writes it as one self-contained SVG:
// each peer's measured positions over its true track, and its distance
// error over time. Not thread-safe: the demo feeds it under its own lock.
class TrackPlot {
 public:
  void Add(char mark, double time_s, const std::optional<Point>& measured, const Point& truth,
           double distance_error_m);
  bool empty() const { return peers_.empty(); }
  // False with the reason in |error| when the file cannot be written.
  bool Write(const std::string& path, std::string* error) const;
  // The document itself.
  std::string Svg() const;

 private:
  struct Sample {
    double time_s;
    std::optional<Point> measured;
    Point truth;
    double error_m;
  };
  std::map<char, std::vector<Sample>> peers_;
};

}  // namespace demo
}  // namespace dalix
}  // namespace hardware
