#pragma once

#include <functional>
#include <memory>

#include <netlink/netlink.h>

#include "looper/event_loop.h"
#include "net/nl_message_reader.h"

namespace hardware {
namespace dalix {

// One connected generic netlink socket: blocking request/acknowledge and
// request/response exchanges, single reads, and a watch on the event loop for
// unsolicited driver messages. Used on the service thread only.
class NlSocket {
 public:
  explicit NlSocket(EventLoop* event_loop);
  virtual ~NlSocket();
  NlSocket(const NlSocket&) = delete;
  NlSocket& operator=(const NlSocket&) = delete;

  virtual bool Setup();
  virtual bool IsValid();
  virtual void DisableAutoAck();
  virtual void DisableSeqCheck();
  virtual int Resolve(const char* family);
  virtual bool ReceiveMessage(std::function<int(nl_msg*)> handler);
  virtual bool SendAndAwaitAck(nl_msg* msg, std::function<int(nl_msg*)> on_message);
  virtual bool SendAndAwaitResponse(nl_msg* msg, std::function<void(nl_msg*)> on_response, int cmd);
  // |self| must point at this socket through the shared_ptr that owns it; the
  // watch keeps only the weak pointer, so releasing the socket ends delivery.
  virtual bool WatchNetlinkSocket(std::weak_ptr<NlSocket> self,
                                  const std::function<int(nl_msg*)>& handler);
  virtual bool StopWatchNetlinkSocket();

 protected:
  // Setup() with |connect| in place of genl_connect, for overrides that reach
  // the driver another way: allocation, buffers, receive timeout and log lines
  // stay those of every other socket. |connect| returns 0 on success.
  bool SetupWith(const std::function<int(nl_sock*)>& connect);
  nl_sock* sock() const { return sock_; }

 private:
  static constexpr int kBufferBytes = 8192;
  static constexpr int kReceiveTimeoutSeconds = 1;

  void set_sock(nl_sock* sock);

  EventLoop* event_loop_;
  nl_sock* sock_;
  bool watching_;
  std::unique_ptr<NlMessageReader> reader_;
};

}  // namespace dalix
}  // namespace hardware
