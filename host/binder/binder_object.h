#pragma once

#include <atomic>
#include <memory>

#include <android/binder_ibinder.h>
#include <android/binder_interface_utils.h>

// One binder of the emulation: a local object and the counts that keep it.
// Strong references keep |object|; weak references (which all strong ones
// hold together as one) keep the memory, so that a weak reference can still
// ask whether the binder may be promoted.
struct AIBinder {
  AIBinder(const char* descriptor_in, std::shared_ptr<ndk::ICInterface> object_in)
      : descriptor(descriptor_in), object(std::move(object_in)) {}

  std::atomic<int32_t> strong{1};
  std::atomic<int32_t> weak{1};
  const char* const descriptor;
  // Set while |strong| is above zero, released with the last strong reference.
  std::shared_ptr<ndk::ICInterface> object;
  std::atomic<bool> alive{true};
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
