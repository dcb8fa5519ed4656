#pragma once

#include <array>

struct ifreq;

namespace hardware {
namespace dalix {

// Brings a radio's network interface up and down and reads or writes its
// 8-byte IEEE 802.15.4 extended address, through ioctls on a control socket
// opened per call. Runs on the service thread; keeps no state between calls.
class InterfaceTool {
 public:
  using MacAddress = std::array<unsigned char, 8>;

  InterfaceTool() = default;
  virtual ~InterfaceTool() = default;
  InterfaceTool(const InterfaceTool&) = delete;
  InterfaceTool& operator=(const InterfaceTool&) = delete;

  virtual bool GetUpState(const char* iface);
  virtual bool SetUpState(const char* iface, bool up);
  virtual bool SetMacAddress(const char* iface, const MacAddress& mac);
  // All zero when the address cannot be read.
  virtual MacAddress GetFactoryMacAddress(const char* iface);

 protected:
  // The one place where the kernel is asked; a test subclass wraps it to
  // watch or interrupt the requests. Returns ioctl()'s result and errno.
  virtual int Ioctl(int fd, unsigned long request, ifreq* ifr);

 private:
  // Fills |ifr| with the name and the current flags of |iface|.
  bool GetIfState(const char* iface, int fd, ifreq* ifr);
  // Ioctl() repeated for as long as it is interrupted.
  int IoctlRetryingEintr(int fd, unsigned long request, ifreq* ifr);
};

}  // namespace dalix
}  // namespace hardware
