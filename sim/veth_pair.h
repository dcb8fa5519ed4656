#pragma once

#include <stdint.h>

#include <memory>
#include <string>

namespace hardware {
namespace dalix {
namespace sim {

// A real veth pair in the process's network namespace, whose near end
// carries a simulated radio's interface name so that if_nametoindex() and the
// interface flags are the kernel's own. Removed on destruction. Any thread.
class VethPair {
 public:
  // Null, with the reason in |error|, when the kernel refuses the pair (name
  // taken or invalid, no CAP_NET_ADMIN in this namespace).
  static std::unique_ptr<VethPair> Create(const std::string& name, std::string* error);
  ~VethPair();
  VethPair(const VethPair&) = delete;
  VethPair& operator=(const VethPair&) = delete;

  const std::string& name() const { return name_; }
  uint32_t ifindex() const { return ifindex_; }
  // Whether IFF_UP is set on the near end.
  bool IsUp() const;

 private:
  VethPair(std::string name, uint32_t ifindex) : name_(std::move(name)), ifindex_(ifindex) {}

  const std::string name_;
  const uint32_t ifindex_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
