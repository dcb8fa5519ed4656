#include "fuzz/seed_recorder.h"
#include "net/mcps_utils.h"

using hardware::dalix::McpsUtils;
using hardware::dalix::fuzz::SeedRecorder;

// A dump of several radios and a single query, in the driver's usual and
// unusual shapes.
bool WriteSeeds(SeedRecorder& recorder) {
  McpsUtils mcps(recorder.factory());
  if (!mcps.Start()) return false;
  auto list_then_get = [&mcps]() {
    bool ok = false;
    mcps.ListHardware(&ok);
    mcps.GetHardwareInfo(0, &ok);
  };
  recorder.radios().AddRadio(0, 0);
  recorder.radios().AddRadio(1, 12);
  bool written = recorder.Write("two_radios", recorder.Record(list_then_get));
  recorder.radios().AddRadio(1, std::nullopt);
  recorder.radios().AddRadio(2, "wpan-phy7");
  recorder.radios().SetReportsScheduler(0, false);
  written &= recorder.Write("odd_radios", recorder.Record(list_then_get));
  recorder.radios().RemoveRadio(0);
  written &= recorder.Write("unknown_index", recorder.Record(list_then_get));
  return written;
}
