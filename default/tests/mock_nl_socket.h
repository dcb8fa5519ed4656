#pragma once

#include <functional>
#include <memory>

#include <gmock/gmock.h>

#include "net/nl_socket.h"
#include "net/nl_socket_factory.h"

namespace hardware {
namespace dalix {

// Test doubles for the netlink transport: driver clients are tested against
// these, with the requests they build captured as SentMessage.
class MockNlSocket : public NlSocket {
 public:
  MockNlSocket() : NlSocket(nullptr) {}
  MOCK_METHOD(void, DisableAutoAck, (), (override));
  MOCK_METHOD(int, Resolve, (const char* family), (override));
  MOCK_METHOD(bool, ReceiveMessage, (std::function<int(nl_msg*)> handler), (override));
  MOCK_METHOD(bool, SendAndAwaitAck, (nl_msg * msg, std::function<int(nl_msg*)> on_message),
              (override));
  MOCK_METHOD(bool, SendAndAwaitResponse,
              (nl_msg * msg, std::function<void(nl_msg*)> on_response, int cmd), (override));
  MOCK_METHOD(bool, WatchNetlinkSocket,
              (std::weak_ptr<NlSocket> self, const std::function<int(nl_msg*)>& handler),
              (override));
  MOCK_METHOD(bool, StopWatchNetlinkSocket, (), (override));
};

class MockNlSocketFactory : public NlSocketFactory {
 public:
  MockNlSocketFactory() : NlSocketFactory(nullptr) {}
  MOCK_METHOD(std::unique_ptr<NlSocket>, Create, (), (override));
};

}  // namespace dalix
}  // namespace hardware
