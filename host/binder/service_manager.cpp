#define LOG_TAG "servicemanager"

#include <android/binder_manager.h>

#include <map>
#include <mutex>
#include <optional>
#include <string>

#include <android-base/logging.h>
#include <android/binder_auto_utils.h>
#include <binder_host/host.h>

#include "binder_process.h"
#include "vintf_manifest.h"

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

// As on a device, only an instance that the VINTF manifest declares may be
// registered. The host's manifest is the project's own fragment, read afresh
// at each registration so that a test always sees the file as it stands.
bool DeclaredInManifest(const char* instance) {
  std::string error;
  std::optional<ndk::host::VintfManifest> manifest =
      ndk::host::VintfManifest::Load(DALIX_VINTF_FRAGMENT, &error);
  if (!manifest.has_value()) {
    LOG(ERROR) << "AServiceManager_addService: unreadable VINTF manifest " << error;
    return false;
  }
  if (!manifest->Declares(instance)) {
    LOG(ERROR) << "AServiceManager_addService: " << instance
               << " is not declared in the VINTF manifest " << DALIX_VINTF_FRAGMENT;
    return false;
  }
  return true;
}

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
  if (!DeclaredInManifest(instance)) return EX_ILLEGAL_ARGUMENT;
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
