// What the platform's binder headers refuse, one case per DALIX_CASE value
// (cmake/compile_fail.cmake); case 0 is the same code done right.
#include <memory>
#include <type_traits>
#include <utility>

#include <android/binder_auto_utils.h>
#include <android/binder_manager.h>
#include <binder_host/host.h>

namespace {

class IThing : public ndk::ICInterface {};
class Thing : public ndk::BnCInterface<IThing> {
#if DALIX_CASE == 1
  ndk::SpAIBinder asBinder() override { return nullptr; }
#elif DALIX_CASE == 2
  bool isRemote() override { return true; }
#endif
  ndk::SpAIBinder createBinder() override {
    return ndk::host::NewLocalBinder("test.IThing", ref<ndk::ICInterface>());
  }
};
void OnDied(void*) {}

#ifdef FIRST_CALL_TRANSACTION
#error FIRST_CALL_TRANSACTION must be an enumerator
#endif
static_assert(std::is_enum_v<decltype(FIRST_CALL_TRANSACTION)>);

}  // namespace

int main() {
  std::shared_ptr<Thing> thing = ndk::SharedRefBase::make<Thing>();
  ndk::SpAIBinder binder = thing->asBinder();
  ndk::ScopedAStatus status = ndk::ScopedAStatus::ok();
  ndk::ScopedAIBinder_Weak weak(AIBinder_Weak_new(binder.get()));
  ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(OnDied));
#if DALIX_CASE == 3
  delete new Thing();
#elif DALIX_CASE == 4
  std::make_unique<Thing>();
#elif DALIX_CASE == 5
  std::as_const(*thing).ref<Thing>();
#elif DALIX_CASE == 6
  AIBinder_decStrong(binder.release());
#elif DALIX_CASE == 7
  AStatus_delete(status.release());
#elif DALIX_CASE == 8
  AIBinder_Weak_delete(weak.release());
#elif DALIX_CASE == 9
  AIBinder_DeathRecipient_delete(recipient.release());
#elif DALIX_CASE == 10
  std::as_const(weak).promote();
#elif DALIX_CASE == 11
  return EX_HAS_REPLY_HEADER;
#elif DALIX_CASE == 12
  AServiceManager_addService(binder.get(), "test.IThing/default");
#elif DALIX_CASE == 13
  AServiceManager_checkService("test.IThing/default");
#elif DALIX_CASE == 14
  AServiceManager_getService("test.IThing/default");
#elif DALIX_CASE == 15
  AIBinder_DeathRecipient_new(OnDied);
#elif DALIX_CASE == 16
  AIBinder_Weak_new(binder.get());
#elif DALIX_CASE == 17
  AIBinder_Weak_promote(weak.get());
#elif DALIX_CASE == 18
  AStatus_fromStatus(STATUS_DEAD_OBJECT);
#elif DALIX_CASE == 19
  ndk::ScopedAStatus::fromExceptionCode(EX_ILLEGAL_STATE);
#else
  (void)AServiceManager_addService(binder.get(), "test.IThing/default");  // dropped on purpose
  (void)ndk::ScopedAStatus::fromExceptionCode(EX_ILLEGAL_STATE);
  ndk::SpAIBinder promoted = weak.promote();
#endif
  return status.isOk() ? 0 : 1;
}
