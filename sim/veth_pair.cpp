#define LOG_TAG "dalix.sim.VethPair"

#include "sim/veth_pair.h"

#include <net/if.h>

#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <linux/veth.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/socket.h>

#include <android-base/logging.h>
#include <android-base/unique_fd.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <netlink/netlink.h>

#include "net/unique_nl_msg.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

struct SocketDeleter {
  void operator()(nl_sock* sock) const { nl_socket_free(sock); }
};
using UniqueNlSock = std::unique_ptr<nl_sock, SocketDeleter>;

// Sends one rtnetlink request and waits for the kernel's verdict: 0, or a
// negative libnl error.
int RouteRequest(nl_msg* msg) {
  UniqueNlSock sock(nl_socket_alloc());
  if (!sock) return -NLE_NOMEM;
  int result = nl_connect(sock.get(), NETLINK_ROUTE);
  if (result < 0) return result;
  result = nl_send_auto(sock.get(), msg);
  if (result < 0) return result;
  return nl_wait_for_ack(sock.get());
}

void PutHeader(nl_msg* msg, uint16_t type, int flags, int ifindex) {
  nlmsg_put(msg, NL_AUTO_PORT, NL_AUTO_SEQ, type, 0, flags);
  ifinfomsg info = {};
  info.ifi_family = AF_UNSPEC;
  info.ifi_index = ifindex;
  nlmsg_append(msg, &info, sizeof(info), NLMSG_ALIGNTO);
}

}  // namespace

std::unique_ptr<VethPair> VethPair::Create(const std::string& name, std::string* error) {
  if (name.empty() || name.size() >= IFNAMSIZ) {
    *error = "invalid interface name '" + name + "'";
    return nullptr;
  }
  UniqueNlMsg msg;
  PutHeader(msg.get(), RTM_NEWLINK, NLM_F_REQUEST | NLM_F_CREATE | NLM_F_EXCL | NLM_F_ACK, 0);
  bool built = nla_put_string(msg.get(), IFLA_IFNAME, name.c_str()) == 0;
  nlattr* link_info = nla_nest_start(msg.get(), IFLA_LINKINFO);
  built = built && link_info != nullptr && nla_put_string(msg.get(), IFLA_INFO_KIND, "veth") == 0;
  nlattr* data = built ? nla_nest_start(msg.get(), IFLA_INFO_DATA) : nullptr;
  nlattr* peer = data ? nla_nest_start(msg.get(), VETH_INFO_PEER) : nullptr;
  if (peer != nullptr) {
    // The peer is described by an ifinfomsg of its own; without a name the
    // kernel picks a free "vethN".
    ifinfomsg peer_info = {};
    peer_info.ifi_family = AF_UNSPEC;
    built = nlmsg_append(msg.get(), &peer_info, sizeof(peer_info), NLMSG_ALIGNTO) == 0;
    nla_nest_end(msg.get(), peer);
    nla_nest_end(msg.get(), data);
    nla_nest_end(msg.get(), link_info);
  } else {
    built = false;
  }
  if (!built) {
    *error = "cannot build the veth request";
    return nullptr;
  }
  const int result = RouteRequest(msg.get());
  if (result < 0) {
    *error = "cannot create veth " + name + ": " + nl_geterror(result);
    return nullptr;
  }
  const unsigned int ifindex = if_nametoindex(name.c_str());
  if (ifindex == 0) {
    *error = "veth " + name + " vanished: " + strerror(errno);
    return nullptr;
  }
  return std::unique_ptr<VethPair>(new VethPair(name, ifindex));
}

VethPair::~VethPair() {
  // Removing one end removes its peer too.
  UniqueNlMsg msg;
  PutHeader(msg.get(), RTM_DELLINK, NLM_F_REQUEST | NLM_F_ACK, static_cast<int>(ifindex_));
  const int result = RouteRequest(msg.get());
  if (result < 0) LOG(WARNING) << "Cannot remove veth " << name_ << ": " << nl_geterror(result);
}

bool VethPair::IsUp() const {
  android::base::unique_fd sock(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (sock.get() < 0) return false;
  ifreq ifr = {};
  memcpy(ifr.ifr_name, name_.c_str(), name_.size() + 1);
  if (ioctl(sock.get(), SIOCGIFFLAGS, &ifr) != 0) return false;
  return (ifr.ifr_flags & IFF_UP) != 0;
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
