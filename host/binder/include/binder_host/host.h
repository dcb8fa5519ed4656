#pragma once

// What the host binder emulation offers beyond the platform API: the hooks
// that the generated interface library uses in place of parcels, and the
// controls a test harness needs. Service code never includes this header.
//
// Where the emulation differs from a device on purpose:
// - Every binder lives in this process. A local object reached through
//   IX::fromBinder() still comes back as a proxy (BpX), as a client in
//   another process would get one, and its calls still run on the service
//   thread; on a device, fromBinder() of a local binder returns the object
//   itself and calls run on the caller's thread. Keeping the proxy is what
//   lets one test process play both the clients and the single-threaded
//   service, with every call crossing the same boundary checks
//   (ParcelCheck) and status rules as a real transaction.
// - Nothing is marshalled: values are handed over as C++ objects, after
//   ParcelCheck has measured what their parcel would hold.
// - A client "process" dies only when a harness calls KillBinder(); on a
//   device death comes from the kernel. The notifications that follow run
//   on the service thread as they do there.
// - AIBinder_isRemote() is always false, since nothing is remote.

#include <functional>
#include <memory>

#include <android/binder_ibinder.h>
#include <android/binder_interface_utils.h>
#include <android/binder_status.h>

namespace ndk {
namespace host {

// A new binder (one strong reference, adopted by the result) standing for
// the local |object|, which it keeps alive. |descriptor| names the
// interface and must outlive the binder (generated descriptors are static).
SpAIBinder NewLocalBinder(const char* descriptor, std::shared_ptr<ICInterface> object);

// The interface descriptor and the object of a binder made by
// NewLocalBinder; null for a null binder.
const char* GetDescriptor(const AIBinder* binder);
std::shared_ptr<ICInterface> GetLocalObject(const AIBinder* binder);

// Carries one call of a proxy to its object. On the service thread (the one
// that set up polling, or one inside ABinderProcess_handlePolledCommands)
// |call| runs at once; on any other thread it is queued, the polled
// descriptor turns readable, and the caller blocks until the service thread
// ran it. STATUS_OK once |call| ran; STATUS_DEAD_OBJECT when the binder is
// dead or the queue was reset before the call ran.
binder_status_t Transact(AIBinder* binder, const std::function<void()>& call);

// Harness: the process behind |binder| dies. The binder stops answering new
// calls (calls already queued still run), AIBinder_isAlive turns false, and
// each of its death links is queued for the service thread. Killing a dead
// binder does nothing. An object keeps one binder for its whole life, so
// a killed object stays dead: its later asBinder() calls return the same
// dead binder, as a proxy to a dead process would.
void KillBinder(AIBinder* binder);

// Harness: forgets registered services, fails queued calls with
// STATUS_DEAD_OBJECT, drops queued death notifications and the service
// thread, so that one test starts where the previous left nothing behind.
// The polled descriptor stays the same.
void ResetForTesting();

}  // namespace host
}  // namespace ndk
