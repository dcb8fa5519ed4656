#pragma once

#include <cstdint>

namespace hardware {
namespace dalix {
namespace sim {

// A misbehaviour the simulator applies to the requests of one family, or of
// one of its commands, until it is cleared or its count runs out. Plain data,
// handed to DriverSimulator::SetFault() from any thread.
struct Fault {
  enum class Kind {
    kNone,
    // The request is swallowed: no reply, no acknowledgement, no error. The
    // client gives up after its receive timeout.
    kNoAnswer,
    // The request is refused with |error| (a positive errno) before the
    // family sees it.
    kError,
    // A reply carrying |other_command| is sent first; then the family answers
    // as usual.
    kOtherCommandFirst,
    // Only an acknowledgement comes back (even without NLM_F_ACK); the family
    // does not see the request.
    kAckOnly,
    // Instead of the family's answer, one reply of the request's command that
    // is cut short inside its generic netlink header (so it carries no
    // command a client can trust), then the usual acknowledgement or
    // NLMSG_DONE.
    kMalformed,
  };

  Kind kind = Kind::kNone;
  int error = 0;
  uint8_t other_command = 0;
  // How many requests it affects before it clears itself; negative: all of them.
  int count = -1;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
