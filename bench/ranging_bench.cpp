// One simple ranging report on its way from the ranging socket to the
// client's callback: the datagram read, the report decoded and converted to
// angles, the result handed through the controller to the callback. The
// decode alone is measured next to it.

#include <sys/socket.h>

#include <cstdint>
#include <functional>
#include <memory>

#include <aidl/aidl/hardware/dalix/uwb/BnSimpleRangingCallback.h>
#include <android-base/logging.h>
#include <benchmark/benchmark.h>
#include <linux/netlink.h>

#include "net/mcps802154.h"
#include "sim/driver_simulator.h"
#include "sim/mcps_family.h"
#include "sim/sim_interface_tool.h"
#include "sim/sim_nl_socket_factory.h"
#include "sim/simple_ranging_sim.h"
#include "sim/world.h"
#include "simple_ranging_controller.h"

namespace hardware {
namespace dalix {
namespace {

namespace uwb = aidl::hardware::dalix::uwb;
constexpr uint32_t kHw = 0;

// Keeps the ranging socket's watch instead of running a loop, so that each
// iteration wakes the socket exactly once.
class CapturingLoop : public EventLoop {
 public:
  void PostTask(const std::function<void()>&) override {}
  bool WatchFileDescriptor(int fd, ReadyMode, const std::function<void(int)>& callback) override {
    fd_ = fd;
    callback_ = callback;
    return true;
  }
  bool StopWatchFileDescriptor(int) override { return true; }

  int fd_ = -1;
  std::function<void(int)> callback_;
};

class CountingCallback : public uwb::BnSimpleRangingCallback {
 public:
  ndk::ScopedAStatus onRangingResult(const uwb::RangingResult& result) override {
    benchmark::DoNotOptimize(result.firstAngleRad);
    ++count_;
    return ndk::ScopedAStatus::ok();
  }
  int64_t count_ = 0;
};

class RangingSession {
 public:
  RangingSession()
      : ranging_(&simulator_, &radios_, &devices_, &world_),
        factory_(&loop_, simulator_.port()),
        mcps_(&factory_),
        tool_(&devices_) {
    radios_.AddRadio(kHw, 0u);
    radios_.SetScheduler(kHw, kMcpsSchedulerSimpleRanging, 16, 0, {});
    family_.SetCommandHandler(MCPS802154_CMD_SET_RANGING_REQUESTS,
                              [this](auto& request, nlattr** attrs, auto& responder) {
                                ranging_.SetRangingRequests(request, attrs, responder);
                              });
    family_id_ = simulator_.RegisterFamily(kMcpsFamilyName, &family_);
    simulator_.Start();
    controller_ =
        ndk::SharedRefBase::make<SimpleRangingController>("wpan0", kHw, &tool_, &mcps_, nullptr);
    callback_ = ndk::SharedRefBase::make<CountingCallback>();
  }
  ~RangingSession() { simulator_.Stop(); }

  // Requests installed through the simulator; the ranging socket's port.
  bool Install(uint32_t* port) {
    uwb::RangingRequest request;
    request.id = 1;
    request.peerAddress = 0x0a0a;
    if (!mcps_.Start() || !controller_->setCallback(callback_).isOk() ||
        !mcps_.SetRangingRequests(kHw, {request})) {
      return false;
    }
    sockaddr_nl local = {};
    socklen_t length = sizeof(local);
    if (getsockname(loop_.fd_, reinterpret_cast<sockaddr*>(&local), &length) != 0) return false;
    *port = local.nl_pid;
    return true;
  }

  UniqueNlMsg Report() const {
    UniqueNlMsg msg = sim::DriverSimulator::NewEvent(family_id_, MCPS802154_CMD_RANGING_REPORT);
    sim::SimpleRangingSim::EncodeRangingReport(
        msg.get(), kHw, {1u, 250u, sim::SimpleRangingSim::AngleToPhase(0.5), -300});
    return msg;
  }

  sim::RadioStore radios_;
  sim::WpanDeviceStore devices_;
  // Empty, and the radio has no interface up: the simulator's own reports
  // and its ticking stay out of the measurement.
  sim::World world_;
  sim::McpsFamily family_{&radios_};
  sim::DriverSimulator simulator_;
  sim::SimpleRangingSim ranging_;
  CapturingLoop loop_;
  sim::SimNlSocketFactory factory_;
  McpsUtils mcps_;
  sim::SimInterfaceTool tool_;
  std::shared_ptr<SimpleRangingController> controller_;
  std::shared_ptr<CountingCallback> callback_;
  int family_id_ = 0;
};

// Both benchmarks start from requests installed through the simulator.
bool Installed(benchmark::State& state, RangingSession& session, uint32_t* port) {
  if (session.Install(port)) return true;
  state.SkipWithError("cannot install ranging requests");
  return false;
}

void BM_RangingReportSocketToCallback(benchmark::State& state) {
  RangingSession session;
  uint32_t port = 0;
  if (!Installed(state, session, &port)) return;
  UniqueNlMsg report = session.Report();
  for (auto _ : state) {
    if (!session.simulator_.SendEvent(port, report.get())) state.SkipWithError("send failed");
    session.loop_.callback_(session.loop_.fd_);
  }
  if (session.callback_->count_ != static_cast<int64_t>(state.iterations())) {
    state.SkipWithError("a report did not reach the callback");
  }
}
BENCHMARK(BM_RangingReportSocketToCallback);

void BM_RangingReportDecode(benchmark::State& state) {
  RangingSession session;
  uint32_t port = 0;
  if (!Installed(state, session, &port)) return;
  UniqueNlMsg report = session.Report();
  for (auto _ : state) session.mcps_.OnRangingResult(report.get());
}
BENCHMARK(BM_RangingReportDecode);

}  // namespace
}  // namespace dalix
}  // namespace hardware
