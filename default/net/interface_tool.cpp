#define LOG_TAG "dalix.uwb.InterfaceTool"

#include "net/interface_tool.h"

// glibc's <net/if.h> must come before the kernel headers that would
// define struct ifreq a second time.
#include <net/if.h>

#include <errno.h>
#include <linux/ethtool.h>
#include <linux/if_arp.h>
#include <linux/sockios.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/socket.h>

#include <string>

#include <android-base/logging.h>
#include <android-base/unique_fd.h>

namespace hardware {
namespace dalix {
namespace {

// Logs |what| followed by the text of the current errno in parentheses, and
// leaves errno as it found it for the caller.
void LogSystemError(const std::string& what) {
  const int saved_errno = errno;
  LOG(ERROR) << what << " (" << strerror(saved_errno) << ")";
  errno = saved_errno;
}

android::base::unique_fd OpenControlSocket() {
  return android::base::unique_fd(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
}

// ETHTOOL_GPERMADDR request: the header, then room for one extended address.
constexpr size_t kPermanentAddressRequestSize =
    sizeof(ethtool_perm_addr) + sizeof(InterfaceTool::MacAddress);

}  // namespace

int InterfaceTool::Ioctl(int fd, unsigned long request, ifreq* ifr) {
  return ioctl(fd, request, ifr);
}

int InterfaceTool::IoctlRetryingEintr(int fd, unsigned long request, ifreq* ifr) {
  int result;
  do {
    result = Ioctl(fd, request, ifr);
  } while (result < 0 && errno == EINTR);
  return result;
}

bool InterfaceTool::GetIfState(const char* iface, int fd, ifreq* ifr) {
  memset(ifr, 0, sizeof(*ifr));
  if (strlen(iface) >= sizeof(ifr->ifr_name)) {
    LOG(ERROR) << "Interface name is too long: " << iface;
    return false;
  }
  strncpy(ifr->ifr_name, iface, sizeof(ifr->ifr_name) - 1);
  if (IoctlRetryingEintr(fd, SIOCGIFFLAGS, ifr) != 0) {
    LogSystemError(std::string("Could not read interface state for ") + iface);
    return false;
  }
  return true;
}

bool InterfaceTool::GetUpState(const char* iface) {
  android::base::unique_fd sock = OpenControlSocket();
  if (sock.get() < 0) {
    // Same text as SetUpState on purpose: operators search for one line.
    LogSystemError("Failed to open socket to set up/down state");
    return false;
  }
  ifreq ifr;
  if (!GetIfState(iface, sock.get(), &ifr)) return false;
  return (ifr.ifr_flags & IFF_UP) != 0;
}

bool InterfaceTool::SetUpState(const char* iface, bool up) {
  android::base::unique_fd sock = OpenControlSocket();
  if (sock.get() < 0) {
    LogSystemError("Failed to open socket to set up/down state");
    return false;
  }
  ifreq ifr;
  if (!GetIfState(iface, sock.get(), &ifr)) return false;
  const bool is_up = (ifr.ifr_flags & IFF_UP) != 0;
  if (is_up == up) return true;
  if (up) {
    ifr.ifr_flags |= IFF_UP;
  } else {
    ifr.ifr_flags &= ~IFF_UP;
  }
  if (IoctlRetryingEintr(sock.get(), SIOCSIFFLAGS, &ifr) != 0) {
    LogSystemError(std::string("Could not set interface flags for ") + iface);
    return false;
  }
  return true;
}

bool InterfaceTool::SetMacAddress(const char* iface, const MacAddress& mac) {
  android::base::unique_fd sock = OpenControlSocket();
  if (sock.get() < 0) {
    LogSystemError("Failed to open socket to set MAC address");
    return false;
  }
  ifreq ifr;
  if (!GetIfState(iface, sock.get(), &ifr)) return false;
  static_assert(sizeof(ifr.ifr_hwaddr.sa_data) >= sizeof(MacAddress),
                "an extended address must fit the hardware address field");
  memset(&ifr.ifr_hwaddr, 0, sizeof(ifr.ifr_hwaddr));
  ifr.ifr_hwaddr.sa_family = ARPHRD_IEEE802154;
  // The driver takes the address in the order the caller gives it.
  memcpy(ifr.ifr_hwaddr.sa_data, mac.data(), mac.size());
  if (IoctlRetryingEintr(sock.get(), SIOCSIFHWADDR, &ifr) != 0) {
    LogSystemError(std::string("Could not set interface MAC address for ") + iface);
    return false;
  }
  return true;
}

InterfaceTool::MacAddress InterfaceTool::GetFactoryMacAddress(const char* iface) {
  MacAddress mac{};
  android::base::unique_fd sock = OpenControlSocket();
  if (sock.get() < 0) {
    LogSystemError("Failed to open socket to get factory MAC address");
    return mac;
  }
  ifreq ifr;
  if (!GetIfState(iface, sock.get(), &ifr)) return mac;
  // The request lives on the stack: the kernel is done with it once the
  // ioctl returns, so nothing needs to outlive the call.
  alignas(ethtool_perm_addr) unsigned char block[kPermanentAddressRequestSize] = {};
  auto* request = reinterpret_cast<ethtool_perm_addr*>(block);
  request->cmd = ETHTOOL_GPERMADDR;
  request->size = sizeof(MacAddress);
  ifr.ifr_data = reinterpret_cast<char*>(block);
  if (IoctlRetryingEintr(sock.get(), SIOCETHTOOL, &ifr) != 0) {
    LogSystemError(std::string("Could not get factory address MAC for ") + iface);
    return mac;
  }
  // A device whose addresses are not extended addresses reports another size.
  if (request->size != sizeof(MacAddress)) return mac;
  memcpy(mac.data(), block + sizeof(ethtool_perm_addr), mac.size());
  return mac;
}

}  // namespace dalix
}  // namespace hardware
