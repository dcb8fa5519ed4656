#pragma once

// Owning C++ wrappers around the binder C objects of the host emulation,
// with the platform's names and member functions, and none beyond those
// that both supported platform releases offer: no release() (ownership of
// a binder object never leaves its wrapper), promote() callable on a
// mutable weak reference only.

#include <android/binder_ibinder.h>
#include <android/binder_status.h>

#include <cstddef>

#include <string>
#include <utility>

namespace ndk {
namespace impl {

// Move-only owner of one C resource, released with |Destroy| unless it is
// |kDefault|.
template <typename T, void (*Destroy)(T), T kDefault>
class ScopedAResource {
 public:
  explicit ScopedAResource(T resource = kDefault) : resource_(resource) {}
  ~ScopedAResource() { set(kDefault); }

  ScopedAResource(const ScopedAResource&) = delete;
  ScopedAResource& operator=(const ScopedAResource&) = delete;
  ScopedAResource(ScopedAResource&& other) noexcept
      : resource_(std::exchange(other.resource_, kDefault)) {}
  ScopedAResource& operator=(ScopedAResource&& other) noexcept {
    if (this != &other) set(std::exchange(other.resource_, kDefault));
    return *this;
  }

  // Takes ownership of |resource|, releasing what was held before.
  void set(T resource) {
    T old = resource_;
    resource_ = resource;
    if (old != kDefault) Destroy(old);
  }
  T get() const { return resource_; }
  // Out-parameter access for C calls that fill the resource in.
  T* getR() { return &resource_; }

 private:
  T resource_;
};

}  // namespace impl

// Strong reference to a binder. Copies share the binder; thread-safe as the
// binder's reference count is.
class SpAIBinder {
 public:
  SpAIBinder() = default;
  SpAIBinder(std::nullptr_t) {}  // NOLINT: converts like a pointer.
  // Adopts a reference that the caller already holds.
  explicit SpAIBinder(AIBinder* binder) : binder_(binder) {}
  SpAIBinder(const SpAIBinder& other) : binder_(other.binder_) {
    if (binder_ != nullptr) AIBinder_incStrong(binder_);
  }
  SpAIBinder(SpAIBinder&& other) noexcept : binder_(std::exchange(other.binder_, nullptr)) {}
  ~SpAIBinder() { set(nullptr); }

  SpAIBinder& operator=(const SpAIBinder& other) {
    if (other.binder_ != nullptr) AIBinder_incStrong(other.binder_);
    set(other.binder_);
    return *this;
  }
  SpAIBinder& operator=(SpAIBinder&& other) noexcept {
    if (this != &other) set(std::exchange(other.binder_, nullptr));
    return *this;
  }

  // Adopts |binder|, dropping the reference held before.
  void set(AIBinder* binder) {
    AIBinder* old = binder_;
    binder_ = binder;
    if (old != nullptr) AIBinder_decStrong(old);
  }
  AIBinder* get() const { return binder_; }
  AIBinder** getR() { return &binder_; }

  bool operator==(const SpAIBinder& other) const { return binder_ == other.binder_; }
  bool operator!=(const SpAIBinder& other) const { return binder_ != other.binder_; }
  bool operator<(const SpAIBinder& other) const { return binder_ < other.binder_; }

 private:
  AIBinder* binder_ = nullptr;
};

class [[nodiscard]] ScopedAIBinder_Weak
    : public impl::ScopedAResource<AIBinder_Weak*, AIBinder_Weak_delete, nullptr> {
 public:
  explicit ScopedAIBinder_Weak(AIBinder_Weak* weak = nullptr) : ScopedAResource(weak) {}
  ScopedAIBinder_Weak(ScopedAIBinder_Weak&&) = default;
  ScopedAIBinder_Weak& operator=(ScopedAIBinder_Weak&&) = default;

  // Null once the binder's last strong reference is gone.
  SpAIBinder promote() { return SpAIBinder(AIBinder_Weak_promote(get())); }
};

class [[nodiscard]] ScopedAIBinder_DeathRecipient
    : public impl::ScopedAResource<AIBinder_DeathRecipient*, AIBinder_DeathRecipient_delete,
                                   nullptr> {
 public:
  explicit ScopedAIBinder_DeathRecipient(AIBinder_DeathRecipient* recipient = nullptr)
      : ScopedAResource(recipient) {}
  ScopedAIBinder_DeathRecipient(ScopedAIBinder_DeathRecipient&&) = default;
  ScopedAIBinder_DeathRecipient& operator=(ScopedAIBinder_DeathRecipient&&) = default;
};

// The status that every interface operation returns; dropping one unread
// is a warning, as on the platform. An empty object (as left by a move) is
// not OK, and reading any other part of it aborts.
class [[nodiscard]] ScopedAStatus : public impl::ScopedAResource<AStatus*, AStatus_delete, nullptr> {
 public:
  explicit ScopedAStatus(AStatus* status = nullptr) : ScopedAResource(status) {}
  ScopedAStatus(ScopedAStatus&&) = default;
  ScopedAStatus& operator=(ScopedAStatus&&) = default;

  bool isOk() const { return get() != nullptr && AStatus_isOk(get()); }
  binder_exception_t getExceptionCode() const { return AStatus_getExceptionCode(get()); }
  int32_t getServiceSpecificError() const { return AStatus_getServiceSpecificError(get()); }
  binder_status_t getStatus() const { return AStatus_getStatus(get()); }
  const char* getMessage() const { return AStatus_getMessage(get()); }
  std::string getDescription() const {
    const char* description = AStatus_getDescription(get());
    std::string text(description);
    AStatus_deleteDescription(description);
    return text;
  }

  static ScopedAStatus ok() { return ScopedAStatus(AStatus_newOk()); }
  static ScopedAStatus fromExceptionCode(binder_exception_t exception) {
    return ScopedAStatus(AStatus_fromExceptionCode(exception));
  }
  static ScopedAStatus fromExceptionCodeWithMessage(binder_exception_t exception,
                                                    const char* message) {
    return ScopedAStatus(AStatus_fromExceptionCodeWithMessage(exception, message));
  }
  static ScopedAStatus fromServiceSpecificError(int32_t service_specific) {
    return ScopedAStatus(AStatus_fromServiceSpecificError(service_specific));
  }
  static ScopedAStatus fromServiceSpecificErrorWithMessage(int32_t service_specific,
                                                           const char* message) {
    return ScopedAStatus(
        AStatus_fromServiceSpecificErrorWithMessage(service_specific, message));
  }
  static ScopedAStatus fromStatus(binder_status_t status) {
    return ScopedAStatus(AStatus_fromStatus(status));
  }
};

}  // namespace ndk
