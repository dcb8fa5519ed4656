#pragma once

#include <functional>
#include <memory>

#include "looper/event_loop.h"
#include "net/nl_socket.h"

namespace hardware {
namespace dalix {

// Makes connected netlink sockets bound to the service's event loop, and
// offers one-shot exchanges on a socket of their own. Service thread only.
// The one-shots log under |log_tag|: callers pass their own LOG_TAG, so each
// line names the client that made the request.
class NlSocketFactory {
 public:
  explicit NlSocketFactory(EventLoop* event_loop) : event_loop_(event_loop) {}
  virtual ~NlSocketFactory() = default;

  // A socket on which Setup() succeeded, or null.
  virtual std::unique_ptr<NlSocket> Create();

  virtual bool SendAndAwaitAck(nl_msg* msg, const char* log_tag);
  virtual bool SendAndAwaitResponse(nl_msg* msg, std::function<void(nl_msg*)> callback, int cmd,
                                    const char* log_tag);

 protected:
  EventLoop* event_loop() const { return event_loop_; }

 private:
  EventLoop* event_loop_;
};

}  // namespace dalix
}  // namespace hardware
