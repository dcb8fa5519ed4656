#pragma once

#include <cstdint>
#include <functional>

#include <netlink/msg.h>

#include "sim/family_handler.h"
#include "net/unique_nl_msg.h"

namespace hardware {
namespace dalix {
namespace sim {

// Collects and sends the answer to one request on the simulator's thread:
// replies go out at once, in order, to the sender's port; the closing
// acknowledgement, error or NLMSG_DONE is left to the simulator, which asks
// Refused()/error() once the family has returned.
class Responder {
 public:
  // |send| puts one finished netlink message on the wire to the request's
  // port; replies carry the family's |version|.
  Responder(const Request& request, uint8_t version,
            std::function<bool(const nlmsghdr*)> send);
  Responder(const Responder&) = delete;
  Responder& operator=(const Responder&) = delete;

  // A reply to the request: the request's family, sequence and port, the
  // family's version, flagged NLM_F_MULTI when the request is a dump.
  UniqueNlMsg NewReply(uint8_t cmd) const;
  // Sends |reply| now. False when the client's socket could not take it
  // (closed, or full: sends never block). Ignored after Refuse().
  bool Reply(nl_msg* reply);
  // Answers with an error instead of an acknowledgement. |error| is an errno,
  // either sign.
  void Refuse(int error);

  bool Refused() const { return error_ != 0; }
  // The negative errno given to Refuse(), 0 if none.
  int error() const { return error_; }
  int replies_sent() const { return replies_sent_; }

 private:
  const Request& request_;
  const uint8_t version_;
  std::function<bool(const nlmsghdr*)> send_;
  int error_;
  int replies_sent_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
