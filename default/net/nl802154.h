#pragma once

// Wire format of the kernel's IEEE 802.15.4 generic netlink family
// "nl802154": the commands and attributes that the service sends or reads,
// and the receive policies that both the service and the simulated driver
// parse with. The numbers are the kernel's and must not change.

#include <net/if.h>
#include <stdint.h>

#include <array>

#include <netlink/attr.h>

namespace hardware {
namespace dalix {

inline constexpr char kNl802154FamilyName[] = "nl802154";

enum Nl802154Command : uint8_t {
  NL802154_CMD_GET_WPAN_PHY = 1,
  // The kernel's answer to NL802154_CMD_GET_WPAN_PHY.
  NL802154_CMD_NEW_WPAN_PHY = 3,
  NL802154_CMD_GET_INTERFACE = 5,
  // One message per interface in the answer to NL802154_CMD_GET_INTERFACE.
  NL802154_CMD_NEW_INTERFACE = 7,
  NL802154_CMD_SET_CHANNEL = 9,
  NL802154_CMD_SET_PAN_ID = 10,
  NL802154_CMD_SET_SHORT_ADDR = 11,
};

enum Nl802154Attribute : int {
  NL802154_ATTR_WPAN_PHY = 1,         // u32
  NL802154_ATTR_IFINDEX = 3,          // u32, first attribute of every request
  NL802154_ATTR_IFNAME = 4,           // NUL-terminated string
  NL802154_ATTR_PAGE = 7,             // u8
  NL802154_ATTR_CHANNEL = 8,          // u8
  NL802154_ATTR_PAN_ID = 9,           // u16, host byte order
  NL802154_ATTR_SHORT_ADDR = 10,      // u16, host byte order
  NL802154_ATTR_WPAN_PHY_CAPS = 24,   // nested, NL802154_CAP_ATTR_*
  NL802154_ATTR_MAX = 29,
};

// Inside NL802154_ATTR_WPAN_PHY_CAPS. NL802154_CAP_ATTR_CHANNELS holds one
// nest per channel page, typed by the page number; inside a page every
// element is typed by a channel number that the phy supports.
enum Nl802154CapabilityAttribute : int {
  NL802154_CAP_ATTR_CHANNELS = 2,
  NL802154_CAP_ATTR_MAX = 15,
};

// The channel page of the UWB PHY; only this page's channels are UWB
// channels, and the service always selects it.
inline constexpr uint8_t kNl802154UwbPage = 4;
// Highest channel number that a page can carry in the kernel's encoding.
inline constexpr int kNl802154MaxChannel = 15;

using Nl802154Policy = std::array<nla_policy, NL802154_ATTR_MAX + 1>;
using Nl802154CapabilityPolicy = std::array<nla_policy, NL802154_CAP_ATTR_MAX + 1>;

// Top-level attributes, for replies read by the service and requests read by
// the simulated driver. Typed entries keep a short attribute from being read
// past its end; undeclared ids stay unconstrained.
inline const Nl802154Policy& Nl802154AttributePolicy() {
  static const Nl802154Policy policy = [] {
    Nl802154Policy p{};
    // Integers are read with nla_get_* at exactly their width.
    auto integer = [&p](int attr, uint16_t type, uint16_t width) {
      p[attr].type = type;
      p[attr].minlen = width;
      p[attr].maxlen = width;
    };
    integer(NL802154_ATTR_WPAN_PHY, NLA_U32, sizeof(uint32_t));
    integer(NL802154_ATTR_IFINDEX, NLA_U32, sizeof(uint32_t));
    p[NL802154_ATTR_IFNAME].type = NLA_STRING;
    p[NL802154_ATTR_IFNAME].maxlen = IFNAMSIZ;
    integer(NL802154_ATTR_PAGE, NLA_U8, sizeof(uint8_t));
    integer(NL802154_ATTR_CHANNEL, NLA_U8, sizeof(uint8_t));
    integer(NL802154_ATTR_PAN_ID, NLA_U16, sizeof(uint16_t));
    integer(NL802154_ATTR_SHORT_ADDR, NLA_U16, sizeof(uint16_t));
    p[NL802154_ATTR_WPAN_PHY_CAPS].type = NLA_NESTED;
    return p;
  }();
  return policy;
}

inline const Nl802154CapabilityPolicy& Nl802154CapabilityAttributePolicy() {
  static const Nl802154CapabilityPolicy policy = [] {
    Nl802154CapabilityPolicy p{};
    // No minimum length: a phy without any channel sends an empty list, which
    // reads as one without UWB channels rather than as a broken reply.
    p[NL802154_CAP_ATTR_CHANNELS].type = NLA_NESTED;
    return p;
  }();
  return policy;
}

}  // namespace dalix
}  // namespace hardware
