// The calibration transfer against a hostile driver: three messages' worth of
// keys, each message's reply read by the calibration reply handler.
#include <cstddef>
#include <cstdint>
#include <string>

#include "fuzz/scripted_driver.h"
#include "net/config_utils.h"
#include "net/mcps_utils.h"

using hardware::dalix::ConfigUtils;
using hardware::dalix::McpsUtils;
using hardware::dalix::fuzz::ScriptedDriver;

// The seed program sends the same keys.
ConfigUtils* CalibrationStore() {
  static ConfigUtils store;
  for (int i = 0; i < 300; ++i) {
    store.Set(("cal.key_" + std::to_string(i)).c_str(), std::to_string(i).c_str());
  }
  return &store;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static ScriptedDriver driver;
  static ConfigUtils* store = CalibrationStore();
  driver.Load(data, size);
  McpsUtils mcps(driver.factory());
  mcps.SetCalibration(0, store);
  return 0;
}
