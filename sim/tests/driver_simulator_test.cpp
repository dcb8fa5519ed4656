#include "sim/driver_simulator.h"

#include <sys/socket.h>
#include <sys/time.h>

#include <cerrno>
#include <cstring>
#include <deque>
#include <functional>
#include <string>
#include <vector>

#include <android-base/unique_fd.h>
#include <gtest/gtest.h>
#include <netlink/attr.h>
#include <netlink/genl/genl.h>

#include "sim/test_family.h"
#include "sim/test_family_defs.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

constexpr uint32_t kClientPort = 4242;
constexpr uint32_t kProbeSeq = 999;
constexpr size_t kErrorSize = NLMSG_LENGTH(sizeof(nlmsgerr));
// Stands for the test family's id in expectations.
constexpr int kFamily = -1;

UniqueNlMsg NewRequest(int type, uint8_t cmd, int flags, uint32_t seq) {
  UniqueNlMsg msg;
  genlmsg_put(msg.get(), kClientPort, seq, type, 0, NLM_F_REQUEST | flags, cmd, kTestFamilyVersion);
  return msg;
}

const nlmsghdr* Header(const std::vector<uint8_t>& datagram) {
  return reinterpret_cast<const nlmsghdr*>(datagram.data());
}

const nlmsgerr* Error(const std::vector<uint8_t>& datagram) {
  return static_cast<const nlmsgerr*>(NLMSG_DATA(Header(datagram)));
}

// One datagram the simulator must send: an acknowledgement (NLMSG_ERROR),
// NLMSG_DONE, or a kTestCmdValue message of the family holding |value|.
struct Want {
  int type;
  uint32_t seq;
  uint32_t value = 0;
  bool multi = false;
};

// A bare netlink client, so that every datagram the simulator sends is
// checked as it is on the wire, without libnl's interpretation.
class DriverSimulatorTest : public ::testing::Test {
 protected:
  void SetUp() override {
    // A version of its own, unlike the requests', so an echo would show.
    family_id_ = simulator_.RegisterFamily(kTestFamilyName, &family_, kTestFamilyVersion + 2);
    ASSERT_TRUE(simulator_.Start());
    client_.reset(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_USERSOCK));
    sockaddr_nl local = {AF_NETLINK, 0, kClientPort, 0};
    ASSERT_EQ(0, bind(client_.get(), reinterpret_cast<sockaddr*>(&local), sizeof(local)));
    timeval timeout = {1, 0};
    setsockopt(client_.get(), SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof(timeout));
  }

  ssize_t Send(nl_msg* msg) {
    sockaddr_nl peer = {AF_NETLINK, 0, simulator_.port(), 0};
    nlmsghdr* header = nlmsg_hdr(msg);
    return sendto(client_.get(), header, header->nlmsg_len, 0, reinterpret_cast<sockaddr*>(&peer),
                  sizeof(peer));
  }

  // One datagram, or an empty vector after the one-second timeout.
  std::vector<uint8_t> Receive() {
    std::vector<uint8_t> datagram(8192);
    ssize_t size = recv(client_.get(), datagram.data(), datagram.size(), 0);
    datagram.resize(size < 0 ? 0 : size);
    return datagram;
  }

  // The next message, taken from the datagram in hand or a newly received
  // one; an empty vector after the one-second timeout.
  std::vector<uint8_t> ReceiveMessage() {
    if (pending_.empty()) {
      std::vector<uint8_t> datagram = Receive();
      ++datagrams_;
      auto* header = reinterpret_cast<nlmsghdr*>(datagram.data());
      int remaining = static_cast<int>(datagram.size());
      for (; nlmsg_ok(header, remaining); header = nlmsg_next(header, &remaining)) {
        const auto* bytes = reinterpret_cast<const uint8_t*>(header);
        pending_.emplace_back(bytes, bytes + header->nlmsg_len);
      }
      if (pending_.empty()) return {};
    }
    std::vector<uint8_t> message = std::move(pending_.front());
    pending_.pop_front();
    return message;
  }

  void Expect(const std::vector<uint8_t>& datagram, const Want& want) {
    ASSERT_GE(datagram.size(), NLMSG_HDRLEN);
    const nlmsghdr* header = Header(datagram);
    EXPECT_EQ(datagram.size(), header->nlmsg_len);
    EXPECT_EQ(want.type == kFamily ? family_id_ : want.type, header->nlmsg_type);
    EXPECT_EQ(want.seq, header->nlmsg_seq);
    EXPECT_EQ(want.multi ? NLM_F_MULTI : 0, header->nlmsg_flags & NLM_F_MULTI);
    if (want.type == NLMSG_ERROR) {
      ASSERT_EQ(kErrorSize, datagram.size());
      // The request's payload is never echoed, and the flag says so.
      EXPECT_EQ(NLM_F_CAPPED, header->nlmsg_flags & NLM_F_CAPPED);
      EXPECT_EQ(0, Error(datagram)->error);
      EXPECT_EQ(want.seq, Error(datagram)->msg.nlmsg_seq);
    } else if (want.type == kFamily) {
      nlattr* attrs[kTestAttrMax + 1];
      ASSERT_EQ(0,
                genlmsg_parse(const_cast<nlmsghdr*>(header), 0, attrs, kTestAttrMax, kTestPolicy));
      EXPECT_EQ(kTestCmdValue, genlmsg_hdr(const_cast<nlmsghdr*>(header))->cmd);
      if (want.seq != 0) {  // a reply: the family's version, not the request's
        EXPECT_EQ(kTestFamilyVersion + 2, genlmsg_hdr(const_cast<nlmsghdr*>(header))->version);
      }
      ASSERT_NE(nullptr, attrs[kTestAttrValue]);
      EXPECT_EQ(want.value, nla_get_u32(attrs[kTestAttrValue]));
      // Replies go to the requester's port; events come with sequence 0.
      EXPECT_EQ(want.seq == 0 ? 0 : kClientPort, header->nlmsg_pid);
    }
  }

  // The next datagram answers a fresh request, so nothing before it was held
  // back or sent twice.
  void ExpectNothingMore() {
    UniqueNlMsg probe = NewRequest(family_id_, kTestCmdGet, 0, kProbeSeq);
    Send(probe.get());
    std::vector<uint8_t> next = Receive();
    ASSERT_FALSE(next.empty());
    EXPECT_EQ(kProbeSeq, Header(next)->nlmsg_seq) << "type " << Header(next)->nlmsg_type;
  }

  TestFamily family_{&simulator_};
  DriverSimulator simulator_;
  std::deque<std::vector<uint8_t>> pending_;
  int datagrams_ = 0;
  int family_id_ = -1;
  android::base::unique_fd client_;
};

TEST_F(DriverSimulatorTest, AnswersAsTheKernelDoes) {
  const struct {
    const char* name;
    uint8_t cmd;
    int flags;
    uint32_t seq;
    int attr;  // none when 0
    uint32_t value;
    std::vector<Want> answer;
    int datagrams;
    size_t dump_datagram_bytes = DriverSimulator::kDefaultDumpDatagramBytes;
  } kCases[] = {
      // clang-format off
      {"no ack unless asked", kTestCmdSet, 0, 6, kTestAttrValue, 1234, {}, 0},
      {"reply then a separate ack", kTestCmdGet, NLM_F_ACK, 7, 0, 0,
       {{kFamily, 7, 1234}, {NLMSG_ERROR, 7}}, 2},
      {"dump packed with its done, no ack", kTestCmdList, NLM_F_DUMP | NLM_F_ACK, 21,
       kTestAttrCount, 2,
       {{kFamily, 21, 1, true}, {kFamily, 21, 2, true}, {NLMSG_DONE, 21, 0, true}}, 1},
      {"dump one message a datagram", kTestCmdList, NLM_F_DUMP, 22, kTestAttrCount, 2,
       {{kFamily, 22, 1, true}, {kFamily, 22, 2, true}, {NLMSG_DONE, 22, 0, true}}, 3, 0},
      {"events follow the ack", kTestCmdSubscribe, NLM_F_ACK, 31, kTestAttrCount, 2,
       {{NLMSG_ERROR, 31}, {kFamily, 0, 1}, {kFamily, 0, 2}}, 3},
      // clang-format on
  };
  for (const auto& request : kCases) {
    SCOPED_TRACE(request.name);
    simulator_.SetDumpDatagramBytes(request.dump_datagram_bytes);
    UniqueNlMsg msg = NewRequest(family_id_, request.cmd, request.flags, request.seq);
    if (request.attr != 0) nla_put_u32(msg.get(), request.attr, request.value);
    Send(msg.get());
    datagrams_ = 0;
    for (const Want& want : request.answer) Expect(ReceiveMessage(), want);
    EXPECT_EQ(request.datagrams, datagrams_);
    EXPECT_TRUE(pending_.empty());
    ExpectNothingMore();
  }
}

TEST_F(DriverSimulatorTest, RefusalsEchoTheHeaderAndEndTheAnswer) {
  auto get = [this](uint32_t seq) { return NewRequest(family_id_, kTestCmdGet, NLM_F_ACK, seq); };
  auto set = [this](uint32_t seq) { return NewRequest(family_id_, kTestCmdSet, NLM_F_ACK, seq); };
  auto both_faults = [this] {
    simulator_.SetFault(kTestFamilyName, {Fault::Kind::kError, EPERM});
    simulator_.SetCommandFault(kTestFamilyName, kTestCmdGet, {Fault::Kind::kError, EBUSY});
  };
  const struct {
    const char* name;
    int error;
    std::function<UniqueNlMsg()> prepare;
  } kCases[] = {
      // clang-format off
      {"unknown family", ENOENT, [&] { return NewRequest(family_id_ + 1, kTestCmdGet, 0, 11); }},
      {"family gone", ENOENT,
       [&] { simulator_.SetFamilyPresent(kTestFamilyName, false); return get(12); }},
      {"set without its value", EINVAL, [&] { return set(13); }},
      {"unknown command", EOPNOTSUPP, [&] { return NewRequest(family_id_, 77, 0, 14); }},
      {"command fault wins", EBUSY, [&] { both_faults(); return get(15); }},
      {"family fault for other commands", EPERM, [&] { both_faults(); return set(16); }},
      {"no generic header", EINVAL, [&] {
         UniqueNlMsg msg;
         nlmsg_put(msg.get(), kClientPort, 17, family_id_, 0, NLM_F_REQUEST | NLM_F_ACK);
         return msg;
       }},
      // clang-format on
  };
  for (const auto& refusal : kCases) {
    SCOPED_TRACE(refusal.name);
    UniqueNlMsg request = refusal.prepare();
    nlmsghdr sent = *nlmsg_hdr(request.get());
    Send(request.get());
    std::vector<uint8_t> answer = Receive();
    ASSERT_EQ(kErrorSize, answer.size());
    EXPECT_EQ(NLMSG_ERROR, Header(answer)->nlmsg_type);
    EXPECT_EQ(-refusal.error, Error(answer)->error);
    EXPECT_EQ(0, std::memcmp(&sent, &Error(answer)->msg, sizeof(sent)));
    simulator_.ClearFaults();
    simulator_.SetFamilyPresent(kTestFamilyName, true);
    ExpectNothingMore();
  }
}

// A client that closed after its answer is gone without a word, as in the
// kernel; a full receive buffer is worth a warning.
TEST_F(DriverSimulatorTest, DropsSilentlyOnlyToAPortThatIsGone) {
  LogCapture log;
  UniqueNlMsg event = DriverSimulator::NewEvent(family_id_, kTestCmdValue);
  EXPECT_FALSE(simulator_.SendEvent(kClientPort + 1, event.get()));
  EXPECT_TRUE(log.Entries().empty()) << log.Text();

  int sent = 0;
  while (simulator_.SendEvent(kClientPort, event.get()) && sent < 100000) ++sent;
  EXPECT_LT(sent, 100000);
  EXPECT_EQ(1, log.Count(android::base::WARNING, "SendRaw: message to port " +
                                                     std::to_string(kClientPort) +
                                                     " dropped: " + std::strerror(EAGAIN)))
      << log.Text();
}

TEST_F(DriverSimulatorTest, PostedTasksRunInDueOrder) {
  auto send_value = [this](uint32_t value) {
    UniqueNlMsg event = DriverSimulator::NewEvent(family_id_, kTestCmdValue);
    nla_put_u32(event.get(), kTestAttrValue, value);
    EXPECT_TRUE(simulator_.SendEvent(kClientPort, event.get()));
  };
  simulator_.Post([=] { send_value(3); }, std::chrono::milliseconds(30));
  simulator_.Post([=] { send_value(1); });
  simulator_.Post([=] { send_value(2); });
  for (uint32_t value = 1; value <= 3; ++value) Expect(Receive(), {kFamily, 0, value});
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
