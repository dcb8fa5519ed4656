#include "sim/driver_simulator.h"

#include <sys/socket.h>
#include <sys/time.h>

#include <cerrno>
#include <cstring>
#include <functional>
#include <vector>

#include <android-base/unique_fd.h>
#include <gtest/gtest.h>
#include <linux/genetlink.h>
#include <netlink/attr.h>
#include <netlink/genl/ctrl.h>
#include <netlink/genl/genl.h>

#include "sim/test_family.h"
#include "sim/test_family_defs.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

using android::base::unique_fd;

constexpr uint32_t kClientPort = 4242;

UniqueNlMsg NewRequest(int type, uint8_t cmd, int flags, uint32_t seq) {
  UniqueNlMsg msg;
  genlmsg_put(msg.get(), kClientPort, seq, type, 0, NLM_F_REQUEST | flags, cmd,
              kTestFamilyVersion);
  return msg;
}

// A bare netlink client, so that every datagram the simulator sends can be
// checked as it is on the wire, without libnl's interpretation.
class DriverSimulatorTest : public ::testing::Test {
 protected:
  void SetUp() override {
    family_id_ = simulator_.RegisterFamily(kTestFamilyName, &family_);
    ASSERT_TRUE(simulator_.Start());
    client_.reset(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_USERSOCK));
    ASSERT_GE(client_.get(), 0);
    sockaddr_nl local = {};
    local.nl_family = AF_NETLINK;
    local.nl_pid = kClientPort;
    ASSERT_EQ(0, bind(client_.get(), reinterpret_cast<sockaddr*>(&local), sizeof(local)));
    timeval timeout = {1, 0};
    setsockopt(client_.get(), SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof(timeout));
  }

  void Send(nl_msg* msg) {
    sockaddr_nl peer = {};
    peer.nl_family = AF_NETLINK;
    peer.nl_pid = simulator_.port();
    nlmsghdr* header = nlmsg_hdr(msg);
    ASSERT_EQ(static_cast<ssize_t>(header->nlmsg_len),
              sendto(client_.get(), header, header->nlmsg_len, 0,
                     reinterpret_cast<sockaddr*>(&peer), sizeof(peer)));
  }

  // One datagram, or an empty vector after the one-second timeout.
  std::vector<uint8_t> Receive() {
    std::vector<uint8_t> datagram(8192);
    ssize_t size = recv(client_.get(), datagram.data(), datagram.size(), 0);
    datagram.resize(size < 0 ? 0 : size);
    return datagram;
  }

  static const nlmsghdr* Header(const std::vector<uint8_t>& datagram) {
    return reinterpret_cast<const nlmsghdr*>(datagram.data());
  }

  static const genlmsghdr* Genl(const std::vector<uint8_t>& datagram) {
    return static_cast<const genlmsghdr*>(NLMSG_DATA(Header(datagram)));
  }

  static const nlmsgerr* Error(const std::vector<uint8_t>& datagram) {
    return static_cast<const nlmsgerr*>(NLMSG_DATA(Header(datagram)));
  }

  static uint32_t ValueOf(const std::vector<uint8_t>& datagram) {
    nlattr* attrs[kTestAttrMax + 1];
    if (genlmsg_parse(const_cast<nlmsghdr*>(Header(datagram)), 0, attrs, kTestAttrMax,
                      kTestPolicy) < 0 ||
        !attrs[kTestAttrValue]) {
      ADD_FAILURE() << "no value in the message";
      return 0;
    }
    return nla_get_u32(attrs[kTestAttrValue]);
  }

  void ExpectAck(const std::vector<uint8_t>& datagram, uint32_t seq) {
    ASSERT_EQ(36u, datagram.size());
    EXPECT_EQ(NLMSG_ERROR, Header(datagram)->nlmsg_type);
    EXPECT_EQ(0, Error(datagram)->error);
    EXPECT_EQ(seq, Error(datagram)->msg.nlmsg_seq);
  }

  // What the simulator sent before is all there was: the next datagram
  // answers a fresh request, so nothing was held back or sent twice.
  void ExpectNothingMore() {
    UniqueNlMsg probe = NewRequest(family_id_, kTestCmdGet, 0, kProbeSeq);
    Send(probe.get());
    std::vector<uint8_t> next = Receive();
    ASSERT_FALSE(next.empty());
    EXPECT_EQ(kProbeSeq, Header(next)->nlmsg_seq) << "type " << Header(next)->nlmsg_type;
  }

  static constexpr uint32_t kProbeSeq = 999;

  TestFamily family_{&simulator_};
  DriverSimulator simulator_;
  int family_id_ = -1;
  unique_fd client_;
};

TEST_F(DriverSimulatorTest, ReplyThenSeparateAck) {
  UniqueNlMsg set = NewRequest(family_id_, kTestCmdSet, NLM_F_ACK, 6);
  nla_put_u32(set.get(), kTestAttrValue, 1234);
  Send(set.get());
  ExpectAck(Receive(), 6);

  UniqueNlMsg get = NewRequest(family_id_, kTestCmdGet, NLM_F_ACK, 7);
  Send(get.get());
  std::vector<uint8_t> reply = Receive();
  ASSERT_FALSE(reply.empty());
  EXPECT_EQ(family_id_, Header(reply)->nlmsg_type);
  EXPECT_EQ(7u, Header(reply)->nlmsg_seq);
  EXPECT_EQ(kClientPort, Header(reply)->nlmsg_pid);
  EXPECT_EQ(0, Header(reply)->nlmsg_flags & NLM_F_MULTI);
  EXPECT_EQ(reply.size(), Header(reply)->nlmsg_len);
  EXPECT_EQ(kTestCmdValue, Genl(reply)->cmd);
  EXPECT_EQ(1234u, ValueOf(reply));
  ExpectAck(Receive(), 7);
  ExpectNothingMore();
}

TEST_F(DriverSimulatorTest, NoAckUnlessAsked) {
  UniqueNlMsg set = NewRequest(family_id_, kTestCmdSet, 0, 3);
  nla_put_u32(set.get(), kTestAttrValue, 5);
  Send(set.get());
  ExpectNothingMore();
}

struct RefusalCase {
  const char* name;
  int error;
  // Sets the simulator up and returns the request to send.
  std::function<UniqueNlMsg(DriverSimulator&, int family_id)> prepare;
};

class DriverSimulatorRefusalTest : public DriverSimulatorTest,
                                   public ::testing::WithParamInterface<RefusalCase> {};

TEST_P(DriverSimulatorRefusalTest, ErrorEchoesHeaderAndEndsTheAnswer) {
  UniqueNlMsg request = GetParam().prepare(simulator_, family_id_);
  nlmsghdr sent = *nlmsg_hdr(request.get());
  Send(request.get());

  std::vector<uint8_t> answer = Receive();
  ASSERT_EQ(36u, answer.size());
  EXPECT_EQ(NLMSG_ERROR, Header(answer)->nlmsg_type);
  EXPECT_EQ(sent.nlmsg_seq, Header(answer)->nlmsg_seq);
  EXPECT_EQ(-GetParam().error, Error(answer)->error);
  EXPECT_EQ(0, std::memcmp(&sent, &Error(answer)->msg, sizeof(sent)));
  simulator_.ClearFaults();
  simulator_.SetFamilyPresent(kTestFamilyName, true);
  ExpectNothingMore();
}

INSTANTIATE_TEST_SUITE_P(
    Refusals, DriverSimulatorRefusalTest,
    ::testing::Values(
        RefusalCase{"UnknownFamily", ENOENT,
                    [](DriverSimulator&, int family_id) {
                      return NewRequest(family_id + 1, kTestCmdGet, NLM_F_ACK, 11);
                    }},
        RefusalCase{"FamilyGone", ENOENT,
                    [](DriverSimulator& simulator, int family_id) {
                      simulator.SetFamilyPresent(kTestFamilyName, false);
                      return NewRequest(family_id, kTestCmdGet, NLM_F_ACK, 12);
                    }},
        RefusalCase{"RefusedByFamily", EINVAL,
                    [](DriverSimulator&, int family_id) {
                      // A set without its value.
                      return NewRequest(family_id, kTestCmdSet, NLM_F_ACK, 13);
                    }},
        RefusalCase{"UnknownCommand", EOPNOTSUPP,
                    [](DriverSimulator&, int family_id) {
                      return NewRequest(family_id, 77, 0, 14);
                    }},
        RefusalCase{"ErrorFault", EBUSY,
                    [](DriverSimulator& simulator, int family_id) {
                      Fault fault;
                      fault.kind = Fault::Kind::kError;
                      fault.error = EBUSY;
                      simulator.SetFault(kTestFamilyName, fault);
                      return NewRequest(family_id, kTestCmdGet, NLM_F_ACK, 15);
                    }},
        RefusalCase{"NoGenericHeader", EINVAL,
                    [](DriverSimulator&, int family_id) {
                      UniqueNlMsg msg;
                      nlmsg_put(msg.get(), kClientPort, 16, family_id, 0,
                                NLM_F_REQUEST | NLM_F_ACK);
                      return msg;
                    }}),
    [](const ::testing::TestParamInfo<RefusalCase>& info) { return info.param.name; });

TEST_F(DriverSimulatorTest, DumpIsMultipartThenDoneWithoutAck) {
  UniqueNlMsg request = NewRequest(family_id_, kTestCmdList, NLM_F_DUMP | NLM_F_ACK, 21);
  nla_put_u32(request.get(), kTestAttrCount, 3);
  Send(request.get());

  for (uint32_t i = 1; i <= 3; ++i) {
    std::vector<uint8_t> entry = Receive();
    ASSERT_FALSE(entry.empty());
    EXPECT_EQ(family_id_, Header(entry)->nlmsg_type);
    EXPECT_EQ(NLM_F_MULTI, Header(entry)->nlmsg_flags & NLM_F_MULTI);
    EXPECT_EQ(21u, Header(entry)->nlmsg_seq);
    EXPECT_EQ(i, ValueOf(entry));
  }
  std::vector<uint8_t> done = Receive();
  ASSERT_FALSE(done.empty());
  EXPECT_EQ(NLMSG_DONE, Header(done)->nlmsg_type);
  EXPECT_EQ(21u, Header(done)->nlmsg_seq);
  ExpectNothingMore();
}

TEST_F(DriverSimulatorTest, EventsFollowTheAckWithSequenceZero) {
  UniqueNlMsg request = NewRequest(family_id_, kTestCmdSubscribe, NLM_F_ACK, 31);
  nla_put_u32(request.get(), kTestAttrCount, 2);
  Send(request.get());

  ExpectAck(Receive(), 31);
  for (uint32_t i = 1; i <= 2; ++i) {
    std::vector<uint8_t> event = Receive();
    ASSERT_FALSE(event.empty());
    EXPECT_EQ(0u, Header(event)->nlmsg_seq);
    EXPECT_EQ(kTestCmdValue, Genl(event)->cmd);
    EXPECT_EQ(i, ValueOf(event));
  }
}

TEST_F(DriverSimulatorTest, ControllerResolvesPresentFamiliesOnly) {
  auto get_family = [this](const char* name, uint32_t seq) {
    UniqueNlMsg request;
    genlmsg_put(request.get(), kClientPort, seq, GENL_ID_CTRL, 0, NLM_F_REQUEST | NLM_F_ACK,
                CTRL_CMD_GETFAMILY, 1);
    nla_put_string(request.get(), CTRL_ATTR_FAMILY_NAME, name);
    Send(request.get());
  };

  get_family(kTestFamilyName, 41);
  std::vector<uint8_t> reply = Receive();
  ASSERT_FALSE(reply.empty());
  EXPECT_EQ(GENL_ID_CTRL, Header(reply)->nlmsg_type);
  EXPECT_EQ(CTRL_CMD_NEWFAMILY, Genl(reply)->cmd);
  nlattr* attrs[CTRL_ATTR_MAX + 1];
  ASSERT_EQ(0, genlmsg_parse(const_cast<nlmsghdr*>(Header(reply)), 0, attrs, CTRL_ATTR_MAX,
                             nullptr));
  ASSERT_TRUE(attrs[CTRL_ATTR_FAMILY_ID] && attrs[CTRL_ATTR_FAMILY_NAME]);
  EXPECT_EQ(family_id_, nla_get_u16(attrs[CTRL_ATTR_FAMILY_ID]));
  EXPECT_STREQ(kTestFamilyName, nla_get_string(attrs[CTRL_ATTR_FAMILY_NAME]));
  ExpectAck(Receive(), 41);

  get_family("absent", 42);
  std::vector<uint8_t> unknown = Receive();
  ASSERT_EQ(36u, unknown.size());
  EXPECT_EQ(-ENOENT, Error(unknown)->error);

  simulator_.SetFamilyPresent(kTestFamilyName, false);
  get_family(kTestFamilyName, 43);
  std::vector<uint8_t> gone = Receive();
  ASSERT_EQ(36u, gone.size());
  EXPECT_EQ(-ENOENT, Error(gone)->error);
  simulator_.SetFamilyPresent(kTestFamilyName, true);
  ExpectNothingMore();
}

TEST_F(DriverSimulatorTest, NoAnswerFaultSwallowsTheRequest) {
  Fault fault;
  fault.kind = Fault::Kind::kNoAnswer;
  fault.count = 1;
  simulator_.SetFault(kTestFamilyName, fault);
  UniqueNlMsg request = NewRequest(family_id_, kTestCmdGet, NLM_F_ACK, 51);
  Send(request.get());
  // The fault was used up by that request; the probe is answered first.
  ExpectNothingMore();
}

TEST_F(DriverSimulatorTest, AckOnlyFaultAcksEvenWithoutTheFlag) {
  Fault fault;
  fault.kind = Fault::Kind::kAckOnly;
  fault.count = 1;
  simulator_.SetFault(kTestFamilyName, fault);
  UniqueNlMsg request = NewRequest(family_id_, kTestCmdGet, 0, 52);
  Send(request.get());
  ExpectAck(Receive(), 52);
  ExpectNothingMore();
}

TEST_F(DriverSimulatorTest, OtherCommandFaultPrecedesTheRealReply) {
  Fault fault;
  fault.kind = Fault::Kind::kOtherCommandFirst;
  fault.other_command = kTestCmdList;
  simulator_.SetCommandFault(kTestFamilyName, kTestCmdGet, fault);
  UniqueNlMsg request = NewRequest(family_id_, kTestCmdGet, NLM_F_ACK, 53);
  Send(request.get());

  std::vector<uint8_t> other = Receive();
  ASSERT_FALSE(other.empty());
  EXPECT_EQ(kTestCmdList, Genl(other)->cmd);
  EXPECT_EQ(53u, Header(other)->nlmsg_seq);
  std::vector<uint8_t> reply = Receive();
  ASSERT_FALSE(reply.empty());
  EXPECT_EQ(kTestCmdValue, Genl(reply)->cmd);
  ExpectAck(Receive(), 53);
}

TEST_F(DriverSimulatorTest, MalformedFaultCutsTheGenericHeader) {
  Fault fault;
  fault.kind = Fault::Kind::kMalformed;
  fault.count = 1;
  simulator_.SetCommandFault(kTestFamilyName, kTestCmdGet, fault);
  UniqueNlMsg request = NewRequest(family_id_, kTestCmdGet, NLM_F_ACK, 54);
  Send(request.get());

  std::vector<uint8_t> reply = Receive();
  ASSERT_GE(reply.size(), NLMSG_HDRLEN + 1u);
  EXPECT_EQ(NLMSG_HDRLEN + 1u, Header(reply)->nlmsg_len);
  EXPECT_EQ(kTestCmdGet, Genl(reply)->cmd);
  nlattr* attrs[kTestAttrMax + 1];
  EXPECT_LT(genlmsg_parse(const_cast<nlmsghdr*>(Header(reply)), 0, attrs, kTestAttrMax,
                          kTestPolicy),
            0);
  ExpectAck(Receive(), 54);
  ExpectNothingMore();
}

TEST_F(DriverSimulatorTest, CommandFaultTakesPrecedenceAndOthersUseTheFamilyFault) {
  Fault family_fault;
  family_fault.kind = Fault::Kind::kError;
  family_fault.error = EPERM;
  simulator_.SetFault(kTestFamilyName, family_fault);
  Fault command_fault;
  command_fault.kind = Fault::Kind::kError;
  command_fault.error = EBUSY;
  simulator_.SetCommandFault(kTestFamilyName, kTestCmdGet, command_fault);

  UniqueNlMsg get = NewRequest(family_id_, kTestCmdGet, NLM_F_ACK, 61);
  Send(get.get());
  EXPECT_EQ(-EBUSY, Error(Receive())->error);
  UniqueNlMsg set = NewRequest(family_id_, kTestCmdSet, NLM_F_ACK, 62);
  Send(set.get());
  EXPECT_EQ(-EPERM, Error(Receive())->error);

  simulator_.ClearFaults();
  ExpectNothingMore();
}

TEST_F(DriverSimulatorTest, RepliesGoToEachSender) {
  unique_fd other(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_USERSOCK));
  sockaddr_nl local = {};
  local.nl_family = AF_NETLINK;
  local.nl_pid = kClientPort + 1;
  ASSERT_EQ(0, bind(other.get(), reinterpret_cast<sockaddr*>(&local), sizeof(local)));
  sockaddr_nl peer = {};
  peer.nl_family = AF_NETLINK;
  peer.nl_pid = simulator_.port();
  UniqueNlMsg request = NewRequest(family_id_, kTestCmdGet, NLM_F_ACK, 71);
  nlmsghdr* header = nlmsg_hdr(request.get());
  ASSERT_GT(sendto(other.get(), header, header->nlmsg_len, 0,
                   reinterpret_cast<sockaddr*>(&peer), sizeof(peer)),
            0);

  std::vector<uint8_t> reply(8192);
  ssize_t size = recv(other.get(), reply.data(), reply.size(), 0);
  ASSERT_GT(size, 0);
  EXPECT_EQ(71u, Header(reply)->nlmsg_seq);
  ExpectNothingMore();
}

TEST_F(DriverSimulatorTest, StoppedSimulatorRefusesConnectionsAndRestarts) {
  simulator_.Stop();
  EXPECT_FALSE(simulator_.IsRunning());
  UniqueNlMsg request = NewRequest(family_id_, kTestCmdGet, NLM_F_ACK, 81);
  sockaddr_nl peer = {};
  peer.nl_family = AF_NETLINK;
  peer.nl_pid = simulator_.port();
  nlmsghdr* header = nlmsg_hdr(request.get());
  EXPECT_EQ(-1, sendto(client_.get(), header, header->nlmsg_len, 0,
                       reinterpret_cast<sockaddr*>(&peer), sizeof(peer)));
  EXPECT_EQ(ECONNREFUSED, errno);

  ASSERT_TRUE(simulator_.Start());
  ExpectNothingMore();
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
  for (uint32_t expected = 1; expected <= 3; ++expected) {
    std::vector<uint8_t> event = Receive();
    ASSERT_FALSE(event.empty());
    EXPECT_EQ(expected, ValueOf(event));
  }
}

TEST_F(DriverSimulatorTest, EventToAnUnboundPortIsDropped) {
  UniqueNlMsg event = DriverSimulator::NewEvent(family_id_, kTestCmdValue);
  EXPECT_FALSE(simulator_.SendEvent(kClientPort + 2, event.get()));
}

TEST_F(DriverSimulatorTest, RegistrationKeepsIdsStable) {
  TestFamily other(&simulator_);
  int other_id = simulator_.RegisterFamily("other", &other);
  EXPECT_NE(family_id_, other_id);
  EXPECT_EQ(other_id, simulator_.FamilyId("other"));
  EXPECT_EQ(family_id_, simulator_.RegisterFamily(kTestFamilyName, &family_));
  EXPECT_EQ(-1, simulator_.FamilyId("absent"));
  simulator_.Stop();
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
