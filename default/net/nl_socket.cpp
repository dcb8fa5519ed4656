#define LOG_TAG "dalix.uwb.NlSocket"

#include "net/nl_socket.h"

#include <sys/socket.h>
#include <sys/time.h>

#include <utility>

#include <android-base/logging.h>
#include <netlink/genl/ctrl.h>
#include <netlink/genl/genl.h>
#include <netlink/msg.h>

namespace hardware {
namespace dalix {
NlSocket::NlSocket(EventLoop* event_loop)
    : event_loop_(event_loop),
      sock_(nullptr),
      watching_(false),
      reader_(std::make_unique<NlMessageReader>()) {}

NlSocket::~NlSocket() {
  if (watching_) StopWatchNetlinkSocket();
  reader_.reset();
  nl_socket_free(sock_);
}

void NlSocket::set_sock(nl_sock* sock) {
  if (sock_ != nullptr) nl_socket_free(sock_);
  sock_ = sock;
}

bool NlSocket::Setup() { return SetupWith(genl_connect); }

bool NlSocket::SetupWith(const std::function<int(nl_sock*)>& connect) {
  set_sock(nl_socket_alloc());
  if (sock_ == nullptr) {
    LOG(ERROR) << "Setup: Failed to create netlink socket";
    return false;
  }
  // Before the connect there is no descriptor yet, so libnl refuses this and
  // the connect applies its own default; kept in this order on purpose.
  nl_socket_set_buffer_size(sock_, kBufferBytes, kBufferBytes);
  if (connect(sock_) != 0) {
    LOG(ERROR) << "Setup: Failed to connect to generic netlink";
    set_sock(nullptr);
    return false;
  }
  // Bounds every blocking read: a driver that never answers costs a second.
  timeval timeout = {kReceiveTimeoutSeconds, 0};
  setsockopt(nl_socket_get_fd(sock_), SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof(timeout));
  return true;
}

bool NlSocket::IsValid() { return sock_ != nullptr; }

void NlSocket::DisableAutoAck() { nl_socket_disable_auto_ack(sock_); }

void NlSocket::DisableSeqCheck() { nl_socket_disable_seq_check(sock_); }

int NlSocket::Resolve(const char* family) { return genl_ctrl_resolve(sock_, family); }

bool NlSocket::ReceiveMessage(std::function<int(nl_msg*)> handler) {
  reader_->SetMessageHandler(std::move(handler));
  int result = reader_->read_message(sock_);
  reader_->ClearMessageHandler();
  if (result < 0) {
    LOG(WARNING) << "ReceiveMessage: Error reading message: " << nl_geterror(result);
    return false;
  }
  return true;
}

bool NlSocket::SendAndAwaitAck(nl_msg* msg, std::function<int(nl_msg*)> on_message) {
  nl_complete_msg(sock_, msg);
  nlmsg_hdr(msg)->nlmsg_flags |= NLM_F_ACK;
  int result = nl_send(sock_, msg);
  if (result < 0) {
    LOG(WARNING) << "SendAndAwaitAck: Error sending netlink message: " << nl_geterror(result);
    return false;
  }

  bool ack_received = false;
  int error = 0;
  reader_->SetAckHandler([&ack_received](nl_msg*) {
    LOG(INFO) << "SendAndAwaitAck: Received ACK";
    ack_received = true;
    return NL_SKIP;
  });
  reader_->SetErrorHandler([&error](nlmsgerr* err) {
    LOG(WARNING) << "SendAndAwaitAck: Nl error: " << err->error;
    error = err->error;
    return NL_STOP;
  });
  reader_->SetMessageHandler(std::move(on_message));

  while (!ack_received && error == 0) {
    result = reader_->read_message(sock_);
    if (result < 0) {
      LOG(WARNING) << "SendAndAwaitAck: Error reading message: " << nl_geterror(result);
      break;
    }
  }

  reader_->ClearAckHandler();
  reader_->ClearErrorHandler();
  reader_->ClearMessageHandler();
  return result >= 0 && ack_received && error == 0;
}

bool NlSocket::SendAndAwaitResponse(nl_msg* msg, std::function<void(nl_msg*)> on_response,
                                    int cmd) {
  LOG(INFO) << "SendAndAwaitResponse";
  // A failed send leaves both handlers installed past this call, so what they
  // touch lives with them, not in this frame.
  auto got_response = std::make_shared<bool>(false);
  auto error = std::make_shared<int>(0);

  reader_->SetMessageHandler(
      [got_response, on_response = std::move(on_response), cmd](nl_msg* reply) {
        // A message too short for the generic header carries no command at
        // all: it is taken for one with another command (-1).
        const nlmsghdr* header = nlmsg_hdr(reply);
        int received = header->nlmsg_len >= NLMSG_LENGTH(GENL_HDRLEN)
                           ? genlmsg_hdr(const_cast<nlmsghdr*>(header))->cmd
                           : -1;
        // An empty callback cannot take the response, so it counts as a mismatch.
        if (on_response && received == cmd) {
          *got_response = true;
          on_response(reply);
        } else {
          LOG(INFO) << "SendAndAwaitResponse: Incorrect received command, got " << received
                    << " instead of " << cmd;
        }
        return NL_SKIP;
      });
  reader_->SetErrorHandler([error](nlmsgerr* err) {
    LOG(WARNING) << "SendAndAwaitResponse: Nl error: " << err->error;
    *error = err->error;
    return NL_STOP;
  });

  int result = nl_send_auto(sock_, msg);
  if (result < 0) {
    LOG(WARNING) << "SendAndAwaitResponse: Error sending netlink message: " << nl_geterror(result);
    return false;
  }

  while (!*got_response && *error == 0) {
    LOG(INFO) << "SendAndAwaitResponse: Read message";
    result = reader_->read_message(sock_);
    if (result < 0) {
      LOG(WARNING) << "SendAndAwaitResponse: Error reading message: " << nl_geterror(result);
      break;
    }
  }

  reader_->ClearErrorHandler();
  reader_->ClearMessageHandler();
  return result >= 0 && *got_response && *error == 0;
}

bool NlSocket::WatchNetlinkSocket(std::weak_ptr<NlSocket> self,
                                  const std::function<int(nl_msg*)>& handler) {
  std::shared_ptr<NlSocket> socket = self.lock();
  if (!socket) return false;
  int fd = socket->sock_ != nullptr ? nl_socket_get_fd(socket->sock_) : -1;
  if (socket->watching_ || fd == -1) return false;

  auto callback = [self, handler](int /*fd*/) {
    std::shared_ptr<NlSocket> locked = self.lock();
    if (!locked) {
      LOG(WARNING) << "WatchNetlinkSocket: socket is close";
      return;
    }
    locked->ReceiveMessage(handler);
  };
  // Output (mode 1) on purpose: the loop wakes the socket as writable, and
  // the read that follows waits for the driver's message within the receive
  // timeout.
  bool watched = socket->event_loop_->WatchFileDescriptor(fd, EventLoop::kModeOutput, callback);
  if (watched) socket->watching_ = true;
  return watched;
}

bool NlSocket::StopWatchNetlinkSocket() {
  int fd = sock_ != nullptr ? nl_socket_get_fd(sock_) : -1;
  if (fd == -1) return false;
  LOG(INFO) << "StopWatchNetlinkSocket";
  watching_ = false;
  return event_loop_->StopWatchFileDescriptor(fd);
}

}  // namespace dalix
}  // namespace hardware
