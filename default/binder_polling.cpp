#include "binder_polling.h"

#include <android/binder_process.h>

namespace hardware {
namespace dalix {

bool BinderPollingAvailable() {
  return &ABinderProcess_setupPolling != nullptr && &ABinderProcess_handlePolledCommands != nullptr;
}

}  // namespace dalix
}  // namespace hardware
