#define LOG_TAG "libbinder_ndk"

#include <android/binder_ibinder.h>

#include <stdlib.h>

#include <android-base/logging.h>

#include <binder_host/host.h>

#include "binder_object.h"
#include "binder_process.h"

// A weak reference: it keeps the binder's memory, not its object.
struct AIBinder_Weak {
  AIBinder* binder;
};

namespace ndk {
namespace internal {

void AbortNotMade(const char* what) {
  LOG(FATAL) << "SharedRefBase: an object not created by SharedRefBase::make() was " << what;
  abort();
}

}  // namespace internal

namespace host {
namespace internal {

void IncWeak(AIBinder* binder) { binder->weak.fetch_add(1, std::memory_order_relaxed); }

void DecWeak(AIBinder* binder) {
  if (binder->weak.fetch_sub(1, std::memory_order_acq_rel) == 1) delete binder;
}

bool TryIncStrong(AIBinder* binder) {
  int32_t count = binder->strong.load(std::memory_order_relaxed);
  while (count > 0) {
    if (binder->strong.compare_exchange_weak(count, count + 1, std::memory_order_acq_rel)) {
      return true;
    }
  }
  return false;
}

}  // namespace internal

SpAIBinder NewLocalBinder(const char* descriptor, std::shared_ptr<ICInterface> object) {
  return SpAIBinder(new AIBinder(descriptor, std::move(object)));
}

SpAIBinder ReviveLocalBinder(AIBinder_Weak* weak_binder, std::shared_ptr<ICInterface> object) {
  if (weak_binder == nullptr || object == nullptr) return nullptr;
  AIBinder* binder = weak_binder->binder;
  std::lock_guard<std::mutex> lock(binder->object_mutex);
  if (binder->strong.load(std::memory_order_acquire) > 0) {
    // Another thread revived it first.
    binder->strong.fetch_add(1, std::memory_order_relaxed);
    return SpAIBinder(binder);
  }
  if (binder->object == nullptr) {
    binder->object = std::move(object);
    internal::IncWeak(binder);
  }
  // Else a releasing thread has not taken the object yet; it will find the
  // count above zero and leave both the object and the weak reference.
  binder->strong.store(1, std::memory_order_release);
  return SpAIBinder(binder);
}

const char* GetDescriptor(const AIBinder* binder) {
  return binder != nullptr ? binder->descriptor : nullptr;
}

std::shared_ptr<ICInterface> GetLocalObject(const AIBinder* binder) {
  return binder != nullptr ? binder->object : nullptr;
}

binder_status_t Transact(AIBinder* binder, const std::function<void()>& call) {
  return BinderProcess::Get().Transact(binder, call);
}

void KillBinder(AIBinder* binder) { BinderProcess::Get().Kill(binder); }

}  // namespace host
}  // namespace ndk

extern "C" {

void AIBinder_incStrong(AIBinder* binder) {
  if (binder != nullptr) binder->strong.fetch_add(1, std::memory_order_relaxed);
}

void AIBinder_decStrong(AIBinder* binder) {
  if (binder == nullptr) return;
  if (binder->strong.fetch_sub(1, std::memory_order_acq_rel) != 1) return;
  // Unless the object revived its binder meanwhile, the object is ours to
  // release, together with the weak reference that all strong ones held.
  std::shared_ptr<ndk::ICInterface> object;
  {
    std::lock_guard<std::mutex> lock(binder->object_mutex);
    if (binder->strong.load(std::memory_order_acquire) == 0) object = std::move(binder->object);
  }
  if (object == nullptr) return;
  // Released outside the lock: the object's destructor may drop further
  // references, to this binder's memory too.
  object.reset();
  ndk::host::internal::DecWeak(binder);
}

int32_t AIBinder_debugGetRefCount(AIBinder* binder) {
  return binder != nullptr ? binder->strong.load() : -1;
}

bool AIBinder_isRemote(const AIBinder* /*binder*/) { return false; }

bool AIBinder_isAlive(const AIBinder* binder) { return binder != nullptr && binder->alive; }

binder_status_t AIBinder_ping(AIBinder* binder) {
  if (binder == nullptr) return STATUS_UNEXPECTED_NULL;
  return binder->alive ? STATUS_OK : STATUS_DEAD_OBJECT;
}

binder_status_t AIBinder_dump(AIBinder* binder, int fd, const char** args, uint32_t num_args) {
  if (binder == nullptr) return STATUS_UNEXPECTED_NULL;
  binder_status_t dumped = STATUS_OK;
  // The caller's strong reference keeps the object while the call runs.
  const binder_status_t sent = BinderProcess::Get().Transact(binder, [&] {
    dumped = binder->object->dump(fd, args, num_args);
  });
  return sent != STATUS_OK ? sent : dumped;
}

AIBinder_Weak* AIBinder_Weak_new(AIBinder* binder) {
  if (binder == nullptr) return nullptr;
  ndk::host::internal::IncWeak(binder);
  return new AIBinder_Weak{binder};
}

void AIBinder_Weak_delete(AIBinder_Weak* weak_binder) {
  if (weak_binder == nullptr) return;
  ndk::host::internal::DecWeak(weak_binder->binder);
  delete weak_binder;
}

AIBinder* AIBinder_Weak_promote(AIBinder_Weak* weak_binder) {
  if (weak_binder == nullptr) return nullptr;
  return ndk::host::internal::TryIncStrong(weak_binder->binder) ? weak_binder->binder : nullptr;
}

}  // extern "C"
