#include "net/nl_socket_factory.h"

#include <utility>

#include <android-base/logging.h>

namespace hardware {
namespace dalix {
namespace {

// One ERROR line under the caller's tag rather than this file's.
void LogBadAlloc(const char* log_tag, const char* operation) {
  android::base::LogMessage(__FILE__, __LINE__, android::base::ERROR, log_tag, -1).stream()
      << operation << ": BAD_ALLOC: cannot allocate NlSocket";
}

}  // namespace

std::unique_ptr<NlSocket> NlSocketFactory::Create() {
  auto socket = std::make_unique<NlSocket>(event_loop_);
  if (!socket->Setup()) return nullptr;
  return socket;
}

bool NlSocketFactory::SendAndAwaitAck(nl_msg* msg, const char* log_tag) {
  std::unique_ptr<NlSocket> socket = Create();
  if (!socket) {
    LogBadAlloc(log_tag, "SendAndAwaitAck");
    return false;
  }
  return socket->SendAndAwaitAck(msg, nullptr);
}

bool NlSocketFactory::SendAndAwaitResponse(nl_msg* msg, std::function<void(nl_msg*)> callback,
                                           int cmd, const char* log_tag) {
  std::shared_ptr<NlSocket> socket = Create();
  if (!socket) {
    LogBadAlloc(log_tag, "SendAndAwaitResponse");
    return false;
  }
  return socket->SendAndAwaitResponse(msg, std::move(callback), cmd);
}

}  // namespace dalix
}  // namespace hardware
