#define LOG_TAG "dalix.uwb.NlSocketTest"

#include "net/nl_socket.h"

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netlink/errno.h>
#include <netlink/genl/genl.h>
#include <netlink/socket.h>

#include "looper/looper_backed_event_loop.h"
#include "net/unique_nl_msg.h"
#include "sim/driver_simulator.h"
#include "sim/fault.h"
#include "sim/sim_nl_socket.h"
#include "sim/sim_nl_socket_factory.h"
#include "sim/test_family.h"
#include "sim/test_family_defs.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using android::base::INFO;
using android::base::WARNING;
using ::testing::_;
using ::testing::DoAll;
using ::testing::Return;
using ::testing::SaveArg;
using ::testing::StrictMock;

constexpr char kTag[] = "dalix.uwb.NlSocket";

class MockEventLoop : public EventLoop {
 public:
  MOCK_METHOD(void, PostTask, (const std::function<void()>& task), (override));
  MOCK_METHOD(bool, WatchFileDescriptor,
              (int fd, ReadyMode mode, const std::function<void(int)>& callback), (override));
  MOCK_METHOD(bool, StopWatchFileDescriptor, (int fd), (override));
};

// The production socket, connected to the simulator, with its descriptor and
// port in view so that the tests can address it and match the watch.
class TestSocket : public sim::SimNlSocket {
 public:
  explicit TestSocket(EventLoop* event_loop)
      : SimNlSocket(event_loop, sim::DriverSimulator::kDefaultPort) {}
  int fd() const { return nl_socket_get_fd(sock()); }
  uint32_t port() const { return nl_socket_get_local_port(sock()); }
};

UniqueNlMsg TestRequest(int family_id, uint8_t cmd) {
  UniqueNlMsg msg;
  genlmsg_put(msg.get(), NL_AUTO_PORT, NL_AUTO_SEQ, family_id, 0, 0, cmd,
              sim::kTestFamilyVersion);
  return msg;
}

// What a handler saw of one test-family message: its command and value
// (0 when it carries none).
struct Seen {
  int cmd;
  uint32_t value;
  bool operator==(const Seen& other) const { return cmd == other.cmd && value == other.value; }
};

Seen Inspect(nl_msg* msg) {
  nlattr* attrs[sim::kTestAttrMax + 1];
  uint32_t value = 0;
  if (genlmsg_parse(nlmsg_hdr(msg), 0, attrs, sim::kTestAttrMax, sim::kTestPolicy) == 0 &&
      attrs[sim::kTestAttrValue]) {
    value = nla_get_u32(attrs[sim::kTestAttrValue]);
  }
  return {genlmsg_hdr(nlmsg_hdr(msg))->cmd, value};
}

void PrintTo(const Seen& seen, std::ostream* os) {
  *os << "{cmd " << seen.cmd << ", value " << seen.value << "}";
}

class NlSocketTest : public ::testing::Test {
 protected:
  void SetUp() override {
    family_id_ = simulator_.RegisterFamily(sim::kTestFamilyName, &family_);
    ASSERT_TRUE(simulator_.Start());
    socket_ = std::make_shared<TestSocket>(&event_loop_);
    ASSERT_TRUE(socket_->Setup());
  }

  // Stores |value| in the family through a one-shot exchange of its own.
  void StoreValue(uint32_t value) {
    UniqueNlMsg set = TestRequest(family_id_, sim::kTestCmdSet);
    nla_put_u32(set.get(), sim::kTestAttrValue, value);
    ASSERT_TRUE(factory_.SendAndAwaitAck(set.get()));
    log_.Reset();
  }

  void SetFault(sim::Fault::Kind kind, int error = 0, uint8_t other_command = 0) {
    sim::Fault fault;
    fault.kind = kind;
    fault.error = error;
    fault.other_command = other_command;
    simulator_.SetFault(sim::kTestFamilyName, fault);
  }

  // Has the family send |count| events to |socket_| once it has acknowledged.
  bool Subscribe(uint32_t count) {
    UniqueNlMsg subscribe = TestRequest(family_id_, sim::kTestCmdSubscribe);
    nla_put_u32(subscribe.get(), sim::kTestAttrCount, count);
    return socket_->SendAndAwaitAck(subscribe.get(), nullptr);
  }

  std::vector<std::string> Lines(android::base::LogSeverity severity) const {
    std::vector<std::string> lines;
    for (const LogCapture::Entry& entry : log_.Entries()) {
      if (entry.severity == severity && entry.tag == kTag) lines.push_back(entry.message);
    }
    return lines;
  }

  LogCapture log_;
  sim::TestFamily family_{&simulator_};
  sim::DriverSimulator simulator_;
  int family_id_ = -1;
  StrictMock<MockEventLoop> event_loop_;
  sim::SimNlSocketFactory factory_{&event_loop_, sim::DriverSimulator::kDefaultPort};
  std::shared_ptr<TestSocket> socket_;
};

// Both exchanges against the same answers: the request asks for the stored
// value, which the family sends as one kTestCmdValue reply.
enum class Exchange { kAck, kResponse };

struct ExchangeOutcome {
  bool result;
  std::vector<Seen> handed;
};

class NlSocketExchangeTest : public NlSocketTest,
                             public ::testing::WithParamInterface<Exchange> {
 protected:
  const char* Operation() const {
    return GetParam() == Exchange::kAck ? "SendAndAwaitAck" : "SendAndAwaitResponse";
  }

  ExchangeOutcome Run() {
    UniqueNlMsg get = TestRequest(family_id_, sim::kTestCmdGet);
    ExchangeOutcome outcome;
    if (GetParam() == Exchange::kAck) {
      outcome.result = socket_->SendAndAwaitAck(get.get(), [&outcome](nl_msg* msg) {
        outcome.handed.push_back(Inspect(msg));
        return NL_OK;
      });
    } else {
      outcome.result = socket_->SendAndAwaitResponse(
          get.get(), [&outcome](nl_msg* msg) { outcome.handed.push_back(Inspect(msg)); },
          sim::kTestCmdValue);
    }
    return outcome;
  }

  int ReadsLogged() const {
    return log_.Count(INFO, "SendAndAwaitResponse: Read message", kTag);
  }
};

TEST_P(NlSocketExchangeTest, CleanAnswer) {
  StoreValue(42);
  ExchangeOutcome outcome = Run();
  EXPECT_TRUE(outcome.result);
  EXPECT_THAT(outcome.handed, ::testing::ElementsAre(Seen{sim::kTestCmdValue, 42}));
  EXPECT_TRUE(Lines(WARNING).empty()) << log_.Text();
  if (GetParam() == Exchange::kAck) {
    EXPECT_EQ(1, log_.Count(INFO, "SendAndAwaitAck: Received ACK", kTag));
  } else {
    EXPECT_EQ(1, log_.Count(INFO, "SendAndAwaitResponse", kTag));
    EXPECT_EQ(1, ReadsLogged());
  }
}

TEST_P(NlSocketExchangeTest, ErrorAnswerFailsAfterOneRead) {
  SetFault(sim::Fault::Kind::kError, EBUSY);
  ExchangeOutcome outcome = Run();
  EXPECT_FALSE(outcome.result);
  EXPECT_TRUE(outcome.handed.empty());
  std::string op = Operation();
  // The error ends the read that carried it, and nothing is read after it.
  EXPECT_THAT(Lines(WARNING),
              ::testing::ElementsAre(op + ": Nl error: -16",
                                     op + ": Error reading message: " +
                                         nl_geterror(-nl_syserr2nlerr(EBUSY))))
      << log_.Text();
  if (GetParam() == Exchange::kResponse) {
    EXPECT_EQ(1, ReadsLogged());
  }
}

TEST_P(NlSocketExchangeTest, ReplyOfAnotherCommandFirst) {
  StoreValue(5);
  SetFault(sim::Fault::Kind::kOtherCommandFirst, 0, sim::kTestCmdList);
  ExchangeOutcome outcome = Run();
  EXPECT_TRUE(outcome.result);
  if (GetParam() == Exchange::kAck) {
    // The acknowledge exchange hands every data message to its handler.
    EXPECT_THAT(outcome.handed, ::testing::ElementsAre(Seen{sim::kTestCmdList, 0},
                                                       Seen{sim::kTestCmdValue, 5}));
  } else {
    EXPECT_THAT(outcome.handed, ::testing::ElementsAre(Seen{sim::kTestCmdValue, 5}));
    EXPECT_EQ(1, log_.Count(INFO,
                            "SendAndAwaitResponse: Incorrect received command, got 4 instead of 3",
                            kTag))
        << log_.Text();
  }
}

TEST_P(NlSocketExchangeTest, NoAnswerTimesOut) {
  SetFault(sim::Fault::Kind::kNoAnswer);
  ExchangeOutcome outcome = Run();
  EXPECT_FALSE(outcome.result);
  EXPECT_TRUE(outcome.handed.empty());
  EXPECT_THAT(Lines(WARNING), ::testing::ElementsAre(std::string(Operation()) +
                                                     ": Error reading message: " +
                                                     nl_geterror(-NLE_AGAIN)))
      << log_.Text();
}

TEST_P(NlSocketExchangeTest, FailedSend) {
  simulator_.Stop();
  ExchangeOutcome outcome = Run();
  EXPECT_FALSE(outcome.result);
  std::vector<std::string> warnings = Lines(WARNING);
  ASSERT_EQ(1u, warnings.size()) << log_.Text();
  EXPECT_THAT(warnings[0],
              ::testing::StartsWith(std::string(Operation()) + ": Error sending netlink message: "));
}

INSTANTIATE_TEST_SUITE_P(Exchanges, NlSocketExchangeTest,
                         ::testing::Values(Exchange::kAck, Exchange::kResponse),
                         [](const ::testing::TestParamInfo<Exchange>& info) {
                           return info.param == Exchange::kAck ? "Ack" : "Response";
                         });

TEST_F(NlSocketTest, AckWithoutDataSucceeds) {
  SetFault(sim::Fault::Kind::kAckOnly);
  UniqueNlMsg get = TestRequest(family_id_, sim::kTestCmdGet);
  int handed = 0;
  EXPECT_TRUE(socket_->SendAndAwaitAck(get.get(), [&handed](nl_msg*) {
    ++handed;
    return NL_OK;
  }));
  EXPECT_EQ(0, handed);
  EXPECT_EQ(1, log_.Count(INFO, "SendAndAwaitAck: Received ACK", kTag));
}

TEST_F(NlSocketTest, ExchangesFollowOneAnotherOnOneSocket) {
  for (uint32_t value : {1u, 2u, 3u}) {
    UniqueNlMsg set = TestRequest(family_id_, sim::kTestCmdSet);
    nla_put_u32(set.get(), sim::kTestAttrValue, value);
    ASSERT_TRUE(socket_->SendAndAwaitAck(set.get(), nullptr));
    UniqueNlMsg get = TestRequest(family_id_, sim::kTestCmdGet);
    uint32_t stored = 0;
    ASSERT_TRUE(socket_->SendAndAwaitResponse(
        get.get(), [&stored](nl_msg* msg) { stored = Inspect(msg).value; }, sim::kTestCmdValue));
    EXPECT_EQ(value, stored);
  }
}

TEST_F(NlSocketTest, ResolveRegisteredUnknownAndVanishedFamilies) {
  EXPECT_EQ(family_id_, socket_->Resolve(sim::kTestFamilyName));
  EXPECT_EQ(-NLE_OBJ_NOTFOUND, socket_->Resolve("no_such_family"));
  simulator_.SetFamilyPresent(sim::kTestFamilyName, false);
  EXPECT_EQ(-NLE_OBJ_NOTFOUND, socket_->Resolve(sim::kTestFamilyName));
}

TEST_F(NlSocketTest, WatchDeliversEventsThroughTheLoopCallback) {
  socket_->DisableAutoAck();
  std::function<void(int)> callback;
  // Mode 1, exactly: the loop wakes the socket as writable.
  EXPECT_CALL(event_loop_,
              WatchFileDescriptor(socket_->fd(), static_cast<EventLoop::ReadyMode>(1), _))
      .WillOnce(DoAll(SaveArg<2>(&callback), Return(true)));
  std::vector<Seen> events;
  ASSERT_TRUE(socket_->WatchNetlinkSocket(socket_, [&events](nl_msg* msg) {
    events.push_back(Inspect(msg));
    return NL_OK;
  }));
  ASSERT_TRUE(Subscribe(2));

  callback(socket_->fd());
  callback(socket_->fd());
  EXPECT_THAT(events, ::testing::ElementsAre(Seen{sim::kTestCmdValue, 1},
                                             Seen{sim::kTestCmdValue, 2}));
  EXPECT_CALL(event_loop_, StopWatchFileDescriptor(socket_->fd())).WillOnce(Return(true));
}

TEST_F(NlSocketTest, SecondWatchIsRefusedAndKeepsTheFirstHandler) {
  socket_->DisableAutoAck();
  std::function<void(int)> callback;
  EXPECT_CALL(event_loop_, WatchFileDescriptor(socket_->fd(), _, _))
      .WillOnce(DoAll(SaveArg<2>(&callback), Return(true)));
  std::vector<std::string> calls;
  ASSERT_TRUE(socket_->WatchNetlinkSocket(socket_, [&calls](nl_msg*) {
    calls.push_back("first");
    return NL_OK;
  }));
  EXPECT_FALSE(socket_->WatchNetlinkSocket(socket_, [&calls](nl_msg*) {
    calls.push_back("second");
    return NL_OK;
  }));
  ASSERT_TRUE(Subscribe(1));
  callback(socket_->fd());
  EXPECT_THAT(calls, ::testing::ElementsAre("first"));
  EXPECT_CALL(event_loop_, StopWatchFileDescriptor(socket_->fd())).WillOnce(Return(true));
}

TEST_F(NlSocketTest, WatchNeedsALiveOwner) {
  std::weak_ptr<NlSocket> empty;
  EXPECT_FALSE(socket_->WatchNetlinkSocket(empty, [](nl_msg*) { return NL_OK; }));

  std::weak_ptr<NlSocket> expired;
  {
    auto other = std::make_shared<TestSocket>(&event_loop_);
    ASSERT_TRUE(other->Setup());
    expired = other;
  }
  EXPECT_FALSE(socket_->WatchNetlinkSocket(expired, [](nl_msg*) { return NL_OK; }));
  // The strict event loop saw no call at all.
}

TEST_F(NlSocketTest, WatchWithoutDescriptorOrRefusedByTheLoop) {
  auto unconnected = std::make_shared<TestSocket>(&event_loop_);
  EXPECT_FALSE(unconnected->WatchNetlinkSocket(unconnected, [](nl_msg*) { return NL_OK; }));
  EXPECT_FALSE(unconnected->StopWatchNetlinkSocket());

  EXPECT_CALL(event_loop_, WatchFileDescriptor(socket_->fd(), _, _)).WillOnce(Return(false));
  EXPECT_FALSE(socket_->WatchNetlinkSocket(socket_, [](nl_msg*) { return NL_OK; }));
  // Not watched, so the destructor has nothing to stop.
}

TEST_F(NlSocketTest, StopThenWatchAgain) {
  ::testing::InSequence in_order;
  EXPECT_CALL(event_loop_, WatchFileDescriptor(socket_->fd(), _, _)).WillOnce(Return(true));
  EXPECT_CALL(event_loop_, StopWatchFileDescriptor(socket_->fd())).WillOnce(Return(true));
  EXPECT_CALL(event_loop_, WatchFileDescriptor(socket_->fd(), _, _)).WillOnce(Return(true));
  EXPECT_CALL(event_loop_, StopWatchFileDescriptor(socket_->fd())).WillOnce(Return(true));

  ASSERT_TRUE(socket_->WatchNetlinkSocket(socket_, [](nl_msg*) { return NL_OK; }));
  EXPECT_TRUE(socket_->StopWatchNetlinkSocket());
  EXPECT_EQ(1, log_.Count(INFO, "StopWatchNetlinkSocket", kTag));
  EXPECT_TRUE(socket_->WatchNetlinkSocket(socket_, [](nl_msg*) { return NL_OK; }));
  socket_.reset();
}

TEST_F(NlSocketTest, ReleasedSocketWarnsOnWakeUp) {
  int fd = socket_->fd();
  std::function<void(int)> callback;
  EXPECT_CALL(event_loop_, WatchFileDescriptor(fd, _, _))
      .WillOnce(DoAll(SaveArg<2>(&callback), Return(true)));
  int handled = 0;
  ASSERT_TRUE(socket_->WatchNetlinkSocket(socket_, [&handled](nl_msg*) {
    ++handled;
    return NL_OK;
  }));
  // The owner lets go; the socket's destructor stops the watch.
  EXPECT_CALL(event_loop_, StopWatchFileDescriptor(fd)).WillOnce(Return(true));
  socket_.reset();

  // A wake-up that was already on its way.
  callback(fd);
  EXPECT_EQ(0, handled);
  EXPECT_EQ(1, log_.Count(WARNING, "WatchNetlinkSocket: socket is close", kTag));
}

TEST_F(NlSocketTest, ErrorWithoutErrorHandlerStopsTheRead) {
  // Reads go through the reader's own callback set, which keeps libnl's
  // sequence check; only a socket without auto-ack takes sequence 0.
  socket_->DisableAutoAck();
  // One datagram: an unsolicited error report, then a data message.
  UniqueNlMsg batch;
  nlmsghdr* error_header = nlmsg_put(batch.get(), 0, 0, NLMSG_ERROR, sizeof(nlmsgerr), 0);
  ASSERT_NE(nullptr, error_header);
  static_cast<nlmsgerr*>(nlmsg_data(error_header))->error = -EIO;
  UniqueNlMsg event = sim::DriverSimulator::NewEvent(family_id_, sim::kTestCmdValue);
  nla_put_u32(event.get(), sim::kTestAttrValue, 1);
  std::string bytes(reinterpret_cast<char*>(error_header), NLMSG_ALIGN(error_header->nlmsg_len));
  bytes.append(reinterpret_cast<char*>(nlmsg_hdr(event.get())), nlmsg_hdr(event.get())->nlmsg_len);
  ASSERT_TRUE(simulator_.SendRaw(socket_->port(), bytes.data(), bytes.size()));

  int handled = 0;
  EXPECT_FALSE(socket_->ReceiveMessage([&handled](nl_msg*) {
    ++handled;
    return NL_OK;
  }));
  EXPECT_EQ(0, handled);
  EXPECT_EQ(1, log_.Count(WARNING,
                          std::string("ReceiveMessage: Error reading message: ") +
                              nl_geterror(-nl_syserr2nlerr(EIO)),
                          kTag))
      << log_.Text();
}

TEST_F(NlSocketTest, ReceiveMessageHandsOverOneDatagram) {
  socket_->DisableAutoAck();
  ASSERT_TRUE(Subscribe(2));
  std::vector<Seen> events;
  auto collect = [&events](nl_msg* msg) {
    events.push_back(Inspect(msg));
    return NL_OK;
  };
  ASSERT_TRUE(socket_->ReceiveMessage(collect));
  EXPECT_THAT(events, ::testing::ElementsAre(Seen{sim::kTestCmdValue, 1}));
  ASSERT_TRUE(socket_->ReceiveMessage(collect));
  EXPECT_EQ(2u, events.size());
}

// The whole path on the service's real loop: a watched socket's events reach
// the handler when the loop polls.
TEST(NlSocketLoopTest, EventsReachTheHandlerThroughTheEventLoop) {
  sim::DriverSimulator simulator;
  sim::TestFamily family(&simulator);
  int family_id = simulator.RegisterFamily(sim::kTestFamilyName, &family);
  ASSERT_TRUE(simulator.Start());
  LooperBackedEventLoop loop;
  sim::SimNlSocketFactory factory(&loop, sim::DriverSimulator::kDefaultPort);
  std::shared_ptr<NlSocket> socket = factory.Create();
  ASSERT_TRUE(socket);
  socket->DisableAutoAck();

  std::vector<Seen> events;
  ASSERT_TRUE(socket->WatchNetlinkSocket(socket, [&events](nl_msg* msg) {
    events.push_back(Inspect(msg));
    return NL_OK;
  }));
  UniqueNlMsg subscribe = TestRequest(family_id, sim::kTestCmdSubscribe);
  nla_put_u32(subscribe.get(), sim::kTestAttrCount, 3);
  ASSERT_TRUE(socket->SendAndAwaitAck(subscribe.get(), nullptr));

  for (int i = 0; i < 10 && events.size() < 3; ++i) {
    android::Looper::getForThread()->pollOnce(100, nullptr, nullptr, nullptr);
  }
  EXPECT_THAT(events, ::testing::ElementsAre(Seen{sim::kTestCmdValue, 1},
                                             Seen{sim::kTestCmdValue, 2},
                                             Seen{sim::kTestCmdValue, 3}));
  EXPECT_TRUE(socket->StopWatchNetlinkSocket());
  simulator.Stop();
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
