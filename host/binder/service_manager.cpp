#include <android/binder_manager.h>

#include <map>
#include <mutex>
#include <string>

#include <android/binder_auto_utils.h>
#include <binder_host/host.h>

#include "binder_process.h"

namespace {

// The registered services by instance name. Stands for the service manager
// process, of which there is one per system.
class ServiceRegistry {
 public:
  static ServiceRegistry& Get() {
    static ServiceRegistry* registry = new ServiceRegistry();
    return *registry;
  }

  void Add(const std::string& instance, ndk::SpAIBinder binder) {
    ndk::SpAIBinder replaced;
    std::lock_guard<std::mutex> lock(mutex_);
    replaced = std::move(services_[instance]);
    services_[instance] = std::move(binder);
  }

  ndk::SpAIBinder Find(const std::string& instance) const {
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = services_.find(instance);
    return it != services_.end() ? it->second : ndk::SpAIBinder();
  }

  void Clear() {
    std::map<std::string, ndk::SpAIBinder> dropped;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      dropped.swap(services_);
    }
    // |dropped| releases its references here, outside the lock: the last
    // one may destroy a service whose destructor calls back into binder.
  }

 private:
  mutable std::mutex mutex_;
  std::map<std::string, ndk::SpAIBinder> services_;
};

}  // namespace

namespace ndk {
namespace host {

void ResetForTesting() {
  ServiceRegistry::Get().Clear();
  BinderProcess::Get().Reset();
}

}  // namespace host
}  // namespace ndk

extern "C" {

binder_exception_t AServiceManager_addService(AIBinder* binder, const char* instance) {
  if (binder == nullptr || instance == nullptr) return EX_ILLEGAL_ARGUMENT;
  AIBinder_incStrong(binder);
  ServiceRegistry::Get().Add(instance, ndk::SpAIBinder(binder));
  return EX_NONE;
}

AIBinder* AServiceManager_checkService(const char* instance) {
  if (instance == nullptr) return nullptr;
  const ndk::SpAIBinder found = ServiceRegistry::Get().Find(instance);
  // The caller's reference, beside the one |found| drops.
  if (found.get() != nullptr) AIBinder_incStrong(found.get());
  return found.get();
}

AIBinder* AServiceManager_getService(const char* instance) {
  return AServiceManager_checkService(instance);
}

}  // extern "C"
