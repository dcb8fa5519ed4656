#pragma once

#include <functional>

#include <utils/Looper.h>
#include <utils/StrongPointer.h>

#include "looper/event_loop.h"

namespace hardware {
namespace dalix {

// The service's only event loop, built on android::Looper. It is bound to the
// thread that constructs it; every watch callback and posted task runs there.
class LooperBackedEventLoop : public EventLoop {
 public:
  LooperBackedEventLoop();
  ~LooperBackedEventLoop() override = default;

  void PostTask(const std::function<void()>& task) override;
  bool WatchFileDescriptor(int fd, ReadyMode mode,
                           const std::function<void(int)>& callback) override;
  bool StopWatchFileDescriptor(int fd) override;

  // Dispatches events until the loop is quit. The service never quits it, so
  // in the daemon this call does not return.
  void Poll();

  // Makes Poll() return after the current iteration. Only tests and host
  // harnesses that run a loop on a thread of their own use this: the daemon
  // serves for the life of the process and has no shutdown path. Safe from
  // any thread, because it goes through PostTask.
  void Quit();

 private:
  android::sp<android::Looper> looper_;
  // Only touched on the loop thread: Quit() clears it from a posted task.
  bool running_;
};

}  // namespace dalix
}  // namespace hardware
