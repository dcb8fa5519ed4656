#include "tools/demo/track_plot.h"

#include <math.h>
#include <stdio.h>

#include <algorithm>
#include <fstream>

namespace hardware {
namespace dalix {
namespace demo {
namespace {

constexpr double kPanel = 420;
constexpr double kMargin = 40;
constexpr const char* kColours[] = {"#1f77b4", "#d62728", "#2ca02c", "#9467bd",
                                    "#ff7f0e", "#8c564b", "#e377c2", "#17becf"};

std::string Number(double value) {
  char text[32];
  snprintf(text, sizeof(text), "%.1f", value);
  return text;
}

// Maps a value range onto a pixel range.
struct Axis {
  double low;
  double high;
  double from;
  double to;
  double operator()(double value) const {
    const double span = high > low ? high - low : 1;
    return from + (value - low) / span * (to - from);
  }
};

}  // namespace

void TrackPlot::Add(char mark, double time_s, const std::optional<Point>& measured,
                    const Point& truth, double distance_error_m) {
  peers_[mark].push_back(Sample{time_s, measured, truth, distance_error_m});
}

std::string TrackPlot::Svg() const {
  // One square scale for both map axes, so that tracks keep their shape.
  double extent = 1;
  double last_time = 1;
  double worst_error = 0.1;
  for (const auto& [mark, samples] : peers_) {
    for (const Sample& sample : samples) {
      extent = std::max({extent, fabs(sample.truth.x), fabs(sample.truth.y)});
      if (sample.measured) extent = std::max({extent, fabs(sample.measured->x), fabs(sample.measured->y)});
      last_time = std::max(last_time, sample.time_s);
      if (!isnan(sample.error_m)) worst_error = std::max(worst_error, fabs(sample.error_m));
    }
  }
  extent *= 1.1;
  const Axis map_x{-extent, extent, kMargin, kMargin + kPanel};
  const Axis map_y{-extent, extent, kMargin + kPanel, kMargin};
  const double left = 2 * kMargin + kPanel;
  const Axis time_x{0, last_time, left + kMargin, left + kMargin + kPanel};
  const Axis error_y{-worst_error, worst_error, kMargin + kPanel, kMargin};

  std::string svg =
      "<svg xmlns=\"http://www.w3.org/2000/svg\" width=\"" + Number(2 * kPanel + 4 * kMargin) +
      "\" height=\"" + Number(kPanel + 2 * kMargin + 20) +
      "\" font-family=\"sans-serif\" font-size=\"12\">\n"
      "<rect width=\"100%\" height=\"100%\" fill=\"white\"/>\n";
  svg += "<text x=\"" + Number(kMargin) + "\" y=\"24\">Positions, top-down (" +
         Number(2 * extent) + " m across): dots measured, lines true tracks</text>\n";
  svg += "<text x=\"" + Number(left + kMargin) + "\" y=\"24\">Distance error (m) over time (0 to " +
         Number(last_time) + " s), limits &#177;" + Number(worst_error) + "</text>\n";
  svg += "<rect x=\"" + Number(kMargin) + "\" y=\"" + Number(kMargin) + "\" width=\"" +
         Number(kPanel) + "\" height=\"" + Number(kPanel) +
         "\" fill=\"none\" stroke=\"#999\"/>\n";
  svg += "<rect x=\"" + Number(left + kMargin) + "\" y=\"" + Number(kMargin) + "\" width=\"" +
         Number(kPanel) + "\" height=\"" + Number(kPanel) +
         "\" fill=\"none\" stroke=\"#999\"/>\n";
  svg += "<line x1=\"" + Number(time_x.from) + "\" x2=\"" + Number(time_x.to) + "\" y1=\"" +
         Number(error_y(0)) + "\" y2=\"" + Number(error_y(0)) + "\" stroke=\"#ccc\"/>\n";
  svg += "<circle cx=\"" + Number(map_x(0)) + "\" cy=\"" + Number(map_y(0)) +
         "\" r=\"4\" fill=\"black\"/>\n";

  size_t index = 0;
  for (const auto& [mark, samples] : peers_) {
    const std::string colour = kColours[index++ % (sizeof(kColours) / sizeof(kColours[0]))];
    std::string track;
    std::string errors;
    std::string dots;
    for (const Sample& sample : samples) {
      track += Number(map_x(sample.truth.x)) + "," + Number(map_y(sample.truth.y)) + " ";
      if (sample.measured) {
        dots += "<circle cx=\"" + Number(map_x(sample.measured->x)) + "\" cy=\"" +
                Number(map_y(sample.measured->y)) + "\" r=\"1.5\"/>";
      }
      if (!isnan(sample.error_m)) {
        errors += Number(time_x(sample.time_s)) + "," + Number(error_y(sample.error_m)) + " ";
      }
    }
    svg += "<g fill=\"" + colour + "\" fill-opacity=\"0.6\">" + dots + "</g>\n";
    svg += "<polyline fill=\"none\" stroke=\"" + colour + "\" stroke-width=\"2\" points=\"" +
           track + "\"/>\n";
    svg += "<polyline fill=\"none\" stroke=\"" + colour + "\" points=\"" + errors + "\"/>\n";
    svg += "<text x=\"" + Number(kMargin + 20 * (index - 1)) + "\" y=\"" +
           Number(kPanel + kMargin + 16) + "\" fill=\"" + colour + "\">" + mark + "</text>\n";
  }
  svg += "</svg>\n";
  return svg;
}

bool TrackPlot::Write(const std::string& path, std::string* error) const {
  std::ofstream file(path);
  file << Svg();
  file.close();
  if (!file) {
    *error = "cannot write " + path;
    return false;
  }
  return true;
}

}  // namespace demo
}  // namespace dalix
}  // namespace hardware
