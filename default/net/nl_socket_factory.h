#pragma once

#include <functional>
#include <memory>

#include <android-base/logging.h>

#include "looper/event_loop.h"
#include "net/nl_socket.h"

namespace hardware {
namespace dalix {

// Makes connected netlink sockets bound to the service's event loop, and
// offers one-shot exchanges on a socket of their own. Service thread only.
// The one-shot helpers are inline so their log lines carry the caller's tag.
class NlSocketFactory {
 public:
  explicit NlSocketFactory(EventLoop* event_loop) : event_loop_(event_loop) {}
  virtual ~NlSocketFactory() = default;

  // A socket on which Setup() succeeded, or null.
  virtual std::unique_ptr<NlSocket> Create() {
    auto socket = std::make_unique<NlSocket>(event_loop_);
    if (!socket->Setup()) return nullptr;
    return socket;
  }

  bool SendAndAwaitAck(nl_msg* msg) {
    std::unique_ptr<NlSocket> socket = Create();
    if (!socket) {
      LOG(ERROR) << "SendAndAwaitAck: BAD_ALLOC: cannot allocate NlSocket";
      return false;
    }
    return socket->SendAndAwaitAck(msg, nullptr);
  }

  bool SendAndAwaitResponse(nl_msg* msg, std::function<void(nl_msg*)> callback, int cmd) {
    std::shared_ptr<NlSocket> socket = Create();
    if (!socket) {
      LOG(ERROR) << "SendAndAwaitResponse: BAD_ALLOC: cannot allocate NlSocket";
      return false;
    }
    return socket->SendAndAwaitResponse(msg, std::move(callback), cmd);
  }

 protected:
  EventLoop* event_loop() const { return event_loop_; }

 private:
  EventLoop* event_loop_;
};

}  // namespace dalix
}  // namespace hardware
