#define LOG_TAG "dalix.sim.DriverSimulator"

#include "sim/driver_simulator.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <memory>

#include <android-base/logging.h>
#include <linux/genetlink.h>
#include <linux/netlink.h>
#include <netlink/attr.h>
#include <netlink/genl/ctrl.h>
#include <netlink/genl/genl.h>

#include "sim/responder.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

// Large enough for a burst of requests from many client sockets at once.
constexpr int kReceiveBufferBytes = 1 << 20;
constexpr size_t kDatagramBytes = 1 << 16;

struct NlMsgDeleter {
  void operator()(nl_msg* msg) const { nlmsg_free(msg); }
};
using OwnedNlMsg = std::unique_ptr<nl_msg, NlMsgDeleter>;

std::array<nla_policy, CTRL_ATTR_MAX + 1> MakeControllerPolicy() {
  std::array<nla_policy, CTRL_ATTR_MAX + 1> policy{};
  policy[CTRL_ATTR_FAMILY_ID].type = NLA_U16;
  policy[CTRL_ATTR_FAMILY_NAME].type = NLA_STRING;
  return policy;
}

const nla_policy* ControllerPolicy() {
  static const std::array<nla_policy, CTRL_ATTR_MAX + 1> policy = MakeControllerPolicy();
  return policy.data();
}

}  // namespace

DriverSimulator::DriverSimulator(uint32_t port)
    : port_(port),
      running_(false),
      next_family_id_(kFirstFamilyId),
      next_task_order_(0),
      request_count_(0) {}

DriverSimulator::~DriverSimulator() { Stop(); }

bool DriverSimulator::Start() {
  std::lock_guard<std::mutex> lock(mutex_);
  if (running_) return true;

  android::base::unique_fd sock(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_USERSOCK));
  if (sock.get() < 0) {
    PLOG(ERROR) << "Start: cannot create the netlink socket";
    return false;
  }
  sockaddr_nl address = {};
  address.nl_family = AF_NETLINK;
  address.nl_pid = port_;
  if (bind(sock.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0) {
    PLOG(ERROR) << "Start: cannot bind netlink port " << port_;
    return false;
  }
  int size = kReceiveBufferBytes;
  // Only a bigger queue; the default still serves, so a refusal is not fatal.
  setsockopt(sock.get(), SOL_SOCKET, SO_RCVBUF, &size, sizeof(size));

  android::base::unique_fd wake(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
  if (wake.get() < 0) {
    PLOG(ERROR) << "Start: cannot create the wake-up descriptor";
    return false;
  }
  socket_ = std::move(sock);
  wake_ = std::move(wake);
  running_ = true;
  thread_ = std::thread([this] { Serve(); });
  return true;
}

void DriverSimulator::Stop() {
  {
    std::lock_guard<std::mutex> lock(mutex_);
    if (!running_) return;
    CHECK(std::this_thread::get_id() != thread_.get_id())
        << "DriverSimulator::Stop called on the simulator thread";
    running_ = false;
    uint64_t one = 1;
    // The eventfd counter cannot overflow from one write.
    (void)!write(wake_.get(), &one, sizeof(one));
  }
  thread_.join();
  std::lock_guard<std::mutex> lock(mutex_);
  socket_.reset();
  wake_.reset();
  tasks_.clear();
}

bool DriverSimulator::IsRunning() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return running_;
}

int DriverSimulator::RegisterFamily(const std::string& name, FamilyHandler* family) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto found = families_.find(name);
  if (found != families_.end()) {
    found->second.handler = family;
    found->second.present = true;
    return found->second.id;
  }
  int id = next_family_id_++;
  families_[name] = Family{id, family, true, std::nullopt, {}};
  return id;
}

void DriverSimulator::SetFamilyPresent(const std::string& name, bool present) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto found = families_.find(name);
  if (found != families_.end()) found->second.present = present;
}

int DriverSimulator::FamilyId(const std::string& name) const {
  std::lock_guard<std::mutex> lock(mutex_);
  auto found = families_.find(name);
  return found == families_.end() ? -1 : found->second.id;
}

void DriverSimulator::SetFault(const std::string& family, const Fault& fault) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto found = families_.find(family);
  CHECK(found != families_.end()) << "SetFault: unknown family " << family;
  found->second.fault = fault;
}

void DriverSimulator::SetCommandFault(const std::string& family, uint8_t cmd,
                                      const Fault& fault) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto found = families_.find(family);
  CHECK(found != families_.end()) << "SetCommandFault: unknown family " << family;
  found->second.command_faults[cmd] = fault;
}

void DriverSimulator::ClearFaults() {
  std::lock_guard<std::mutex> lock(mutex_);
  for (auto& entry : families_) {
    entry.second.fault.reset();
    entry.second.command_faults.clear();
  }
}

UniqueNlMsg DriverSimulator::NewEvent(int family_id, uint8_t cmd) {
  UniqueNlMsg msg;
  genlmsg_put(msg.get(), 0, 0, family_id, 0, 0, cmd, 1);
  return msg;
}

bool DriverSimulator::SendEvent(uint32_t port, nl_msg* msg) {
  return SendMessage(port, nlmsg_hdr(msg));
}

void DriverSimulator::SetSendObserver(SendObserver observer) {
  std::lock_guard<std::mutex> lock(mutex_);
  send_observer_ = std::move(observer);
}

bool DriverSimulator::SendRaw(uint32_t port, const void* data, size_t size) {
  std::lock_guard<std::mutex> lock(mutex_);
  if (socket_.get() < 0) return false;
  if (send_observer_) send_observer_(port, static_cast<const uint8_t*>(data), size);
  sockaddr_nl peer = {};
  peer.nl_family = AF_NETLINK;
  peer.nl_pid = port;
  ssize_t sent = sendto(socket_.get(), data, size, MSG_DONTWAIT,
                        reinterpret_cast<sockaddr*>(&peer), sizeof(peer));
  if (sent < 0) {
    // A port that is gone is a client that closed after its answer, as a
    // one-shot exchange does before the acknowledgement that follows its
    // reply: the kernel drops such messages without a word.
    if (errno != ECONNREFUSED) {
      PLOG(WARNING) << "SendRaw: message to port " << port << " dropped";
    }
    return false;
  }
  return true;
}

void DriverSimulator::Post(std::function<void()> task, std::chrono::milliseconds delay) {
  std::lock_guard<std::mutex> lock(mutex_);
  if (!running_) return;
  tasks_.push_back(
      Task{std::chrono::steady_clock::now() + delay, next_task_order_++, std::move(task)});
  uint64_t one = 1;
  (void)!write(wake_.get(), &one, sizeof(one));
}

int DriverSimulator::RequestCount() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return request_count_;
}

void DriverSimulator::Serve() {
  std::vector<uint8_t> buffer(kDatagramBytes);
  for (;;) {
    pollfd fds[2] = {{socket_.get(), POLLIN, 0}, {wake_.get(), POLLIN, 0}};
    int timeout_ms = static_cast<int>(NextTaskDelay().count());
    if (poll(fds, 2, timeout_ms) < 0 && errno != EINTR) {
      PLOG(ERROR) << "Serve: poll failed";
      return;
    }
    if (fds[1].revents & POLLIN) {
      uint64_t count;
      (void)!read(wake_.get(), &count, sizeof(count));
    }
    {
      std::lock_guard<std::mutex> lock(mutex_);
      if (!running_) return;
    }
    RunDueTasks();
    for (;;) {
      sockaddr_nl sender = {};
      socklen_t sender_size = sizeof(sender);
      ssize_t size = recvfrom(socket_.get(), buffer.data(), buffer.size(), MSG_DONTWAIT,
                              reinterpret_cast<sockaddr*>(&sender), &sender_size);
      if (size < 0) {
        if (errno != EAGAIN && errno != EWOULDBLOCK && errno != EINTR) {
          PLOG(WARNING) << "Serve: receive failed";
        }
        break;
      }
      HandleDatagram(sender.nl_pid, buffer.data(), static_cast<size_t>(size));
    }
  }
}

std::chrono::milliseconds DriverSimulator::NextTaskDelay() {
  std::lock_guard<std::mutex> lock(mutex_);
  if (tasks_.empty()) return std::chrono::milliseconds(-1);
  auto due = std::min_element(tasks_.begin(), tasks_.end(), [](const Task& a, const Task& b) {
               return a.due < b.due;
             })->due;
  auto delay = std::chrono::ceil<std::chrono::milliseconds>(due -
                                                             std::chrono::steady_clock::now());
  return std::max(delay, std::chrono::milliseconds(0));
}

void DriverSimulator::RunDueTasks() {
  std::vector<Task> due;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    auto now = std::chrono::steady_clock::now();
    auto first_later = std::stable_partition(tasks_.begin(), tasks_.end(),
                                             [&](const Task& task) { return task.due <= now; });
    std::move(tasks_.begin(), first_later, std::back_inserter(due));
    tasks_.erase(tasks_.begin(), first_later);
  }
  std::sort(due.begin(), due.end(), [](const Task& a, const Task& b) {
    return a.due != b.due ? a.due < b.due : a.order < b.order;
  });
  for (Task& task : due) task.run();
}

void DriverSimulator::HandleDatagram(uint32_t sender, const uint8_t* data, size_t size) {
  auto* header = reinterpret_cast<const nlmsghdr*>(data);
  int remaining = static_cast<int>(size);
  if (!nlmsg_ok(header, remaining)) {
    LOG(WARNING) << "HandleDatagram: dropped " << size << " bytes from port " << sender
                 << " that hold no netlink message";
    return;
  }
  while (nlmsg_ok(header, remaining)) {
    HandleMessage(sender, header);
    header = nlmsg_next(const_cast<nlmsghdr*>(header), &remaining);
  }
}

void DriverSimulator::HandleMessage(uint32_t sender, const nlmsghdr* header) {
  {
    std::lock_guard<std::mutex> lock(mutex_);
    ++request_count_;
  }
  // As the kernel: only requests are served; anything else is acknowledged
  // on demand and otherwise ignored.
  if (!(header->nlmsg_flags & NLM_F_REQUEST) || header->nlmsg_type < NLMSG_MIN_TYPE) {
    if (header->nlmsg_flags & NLM_F_ACK) SendError(sender, header, 0);
    return;
  }
  if (header->nlmsg_len < NLMSG_LENGTH(GENL_HDRLEN)) {
    SendError(sender, header, -EINVAL);
    return;
  }
  OwnedNlMsg msg(nlmsg_convert(const_cast<nlmsghdr*>(header)));
  if (!msg) {
    SendError(sender, header, -ENOMEM);
    return;
  }
  auto* genl = static_cast<const genlmsghdr*>(nlmsg_data(header));
  Request request;
  request.port = sender;
  request.seq = header->nlmsg_seq;
  request.flags = header->nlmsg_flags;
  request.family_id = header->nlmsg_type;
  request.cmd = genl->cmd;
  request.version = genl->version;
  request.msg = msg.get();

  if (header->nlmsg_type == GENL_ID_CTRL) {
    HandleController(request, header);
    return;
  }

  FamilyHandler* handler = nullptr;
  Fault fault;
  if (!TakeFamily(header->nlmsg_type, request.cmd, &handler, &fault)) {
    SendError(sender, header, -ENOENT);
    return;
  }
  Responder responder(request, [this, sender](const nlmsghdr* reply) {
    return SendMessage(sender, reply);
  });
  switch (fault.kind) {
    case Fault::Kind::kNoAnswer:
      return;
    case Fault::Kind::kError:
      SendError(sender, header, -std::abs(fault.error));
      return;
    case Fault::Kind::kAckOnly:
      SendError(sender, header, 0);
      return;
    case Fault::Kind::kMalformed:
      SendMalformedReply(responder, request.cmd);
      break;
    case Fault::Kind::kOtherCommandFirst: {
      UniqueNlMsg other = responder.NewReply(fault.other_command);
      responder.Reply(other.get());
      handler->HandleRequest(request, responder);
      break;
    }
    case Fault::Kind::kNone:
      handler->HandleRequest(request, responder);
      break;
  }

  if (responder.Refused()) {
    SendError(sender, header, responder.error());
  } else if (request.IsDump()) {
    SendDone(sender, header);
  } else if (header->nlmsg_flags & NLM_F_ACK) {
    SendError(sender, header, 0);
  }
}

void DriverSimulator::HandleController(const Request& request, const nlmsghdr* header) {
  if (request.cmd != CTRL_CMD_GETFAMILY) {
    SendError(request.port, header, -EOPNOTSUPP);
    return;
  }
  nlattr* attrs[CTRL_ATTR_MAX + 1];
  if (genlmsg_parse(const_cast<nlmsghdr*>(header), 0, attrs, CTRL_ATTR_MAX,
                    ControllerPolicy()) < 0) {
    SendError(request.port, header, -EINVAL);
    return;
  }

  std::vector<std::pair<std::string, int>> matches;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    for (const auto& entry : families_) {
      if (!entry.second.present) continue;
      if (request.IsDump() ||
          (attrs[CTRL_ATTR_FAMILY_NAME] && entry.first == nla_get_string(attrs[CTRL_ATTR_FAMILY_NAME])) ||
          (attrs[CTRL_ATTR_FAMILY_ID] &&
           entry.second.id == nla_get_u16(attrs[CTRL_ATTR_FAMILY_ID]))) {
        matches.emplace_back(entry.first, entry.second.id);
      }
    }
  }
  if (!request.IsDump() && !attrs[CTRL_ATTR_FAMILY_NAME] && !attrs[CTRL_ATTR_FAMILY_ID]) {
    SendError(request.port, header, -EINVAL);
    return;
  }
  if (!request.IsDump() && matches.empty()) {
    SendError(request.port, header, -ENOENT);
    return;
  }

  Responder responder(request, [this, &request](const nlmsghdr* reply) {
    return SendMessage(request.port, reply);
  });
  for (const auto& match : matches) {
    UniqueNlMsg reply = responder.NewReply(CTRL_CMD_NEWFAMILY);
    genlmsghdr* genl = genlmsg_hdr(nlmsg_hdr(reply.get()));
    genl->version = kControllerVersion;
    nla_put_u16(reply.get(), CTRL_ATTR_FAMILY_ID, static_cast<uint16_t>(match.second));
    nla_put_string(reply.get(), CTRL_ATTR_FAMILY_NAME, match.first.c_str());
    nla_put_u32(reply.get(), CTRL_ATTR_VERSION, 1);
    nla_put_u32(reply.get(), CTRL_ATTR_HDRSIZE, 0);
    responder.Reply(reply.get());
  }
  if (request.IsDump()) {
    SendDone(request.port, header);
  } else if (header->nlmsg_flags & NLM_F_ACK) {
    SendError(request.port, header, 0);
  }
}

bool DriverSimulator::TakeFamily(int type, uint8_t cmd, FamilyHandler** handler, Fault* fault) {
  std::lock_guard<std::mutex> lock(mutex_);
  for (auto& entry : families_) {
    Family& family = entry.second;
    if (family.id != type) continue;
    if (!family.present || family.handler == nullptr) return false;
    *handler = family.handler;
    Fault* applied = nullptr;
    auto command_fault = family.command_faults.find(cmd);
    if (command_fault != family.command_faults.end()) {
      applied = &command_fault->second;
    } else if (family.fault) {
      applied = &*family.fault;
    }
    if (applied != nullptr) {
      *fault = *applied;
      if (applied->count > 0 && --applied->count == 0) {
        if (command_fault != family.command_faults.end()) {
          family.command_faults.erase(command_fault);
        } else {
          family.fault.reset();
        }
      }
    }
    return true;
  }
  return false;
}

bool DriverSimulator::SendMessage(uint32_t port, const nlmsghdr* header) {
  return SendRaw(port, header, header->nlmsg_len);
}

void DriverSimulator::SendError(uint32_t port, const nlmsghdr* request, int error) {
  struct {
    nlmsghdr header;
    nlmsgerr error;
  } message = {};
  message.header.nlmsg_len = sizeof(message);
  message.header.nlmsg_type = NLMSG_ERROR;
  message.header.nlmsg_seq = request->nlmsg_seq;
  message.header.nlmsg_pid = port;
  message.error.error = error;
  message.error.msg = *request;
  SendRaw(port, &message, sizeof(message));
}

void DriverSimulator::SendDone(uint32_t port, const nlmsghdr* request) {
  struct {
    nlmsghdr header;
    int32_t status;
  } message = {};
  message.header.nlmsg_len = sizeof(message);
  message.header.nlmsg_type = NLMSG_DONE;
  message.header.nlmsg_flags = NLM_F_MULTI;
  message.header.nlmsg_seq = request->nlmsg_seq;
  message.header.nlmsg_pid = port;
  SendRaw(port, &message, sizeof(message));
}

void DriverSimulator::SendMalformedReply(Responder& responder, uint8_t cmd) {
  UniqueNlMsg reply = responder.NewReply(cmd);
  // Keep the command byte, so the reply is taken for the awaited one, and cut
  // the rest of the generic netlink header off.
  nlmsg_hdr(reply.get())->nlmsg_len = NLMSG_HDRLEN + 1;
  responder.Reply(reply.get());
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
