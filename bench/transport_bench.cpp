// Round trips through the netlink transport against the driver simulator,
// next to the same round trip on a bare socket, so that the cost libnl and
// the transport add on top of the kernel's is visible.

#include <sys/socket.h>
#include <sys/time.h>

#include <cstdint>
#include <memory>
#include <vector>

#include <android-base/logging.h>
#include <android-base/unique_fd.h>
#include <benchmark/benchmark.h>
#include <linux/netlink.h>
#include <netlink/genl/genl.h>

#include "net/nl_socket.h"
#include "net/unique_nl_msg.h"
#include "sim/driver_simulator.h"
#include "sim/sim_nl_socket_factory.h"
#include "sim/test_family.h"
#include "sim/test_family_defs.h"

namespace hardware {
namespace dalix {
namespace {

// One simulator per benchmark run, with the test family registered.
class SimulatorSession {
 public:
  SimulatorSession() : family_(&simulator_), factory_(nullptr, simulator_.port()) {
    family_id_ = simulator_.RegisterFamily(sim::kTestFamilyName, &family_);
    simulator_.Start();
  }
  ~SimulatorSession() { simulator_.Stop(); }

  int family_id() const { return family_id_; }
  uint32_t port() const { return simulator_.port(); }
  NlSocketFactory& factory() { return factory_; }

 private:
  sim::TestFamily family_;
  sim::DriverSimulator simulator_;
  sim::SimNlSocketFactory factory_;
  int family_id_;
};

void BM_SendAndAwaitAck(benchmark::State& state) {
  SimulatorSession session;
  std::unique_ptr<NlSocket> socket = session.factory().Create();
  uint32_t value = 0;
  for (auto _ : state) {
    UniqueNlMsg set = sim::TestFamily::NewRequest(session.family_id(), sim::kTestCmdSet);
    nla_put_u32(set.get(), sim::kTestAttrValue, ++value);
    if (!socket->SendAndAwaitAck(set.get(), nullptr)) state.SkipWithError("exchange failed");
  }
}
BENCHMARK(BM_SendAndAwaitAck);

void BM_SendAndAwaitResponse(benchmark::State& state) {
  SimulatorSession session;
  std::unique_ptr<NlSocket> socket = session.factory().Create();
  for (auto _ : state) {
    UniqueNlMsg get = sim::TestFamily::NewRequest(session.family_id(), sim::kTestCmdGet);
    bool ok = socket->SendAndAwaitResponse(
        get.get(), [](nl_msg* msg) { benchmark::DoNotOptimize(msg); }, sim::kTestCmdValue);
    if (!ok) state.SkipWithError("exchange failed");
  }
}
BENCHMARK(BM_SendAndAwaitResponse);

// The factory's one-shot form: a socket of its own per request, as most
// driver requests of the service are made.
void BM_OneShotSendAndAwaitAck(benchmark::State& state) {
  SimulatorSession session;
  uint32_t value = 0;
  for (auto _ : state) {
    UniqueNlMsg set = sim::TestFamily::NewRequest(session.family_id(), sim::kTestCmdSet);
    nla_put_u32(set.get(), sim::kTestAttrValue, ++value);
    if (!session.factory().SendAndAwaitAck(set.get(), "dalix.bench")) state.SkipWithError("exchange failed");
  }
}
BENCHMARK(BM_OneShotSendAndAwaitAck);

// The same set-and-acknowledge on a bare socket: one sendto, one recv.
void BM_BareSocketRoundTrip(benchmark::State& state) {
  SimulatorSession session;
  android::base::unique_fd fd(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_USERSOCK));
  sockaddr_nl local = {};
  local.nl_family = AF_NETLINK;
  local.nl_pid = 0x0BE4C400;
  sockaddr_nl peer = {};
  peer.nl_family = AF_NETLINK;
  peer.nl_pid = session.port();
  timeval timeout = {1, 0};
  if (bind(fd.get(), reinterpret_cast<sockaddr*>(&local), sizeof(local)) != 0 ||
      setsockopt(fd.get(), SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof(timeout)) != 0) {
    state.SkipWithError("cannot set up the bare socket");
    return;
  }
  UniqueNlMsg set = sim::TestFamily::NewRequest(session.family_id(), sim::kTestCmdSet);
  nla_put_u32(set.get(), sim::kTestAttrValue, 1);
  nlmsghdr* header = nlmsg_hdr(set.get());
  header->nlmsg_flags |= NLM_F_REQUEST | NLM_F_ACK;
  std::vector<uint8_t> answer(8192);
  for (auto _ : state) {
    ++header->nlmsg_seq;
    if (sendto(fd.get(), header, header->nlmsg_len, 0, reinterpret_cast<sockaddr*>(&peer),
               sizeof(peer)) < 0 ||
        recv(fd.get(), answer.data(), answer.size(), 0) <= 0) {
      state.SkipWithError("round trip failed");
    }
  }
}
BENCHMARK(BM_BareSocketRoundTrip);

}  // namespace
}  // namespace dalix
}  // namespace hardware
