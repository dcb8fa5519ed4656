// The on-device ranging client: waits for the HAL, opens it, lists the
// radios and runs FiRa or simple ranging from the command line, printing
// each result as it comes.
#include <math.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>

#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/IUwb.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>

#include "tools/ranging_client.h"

namespace {

namespace uwb = aidl::aidl::hardware::dalix::uwb;
namespace tools = hardware::dalix::tools;

constexpr auto kServicePoll = std::chrono::milliseconds(100);
constexpr double kDegreesPerRadian = 180.0 / M_PI;

volatile sig_atomic_t g_interrupted = 0;
void OnSignal(int) { g_interrupted = 1; }

struct Options {
  std::string mode;
  std::string radio;
  std::vector<uint64_t> peers;
  int32_t channel = 9;
  int32_t block_ms = 200;
  double duration_s = 0;
  double wait_s = 10;
};

const char kUsage[] =
    "usage: uwb-ranging-client fira|simple [options]\n"
    "  fira     FiRa two-way ranging as controller with the peers as controlees\n"
    "  simple   simple ranging as initiator with the peers\n"
    "  --peers A,B,...     peer addresses in hex: 16-bit short ones for FiRa,\n"
    "                      64-bit extended ones for simple ranging (required)\n"
    "  --radio NAME        network interface of the radio (default: the first)\n"
    "  --channel N         UWB channel (default 9)\n"
    "  --block-ms N        FiRa ranging block duration in ms (default 200)\n"
    "  --duration SECONDS  stop after this long (default: at Ctrl-C)\n"
    "  --wait SECONDS      how long to wait for the service (default 10)\n";

bool ParsePeers(const std::string& text, std::vector<uint64_t>* peers) {
  size_t start = 0;
  while (start <= text.size()) {
    const size_t comma = text.find(',', start);
    const std::string item = text.substr(start, comma == std::string::npos ? comma : comma - start);
    char* end = nullptr;
    const unsigned long long value = strtoull(item.c_str(), &end, 16);
    if (item.empty() || *end != '\0') return false;
    peers->push_back(value);
    if (comma == std::string::npos) break;
    start = comma + 1;
  }
  return !peers->empty();
}

bool ParseOptions(int argc, char** argv, Options* options, std::string* error) {
  if (argc < 2) {
    *error = "a mode is needed";
    return false;
  }
  options->mode = argv[1];
  if (options->mode != "fira" && options->mode != "simple") {
    *error = "unknown mode '" + options->mode + "'";
    return false;
  }
  for (int i = 2; i < argc; ++i) {
    const std::string arg = argv[i];
    if (i + 1 >= argc) {
      *error = arg + " needs a value";
      return false;
    }
    const std::string value = argv[++i];
    char* end = nullptr;
    if (arg == "--peers") {
      if (!ParsePeers(value, &options->peers)) {
        *error = "--peers takes hexadecimal addresses separated by commas";
        return false;
      }
      continue;
    } else if (arg == "--radio") {
      options->radio = value;
      continue;
    }
    const double number = strtod(value.c_str(), &end);
    if (value.empty() || *end != '\0' || number < 0) {
      *error = arg + " takes a number, not '" + value + "'";
      return false;
    }
    if (arg == "--channel") {
      options->channel = static_cast<int32_t>(number);
    } else if (arg == "--block-ms") {
      options->block_ms = static_cast<int32_t>(number);
    } else if (arg == "--duration") {
      options->duration_s = number;
    } else if (arg == "--wait") {
      options->wait_s = number;
    } else {
      *error = "unknown option '" + arg + "'";
      return false;
    }
  }
  if (options->peers.empty()) {
    *error = "--peers is required";
    return false;
  }
  for (uint64_t peer : options->peers) {
    if (options->mode == "fira" && peer > 0xffff) {
      *error = "FiRa peers are 16-bit short addresses";
      return false;
    }
  }
  return true;
}

std::shared_ptr<uwb::IUwb> WaitForService(const std::string& instance, double wait_s) {
  const auto deadline = std::chrono::steady_clock::now() +
                        std::chrono::duration_cast<std::chrono::steady_clock::duration>(
                            std::chrono::duration<double>(wait_s));
  while (!g_interrupted) {
    ndk::SpAIBinder binder(AServiceManager_checkService(instance.c_str()));
    if (binder.get() != nullptr) return uwb::IUwb::fromBinder(binder);
    if (std::chrono::steady_clock::now() >= deadline) break;
    std::this_thread::sleep_for(kServicePoll);
  }
  return nullptr;
}

void PrintResult(const tools::PeerReading& reading) {
  if (!reading.measured) {
    printf("%s %s %llx: no measurement\n", reading.radio.c_str(), tools::ModeName(reading.mode),
           static_cast<unsigned long long>(reading.address));
  } else {
    printf("%s %s %llx: %.2f m, azimuth %.1f deg, elevation %.1f deg, los %d\n",
           reading.radio.c_str(), tools::ModeName(reading.mode),
           static_cast<unsigned long long>(reading.address), reading.distance_m,
           reading.azimuth_rad * kDegreesPerRadian, reading.elevation_rad * kDegreesPerRadian,
           reading.line_of_sight);
  }
  fflush(stdout);
}

int Run(const Options& options) {
  // Results come as binder calls into this process.
  ABinderProcess_startThreadPool();
  const std::string instance = std::string(uwb::IUwb::descriptor) + "/default";
  std::shared_ptr<uwb::IUwb> service = WaitForService(instance, options.wait_s);
  if (service == nullptr) {
    fprintf(stderr, "uwb-ranging-client: %s is not running\n", instance.c_str());
    return 1;
  }
  tools::RangingClient client(service);
  client.SetResultListener(PrintResult);
  std::string error;
  std::vector<std::string> radios;
  if (!client.Open(&error) || !client.ListRadios(&radios, &error)) {
    fprintf(stderr, "uwb-ranging-client: %s\n", error.c_str());
    return 1;
  }
  printf("radios:");
  for (const std::string& radio : radios) printf(" %s", radio.c_str());
  printf("\n");
  const std::string radio = options.radio.empty() && !radios.empty() ? radios[0] : options.radio;
  bool started;
  if (options.mode == "fira") {
    tools::FiraOptions fira;
    fira.channel = options.channel;
    fira.block_duration_ms = options.block_ms;
    for (uint64_t peer : options.peers) fira.controlees.push_back(static_cast<uint16_t>(peer));
    started = client.StartFira(radio, fira, &error);
  } else {
    tools::SimpleRangingOptions simple;
    simple.channel = options.channel;
    for (uint64_t peer : options.peers) simple.peers.push_back(static_cast<int64_t>(peer));
    started = client.StartSimpleRanging(radio, simple, &error);
  }
  if (!started) {
    fprintf(stderr, "uwb-ranging-client: %s\n", error.c_str());
    return 1;
  }
  const auto start = std::chrono::steady_clock::now();
  while (!g_interrupted) {
    const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - start;
    if (options.duration_s > 0 && elapsed.count() >= options.duration_s) break;
    std::this_thread::sleep_for(kServicePoll);
  }
  if (!client.Stop(&error)) {
    fprintf(stderr, "uwb-ranging-client: %s\n", error.c_str());
    return 1;
  }
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  Options options;
  std::string error;
  if (argc == 2 && (std::string(argv[1]) == "--help" || std::string(argv[1]) == "-h")) {
    printf("%s", kUsage);
    return 0;
  }
  if (!ParseOptions(argc, argv, &options, &error)) {
    fprintf(stderr, "uwb-ranging-client: %s\n%s", error.c_str(), kUsage);
    return 64;
  }
  struct sigaction action = {};
  action.sa_handler = OnSignal;
  sigaction(SIGINT, &action, nullptr);
  sigaction(SIGTERM, &action, nullptr);
  return Run(options);
}
