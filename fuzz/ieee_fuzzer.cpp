// The nl802154 interface dump and the phy description against a hostile
// kernel, through the real response exchange.
#include <cstddef>
#include <cstdint>

#include "fuzz/scripted_driver.h"
#include "net/ieee_utils.h"

using hardware::dalix::IeeeUtils;
using hardware::dalix::PhyInfo;
using hardware::dalix::fuzz::ScriptedDriver;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static ScriptedDriver driver;
  driver.Load(data, size);
  IeeeUtils ieee(driver.factory());
  bool ok = false;
  ieee.ListDevices(&ok);
  // Any interface of the process's namespace does: the request only needs
  // its index, and the answer comes from the script.
  PhyInfo info;
  ieee.GetPhyInfo("lo", &info);
  return 0;
}
