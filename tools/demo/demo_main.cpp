// The host demo: the whole service, through its real start-up path, against
// the simulated driver, with a client ranging moving peers.
#define LOG_TAG "dalix.demo"

#include <math.h>
#include <signal.h>
#include <stdio.h>
#include <unistd.h>

#include <chrono>
#include <deque>
#include <fstream>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/IUwb.h>
#include <android-base/logging.h>
#include <android/binder_manager.h>

#include "service_main.h"
#include "uwb.h"
#include "sim/private_namespace.h"
#include "sim/service_thread.h"
#include "tools/demo/demo_options.h"
#include "tools/demo/demo_site.h"
#include "tools/demo/screen.h"
#include "tools/demo/track_plot.h"
#include "tools/ranging_client.h"
#include "tools/service_dump.h"

namespace hardware {
namespace dalix {
namespace demo {
namespace {

namespace uwb = aidl::aidl::hardware::dalix::uwb;
using Clock = std::chrono::steady_clock;

constexpr auto kRefresh = std::chrono::milliseconds(200);
constexpr int kMapColumns = 61;
constexpr int kMapLines = 17;
constexpr size_t kLogLinesShown = 4;
constexpr double kDegreesPerRadian = 180.0 / M_PI;

volatile sig_atomic_t g_interrupted = 0;

void OnSignal(int) { g_interrupted = 1; }

void Say(const DemoOptions& options, const std::string& line) {
  if (!options.quiet) printf("%s\n", line.c_str());
  fflush(stdout);
}

// Keeps the service's warnings for the screen instead of letting them tear
// it; with --verbose every line goes to stderr as usual.
class LogTail {
 public:
  void Add(android::base::LogSeverity severity, const char* tag, const char* message) {
    if (severity < android::base::WARNING) return;
    std::lock_guard<std::mutex> lock(mutex_);
    lines_.push_back(std::string(tag != nullptr ? tag : "") + ": " + message);
    if (lines_.size() > kLogLinesShown) lines_.pop_front();
  }
  void Clear() {
    std::lock_guard<std::mutex> lock(mutex_);
    lines_.clear();
  }
  std::deque<std::string> Lines() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return lines_;
  }

 private:
  mutable std::mutex mutex_;
  std::deque<std::string> lines_;
};

// Every result, with the truth at the moment it arrived: the CSV, the plot
// and the summary are made from it.
class Recorder {
 public:
  Recorder(const DemoSite* site, Clock::time_point start) : site_(site), start_(start) {}

  bool OpenCsv(const std::string& path) {
    csv_.open(path);
    csv_ << "time_s,radio,mode,address,measured,distance_m,azimuth_deg,elevation_deg,"
            "line_of_sight,true_distance_m,true_azimuth_deg,true_elevation_deg,"
            "true_line_of_sight\n";
    return static_cast<bool>(csv_);
  }

  void Add(const tools::PeerReading& reading) {
    const double time_s = std::chrono::duration<double>(Clock::now() - start_).count();
    const std::optional<Truth> truth = site_->TruthOf(reading);
    const std::optional<Point> measured =
        reading.measured ? site_->MeasuredPosition(reading) : std::nullopt;
    std::lock_guard<std::mutex> lock(mutex_);
    const char mark = site_->MarkOf(reading);
    Stats& stats = stats_[{mark, reading.radio}];
    stats.mode = reading.mode;
    ++stats.results;
    double error = NAN;
    if (reading.measured && truth) {
      error = reading.distance_m - truth->distance_m;
      ++stats.measured;
      stats.sum_abs_error += fabs(error);
      stats.max_abs_error = std::max(stats.max_abs_error, fabs(error));
    }
    if (truth) plot_.Add(mark, time_s, measured, truth->position, error);
    if (csv_.is_open()) {
      char line[512];
      snprintf(line, sizeof(line), "%.3f,%s,%s,%llx,%d,%.3f,%.2f,%.2f,%d,%.3f,%.2f,%.2f,%d\n",
               time_s, reading.radio.c_str(), tools::ModeName(reading.mode),
               static_cast<unsigned long long>(reading.address), reading.measured ? 1 : 0,
               reading.measured ? reading.distance_m : NAN,
               reading.measured ? reading.azimuth_rad * kDegreesPerRadian : NAN,
               reading.measured ? reading.elevation_rad * kDegreesPerRadian : NAN,
               reading.line_of_sight, truth ? truth->distance_m : NAN,
               truth ? truth->azimuth_rad * kDegreesPerRadian : NAN,
               truth ? truth->elevation_rad * kDegreesPerRadian : NAN,
               truth ? (truth->line_of_sight ? 1 : 0) : -1);
      csv_ << line;
    }
  }

  // One line per peer and radio; false when a peer was never measured or
  // erred beyond |bound|.
  bool Summary(int peers, std::string* text) {
    std::lock_guard<std::mutex> lock(mutex_);
    bool ok = true;
    std::map<std::string, int> peers_per_radio;
    for (const auto& [key, stats] : stats_) {
      char line[200];
      const double mean = stats.measured > 0 ? stats.sum_abs_error / stats.measured : NAN;
      snprintf(line, sizeof(line),
               "peer %c on %s (%s): %d results, %d measured, mean |error| %.3f m, max %.3f m\n",
               key.first, key.second.c_str(), tools::ModeName(stats.mode), stats.results,
               stats.measured, mean, stats.max_abs_error);
      *text += line;
      if (stats.measured > 0) ++peers_per_radio[key.second];
      if (stats.measured == 0 || stats.max_abs_error > site_->ErrorBound(stats.mode)) {
        snprintf(line, sizeof(line), "  peer %c on %s: off by more than %.2f m\n", key.first,
                 key.second.c_str(), site_->ErrorBound(stats.mode));
        *text += line;
        ok = false;
      }
    }
    for (const char* radio : {DemoSite::kFiraRadio, DemoSite::kSimpleRangingRadio}) {
      if (peers_per_radio[radio] != peers) {
        *text += std::string("not every peer was measured on ") + radio + "\n";
        ok = false;
      }
    }
    return ok;
  }

  bool WritePlot(const std::string& path, std::string* error) {
    std::lock_guard<std::mutex> lock(mutex_);
    return plot_.Write(path, error);
  }

 private:
  struct Stats {
    tools::RangingMode mode = tools::RangingMode::kFira;
    int results = 0;
    int measured = 0;
    double sum_abs_error = 0;
    double max_abs_error = 0;
  };

  const DemoSite* const site_;
  const Clock::time_point start_;
  std::mutex mutex_;
  std::ofstream csv_;
  TrackPlot plot_;
  std::map<std::pair<char, std::string>, Stats> stats_;
};

std::string Screen(const DemoSite& site, const tools::RangingClient& client, const LogTail& log,
                   double elapsed_s) {
  std::vector<PeerRow> rows;
  for (const tools::PeerReading& reading : client.Readings()) {
    PeerRow row;
    row.reading = reading;
    row.mark = site.MarkOf(reading);
    row.truth = site.TruthOf(reading);
    if (reading.measured) row.measured = site.MeasuredPosition(reading);
    rows.push_back(row);
  }
  char header[160];
  snprintf(header, sizeof(header),
           "UWB HAL demo: FiRa on %s, simple ranging on %s, %.0f s (Ctrl-C to stop)\n\n",
           DemoSite::kFiraRadio, DemoSite::kSimpleRangingRadio, elapsed_s);
  std::string text = header + RenderTable(rows) + "\n" +
                     RenderMap(rows, site.RadioPositions(), site.MapCentre(), site.HalfWidth(), kMapColumns,
                               kMapLines);
  for (const std::string& line : log.Lines()) text += line + "\n";
  return text;
}

int Run(const DemoOptions& options) {
  const bool live = !options.quiet && isatty(STDOUT_FILENO);
  Say(options, "namespace: entering a private user and network namespace for the simulated driver");
  if (!sim::EnterPrivateNamespace()) {
    fprintf(stderr, "demo: this machine does not allow user namespaces; the demo cannot run\n");
    return 1;
  }

  static LogTail log_tail;
  if (!options.verbose) {
    android::base::SetLogger([](android::base::LogId, android::base::LogSeverity severity,
                                const char* tag, const char*, unsigned int,
                                const char* message) { log_tail.Add(severity, tag, message); });
  }

  DemoSite site(options.peers, options.seed);
  Say(options, "driver: simulated driver with radios " + std::string(DemoSite::kFiraRadio) +
                   " and " + DemoSite::kSimpleRangingRadio + ", " +
                   std::to_string(options.peers) + " moving peers, seed " +
                   std::to_string(options.seed));
  std::string error;
  if (!site.Start(&error)) {
    fprintf(stderr, "demo: cannot start the simulated driver: %s\n", error.c_str());
    return 1;
  }

  Say(options, "service: starting the UWB HAL service on its own thread");
  sim::ServiceThread service(site.driver().port(), &site.driver().devices());
  service.Start();

  Say(options, "client: opening " + ServiceInstanceName() + " and starting FiRa on " +
                   DemoSite::kFiraRadio + " and simple ranging on " +
                   DemoSite::kSimpleRangingRadio);
  std::shared_ptr<uwb::IUwb> uwb = uwb::IUwb::fromBinder(
      ndk::SpAIBinder(AServiceManager_checkService(ServiceInstanceName().c_str())));
  if (uwb == nullptr) {
    fprintf(stderr, "demo: the service is not registered\n");
    return 1;
  }

  const Clock::time_point start = Clock::now();
  Recorder recorder(&site, start);
  if (!options.csv_path.empty() && !recorder.OpenCsv(options.csv_path)) {
    fprintf(stderr, "demo: cannot write %s\n", options.csv_path.c_str());
    return 1;
  }
  int status = 0;
  {
    tools::RangingClient client(uwb);
    client.SetResultListener([&recorder](const tools::PeerReading& r) { recorder.Add(r); });
    std::vector<std::string> radios;
    tools::FiraOptions fira;
    fira.block_duration_ms = DemoSite::kFiraBlockMs;
    fira.controlees = site.ShortAddresses();
    tools::SimpleRangingOptions simple;
    simple.peers = site.ExtendedAddresses();
    if (!client.Open(&error) || !client.ListRadios(&radios, &error)) {
      fprintf(stderr, "demo: %s\n", error.c_str());
      status = 1;
    }
    // A workstation has no vendor partition: the service says so at open,
    // and the demo says it once instead of showing those lines.
    if (access(Uwb::kCalibrationFile, R_OK) != 0 || access(Uwb::kHalPropertiesFile, R_OK) != 0) {
      Say(options, std::string("service: no ") + Uwb::kCalibrationFile + " or " +
                       Uwb::kHalPropertiesFile +
                       " here: the radios run uncalibrated, with default antenna properties");
    }
    log_tail.Clear();
    // One mode failing still shows the other.
    if (status == 0 && !client.StartFira(DemoSite::kFiraRadio, fira, &error)) {
      fprintf(stderr, "demo: FiRa on %s: %s\n", DemoSite::kFiraRadio, error.c_str());
      error.clear();
    }
    if (status == 0 &&
        !client.StartSimpleRanging(DemoSite::kSimpleRangingRadio, simple, &error)) {
      fprintf(stderr, "demo: simple ranging on %s: %s\n", DemoSite::kSimpleRangingRadio,
              error.c_str());
      error.clear();
    }

    struct sigaction action = {};
    action.sa_handler = OnSignal;
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
    if (live) printf("\x1b[2J");
    while (status == 0 && !g_interrupted) {
      const double elapsed = std::chrono::duration<double>(Clock::now() - start).count();
      if (options.duration_s > 0 && elapsed >= options.duration_s) break;
      if (live) {
        printf("\x1b[H\x1b[J%s", Screen(site, client, log_tail, elapsed).c_str());
        fflush(stdout);
      }
      std::this_thread::sleep_for(kRefresh);
    }
    if (!live && !options.quiet && status == 0) {
      const double elapsed = std::chrono::duration<double>(Clock::now() - start).count();
      printf("%s", Screen(site, client, log_tail, elapsed).c_str());
    }
    if (options.dump) printf("%s", tools::DumpService(uwb->asBinder().get()).c_str());
    Say(options, "client: stopping the sessions and closing the service");
    if (!client.Stop(&error)) {
      fprintf(stderr, "demo: %s\n", error.c_str());
      status = 1;
    }
  }
  Say(options, "service: stopping");
  uwb.reset();
  service.Stop();

  std::string summary;
  const bool accurate = recorder.Summary(options.peers, &summary);
  printf("%s", summary.c_str());
  if (!options.plot_path.empty()) {
    if (!recorder.WritePlot(options.plot_path, &error)) {
      fprintf(stderr, "demo: %s\n", error.c_str());
      status = 1;
    } else {
      Say(options, "plot: " + options.plot_path);
    }
  }
  if (status == 0 && !accurate) status = 2;
  return status;
}

}  // namespace
}  // namespace demo
}  // namespace dalix
}  // namespace hardware

int main(int argc, char** argv) {
  using hardware::dalix::demo::DemoOptions;
  DemoOptions options;
  bool help = false;
  std::string error;
  if (!hardware::dalix::demo::ParseDemoOptions(argc, argv, &options, &help, &error)) {
    fprintf(stderr, "%s: %s\n%s", argv[0], error.c_str(),
            hardware::dalix::demo::DemoUsage(argv[0]).c_str());
    return 64;
  }
  if (help) {
    printf("%s", hardware::dalix::demo::DemoUsage(argv[0]).c_str());
    return 0;
  }
  return hardware::dalix::demo::Run(options);
}
