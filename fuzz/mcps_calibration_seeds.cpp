#include <string>

#include "fuzz/seed_recorder.h"
#include "net/config_utils.h"
#include "net/mcps_utils.h"

using hardware::dalix::ConfigUtils;
using hardware::dalix::McpsUtils;
using hardware::dalix::fuzz::SeedRecorder;

// The same 300 keys as the target sends, against a driver that knows all of
// them, some of them, or the radio not at all.
bool WriteSeeds(SeedRecorder& recorder) {
  McpsUtils mcps(recorder.factory());
  if (!mcps.Start()) return false;
  ConfigUtils store;
  for (int i = 0; i < 300; ++i) {
    std::string key = "cal.key_" + std::to_string(i);
    store.Set(key.c_str(), std::to_string(i).c_str());
    if (i % 7 != 3) recorder.radios().AddCalibrationKey(key);
  }
  auto transfer = [&]() { mcps.SetCalibration(0, &store); };
  recorder.radios().AddRadio(0, 0);
  bool written = recorder.Write("some_refused", recorder.Record(transfer));
  for (int i = 3; i < 300; i += 7) recorder.radios().AddCalibrationKey("cal.key_" + std::to_string(i));
  written &= recorder.Write("all_accepted", recorder.Record(transfer));
  recorder.radios().RemoveRadio(0);
  written &= recorder.Write("no_radio", recorder.Record(transfer));
  return written;
}
