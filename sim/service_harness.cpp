#include "sim/service_harness.h"

#include <future>
#include <utility>

#include <android/binder_process.h>

#include "looper/looper_backed_event_loop.h"
#include "sim/sim_interface_tool.h"
#include "sim/sim_nl_socket_factory.h"

namespace hardware {
namespace dalix {
namespace sim {

ServiceHarness::ServiceHarness(std::vector<Radio> radios) : radio_list_(std::move(radios)) {}

ServiceHarness::~ServiceHarness() {
  if (thread_.joinable()) {
    // The driver clients go with the thread that used them.
    RunOnService([this] { static_cast<LooperBackedEventLoop*>(event_loop_)->Quit(); });
    thread_.join();
  }
  driver_.simulator().Stop();
}

bool ServiceHarness::Start(std::string* error) {
  // Each radio drives the phy of its own number.
  for (const Radio& radio : radio_list_) {
    if (!driver_.AddRadio(radio.hw_index, radio.hw_index, radio.iface, error)) return false;
  }
  if (!driver_.Start()) {
    *error = "the driver simulator did not start";
    return false;
  }
  std::promise<bool> ready;
  thread_ = std::thread([this, &ready] { Serve([&ready](bool ok) { ready.set_value(ok); }); });
  if (!ready.get_future().get()) {
    thread_.join();
    *error = "the service's driver clients did not start";
    return false;
  }
  return true;
}

void ServiceHarness::RunOnService(const std::function<void()>& task) {
  // Not serving: the calling thread is the only one.
  if (!thread_.joinable()) {
    task();
    return;
  }
  std::promise<void> done;
  event_loop_->PostTask([&task, &done] {
    task();
    done.set_value();
  });
  done.get_future().get();
}

void ServiceHarness::Serve(const std::function<void(bool)>& ready) {
  LooperBackedEventLoop loop;
  int binder_fd = -1;
  if (ABinderProcess_setupPolling(&binder_fd) != STATUS_OK ||
      !loop.WatchFileDescriptor(binder_fd, EventLoop::kModeInput,
                                [](int) { (void)ABinderProcess_handlePolledCommands(); })) {
    ready(false);
    return;
  }
  auto clients = std::make_unique<Clients>();
  clients->factory = std::make_unique<SimNlSocketFactory>(&loop, driver_.port());
  clients->mcps = std::make_unique<McpsUtils>(clients->factory.get());
  clients->ieee = std::make_unique<IeeeUtils>(clients->factory.get());
  clients->fira = std::make_unique<FiraRegionUtils>(clients->factory.get());
  clients->interface_tool = std::make_unique<SimInterfaceTool>(&driver_.devices());
  const bool started = clients->mcps->Start() && clients->ieee->Setup();
  clients->fira->SetMcpsNetId(clients->mcps->GetNetId());
  clients_ = std::move(clients);
  event_loop_ = &loop;
  ready(started);
  if (started) loop.Poll();
  loop.StopWatchFileDescriptor(binder_fd);
  clients_.reset();
  event_loop_ = nullptr;
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
