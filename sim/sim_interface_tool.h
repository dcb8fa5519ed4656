#pragma once

#include "net/interface_tool.h"
#include "sim/wpan_device_store.h"

namespace hardware {
namespace dalix {
namespace sim {

// The service's interface tool for the simulated driver. Flags go to the
// real veth behind each simulated interface, so up and down are the
// kernel's; what a veth cannot hold (the 8-byte extended address and the
// factory address) is kept in the WpanDeviceStore instead. Everything else,
// name checks, retries and log lines, is the production tool's. Runs on the
// service thread; the store is borrowed.
class SimInterfaceTool : public InterfaceTool {
 public:
  explicit SimInterfaceTool(WpanDeviceStore* devices) : devices_(devices) {}

 protected:
  int Ioctl(int fd, unsigned long request, ifreq* ifr) override;

 private:
  WpanDeviceStore* const devices_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
