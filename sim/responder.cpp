#include "sim/responder.h"

#include <cstdlib>

#include <netlink/genl/genl.h>

namespace hardware {
namespace dalix {
namespace sim {

Responder::Responder(const Request& request, uint8_t version,
                     std::function<bool(const nlmsghdr*)> send)
    : request_(request), version_(version), send_(std::move(send)), error_(0), replies_sent_(0) {}

UniqueNlMsg Responder::NewReply(uint8_t cmd) const {
  UniqueNlMsg reply;
  int flags = request_.IsDump() ? NLM_F_MULTI : 0;
  genlmsg_put(reply.get(), request_.port, request_.seq, request_.family_id, 0, flags, cmd,
              version_);
  return reply;
}

bool Responder::Reply(nl_msg* reply) {
  if (Refused()) return false;
  if (!send_(nlmsg_hdr(reply))) return false;
  ++replies_sent_;
  return true;
}

void Responder::Refuse(int error) { error_ = -std::abs(error); }

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
