// Time and message count of a whole calibration transfer, from the service's
// McpsUtils to the simulated driver over real netlink sockets.

#include <cstdio>
#include <string>

#include <android-base/logging.h>
#include <benchmark/benchmark.h>

#include "net/config_utils.h"
#include "net/mcps802154.h"
#include "net/mcps_utils.h"
#include "sim/driver_simulator.h"
#include "sim/mcps_family.h"
#include "sim/private_namespace.h"
#include "sim/radio_store.h"
#include "sim/sim_nl_socket_factory.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

constexpr uint32_t kHw = 0;

void BM_CalibrationTransfer(benchmark::State& state) {
  RadioStore radios;
  McpsFamily family(&radios);
  DriverSimulator simulator;
  simulator.RegisterFamily(kMcpsFamilyName, &family);
  if (!simulator.Start()) {
    state.SkipWithError("the simulator did not start");
    return;
  }
  SimNlSocketFactory factory(nullptr, simulator.port());
  McpsUtils mcps(&factory);
  if (!mcps.Start()) {
    state.SkipWithError("mcps802154 did not resolve");
    return;
  }
  radios.AddRadio(kHw, 0u);
  ConfigUtils store;
  const int keys = static_cast<int>(state.range(0));
  for (int i = 0; i < keys; ++i) {
    char key[24];
    std::snprintf(key, sizeof(key), "ant%d.cal%04d", i % 4, i);
    radios.AddCalibrationKey(key);
    store.Set(key, std::to_string(i * 7).c_str());
  }

  for (auto _ : state) {
    if (!mcps.SetCalibration(kHw, &store)) {
      state.SkipWithError("the transfer failed");
      return;
    }
  }
  std::optional<SimRadio> radio = radios.Radio(kHw);
  if (!radio || static_cast<int>(radio->calibration.size()) != keys) {
    state.SkipWithError("keys were lost");
    return;
  }
  state.counters["messages"] = benchmark::Counter(
      static_cast<double>(radio->calibration_messages) / static_cast<double>(state.iterations()));
  state.counters["keys"] = keys;
  state.SetItemsProcessed(state.iterations() * keys);
}
BENCHMARK(BM_CalibrationTransfer)->Arg(1000)->Unit(benchmark::kMicrosecond);

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware

int main(int argc, char** argv) {
  // The namespace must come before any thread; the benchmark's own output
  // matters here, not the per-message log lines.
  if (!hardware::dalix::sim::EnterPrivateNamespace()) return 1;
  android::base::SetMinimumLogSeverity(android::base::ERROR);
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  benchmark::RunSpecifiedBenchmarks();
  benchmark::Shutdown();
  return 0;
}
