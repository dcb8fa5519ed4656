// What the platform's binder headers refuse, one case per DALIX_CASE value
// (see cmake/compile_fail.cmake); case 0 is the same code done right.
#include <memory>
#include <type_traits>

#include <android/binder_auto_utils.h>
#include <android/binder_ibinder.h>
#include <android/binder_interface_utils.h>
#include <android/binder_manager.h>
#include <android/binder_status.h>
#include <binder_host/host.h>

namespace {

class IThing : public ndk::ICInterface {};

class Thing : public ndk::BnCInterface<IThing> {
 public:
#if DALIX_CASE == 1
  ndk::SpAIBinder asBinder() override { return nullptr; }
#elif DALIX_CASE == 2
  bool isRemote() override { return true; }
#endif

 protected:
  ndk::SpAIBinder createBinder() override {
    return ndk::host::NewLocalBinder("test.IThing", ref<ndk::ICInterface>());
  }
};

void OnDied(void*) {}

// Transaction codes are enumerators, not macros.
#ifdef FIRST_CALL_TRANSACTION
#error FIRST_CALL_TRANSACTION must not be a macro
#endif
static_assert(std::is_enum_v<decltype(FIRST_CALL_TRANSACTION)>);

}  // namespace

int main() {
  std::shared_ptr<Thing> thing = ndk::SharedRefBase::make<Thing>();
  ndk::SpAIBinder binder = thing->asBinder();
  ndk::ScopedAStatus status = ndk::ScopedAStatus::ok();
  ndk::ScopedAIBinder_Weak weak(AIBinder_Weak_new(binder.get()));
  ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(OnDied));
  int code = FIRST_CALL_TRANSACTION;
#if DALIX_CASE == 3
  auto* raw = new Thing();
#elif DALIX_CASE == 4
  auto owned = std::make_unique<Thing>();
#elif DALIX_CASE == 5
  const Thing& fixed = *thing;
  auto again = fixed.ref<Thing>();
#elif DALIX_CASE == 6
  AIBinder* taken = binder.release();
#elif DALIX_CASE == 7
  AStatus* taken = status.release();
#elif DALIX_CASE == 8
  AIBinder_Weak* taken = weak.release();
#elif DALIX_CASE == 9
  AIBinder_DeathRecipient* taken = recipient.release();
#elif DALIX_CASE == 10
  const ndk::ScopedAIBinder_Weak& fixed = weak;
  ndk::SpAIBinder promoted = fixed.promote();
#elif DALIX_CASE == 11
  code = EX_HAS_REPLY_HEADER;
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
  // Each marked result may be dropped on purpose.
  (void)AServiceManager_addService(binder.get(), "test.IThing/default");
  ndk::SpAIBinder found(AServiceManager_checkService("test.IThing/default"));
  ndk::SpAIBinder promoted = weak.promote();
  (void)ndk::ScopedAStatus::fromExceptionCode(EX_ILLEGAL_STATE);
#endif
  return code == FIRST_CALL_TRANSACTION && status.isOk() ? 0 : 1;
}
