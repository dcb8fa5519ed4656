#pragma once

namespace hardware {
namespace dalix {
namespace sim {

// Moves the calling process into a user and network namespace of its own,
// mapped to root inside, so that the simulator's fixed netlink port and any
// interfaces it creates are private to the process. Must run before the
// process starts its second thread (the kernel refuses a new user namespace
// to a threaded process). False, with one log line saying why, when the
// machine does not allow it.
bool EnterPrivateNamespace();

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
