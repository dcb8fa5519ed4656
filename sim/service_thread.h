#pragma once

#include <cstdint>
#include <future>
#include <memory>
#include <thread>

#include "looper/looper_backed_event_loop.h"
#include "service_main.h"
#include "sim/wpan_device_store.h"

namespace hardware {
namespace dalix {
namespace sim {

// Runs the whole service, through the daemon's own start-up path, on a
// thread of its own against the driver simulator listening on a port: the
// host's stand-in for the daemon process. Clients on other threads reach it
// through the service manager of the host binder. Start and Stop are for the
// thread that owns the object.
class ServiceThread {
 public:
  ServiceThread(uint32_t simulator_port, WpanDeviceStore* devices);
  ~ServiceThread();
  ServiceThread(const ServiceThread&) = delete;
  ServiceThread& operator=(const ServiceThread&) = delete;

  // Returns once the service is registered and its loop is about to run.
  void Start();
  // Quits the service's loop, waits for its thread, and forgets what the
  // binder emulation still held for the service (its registration, queued
  // calls), so that a later Start begins afresh.
  void Stop();
  bool running() const { return thread_.joinable(); }

 private:
  class Platform : public ServicePlatform {
   public:
    Platform(uint32_t simulator_port, WpanDeviceStore* devices)
        : simulator_port_(simulator_port), devices_(devices) {}
    std::unique_ptr<NlSocketFactory> NewSocketFactory(EventLoop* event_loop) override;
    std::unique_ptr<InterfaceTool> NewInterfaceTool() override;
    void OnServing(LooperBackedEventLoop* event_loop) override;

    std::promise<LooperBackedEventLoop*> serving;

   private:
    const uint32_t simulator_port_;
    WpanDeviceStore* const devices_;
  };

  Platform platform_;
  std::thread thread_;
  LooperBackedEventLoop* event_loop_ = nullptr;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
