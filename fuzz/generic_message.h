#pragma once

// Structure-aware framing for the fuzz targets of mcps802154 parsers: the
// first input byte is the generic netlink command, the rest the attribute
// stream, so that mutations reach the attribute parsers instead of dying at
// the headers. Seeds are written in the same form.

#include <stddef.h>
#include <stdint.h>

#include <string>

#include <netlink/genl/genl.h>
#include <netlink/msg.h>

#include "net/unique_nl_msg.h"

namespace hardware {
namespace dalix {
namespace fuzz {

// The family id the messages are framed with: the parsers under test read
// the command and the attributes only.
constexpr int kMessageFamily = 0x1a;

// Puts |data| into the empty |msg| as libnl would deliver it: nlmsg_len
// covers exactly the headers and the attribute stream. False when there is
// no command byte or the input is larger than a page.
inline bool FrameGenericMessage(const uint8_t* data, size_t size, UniqueNlMsg* msg) {
  if (size == 0 || size > 4096) return false;
  if (genlmsg_put(msg->get(), 0, 0, kMessageFamily, 0, 0, data[0], 0) == nullptr) return false;
  return size == 1 || nlmsg_append(msg->get(), const_cast<uint8_t*>(data + 1), size - 1, 1) == 0;
}

// The seed form of an encoded message: its command, then its attributes.
inline std::string SeedOf(nl_msg* msg) {
  genlmsghdr* genl = genlmsg_hdr(nlmsg_hdr(msg));
  const auto* attrs = reinterpret_cast<const char*>(genlmsg_attrdata(genl, 0));
  return std::string(1, static_cast<char>(genl->cmd)) +
         std::string(attrs, genlmsg_attrlen(genl, 0));
}

}  // namespace fuzz
}  // namespace dalix
}  // namespace hardware
