#pragma once

#include <atomic>
#include <memory>
#include <mutex>

#include <android/binder_ibinder.h>
#include <android/binder_interface_utils.h>

// One binder of the emulation: a local object and the counts that keep it.
// Strong references keep |object|; weak references (which all strong ones
// hold together as one, while |object| is set) keep the memory, so that a
// weak reference can still ask whether the binder may be promoted. The
// object's own weak reference lets it take its binder back to life when the
// strong count went to zero, so that a living object keeps one binder, with
// its death state and links, for its whole life.
struct AIBinder {
  AIBinder(const char* descriptor_in, std::shared_ptr<ndk::ICInterface> object_in)
      : descriptor(descriptor_in), object(std::move(object_in)) {}

  std::atomic<int32_t> strong{1};
  std::atomic<int32_t> weak{1};
  const char* const descriptor;
  // Set while |strong| is above zero, released with the last strong reference.
  std::shared_ptr<ndk::ICInterface> object;
  std::atomic<bool> alive{true};
  // Serializes handing |object| over when the strong count passes zero.
  std::mutex object_mutex;
};

namespace ndk {
namespace host {
namespace internal {

void IncWeak(AIBinder* binder);
// May free |binder|.
void DecWeak(AIBinder* binder);
// Adds a strong reference unless the last one is already gone.
bool TryIncStrong(AIBinder* binder);

}  // namespace internal
}  // namespace host
}  // namespace ndk
