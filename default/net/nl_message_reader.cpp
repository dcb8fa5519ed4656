#define LOG_TAG "dalix.uwb"

#include "net/nl_message_reader.h"

#include <utility>

#include <android-base/logging.h>

namespace hardware {
namespace dalix {

NlMessageReader::NlMessageReader() : cb_(nl_cb_alloc(NL_CB_DEFAULT)) {
  CHECK(cb_) << "Failed to allocate netlink callback";
  nl_cb_set(cb_, NL_CB_VALID, NL_CB_CUSTOM, &NlMessageReader::OnNlMessage, this);
  nl_cb_set(cb_, NL_CB_ACK, NL_CB_CUSTOM, &NlMessageReader::OnAck, this);
  nl_cb_set(cb_, NL_CB_FINISH, NL_CB_CUSTOM, &NlMessageReader::OnFinish, nullptr);
  nl_cb_err(cb_, NL_CB_CUSTOM, &NlMessageReader::OnError, this);
}

NlMessageReader::~NlMessageReader() { nl_cb_put(cb_); }

int NlMessageReader::read_message(nl_sock* sock) { return nl_recvmsgs(sock, cb_); }

void NlMessageReader::SetMessageHandler(MessageHandler handler) {
  message_handler_.swap(handler);
}

void NlMessageReader::ClearMessageHandler() { message_handler_ = nullptr; }

void NlMessageReader::SetAckHandler(MessageHandler handler) { ack_handler_.swap(handler); }

void NlMessageReader::ClearAckHandler() { ack_handler_ = nullptr; }

void NlMessageReader::SetErrorHandler(ErrorHandler handler) { error_handler_.swap(handler); }

void NlMessageReader::ClearErrorHandler() { error_handler_ = nullptr; }

int NlMessageReader::OnNlMessage(nl_msg* msg, void* arg) {
  auto* reader = static_cast<NlMessageReader*>(arg);
  return reader->message_handler_ ? reader->message_handler_(msg) : NL_SKIP;
}

int NlMessageReader::OnAck(nl_msg* msg, void* arg) {
  auto* reader = static_cast<NlMessageReader*>(arg);
  return reader->ack_handler_ ? reader->ack_handler_(msg) : NL_SKIP;
}

int NlMessageReader::OnFinish(nl_msg* /*msg*/, void* /*arg*/) { return NL_OK; }

// Without an exchange waiting for it, an error report ends the read: nothing
// that follows it in the same datagram can belong to anyone.
int NlMessageReader::OnError(sockaddr_nl* /*addr*/, nlmsgerr* err, void* arg) {
  auto* reader = static_cast<NlMessageReader*>(arg);
  return reader->error_handler_ ? reader->error_handler_(err) : NL_STOP;
}

}  // namespace dalix
}  // namespace hardware
