// Hardware discovery against a hostile driver: the NEW_HW dump, the
// single-radio query and ParseHwInfo behind both, through the real response
// exchange.
#include <cstddef>
#include <cstdint>

#include "fuzz/scripted_driver.h"
#include "net/mcps_utils.h"

using hardware::dalix::McpsUtils;
using hardware::dalix::fuzz::ScriptedDriver;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static ScriptedDriver driver;
  driver.Load(data, size);
  McpsUtils mcps(driver.factory());
  bool ok = false;
  mcps.ListHardware(&ok);
  mcps.GetHardwareInfo(0, &ok);
  return 0;
}
