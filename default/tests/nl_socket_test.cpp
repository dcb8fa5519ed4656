#include "net/nl_socket.h"

#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netlink/errno.h>
#include <netlink/genl/genl.h>
#include <netlink/socket.h>

#include "net/ieee_utils.h"
#include "net/mcps_utils.h"
#include "sim/driver_simulator.h"
#include "sim/sim_nl_socket.h"
#include "sim/test_family.h"
#include "sim/test_family_defs.h"
#include "tests/log_capture.h"
#include "tests/mock_event_loop.h"
#include "tests/mock_nl_socket.h"

namespace hardware {
namespace dalix {
namespace {

using android::base::ERROR;
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
  using NlSocket::SetupWith;
  int fd() const { return nl_socket_get_fd(sock()); }
  uint32_t port() const { return nl_socket_get_local_port(sock()); }
};

// A test-family message as a handler saw it: command, value (0 when none).
using Seen = std::pair<int, uint32_t>;

class NlSocketTest : public ::testing::Test {
 protected:
  void SetUp() override {
    family_id_ = simulator_.RegisterFamily(sim::kTestFamilyName, &family_);
    ASSERT_TRUE(simulator_.Start());
    socket_ = std::make_shared<TestSocket>(&event_loop_);
    ASSERT_TRUE(socket_->Setup());
    UniqueNlMsg set = Request(sim::kTestCmdSet, sim::kTestAttrValue, 42);
    ASSERT_TRUE(socket_->SendAndAwaitAck(set.get(), nullptr));
  }

  // A test-family request, with |attr| set to |value| unless it is 0.
  UniqueNlMsg Request(uint8_t cmd, int attr = 0, uint32_t value = 0) {
    UniqueNlMsg msg = sim::TestFamily::NewRequest(family_id_, cmd);
    if (attr != 0) nla_put_u32(msg.get(), attr, value);
    return msg;
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
  std::shared_ptr<TestSocket> socket_;
  std::vector<Seen> handed_;
  std::function<int(nl_msg*)> record_ = [this](nl_msg* msg) {
    nlattr* value = nlmsg_find_attr(nlmsg_hdr(msg), GENL_HDRLEN, sim::kTestAttrValue);
    handed_.emplace_back(genlmsg_hdr(nlmsg_hdr(msg))->cmd, value ? nla_get_u32(value) : 0);
    return NL_OK;
  };
};

// One answer of the simulator to a get of the stored value 42, and what each
// exchange makes of it. Warnings lack their "<exchange>: " prefix; a read
// more than the answer needs would time out and warn.
struct Answer {
  const char* name;
  Fault fault;
  bool stop_simulator;
  bool result;
  std::vector<Seen> ack_handed, response_handed;
  std::vector<std::string> warnings;
};

const Seen kValue{sim::kTestCmdValue, 42};
const std::string kReadError = "Error reading message: ";

// clang-format off
const Answer kAnswers[] = {
    {"Clean", {}, false, true, {kValue}, {kValue}, {}},
    // The error ends the read that carried it.
    {"Error", {Fault::Kind::kError, EBUSY}, false, false, {}, {},
     {"Nl error: " + std::to_string(-EBUSY), kReadError + nl_geterror(-nl_syserr2nlerr(EBUSY))}},
    // The acknowledge exchange hands every data message on; the response
    // exchange skips the other command.
    {"OtherCommandFirst", {Fault::Kind::kOtherCommandFirst, 0, sim::kTestCmdList}, false, true,
     {{sim::kTestCmdList, 0}, kValue}, {kValue}, {}},
    {"NoAnswer", {Fault::Kind::kNoAnswer}, false, false, {}, {},
     {kReadError + nl_geterror(-NLE_AGAIN)}},
    {"FailedSend", {}, true, false, {}, {},
     {std::string("Error sending netlink message: ") + nl_geterror(-nl_syserr2nlerr(ECONNREFUSED))}},
};
// clang-format on

// Each answer to either exchange, on a socket of its own.
TEST_F(NlSocketTest, ExchangesHandleEveryAnswer) {
  for (const Answer& answer : kAnswers) {
    for (const bool ack : {true, false}) {
      const std::string op = ack ? "SendAndAwaitAck" : "SendAndAwaitResponse";
      SCOPED_TRACE(op + " " + answer.name);
      socket_ = std::make_shared<TestSocket>(&event_loop_);
      ASSERT_TRUE(socket_->Setup());
      simulator_.SetFault(sim::kTestFamilyName, answer.fault);
      if (answer.stop_simulator) simulator_.Stop();
      log_.Reset();
      handed_.clear();

      UniqueNlMsg get = Request(sim::kTestCmdGet);
      bool result = ack ? socket_->SendAndAwaitAck(get.get(), record_)
                        : socket_->SendAndAwaitResponse(get.get(), record_, sim::kTestCmdValue);
      std::vector<std::string> warnings;
      for (const std::string& line : answer.warnings) warnings.push_back(op + ": " + line);
      EXPECT_EQ(answer.result, result);
      EXPECT_EQ(ack ? answer.ack_handed : answer.response_handed, handed_);
      EXPECT_EQ(warnings, Lines(WARNING)) << log_.Text();

      simulator_.SetFault(sim::kTestFamilyName, {});
      ASSERT_TRUE(simulator_.Start());
    }
  }
}

// Without a live owner the strict loop sees no call; a watch that was
// stopped can start again, but one socket takes one handler at a time.
TEST_F(NlSocketTest, WatchDeliversEventsToOneHandlerWhileTheOwnerLives) {
  EXPECT_FALSE(socket_->WatchNetlinkSocket(std::weak_ptr<NlSocket>(), record_));
  socket_->DisableAutoAck();
  const int fd = socket_->fd();
  std::function<void(int)> wake;
  ::testing::InSequence in_order;
  for (int i = 0; i < 2; ++i) {
    // Mode 1 exactly; the second stop is the socket destructor's.
    EXPECT_CALL(event_loop_, WatchFileDescriptor(fd, static_cast<EventLoop::ReadyMode>(1), _))
        .WillOnce(DoAll(SaveArg<2>(&wake), Return(true)));
    EXPECT_CALL(event_loop_, StopWatchFileDescriptor(fd)).WillOnce(Return(true));
  }
  ASSERT_TRUE(socket_->WatchNetlinkSocket(socket_, record_));
  EXPECT_TRUE(socket_->StopWatchNetlinkSocket());
  ASSERT_TRUE(socket_->WatchNetlinkSocket(socket_, record_));
  EXPECT_FALSE(socket_->WatchNetlinkSocket(socket_, record_));
  UniqueNlMsg subscribe = Request(sim::kTestCmdSubscribe, sim::kTestAttrCount, 3);
  ASSERT_TRUE(socket_->SendAndAwaitAck(subscribe.get(), nullptr));
  wake(fd);
  wake(fd);
  EXPECT_THAT(handed_, ElementsAre(Seen{sim::kTestCmdValue, 1}, Seen{sim::kTestCmdValue, 2}));

  // The owner lets go without stopping; a wake-up already on its way finds
  // the socket gone and returns before reading the third event.
  socket_.reset();
  wake(fd);
  EXPECT_EQ(1, log_.Count(WARNING, "WatchNetlinkSocket: socket is close", kTag));
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

TEST_F(NlSocketTest, FailedConnectIsLoggedAndLeavesNoSocket) {
  EXPECT_FALSE(socket_->SetupWith([](nl_sock*) { return -NLE_FAILURE; }));
  EXPECT_FALSE(socket_->IsValid());
  EXPECT_EQ(1, log_.Count(ERROR, "Setup: Failed to connect to generic netlink", kTag));
}

// Two clients built into one program: when no socket can be made, each
// one-shot's line names the client that asked, whatever order the objects
// were linked in.
TEST(NlSocketFactoryTest, OneShotsWithoutASocketFailUnderTheCallersTag) {
  StrictMock<MockNlSocketFactory> factory;
  EXPECT_CALL(factory, Create()).Times(2).WillRepeatedly([] { return nullptr; });
  LogCapture log;
  bool listed = true;
  EXPECT_FALSE(McpsUtils(&factory).SetFiraRegion(0));
  IeeeUtils(&factory).ListDevices(&listed);
  EXPECT_FALSE(listed);
  EXPECT_EQ(1, log.Count(ERROR, "SendAndAwaitAck: BAD_ALLOC: cannot allocate NlSocket",
                         "dalix.uwb.McpsUtils"))
      << log.Text();
  EXPECT_EQ(1, log.Count(ERROR, "SendAndAwaitResponse: BAD_ALLOC: cannot allocate NlSocket",
                         "dalix.uwb.IeeeUtils"));
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
