#pragma once

// Process-wide binder settings and the polled command interface of the host
// binder emulation, under the platform header's names.

#include <stdbool.h>
#include <stdint.h>

#include <android/binder_status.h>

#ifdef __cplusplus
extern "C" {
#endif

// Recorded only: the emulation never starts binder threads.
bool ABinderProcess_setThreadPoolMaxThreadCount(uint32_t num_threads);

// Does nothing: a client process of the emulation receives its callbacks
// on the service thread, so there are no threads to start.
void ABinderProcess_startThreadPool(void);

// The two polling calls are declared weak, as the platform declares them
// for vendor code: the vendor link stub of libbinder_ndk does not carry
// them, so a vendor program links without them and must check that they
// resolved (their addresses are not null) before it calls either.

// Gives the descriptor (an eventfd) that turns readable while commands wait
// for ABinderProcess_handlePolledCommands. The calling thread becomes the
// service thread: proxy calls made on it run directly.
__attribute__((weak)) binder_status_t ABinderProcess_setupPolling(int* fd);

// Runs the calls and death notifications queued so far, on the calling
// thread, and returns STATUS_OK.
__attribute__((weak)) binder_status_t ABinderProcess_handlePolledCommands(void);

#ifdef __cplusplus
}  // extern "C"
#endif
