#define LOG_TAG "dalix.fuzz.ScriptedDriver"

#include "fuzz/scripted_driver.h"

#include <sys/socket.h>

#include <cerrno>
#include <cstring>

#include <android-base/logging.h>
#include <linux/netlink.h>
#include <netlink/handlers.h>
#include <netlink/msg.h>
#include <netlink/socket.h>

namespace hardware {
namespace dalix {
namespace fuzz {
namespace {

// libnl's send hook takes no context; the process has one driver.
ScriptedDriver* g_driver = nullptr;

int SendHook(nl_sock* sock, nl_msg* msg) {
  nlmsghdr* header = nlmsg_hdr(msg);
  g_driver->Answer(nl_socket_get_local_port(sock), header->nlmsg_seq);
  return static_cast<int>(header->nlmsg_len);
}

// The production socket, reaching the scripted driver instead of a kernel.
class ScriptedNlSocket : public NlSocket {
 public:
  explicit ScriptedNlSocket(EventLoop* event_loop) : NlSocket(event_loop) {}

  bool Setup() override {
    return SetupWith([](nl_sock* sock) {
      int result = nl_connect(sock, NETLINK_USERSOCK);
      if (result != 0) return result;
      nl_cb* cb = nl_socket_get_cb(sock);
      nl_cb_overwrite_send(cb, &SendHook);
      nl_cb_put(cb);
      return nl_socket_set_nonblocking(sock);
    });
  }
};

class ScriptedSocketFactory : public NlSocketFactory {
 public:
  ScriptedSocketFactory() : NlSocketFactory(nullptr) {}

  std::unique_ptr<NlSocket> Create() override {
    auto socket = std::make_unique<ScriptedNlSocket>(event_loop());
    if (!socket->Setup()) return nullptr;
    return socket;
  }
};

}  // namespace

ScriptedDriver::ScriptedDriver()
    : socket_(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_USERSOCK)),
      factory_(std::make_unique<ScriptedSocketFactory>()) {
  CHECK(g_driver == nullptr) << "one ScriptedDriver per process";
  CHECK(socket_.get() >= 0) << "netlink socket: " << strerror(errno);
  sockaddr_nl address = {};
  address.nl_family = AF_NETLINK;  // port 0: the kernel picks one
  CHECK(bind(socket_.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)) == 0)
      << "netlink bind: " << strerror(errno);
  g_driver = this;
}

ScriptedDriver::~ScriptedDriver() { g_driver = nullptr; }

void ScriptedDriver::Load(const uint8_t* data, size_t size) {
  answers_.assign(1, {});
  next_answer_ = 0;
  while (size >= 2) {
    size_t length = data[0] | (data[1] << 8);
    data += 2;
    size -= 2;
    if (length > size) length = size;
    if (length == 0) {
      answers_.emplace_back();
    } else {
      answers_.back().emplace_back(data, data + length);
    }
    data += length;
    size -= length;
  }
}

void ScriptedDriver::Answer(uint32_t port, uint32_t seq) {
  if (next_answer_ >= answers_.size()) return;
  sockaddr_nl peer = {};
  peer.nl_family = AF_NETLINK;
  peer.nl_pid = port;
  for (std::vector<uint8_t>& datagram : answers_[next_answer_]) {
    auto* header = reinterpret_cast<nlmsghdr*>(datagram.data());
    int remaining = static_cast<int>(datagram.size());
    for (; nlmsg_ok(header, remaining); header = nlmsg_next(header, &remaining)) {
      header->nlmsg_seq += seq;
    }
    // A full receive queue drops the rest, as the kernel would.
    sendto(socket_.get(), datagram.data(), datagram.size(), MSG_DONTWAIT,
           reinterpret_cast<sockaddr*>(&peer), sizeof(peer));
  }
  ++next_answer_;
}

void ScriptedDriver::AppendDatagram(std::string* script, const uint8_t* data, size_t size) {
  CHECK(size > 0 && size <= 0xFFFF) << "datagram of " << size << " bytes";
  script->push_back(static_cast<char>(size & 0xFF));
  script->push_back(static_cast<char>(size >> 8));
  script->append(reinterpret_cast<const char*>(data), size);
}

void ScriptedDriver::AppendEndOfAnswer(std::string* script) { script->append(2, '\0'); }

}  // namespace fuzz
}  // namespace dalix
}  // namespace hardware
