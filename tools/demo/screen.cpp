#include "tools/demo/screen.h"

#include <math.h>
#include <stdio.h>

#include <cctype>

namespace hardware {
namespace dalix {
namespace demo {
namespace {

constexpr double kDegreesPerRadian = 180.0 / M_PI;

std::string Format(const char* format, double value) {
  if (isnan(value)) return "-";
  char text[32];
  snprintf(text, sizeof(text), format, value);
  return text;
}

std::string AddressText(const tools::PeerReading& reading) {
  char text[24];
  if (reading.mode == tools::RangingMode::kFira) {
    snprintf(text, sizeof(text), "%04llx", static_cast<unsigned long long>(reading.address));
  } else {
    snprintf(text, sizeof(text), "%016llx", static_cast<unsigned long long>(reading.address));
  }
  return text;
}

const char* LineOfSightText(int line_of_sight) {
  switch (line_of_sight) {
    case 1:
      return "yes";
    case 0:
      return "no";
    default:
      return "?";
  }
}

}  // namespace

std::string RenderTable(const std::vector<PeerRow>& rows) {
  std::string text;
  char line[256];
  snprintf(line, sizeof(line), "%-4s %-6s %-7s %-16s %9s %9s %9s %4s %6s %9s\n", "peer", "radio",
           "mode", "address", "dist m", "azim deg", "elev deg", "los", "upd/s", "error m");
  text += line;
  for (const PeerRow& row : rows) {
    const tools::PeerReading& reading = row.reading;
    const double error = row.truth && reading.measured
                             ? reading.distance_m - row.truth->distance_m
                             : NAN;
    const bool has = reading.results > reading.failures;
    snprintf(line, sizeof(line), "%-4c %-6s %-7s %-16s %9s %9s %9s %4s %6.1f %9s%s\n", row.mark,
             reading.radio.c_str(), tools::ModeName(reading.mode), AddressText(reading).c_str(),
             has ? Format("%.2f", reading.distance_m).c_str() : "-",
             has ? Format("%.1f", reading.azimuth_rad * kDegreesPerRadian).c_str() : "-",
             has ? Format("%.1f", reading.elevation_rad * kDegreesPerRadian).c_str() : "-",
             LineOfSightText(reading.line_of_sight), reading.updates_per_second,
             Format("%+.2f", error).c_str(), reading.measured ? "" : "  (no result)");
    text += line;
  }
  return text;
}

std::string RenderMap(const std::vector<PeerRow>& rows, const std::vector<Point>& radios,
                      const Point& centre, double half_width_m, int columns, int lines) {
  std::vector<std::string> grid(lines, std::string(columns, ' '));
  // A character cell is about twice as tall as it is wide.
  const double half_height_m = half_width_m * lines * 2.0 / columns;
  auto plot = [&](const Point& point, char mark, bool over) {
    const double x = (point.x - centre.x) / half_width_m;
    const double y = (point.y - centre.y) / half_height_m;
    const int column = static_cast<int>(lround((x + 1) * (columns - 1) / 2));
    const int row = static_cast<int>(lround((1 - y) * (lines - 1) / 2));
    if (column < 0 || column >= columns || row < 0 || row >= lines) return;
    char& cell = grid[row][column];
    if (over || cell == ' ' || cell == '.') cell = mark;
  };
  for (const PeerRow& row : rows) {
    if (row.truth) plot(row.truth->position, static_cast<char>(tolower(row.mark)), false);
  }
  for (const PeerRow& row : rows) {
    if (row.measured) plot(*row.measured, row.mark, true);
  }
  for (const Point& radio : radios) plot(radio, '#', true);

  std::string text = "+" + std::string(columns, '-') + "+\n";
  for (const std::string& line : grid) text += "|" + line + "|\n";
  text += "+" + std::string(columns, '-') + "+\n";
  char legend[128];
  snprintf(legend, sizeof(legend),
           "%.0f m across; # radio, A measured, a true position\n", 2 * half_width_m);
  text += legend;
  return text;
}

}  // namespace demo
}  // namespace dalix
}  // namespace hardware
