#pragma once

// Owning C++ wrappers around the binder C objects of the host emulation,
// with the platform's names and member functions.

#include <android/binder_status.h>

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
  ScopedAResource(ScopedAResource&& other) noexcept : resource_(other.release()) {}
  ScopedAResource& operator=(ScopedAResource&& other) noexcept {
    if (this != &other) set(other.release());
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
  T release() {
    T held = resource_;
    resource_ = kDefault;
    return held;
  }

 private:
  T resource_;
};

}  // namespace impl

// The status that every interface operation returns. An empty object (as
// left by a move) is not OK, and reads as a failed transaction carrying
// STATUS_UNEXPECTED_NULL.
class ScopedAStatus : public impl::ScopedAResource<AStatus*, AStatus_delete, nullptr> {
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
