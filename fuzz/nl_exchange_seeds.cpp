#include "fuzz/seed_recorder.h"
#include "net/mcps_utils.h"

using hardware::dalix::McpsScheduler;
using hardware::dalix::McpsUtils;
using hardware::dalix::fuzz::SeedRecorder;

// The answers of the four exchanges the target makes: a reply, an
// acknowledgement, a reply, an acknowledgement; then the same refused.
bool WriteSeeds(SeedRecorder& recorder) {
  McpsUtils mcps(recorder.factory());
  if (!mcps.Start()) return false;
  recorder.radios().AddRadio(0, 0);
  auto exchanges = [&mcps]() {
    bool ok = false;
    mcps.GetHardwareInfo(0, &ok);
    mcps.SetScheduler(0, McpsScheduler::kDefault, McpsUtils::kNoSlotDuration,
                      McpsUtils::kNoNodeType, false);
    mcps.GetHardwareInfo(0, &ok);
    mcps.SetFiraRegion(0);
  };
  bool written = recorder.Write("answered", recorder.Record(exchanges));
  recorder.radios().RemoveRadio(0);
  written &= recorder.Write("refused", recorder.Record(exchanges));
  return written;
}
