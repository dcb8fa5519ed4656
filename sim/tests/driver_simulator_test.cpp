#include "sim/driver_simulator.h"

#include <sys/socket.h>
#include <sys/time.h>

#include <cerrno>
#include <cstring>
#include <deque>
#include <vector>

#include <android-base/unique_fd.h>
#include <gtest/gtest.h>
#include <netlink/attr.h>
#include <netlink/genl/genl.h>

#include "sim/test_family.h"
#include "sim/test_family_defs.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

constexpr uint32_t kClientPort = 4242;
constexpr uint32_t kProbeSeq = 999;

// One message the simulator must send: an acknowledgement or a refusal
// (NLMSG_ERROR, |value| its errno), NLMSG_DONE, or a kTestCmdValue message of
// the family (|type| its id) holding |value|.
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

  // Sends a request of |cmd| to |type|, with |attr| set to |value| unless it is 0.
  void Send(int type, int cmd, int flags, uint32_t seq, int attr = 0, uint32_t value = 0) {
    UniqueNlMsg msg;
    genlmsg_put(msg.get(), kClientPort, seq, type, 0, flags | NLM_F_REQUEST, cmd,
                kTestFamilyVersion);
    if (attr != 0) nla_put_u32(msg.get(), attr, value);
    nlmsghdr* header = nlmsg_hdr(msg.get());
    sent_ = *header;
    sockaddr_nl peer = {AF_NETLINK, 0, simulator_.port(), 0};
    ASSERT_EQ(sendto(client_.get(), header, header->nlmsg_len, 0,
                     reinterpret_cast<sockaddr*>(&peer), sizeof(peer)),
              header->nlmsg_len);
  }

  // The next message, taken from the datagram in hand or a newly received
  // one; an empty vector after the one-second timeout.
  std::vector<uint8_t> ReceiveMessage() {
    if (pending_.empty()) {
      std::vector<uint8_t> datagram(8192);
      int size = static_cast<int>(recv(client_.get(), datagram.data(), datagram.size(), 0));
      ++datagrams_;
      for (auto* header = reinterpret_cast<nlmsghdr*>(datagram.data());
           size > 0 && nlmsg_ok(header, size); header = nlmsg_next(header, &size)) {
        const auto* bytes = reinterpret_cast<const uint8_t*>(header);
        pending_.emplace_back(bytes, bytes + header->nlmsg_len);
      }
      if (pending_.empty()) return {};
    }
    std::vector<uint8_t> message = std::move(pending_.front());
    pending_.pop_front();
    return message;
  }

  void Expect(const std::vector<uint8_t>& message, const Want& want) {
    ASSERT_GE(message.size(), NLMSG_HDRLEN);
    const auto* header = reinterpret_cast<const nlmsghdr*>(message.data());
    EXPECT_EQ(message.size(), header->nlmsg_len);
    EXPECT_EQ(want.type, header->nlmsg_type);
    EXPECT_EQ(want.seq, header->nlmsg_seq);
    EXPECT_EQ(want.multi ? NLM_F_MULTI : 0, header->nlmsg_flags & NLM_F_MULTI);
    if (want.type == NLMSG_ERROR) {
      ASSERT_EQ(NLMSG_LENGTH(sizeof(nlmsgerr)), message.size());
      // The request's header comes back, never its payload, and the flag says so.
      EXPECT_EQ(NLM_F_CAPPED, header->nlmsg_flags & NLM_F_CAPPED);
      const auto* error = static_cast<const nlmsgerr*>(NLMSG_DATA(header));
      EXPECT_EQ(-static_cast<int>(want.value), error->error);
      EXPECT_EQ(0, std::memcmp(&sent_, &error->msg, sizeof(sent_)));
    } else if (want.type == family_id_) {
      auto* reply = const_cast<nlmsghdr*>(header);
      EXPECT_EQ(kTestCmdValue, genlmsg_hdr(reply)->cmd);
      if (want.seq != 0) {  // a reply: the family's version, not the request's
        EXPECT_EQ(kTestFamilyVersion + 2, genlmsg_hdr(reply)->version);
      }
      nlattr* value = nlmsg_find_attr(reply, GENL_HDRLEN, kTestAttrValue);
      ASSERT_TRUE(value != nullptr && nla_len(value) == sizeof(uint32_t));
      EXPECT_EQ(want.value, nla_get_u32(value));
      // Replies go to the requester's port; events come with sequence 0.
      EXPECT_EQ(want.seq == 0 ? 0 : kClientPort, header->nlmsg_pid);
    }
  }

  TestFamily family_{&simulator_};
  DriverSimulator simulator_;
  std::deque<std::vector<uint8_t>> pending_;
  int datagrams_ = 0;
  int family_id_ = -1;
  nlmsghdr sent_ = {};
  android::base::unique_fd client_;
};

TEST_F(DriverSimulatorTest, AnswersAndRefusesAsTheKernelDoes) {
  const int id = family_id_;
  const struct {
    const char* name;
    bool family_gone;
    int type, cmd, flags;
    uint32_t seq;
    int attr;  // none when 0
    uint32_t value;
    std::vector<Want> answer;
    int datagrams;
    size_t dump_datagram_bytes = DriverSimulator::kDefaultDumpDatagramBytes;
  } kCases[] = {
      // clang-format off
      {"no ack unless asked", false, id, kTestCmdSet, 0, 6, kTestAttrValue, 1234, {}, 0},
      {"reply then a separate ack", false, id, kTestCmdGet, NLM_F_ACK, 7, 0, 0,
       {{id, 7, 1234}, {NLMSG_ERROR, 7}}, 2},
      {"dump packed with its done, no ack", false, id, kTestCmdList, NLM_F_DUMP | NLM_F_ACK, 21,
       kTestAttrCount, 2, {{id, 21, 1, true}, {id, 21, 2, true}, {NLMSG_DONE, 21, 0, true}}, 1},
      {"dump one message a datagram", false, id, kTestCmdList, NLM_F_DUMP, 22, kTestAttrCount, 2,
       {{id, 22, 1, true}, {id, 22, 2, true}, {NLMSG_DONE, 22, 0, true}}, 3, 0},
      // A refusal ends the answer: no acknowledgement follows it.
      {"unknown family", false, id + 1, kTestCmdGet, 0, 11, 0, 0, {{NLMSG_ERROR, 11, ENOENT}}, 1},
      {"family gone", true, id, kTestCmdGet, NLM_F_ACK, 12, 0, 0, {{NLMSG_ERROR, 12, ENOENT}}, 1},
      {"unknown command", false, id, 77, 0, 14, 0, 0, {{NLMSG_ERROR, 14, EOPNOTSUPP}}, 1},
      // clang-format on
  };
  for (const auto& request : kCases) {
    SCOPED_TRACE(request.name);
    simulator_.SetFamilyPresent(kTestFamilyName, !request.family_gone);
    simulator_.SetDumpDatagramBytes(request.dump_datagram_bytes);
    Send(request.type, request.cmd, request.flags, request.seq, request.attr, request.value);
    datagrams_ = 0;
    for (const Want& want : request.answer) Expect(ReceiveMessage(), want);
    EXPECT_EQ(request.datagrams, datagrams_);
    EXPECT_TRUE(pending_.empty());
    simulator_.SetFamilyPresent(kTestFamilyName, true);
    // The next message answers a fresh request, so nothing before it was held
    // back or sent twice.
    Send(family_id_, kTestCmdGet, 0, kProbeSeq);
    std::vector<uint8_t> next = ReceiveMessage();
    ASSERT_FALSE(next.empty());
    const auto* header = reinterpret_cast<const nlmsghdr*>(next.data());
    EXPECT_EQ(kProbeSeq, header->nlmsg_seq) << "type " << header->nlmsg_type;
  }
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
