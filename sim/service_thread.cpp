#include "sim/service_thread.h"

#include <binder_host/host.h>

#include "sim/sim_interface_tool.h"
#include "sim/sim_nl_socket_factory.h"

namespace hardware {
namespace dalix {
namespace sim {

std::unique_ptr<NlSocketFactory> ServiceThread::Platform::NewSocketFactory(EventLoop* event_loop) {
  return std::make_unique<SimNlSocketFactory>(event_loop, simulator_port_);
}

std::unique_ptr<InterfaceTool> ServiceThread::Platform::NewInterfaceTool() {
  return std::make_unique<SimInterfaceTool>(devices_);
}

void ServiceThread::Platform::OnServing(LooperBackedEventLoop* event_loop) {
  serving.set_value(event_loop);
}

ServiceThread::ServiceThread(uint32_t simulator_port, WpanDeviceStore* devices)
    : platform_(simulator_port, devices) {}

ServiceThread::~ServiceThread() { Stop(); }

void ServiceThread::Start() {
  if (running()) return;
  platform_.serving = std::promise<LooperBackedEventLoop*>();
  std::future<LooperBackedEventLoop*> serving = platform_.serving.get_future();
  thread_ = std::thread([this] { RunService(&platform_); });
  event_loop_ = serving.get();
}

void ServiceThread::Stop() {
  if (!running()) return;
  event_loop_->Quit();
  thread_.join();
  event_loop_ = nullptr;
  ndk::host::ResetForTesting();
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
