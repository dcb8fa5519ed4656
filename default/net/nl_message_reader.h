#pragma once

#include <functional>

#include <netlink/handlers.h>
#include <netlink/netlink.h>

namespace hardware {
namespace dalix {

// Owns a socket's libnl callback set and routes each received message to the
// handler that the current exchange installed. Runs on the service thread.
class NlMessageReader {
 public:
  using MessageHandler = std::function<int(nl_msg*)>;
  using ErrorHandler = std::function<int(nlmsgerr*)>;

  NlMessageReader();
  virtual ~NlMessageReader();
  NlMessageReader(const NlMessageReader&) = delete;
  NlMessageReader& operator=(const NlMessageReader&) = delete;

  // One nl_recvmsgs() call; libnl's result (negative on error or timeout).
  virtual int read_message(nl_sock* sock);

  virtual void SetMessageHandler(MessageHandler handler);
  virtual void ClearMessageHandler();
  virtual void SetAckHandler(MessageHandler handler);
  virtual void ClearAckHandler();
  virtual void SetErrorHandler(ErrorHandler handler);
  virtual void ClearErrorHandler();

 private:
  static int OnNlMessage(nl_msg* msg, void* arg);
  static int OnAck(nl_msg* msg, void* arg);
  static int OnFinish(nl_msg* msg, void* arg);
  static int OnError(sockaddr_nl* addr, nlmsgerr* err, void* arg);

  MessageHandler message_handler_;
  MessageHandler ack_handler_;
  ErrorHandler error_handler_;
  nl_cb* cb_;
};

}  // namespace dalix
}  // namespace hardware
