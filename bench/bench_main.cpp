// The entry point of the benchmark programs that run the driver simulator.

#include <android-base/logging.h>
#include <benchmark/benchmark.h>

#include "sim/private_namespace.h"

int main(int argc, char** argv) {
  // The namespace must come before any thread.
  if (!hardware::dalix::sim::EnterPrivateNamespace()) return 1;
  // The service logs every exchange; the lines are formatted as usual and
  // then dropped, so that the terminal is not part of the measurement.
  android::base::SetLogger([](android::base::LogId, android::base::LogSeverity, const char*,
                              const char*, unsigned int, const char*) {});
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  benchmark::RunSpecifiedBenchmarks();
  benchmark::Shutdown();
  return 0;
}
