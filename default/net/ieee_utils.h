#pragma once

// IeeeUtils: client of the kernel's "nl802154" family. Lists the 802.15.4
// interfaces, reads a phy's UWB channels and sets an interface's PAN id,
// channel and short address. Runs on the service thread; each request blocks
// it until the kernel answers, on a socket of its own.

#include <stdint.h>

#include <string>
#include <vector>

#include <netlink/msg.h>

#include "net/nl_socket_factory.h"

namespace hardware {
namespace dalix {

// One IEEE 802.15.4 network interface and the phy it belongs to.
struct DevInfo {
  std::string name;
  uint32_t phy_index = 0;
};

// One phy and the UWB channels it supports, in the kernel's order.
struct PhyInfo {
  uint32_t phy_index = 0;
  std::vector<int> channels;
};

class IeeeUtils {
 public:
  explicit IeeeUtils(NlSocketFactory* factory) : factory_(factory) {}
  virtual ~IeeeUtils() = default;
  IeeeUtils(const IeeeUtils&) = delete;
  IeeeUtils& operator=(const IeeeUtils&) = delete;

  // Resolves the family; called once before any request.
  virtual bool Setup();
  // Every interface that the kernel lists with a name and a phy. |ok| tells
  // whether the exchange succeeded; what was gathered is returned either way.
  virtual std::vector<DevInfo> ListDevices(bool* ok);
  virtual bool SetPanId(const char* iface, uint16_t pan_id);
  // Adds the phy's page-4 channels to |info|, which is not cleared first.
  virtual bool GetPhyInfo(const char* iface, PhyInfo* info);
  virtual bool SetChannel(const char* iface, int channel);
  virtual bool SetShortMacAddress(const char* iface, const std::vector<uint8_t>& address);

  // Writes the generic netlink header and the interface index of |iface|.
  bool SetIeeeCommand(nl_msg* msg, const char* iface, uint8_t cmd, int flags);

 private:
  NlSocketFactory* factory_;
  int family_id_ = 0;
};

}  // namespace dalix
}  // namespace hardware
