#pragma once

// Base classes of the generated interfaces of the host binder emulation,
// under the platform header's names: shared ownership, the interface base,
// and the local (Bn) and proxy (Bp) halves.

#include <android/binder_auto_utils.h>
#include <android/binder_ibinder.h>

#include <cstddef>
#include <memory>
#include <mutex>
#include <utility>

namespace ndk {

namespace internal {
// Aborts with a line that names what happened to an object that
// SharedRefBase::make() did not create.
[[noreturn]] void AbortNotMade(const char* what);
}  // namespace internal

// An object owned through std::shared_ptr that can hand out further owners
// of itself. The only way to create one is make(): `new`, std::make_unique
// and the like do not compile (operator new is private, as on the device),
// and an object that make() did not create -- on the stack, a member, or
// from std::make_shared -- aborts when it is destroyed or asked for ref(),
// where the device would own it twice.
class SharedRefBase {
 public:
  SharedRefBase() = default;
  virtual ~SharedRefBase() {
    if (!made_) internal::AbortNotMade("destroyed");
  }
  SharedRefBase(const SharedRefBase&) = delete;
  SharedRefBase& operator=(const SharedRefBase&) = delete;

  std::shared_ptr<SharedRefBase> ref() {
    if (!made_) internal::AbortNotMade("asked for ref()");
    return this_.lock();
  }
  template <typename CHILD>
  std::shared_ptr<CHILD> ref() {
    return std::static_pointer_cast<CHILD>(ref());
  }

  template <typename T, typename... Args>
  static std::shared_ptr<T> make(Args&&... args) {
    std::shared_ptr<T> object(new T(std::forward<Args>(args)...));
    object->SharedRefBase::this_ = object;
    object->SharedRefBase::made_ = true;
    return object;
  }

  static void operator delete(void* pointer) { ::operator delete(pointer); }

 private:
  static void* operator new(size_t size) { return ::operator new(size); }

  std::weak_ptr<SharedRefBase> this_;
  bool made_ = false;
};

class ICInterface;

namespace host {
// The binder that |weak_binder| names, back in service for |object| when its
// strong references had all gone; null when it cannot be. Used only by
// BnCInterface below.
SpAIBinder ReviveLocalBinder(AIBinder_Weak* weak_binder, std::shared_ptr<ICInterface> object);
}  // namespace host

// What every generated interface derives from.
class ICInterface : public SharedRefBase {
 public:
  // The binder that stands for this object; the same one for as long as
  // anybody holds it.
  virtual SpAIBinder asBinder() = 0;
  virtual bool isRemote() = 0;
  virtual binder_status_t dump(int /*fd*/, const char** /*args*/, uint32_t /*num_args*/) {
    return STATUS_OK;
  }
};

// The implementation side of interface INTERFACE. Its binder is created on
// first use, keeps the object alive while the binder is referenced, and stays
// the same binder for as long as the object lives.
template <typename INTERFACE>
class BnCInterface : public INTERFACE {
 public:
  SpAIBinder asBinder() final {
    std::lock_guard<std::mutex> lock(binder_mutex_);
    SpAIBinder binder = weak_binder_.promote();
    if (binder.get() == nullptr && weak_binder_.get() != nullptr) {
      binder = host::ReviveLocalBinder(weak_binder_.get(), this->template ref<ICInterface>());
    }
    if (binder.get() == nullptr) {
      binder = createBinder();
      weak_binder_.set(AIBinder_Weak_new(binder.get()));
    }
    return binder;
  }
  bool isRemote() final { return false; }

 protected:
  virtual SpAIBinder createBinder() = 0;

 private:
  std::mutex binder_mutex_;
  ScopedAIBinder_Weak weak_binder_;
};

// The proxy side of interface INTERFACE: holds the binder it calls through.
template <typename INTERFACE>
class BpCInterface : public INTERFACE {
 public:
  explicit BpCInterface(const SpAIBinder& binder) : binder_(binder) {}
  SpAIBinder asBinder() final { return binder_; }
  bool isRemote() final { return AIBinder_isRemote(binder_.get()); }

 private:
  SpAIBinder binder_;
};

}  // namespace ndk
