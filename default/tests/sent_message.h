#pragma once

#include <stdint.h>
#include <string.h>

#include <string>
#include <vector>

#include <netlink/attr.h>
#include <netlink/genl/genl.h>
#include <netlink/msg.h>

namespace hardware {
namespace dalix {

// A copy of a generic netlink request as a driver client built it, taken
// inside a mocked exchange so that it outlives the client's own message.
// Attribute views point into the copy.
class SentMessage {
 public:
  explicit SentMessage(nl_msg* msg) {
    const nlmsghdr* header = nlmsg_hdr(msg);
    const auto* begin = reinterpret_cast<const uint8_t*>(header);
    bytes_.assign(begin, begin + header->nlmsg_len);
  }

  nlmsghdr* header() { return reinterpret_cast<nlmsghdr*>(bytes_.data()); }
  uint8_t cmd() { return genlmsg_hdr(header())->cmd; }

  // Top-level attributes in the order they were put.
  std::vector<nlattr*> Attrs() {
    std::vector<nlattr*> attrs;
    nlattr* attr;
    int remaining;
    nlmsg_for_each_attr(attr, header(), GENL_HDRLEN, remaining) attrs.push_back(attr);
    return attrs;
  }

  static std::vector<nlattr*> Children(nlattr* nest) {
    std::vector<nlattr*> children;
    nlattr* attr;
    int remaining;
    nla_for_each_nested(attr, nest, remaining) children.push_back(attr);
    return children;
  }

  // The payload as bytes, for comparisons with expected values.
  static std::vector<uint8_t> Payload(nlattr* attr) {
    const auto* data = static_cast<const uint8_t*>(nla_data(attr));
    return std::vector<uint8_t>(data, data + nla_len(attr));
  }

  template <typename T>
  static std::vector<uint8_t> Bytes(T value) {
    std::vector<uint8_t> bytes(sizeof(value));
    memcpy(bytes.data(), &value, sizeof(value));
    return bytes;
  }

  // A string attribute with its terminating NUL, as libnl puts it.
  static std::vector<uint8_t> StringBytes(const std::string& text) {
    return std::vector<uint8_t>(text.c_str(), text.c_str() + text.size() + 1);
  }

 private:
  std::vector<uint8_t> bytes_;
};

}  // namespace dalix
}  // namespace hardware
