#include "sim/sim_interface_tool.h"

// glibc's <net/if.h> must come before the kernel headers that would
// define struct ifreq a second time.
#include <net/if.h>

#include <errno.h>
#include <linux/ethtool.h>
#include <linux/if_arp.h>
#include <linux/sockios.h>
#include <string.h>

#include <optional>
#include <string>

namespace hardware {
namespace dalix {
namespace sim {
namespace {

int Fail(int error) {
  errno = error;
  return -1;
}

}  // namespace

int SimInterfaceTool::Ioctl(int fd, unsigned long request, ifreq* ifr) {
  const std::string name(ifr->ifr_name, strnlen(ifr->ifr_name, sizeof(ifr->ifr_name)));
  switch (request) {
    case SIOCSIFHWADDR: {
      // A veth takes only Ethernet addresses; an 802.15.4 device takes only
      // its own family.
      if (ifr->ifr_hwaddr.sa_family != ARPHRD_IEEE802154) return Fail(EINVAL);
      InterfaceTool::MacAddress address;
      memcpy(address.data(), ifr->ifr_hwaddr.sa_data, address.size());
      const int error = devices_->SetExtendedAddress(name, address);
      return error == 0 ? 0 : Fail(error);
    }
    case SIOCETHTOOL: {
      std::optional<WpanDevice> device = devices_->FindByName(name);
      if (!device) return Fail(ENODEV);
      auto* header = reinterpret_cast<ethtool_perm_addr*>(ifr->ifr_data);
      if (header->cmd != ETHTOOL_GPERMADDR) return Fail(EOPNOTSUPP);
      const InterfaceTool::MacAddress& factory = device->config.factory_address;
      // A buffer too small is refused; otherwise the real size is reported.
      if (header->size < factory.size()) return Fail(EINVAL);
      header->size = factory.size();
      memcpy(ifr->ifr_data + sizeof(ethtool_perm_addr), factory.data(), factory.size());
      return 0;
    }
    default:
      return InterfaceTool::Ioctl(fd, request, ifr);
  }
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
