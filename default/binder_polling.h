#pragma once

namespace hardware {
namespace dalix {

// Whether this process can serve binder from its own event loop: true when
// both ABinderProcess_setupPolling and ABinderProcess_handlePolledCommands
// resolved. Vendor code links against a libbinder_ndk stub that lacks both
// (they are declared weak for it), so on a device whose library does not
// export them their addresses stay null and calling either would crash.
// Start-up checks this before it sets binder up. Any thread.
bool BinderPollingAvailable();

}  // namespace dalix
}  // namespace hardware
