#define LOG_TAG "dalix.uwb.NlSocketTest"

#include "net/nl_socket.h"

#include <cstdint>
#include <memory>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netlink/errno.h>
#include <netlink/genl/genl.h>
#include <netlink/socket.h>

#include "net/unique_nl_msg.h"
#include "sim/driver_simulator.h"
#include "sim/fault.h"
#include "sim/sim_nl_socket.h"
#include "sim/sim_nl_socket_factory.h"
#include "sim/test_family.h"
#include "sim/test_family_defs.h"
#include "tests/log_capture.h"
#include "tests/mock_event_loop.h"

namespace hardware {
namespace dalix {
namespace {

using android::base::INFO;
using android::base::WARNING;
using sim::Fault;
using ::testing::_;
using ::testing::DoAll;
using ::testing::ElementsAre;
using ::testing::Return;
using ::testing::SaveArg;
using ::testing::StrictMock;

constexpr char kTag[] = "dalix.uwb.NlSocket";

// The production socket connected to the simulator, with its descriptor and
// port in view so that the tests can match the watch and address it.
class TestSocket : public sim::SimNlSocket {
 public:
  explicit TestSocket(EventLoop* event_loop)
      : SimNlSocket(event_loop, sim::DriverSimulator::kDefaultPort) {}
  int fd() const { return nl_socket_get_fd(sock()); }
  uint32_t port() const { return nl_socket_get_local_port(sock()); }
};

// A test-family message as a handler saw it: command, value (0 when none).
using Seen = std::pair<int, uint32_t>;

Seen Inspect(nl_msg* msg) {
  nlattr* attrs[sim::kTestAttrMax + 1];
  uint32_t value = 0;
  if (genlmsg_parse(nlmsg_hdr(msg), 0, attrs, sim::kTestAttrMax, sim::kTestPolicy) == 0 &&
      attrs[sim::kTestAttrValue]) {
    value = nla_get_u32(attrs[sim::kTestAttrValue]);
  }
  return {genlmsg_hdr(nlmsg_hdr(msg))->cmd, value};
}

class NlSocketTest : public ::testing::Test {
 protected:
  void SetUp() override {
    family_id_ = simulator_.RegisterFamily(sim::kTestFamilyName, &family_);
    ASSERT_TRUE(simulator_.Start());
    socket_ = std::make_shared<TestSocket>(&event_loop_);
    ASSERT_TRUE(socket_->Setup());
  }

  // A test-family request, with |attr| set to |value| unless it is 0.
  UniqueNlMsg Request(uint8_t cmd, int attr = 0, uint32_t value = 0) {
    UniqueNlMsg msg = sim::TestFamily::NewRequest(family_id_, cmd);
    if (attr != 0) nla_put_u32(msg.get(), attr, value);
    return msg;
  }

  // Lets the loop watch |socket_| (mode 1, exactly) and keeps its callback;
  // the socket's destructor stops the watch.
  void ExpectWatch() {
    EXPECT_CALL(event_loop_,
                WatchFileDescriptor(socket_->fd(), static_cast<EventLoop::ReadyMode>(1), _))
        .WillOnce(DoAll(SaveArg<2>(&wake_), Return(true)));
    EXPECT_CALL(event_loop_, StopWatchFileDescriptor(socket_->fd())).WillOnce(Return(true));
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
  std::function<void(int)> wake_;
  std::vector<Seen> handed_;
  std::function<int(nl_msg*)> record_ = [this](nl_msg* msg) {
    handed_.push_back(Inspect(msg));
    return NL_OK;
  };
};

// One answer of the simulator to a get of the stored value 42, and what each
// exchange makes of it. Log lines lack their "<exchange>: " prefix.
struct Answer {
  const char* name;
  Fault fault;
  bool stop_simulator;
  bool result;
  std::vector<Seen> ack_handed, response_handed;
  std::vector<std::string> warnings, ack_info, response_info;
  bool ack_only = false;  // the response exchange would wait for data until it times out
};

void PrintTo(const Answer& answer, std::ostream* os) { *os << answer.name; }

const Seen kValue{sim::kTestCmdValue, 42};
const std::string kReadError = "Error reading message: ";

// clang-format off
const Answer kAnswers[] = {
    {"Clean", {}, false, true, {kValue}, {kValue}, {}, {"Received ACK"}, {"Read message"}},
    {"AckWithoutData", {Fault::Kind::kAckOnly}, false, true, {}, {}, {}, {"Received ACK"}, {},
     true},
    // False after one read: the error ends the read that carried it.
    {"Error", {Fault::Kind::kError, EBUSY}, false, false, {}, {},
     {"Nl error: " + std::to_string(-EBUSY), kReadError + nl_geterror(-nl_syserr2nlerr(EBUSY))}, {}, {"Read message"}},
    // The acknowledge exchange hands every data message on; the response
    // exchange logs and skips the other command.
    {"OtherCommandFirst", {Fault::Kind::kOtherCommandFirst, 0, sim::kTestCmdList}, false, true,
     {{sim::kTestCmdList, 0}, kValue}, {kValue}, {}, {"Received ACK"},
     {"Read message", "Incorrect received command, got 4 instead of 3", "Read message"}},
    {"NoAnswer", {Fault::Kind::kNoAnswer}, false, false, {}, {},
     {kReadError + nl_geterror(-NLE_AGAIN)}, {}, {"Read message"}},
    {"FailedSend", {}, true, false, {}, {},
     {std::string("Error sending netlink message: ") + nl_geterror(-nl_syserr2nlerr(ECONNREFUSED))},
     {}, {}},
};
// clang-format on

std::vector<std::tuple<bool, Answer>> Exchanges() {
  std::vector<std::tuple<bool, Answer>> exchanges;
  for (const Answer& answer : kAnswers) {
    exchanges.emplace_back(true, answer);
    if (!answer.ack_only) exchanges.emplace_back(false, answer);
  }
  return exchanges;
}

class NlSocketExchangeTest : public NlSocketTest,
                             public ::testing::WithParamInterface<std::tuple<bool, Answer>> {};

TEST_P(NlSocketExchangeTest, HandlesTheAnswer) {
  const bool ack = std::get<0>(GetParam());
  const Answer& answer = std::get<1>(GetParam());
  UniqueNlMsg set = Request(sim::kTestCmdSet, sim::kTestAttrValue, 42);
  ASSERT_TRUE(factory_.SendAndAwaitAck(set.get(), LOG_TAG));
  simulator_.SetFault(sim::kTestFamilyName, answer.fault);
  if (answer.stop_simulator) simulator_.Stop();
  log_.Reset();

  UniqueNlMsg get = Request(sim::kTestCmdGet);
  bool result = ack ? socket_->SendAndAwaitAck(get.get(), record_)
                    : socket_->SendAndAwaitResponse(get.get(), record_, sim::kTestCmdValue);

  const std::string op = ack ? "SendAndAwaitAck" : "SendAndAwaitResponse";
  auto prefixed = [&op](const std::vector<std::string>& lines) {
    std::vector<std::string> out;
    for (const std::string& line : lines) out.push_back(op + ": " + line);
    return out;
  };
  std::vector<std::string> info = prefixed(ack ? answer.ack_info : answer.response_info);
  if (!ack) info.insert(info.begin(), op);
  EXPECT_EQ(answer.result, result);
  EXPECT_EQ(ack ? answer.ack_handed : answer.response_handed, handed_);
  EXPECT_EQ(prefixed(answer.warnings), Lines(WARNING)) << log_.Text();
  EXPECT_EQ(info, Lines(INFO)) << log_.Text();
}

INSTANTIATE_TEST_SUITE_P(Answers, NlSocketExchangeTest, ::testing::ValuesIn(Exchanges()),
                         [](const ::testing::TestParamInfo<std::tuple<bool, Answer>>& info) {
                           return std::string(std::get<0>(info.param) ? "Ack" : "Response") +
                                  std::get<1>(info.param).name;
                         });

// A reply's trailing acknowledgement must not upset the next exchange.
TEST_F(NlSocketTest, ExchangesFollowOneAnotherOnOneSocket) {
  for (uint32_t value : {1u, 2u, 3u}) {
    UniqueNlMsg set = Request(sim::kTestCmdSet, sim::kTestAttrValue, value);
    ASSERT_TRUE(socket_->SendAndAwaitAck(set.get(), nullptr));
    UniqueNlMsg get = Request(sim::kTestCmdGet);
    ASSERT_TRUE(socket_->SendAndAwaitResponse(get.get(), record_, sim::kTestCmdValue));
  }
  EXPECT_THAT(handed_, ElementsAre(Seen{sim::kTestCmdValue, 1}, Seen{sim::kTestCmdValue, 2},
                                   Seen{sim::kTestCmdValue, 3}));
}

TEST_F(NlSocketTest, ResolveRegisteredUnknownAndVanishedFamilies) {
  EXPECT_EQ(family_id_, socket_->Resolve(sim::kTestFamilyName));
  EXPECT_EQ(-NLE_OBJ_NOTFOUND, socket_->Resolve("no_such_family"));
  simulator_.SetFamilyPresent(sim::kTestFamilyName, false);
  EXPECT_EQ(-NLE_OBJ_NOTFOUND, socket_->Resolve(sim::kTestFamilyName));
}

TEST_F(NlSocketTest, WatchDeliversEventsToTheFirstHandlerUntilReleased) {
  socket_->DisableAutoAck();
  int fd = socket_->fd();
  ExpectWatch();
  ASSERT_TRUE(socket_->WatchNetlinkSocket(socket_, record_));
  EXPECT_FALSE(socket_->WatchNetlinkSocket(socket_, [](nl_msg*) {
    ADD_FAILURE() << "the refused handler was called";
    return NL_OK;
  }));
  UniqueNlMsg subscribe = Request(sim::kTestCmdSubscribe, sim::kTestAttrCount, 3);
  ASSERT_TRUE(socket_->SendAndAwaitAck(subscribe.get(), nullptr));
  wake_(fd);
  wake_(fd);
  EXPECT_THAT(handed_, ElementsAre(Seen{sim::kTestCmdValue, 1}, Seen{sim::kTestCmdValue, 2}));

  // The owner lets go without stopping; a wake-up already on its way finds
  // the socket gone and leaves the third event unread.
  socket_.reset();
  wake_(fd);
  EXPECT_EQ(2u, handed_.size());
  EXPECT_EQ(1, log_.Count(WARNING, "WatchNetlinkSocket: socket is close", kTag));
}

// The strict loop sees no call.
TEST_F(NlSocketTest, WatchNeedsALiveOwner) {
  EXPECT_FALSE(socket_->WatchNetlinkSocket(std::weak_ptr<NlSocket>(), record_));
  auto other = std::make_shared<TestSocket>(&event_loop_);
  ASSERT_TRUE(other->Setup());
  std::weak_ptr<NlSocket> expired = other;
  other.reset();
  EXPECT_FALSE(socket_->WatchNetlinkSocket(expired, record_));
}

TEST_F(NlSocketTest, StopThenWatchAgain) {
  ::testing::InSequence in_order;
  for (int i = 0; i < 2; ++i) {
    EXPECT_CALL(event_loop_, WatchFileDescriptor(socket_->fd(), _, _)).WillOnce(Return(true));
    EXPECT_CALL(event_loop_, StopWatchFileDescriptor(socket_->fd())).WillOnce(Return(true));
  }
  ASSERT_TRUE(socket_->WatchNetlinkSocket(socket_, record_));
  EXPECT_TRUE(socket_->StopWatchNetlinkSocket());
  EXPECT_EQ(1, log_.Count(INFO, "StopWatchNetlinkSocket", kTag));
  EXPECT_TRUE(socket_->WatchNetlinkSocket(socket_, record_));
}

TEST_F(NlSocketTest, ErrorWithoutErrorHandlerStopsTheRead) {
  // The reader keeps libnl's sequence check; only without auto-ack does a
  // socket take the sequence 0 of unsolicited messages.
  socket_->DisableAutoAck();
  // One datagram: an unsolicited error report, then a data message.
  UniqueNlMsg batch;
  nlmsghdr* error = nlmsg_put(batch.get(), 0, 0, NLMSG_ERROR, sizeof(nlmsgerr), 0);
  static_cast<nlmsgerr*>(nlmsg_data(error))->error = -EIO;
  UniqueNlMsg event = sim::DriverSimulator::NewEvent(family_id_, sim::kTestCmdValue);
  std::string bytes(reinterpret_cast<char*>(error), NLMSG_ALIGN(error->nlmsg_len));
  bytes.append(reinterpret_cast<char*>(nlmsg_hdr(event.get())), nlmsg_hdr(event.get())->nlmsg_len);
  ASSERT_TRUE(simulator_.SendRaw(socket_->port(), bytes.data(), bytes.size()));

  EXPECT_FALSE(socket_->ReceiveMessage(record_));
  EXPECT_TRUE(handed_.empty());
  const std::string read_error =
      std::string("ReceiveMessage: ") + kReadError + nl_geterror(-nl_syserr2nlerr(EIO));
  EXPECT_THAT(Lines(WARNING), ElementsAre(read_error));

  // A response exchange whose send failed leaves its handlers installed; its
  // error handler then sees the next error report, past the exchange's end.
  simulator_.Stop();
  UniqueNlMsg get = Request(sim::kTestCmdGet);
  EXPECT_FALSE(socket_->SendAndAwaitResponse(get.get(), record_, sim::kTestCmdValue));
  ASSERT_TRUE(simulator_.Start());
  log_.Reset();
  ASSERT_TRUE(simulator_.SendRaw(socket_->port(), bytes.data(), bytes.size()));
  EXPECT_FALSE(socket_->ReceiveMessage(record_));
  EXPECT_TRUE(handed_.empty());
  EXPECT_THAT(Lines(WARNING),
              ElementsAre("SendAndAwaitResponse: Nl error: " + std::to_string(-EIO), read_error));
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
