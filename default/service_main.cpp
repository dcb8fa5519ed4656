// The start-up and exit sequence of the daemon, shared with the host programs
// that run it against the driver simulator; it logs as main.
#define LOG_TAG "dalix.uwb.main"

#include "service_main.h"

#include <stdint.h>
#include <unistd.h>

#include <string>

#include <android-base/logging.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <netlink/msg.h>

#include "binder_polling.h"
#include "net/ccc_region_utils.h"
#include "net/fira_region_utils.h"
#include "net/ieee_utils.h"
#include "net/mcps_utils.h"
#include "uwb.h"

namespace hardware {
namespace dalix {
namespace {

// Every netlink message is allocated one page: read once, before main.
const int32_t kPageSize = getpagesize();

void InitLogger() {
  // The platform's default logger and tag handling are what the service
  // wants; this stays as the one place to change that.
}

int SetupBinderOrCrash() {
  CHECK(BinderPollingAvailable())
      << "libbinder_ndk does not export ABinderProcess_setupPolling and "
         "ABinderProcess_handlePolledCommands";
  // No binder threads: every transaction is drained by the event loop, on
  // the one thread the service has.
  ABinderProcess_setThreadPoolMaxThreadCount(0);
  int binder_fd = -1;
  binder_status_t status = ABinderProcess_setupPolling(&binder_fd);
  CHECK_EQ(status, STATUS_OK);
  CHECK_GE(binder_fd, 0) << "Invalid binder FD: " << binder_fd;
  return binder_fd;
}

void OnBinderReadReady(int /*fd*/) { (void)ABinderProcess_handlePolledCommands(); }

void RegisterServiceOrCrash(const std::shared_ptr<Uwb>& uwb) {
  const std::string instance = ServiceInstanceName();
  binder_exception_t status = AServiceManager_addService(uwb->asBinder().get(), instance.c_str());
  CHECK(status == STATUS_OK);
}

}  // namespace

std::string ServiceInstanceName() {
  return std::string(aidl::hardware::dalix::uwb::IUwb::descriptor) + "/default";
}

int RunService(ServicePlatform* platform) {
  LOG(INFO) << "UWB HAL start";
  InitLogger();
  const int binder_fd = SetupBinderOrCrash();

  LooperBackedEventLoop event_dispatcher;
  CHECK(event_dispatcher.WatchFileDescriptor(
      binder_fd, hardware::dalix::EventLoop::kModeInput, &OnBinderReadReady))
      << "Failed to watch binder FD";

  // Nothing below talks to the driver: it is first asked when a client
  // opens the HAL.
  std::unique_ptr<NlSocketFactory> socket_factory = platform->NewSocketFactory(&event_dispatcher);
  nlmsg_set_default_size(kPageSize);
  McpsUtils mcps_utils(socket_factory.get());
  CccRegionUtils ccc_region_utils(socket_factory.get());
  FiraRegionUtils fira_region_utils(socket_factory.get());
  IeeeUtils ieee_utils(socket_factory.get());
  std::unique_ptr<InterfaceTool> interface_tool = platform->NewInterfaceTool();
  std::shared_ptr<Uwb> uwb =
      ndk::SharedRefBase::make<Uwb>(interface_tool.get(), &mcps_utils, &ieee_utils,
                                    &ccc_region_utils, &fira_region_utils, &event_dispatcher);
  RegisterServiceOrCrash(uwb);

  platform->OnServing(&event_dispatcher);
  event_dispatcher.Poll();

  LOG(INFO) << "UWB HAL is about to exit";
  uwb.reset();
  return 0;
}

}  // namespace dalix
}  // namespace hardware
