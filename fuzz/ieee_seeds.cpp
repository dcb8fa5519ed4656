#include <string>

#include "fuzz/seed_recorder.h"
#include "net/ieee_utils.h"

using hardware::dalix::IeeeUtils;
using hardware::dalix::PhyInfo;
using hardware::dalix::fuzz::SeedRecorder;
using hardware::dalix::sim::WpanDeviceConfig;

// An interface dump and a phy description, with the usual and a broken
// device among them.
bool WriteSeeds(SeedRecorder& recorder) {
  IeeeUtils ieee(recorder.factory());
  if (!ieee.Setup()) return false;
  std::string error;
  WpanDeviceConfig first{"wpan0", 0};
  first.pages = {{0, {1, 2}}, {4, {1, 5, 9}}};
  WpanDeviceConfig nameless{"wpan1", 1};
  nameless.dump_without_name = true;
  if (!recorder.devices().AddDevice(first, &error) ||
      !recorder.devices().AddDevice(nameless, &error)) {
    fprintf(stderr, "ieee seeds: %s\n", error.c_str());
    return false;
  }
  auto exchanges = [&ieee](const char* iface) {
    return [&ieee, iface]() {
      bool ok = false;
      ieee.ListDevices(&ok);
      PhyInfo info;
      ieee.GetPhyInfo(iface, &info);
    };
  };
  return recorder.Write("two_devices", recorder.Record(exchanges("wpan0"))) &&
         recorder.Write("unknown_interface", recorder.Record(exchanges("lo")));
}
