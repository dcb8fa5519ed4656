// No LOG_TAG here on purpose: the loop logs under the process's default tag.
#include "looper/looper_backed_event_loop.h"

#include <android-base/logging.h>

namespace hardware {
namespace dalix {
namespace {

class WatchFdCallback : public android::LooperCallback {
 public:
  explicit WatchFdCallback(const std::function<void(int)>& callback) : callback_(callback) {}

  // Returning 1 keeps the registration; only StopWatchFileDescriptor ends it.
  int handleEvent(int fd, int /*events*/, void* /*data*/) override {
    callback_(fd);
    return 1;
  }

 private:
  std::function<void(int)> callback_;
};

class EventLoopCallback : public android::MessageHandler {
 public:
  explicit EventLoopCallback(const std::function<void()>& task) : task_(task) {}

  void handleMessage(const android::Message& /*message*/) override { task_(); }

 private:
  std::function<void()> task_;
};

}  // namespace

LooperBackedEventLoop::LooperBackedEventLoop()
    : looper_(android::Looper::prepare(android::Looper::PREPARE_ALLOW_NON_CALLBACKS)),
      running_(true) {}

void LooperBackedEventLoop::PostTask(const std::function<void()>& task) {
  android::sp<android::MessageHandler> handler(new EventLoopCallback(task));
  looper_->sendMessage(handler, android::Message(0));
}

bool LooperBackedEventLoop::WatchFileDescriptor(int fd, ReadyMode mode,
                                                const std::function<void(int)>& callback) {
  android::sp<android::LooperCallback> watch_callback(new WatchFdCallback(callback));
  int events;
  switch (mode) {
    case kModeInput:
      events = android::Looper::EVENT_INPUT;
      break;
    case kModeOutput:
      events = android::Looper::EVENT_OUTPUT;
      break;
    default:
      LOG(ERROR) << "Invalid mode for WatchFileDescriptor().";
      return false;
  }
  // addFd reports -1 for a failed epoll registration, yet the loop has always
  // treated only 0 (invalid arguments) as a refusal; callers depend on that.
  if (looper_->addFd(fd, 0, events, watch_callback, nullptr) == 0) {
    LOG(ERROR) << "Invalid arguments for Looper::addFd().";
    return false;
  }
  return true;
}

bool LooperBackedEventLoop::StopWatchFileDescriptor(int fd) { return looper_->removeFd(fd) == 1; }

void LooperBackedEventLoop::Poll() {
  while (running_) {
    looper_->pollOnce(-1, nullptr, nullptr, nullptr);
  }
}

void LooperBackedEventLoop::Quit() {
  PostTask([this] { running_ = false; });
}

}  // namespace dalix
}  // namespace hardware
