#pragma once

#include <functional>

namespace hardware {
namespace dalix {

// Waits for file descriptors and runs deferred work for the whole service.
// Every method except PostTask must be called on the thread that owns the loop.
class EventLoop {
 public:
  enum ReadyMode {
    kModeInput = 0,   // wait until readable
    kModeOutput = 1,  // wait until writable
  };

  virtual ~EventLoop() = default;

  // Runs |task| on the loop thread on a later iteration. Safe from any thread.
  virtual void PostTask(const std::function<void()>& task) = 0;
  // Calls |callback| with |fd| each time it becomes ready in |mode|, until stopped.
  virtual bool WatchFileDescriptor(int fd, ReadyMode mode,
                                   const std::function<void(int)>& callback) = 0;
  virtual bool StopWatchFileDescriptor(int fd) = 0;
};

}  // namespace dalix
}  // namespace hardware
