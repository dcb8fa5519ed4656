#pragma once

#include <cstdint>

#include <linux/netlink.h>
#include <netlink/msg.h>

namespace hardware {
namespace dalix {
namespace sim {

class Responder;

// One generic netlink request as the simulator received it. Valid only for
// the duration of FamilyHandler::HandleRequest().
struct Request {
  // The sender's netlink port: where replies go, and where the events of
  // whatever the request starts are to be sent.
  uint32_t port = 0;
  uint32_t seq = 0;
  // nlmsg_flags as sent: NLM_F_REQUEST, NLM_F_ACK, NLM_F_DUMP...
  uint16_t flags = 0;
  int family_id = 0;
  uint8_t cmd = 0;
  uint8_t version = 0;
  // The whole request, to be parsed as the kernel would:
  //   genlmsg_parse(nlmsg_hdr(request.msg), 0, attrs, kMaxAttr, kPolicy)
  nl_msg* msg = nullptr;

  bool IsDump() const { return (flags & NLM_F_DUMP) == NLM_F_DUMP; }
};

// The behaviour of one generic netlink family inside the simulator. Register
// an instance with DriverSimulator::RegisterFamily(); it is then called on the
// simulator's thread, once per request, in the order the requests arrive.
//
// A handler answers through |responder|:
//   - nothing:               the request succeeds; an acknowledgement follows
//                            when the client asked for one (NLM_F_ACK).
//   - responder.Reply(...):  one or more replies, each its own datagram, then
//                            the acknowledgement if asked for. For a dump
//                            (request.IsDump()) every reply is flagged
//                            NLM_F_MULTI, replies are packed into datagrams
//                            as the kernel packs them, and NLMSG_DONE
//                            follows, never an ack.
//   - responder.Refuse(e):   an NLMSG_ERROR carrying -e and the echoed
//                            request header; no acknowledgement after it.
// Replies are built with responder.NewReply(cmd), which puts the generic
// netlink header exactly as the service's builders do (genlmsg_put); add
// attributes with the usual nla_put_* calls.
//
// Unsolicited messages (sequence 0) are built with DriverSimulator::NewEvent()
// and sent with DriverSimulator::SendEvent(port, msg), from the handler or
// from a task the handler scheduled with DriverSimulator::Post().
//
// A complete family:
//
//   class EchoFamily : public FamilyHandler {
//    public:
//     void HandleRequest(const Request& request, Responder& responder) override {
//       nlattr* attrs[kEchoAttrMax + 1];
//       if (genlmsg_parse(nlmsg_hdr(request.msg), 0, attrs, kEchoAttrMax,
//                         kEchoPolicy) < 0) {
//         responder.Refuse(EINVAL);
//         return;
//       }
//       if (request.cmd != kEchoCmdPing || !attrs[kEchoAttrValue]) {
//         responder.Refuse(EOPNOTSUPP);
//         return;
//       }
//       UniqueNlMsg reply = responder.NewReply(kEchoCmdPong);
//       nla_put_u32(reply.get(), kEchoAttrValue, nla_get_u32(attrs[kEchoAttrValue]));
//       responder.Reply(reply.get());
//     }
//   };
//
//   EchoFamily echo;             // declared before the simulator, so it
//   DriverSimulator simulator;   // outlives the simulator's thread
//   int id = simulator.RegisterFamily("echo", &echo);
//   simulator.Start();
//   SimNlSocketFactory factory(&event_loop, simulator.port());
//   // ... the service's own code, given |factory|, now resolves "echo" and
//   // talks to EchoFamily.
//
// Handlers need no locking of their own as long as only the simulator thread
// touches their state; a test that wants to change it while the simulator
// runs does so with DriverSimulator::Post(). Misbehaviour (no answer, an
// error, a stray reply, a malformed reply, a vanished family) is switched on
// from outside with DriverSimulator::SetFault() and friends, so families only
// implement the good path and their own argument checks; anything no builder
// can make goes out with DriverSimulator::SendRaw().
//
// Every program that runs a simulator calls EnterPrivateNamespace() before
// its first thread; test programs get that from the shared test main.
class FamilyHandler {
 public:
  virtual ~FamilyHandler() = default;

  virtual void HandleRequest(const Request& request, Responder& responder) = 0;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
