#pragma once

#include <stdint.h>

#include <string>

namespace hardware {
namespace dalix {
namespace demo {

// What the demo is asked to do, from its command line.
struct DemoOptions {
  // 0 runs until Ctrl-C.
  double duration_s = 30;
  int peers = 3;
  uint32_t seed = 1;
  bool quiet = false;
  bool dump = false;
  bool verbose = false;
  std::string csv_path;
  std::string plot_path;
};

constexpr int kMaxPeers = 8;

// Fills |options| from the arguments. False with a one-line reason in
// |error| for anything it does not understand; |*help| when help was asked.
bool ParseDemoOptions(int argc, char** argv, DemoOptions* options, bool* help,
                      std::string* error);
std::string DemoUsage(const char* program);

}  // namespace demo
}  // namespace dalix
}  // namespace hardware
