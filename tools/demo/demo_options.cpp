#include "tools/demo/demo_options.h"

#include <stdlib.h>

#include <cerrno>

namespace hardware {
namespace dalix {
namespace demo {
namespace {

bool ParseNumber(const std::string& text, double low, double high, double* value) {
  if (text.empty()) return false;
  char* end = nullptr;
  errno = 0;
  const double parsed = strtod(text.c_str(), &end);
  if (errno != 0 || *end != '\0' || parsed < low || parsed > high) return false;
  *value = parsed;
  return true;
}

}  // namespace

std::string DemoUsage(const char* program) {
  return std::string("usage: ") + program +
         " [options]\n"
         "Runs the UWB HAL service against a simulated driver with two radios and\n"
         "moving peers, and shows what a client of the service measures: FiRa\n"
         "ranging on the first radio, simple ranging on the second.\n"
         "\n"
         "  --duration SECONDS  how long to range (default 30; 0: until Ctrl-C)\n"
         "  --peers N           number of moving peers, 1 to 8 (default 3)\n"
         "  --seed N            seed of the simulated world and its noise (default 1)\n"
         "  --quiet             no live screen: a summary at the end only\n"
         "  --csv FILE          write every result with the simulated truth to FILE\n"
         "  --plot FILE.svg     write measured positions against the true tracks,\n"
         "                      and the distance error over time, at the end\n"
         "  --dump              print the service's diagnostic dump before stopping\n"
         "  --verbose           show the service's log lines\n"
         "  --help              this text\n";
}

bool ParseDemoOptions(int argc, char** argv, DemoOptions* options, bool* help,
                      std::string* error) {
  *help = false;
  for (int i = 1; i < argc; ++i) {
    const std::string arg = argv[i];
    auto value = [&](std::string* out) {
      if (i + 1 >= argc) {
        *error = arg + " needs a value";
        return false;
      }
      *out = argv[++i];
      return true;
    };
    std::string text;
    double number = 0;
    if (arg == "--help" || arg == "-h") {
      *help = true;
    } else if (arg == "--quiet") {
      options->quiet = true;
    } else if (arg == "--dump") {
      options->dump = true;
    } else if (arg == "--verbose") {
      options->verbose = true;
    } else if (arg == "--duration") {
      if (!value(&text)) return false;
      if (!ParseNumber(text, 0, 24 * 3600, &number)) {
        *error = "--duration takes seconds from 0 to 86400, not '" + text + "'";
        return false;
      }
      options->duration_s = number;
    } else if (arg == "--peers") {
      if (!value(&text)) return false;
      if (!ParseNumber(text, 1, kMaxPeers, &number) || number != static_cast<int>(number)) {
        *error = "--peers takes a whole number from 1 to " + std::to_string(kMaxPeers) +
                 ", not '" + text + "'";
        return false;
      }
      options->peers = static_cast<int>(number);
    } else if (arg == "--seed") {
      if (!value(&text)) return false;
      if (!ParseNumber(text, 0, UINT32_MAX, &number) || number != static_cast<uint32_t>(number)) {
        *error = "--seed takes a whole number from 0 to 4294967295, not '" + text + "'";
        return false;
      }
      options->seed = static_cast<uint32_t>(number);
    } else if (arg == "--csv") {
      if (!value(&options->csv_path)) return false;
    } else if (arg == "--plot") {
      if (!value(&options->plot_path)) return false;
    } else {
      *error = "unknown option '" + arg + "'";
      return false;
    }
  }
  return true;
}

}  // namespace demo
}  // namespace dalix
}  // namespace hardware
