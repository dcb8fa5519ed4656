// The FiRa result path as a client sees it: one driver notification with
// eight measurements, from the ranging socket through FiraController to the
// client's session callback and on to a client thread; and how long a
// client's binder call waits while a session ranges on the watched socket.

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <android-base/logging.h>
#include <benchmark/benchmark.h>

#include "fira_controller.h"
#include "net/unique_nl_msg.h"
#include "sim/fira_client_callback.h"
#include "sim/fira_notification.h"
#include "sim/service_harness.h"
#include "tests/fira_session_builder.h"

namespace hardware {
namespace dalix {
namespace {

namespace uwb = aidl::hardware::dalix::uwb;

constexpr int32_t kSessionId = 42;
constexpr int kPeers = 8;

// A running session of one controller on one simulated radio, reached by the
// benchmark's thread through the controller's binder proxy.
class RunningSession {
 public:
  explicit RunningSession(int32_t block_ms) {
    android::base::SetMinimumLogSeverity(android::base::WARNING);
    std::string error;
    if (!harness_.Start(&error)) {
      error_ = error;
      return;
    }
    harness_.RunOnService([this] {
      auto controller = ndk::SharedRefBase::make<FiraController>(
          "uwb0", 0, harness_.interface_tool(), harness_.mcps_utils(), harness_.ieee_utils(),
          harness_.fira_region_utils(), harness_.event_loop());
      proxy_ = uwb::IFiraController::fromBinder(controller->asBinder());
    });
    std::vector<uint16_t> peers;
    for (int i = 0; i < kPeers; ++i) {
      sim::Peer peer;
      peer.short_address = static_cast<uint16_t>(0x10 + i);
      peer.motion = sim::Motion::Circle({0, 0, 0}, 2 + i, 1.0);
      harness_.world().AddPeer(peer);
      peers.push_back(peer.short_address);
    }
    uwb::FiraTwrSession session = ValidFiraSession(kSessionId, peers);
    session.rangingBlockDurationMs = block_ms;
    if (!proxy_->setSessionCallback(callback_).isOk() ||
        !proxy_->initNewTwrSession(session).isOk() ||
        !proxy_->startRangingSession(kSessionId).isOk()) {
      error_ = "the session did not start";
    }
  }
  ~RunningSession() {
    if (proxy_ == nullptr) return;
    (void)proxy_->stopRangingSession(kSessionId);
    // The controller goes on the service thread, once it is done with it.
    harness_.RunOnService([this] { proxy_.reset(); });
  }

  const std::string& error() const { return error_; }
  sim::ServiceHarness& harness() { return harness_; }
  uwb::IFiraController& controller() { return *proxy_; }
  sim::FiraClientCallback& callback() { return *callback_; }

 private:
  sim::ServiceHarness harness_;
  std::shared_ptr<uwb::IFiraController> proxy_;
  std::shared_ptr<sim::FiraClientCallback> callback_ =
      ndk::SharedRefBase::make<sim::FiraClientCallback>();
  std::string error_;
};

// One notification of eight measurements with distances and both angle
// pairs, as the driver sends it, from the simulator to the ranging socket
// and through the service to the client's thread. The driver's own rounds
// are a minute apart, out of the way.
void BM_FiraNotificationToClient(benchmark::State& state) {
  RunningSession session(60000);
  if (!session.error().empty()) {
    state.SkipWithError(session.error().c_str());
    return;
  }
  const std::optional<sim::SimFiraSession> driver_session =
      session.harness().fira_region().Session(0, kSessionId);
  if (!driver_session.has_value()) {
    state.SkipWithError("the driver has no session");
    return;
  }
  sim::FiraNotificationData data;
  data.hw_index = 0;
  data.session_id = kSessionId;
  data.index = 1;
  data.timestamp_ns = 1000;
  data.measurements.emplace();
  for (int i = 0; i < kPeers; ++i) {
    sim::FiraMeasurementData m;
    m.short_address = static_cast<uint16_t>(0x10 + i);
    m.status = 0;
    m.line_of_sight = true;
    m.distance_cm = static_cast<uint32_t>(150 + 10 * i);
    m.aoa_azimuth = sim::FiraAoaData{0, sim::FiraAzimuthRaw(0.3), 200, sim::FiraAzimuthRaw(0.1)};
    m.aoa_elevation = sim::FiraAoaData{1, sim::FiraAzimuthRaw(0.1), 180, sim::FiraAzimuthRaw(0.3)};
    m.azimuth = sim::FiraAzimuthRaw(0.3);
    m.elevation = sim::FiraElevationRaw(0.1);
    m.azimuth_fom = 200;
    m.elevation_fom = 180;
    data.measurements->push_back(m);
  }
  UniqueNlMsg msg;
  if (!sim::EncodeFiraNotification(msg.get(), driver_session->family_id, data)) {
    state.SkipWithError("the notification does not encode");
    return;
  }
  size_t received = 0;
  for (auto _ : state) {
    // The client's thread takes each result as it arrives.
    std::optional<sim::FiraClientCallback::Result> result;
    if (!session.harness().simulator().SendEvent(driver_session->port, msg.get()) ||
        !(result = session.callback().WaitForResult(++received)) ||
        result->measurements.size() != kPeers) {
      state.SkipWithError("the result did not reach the client");
      break;
    }
  }
  state.SetItemsProcessed(state.iterations());
}
BENCHMARK(BM_FiraNotificationToClient)->MeasureProcessCPUTime()->UseRealTime();

// A binder call from the client's thread, with no session (argument 0) or
// while one session ranges every |argument| milliseconds. Reports the
// slowest call too, since the watched ranging socket can hold the loop.
void BM_BinderCallWhileRanging(benchmark::State& state) {
  const int32_t block_ms = static_cast<int32_t>(state.range(0));
  RunningSession session(block_ms == 0 ? 60000 : block_ms);
  if (!session.error().empty()) {
    state.SkipWithError(session.error().c_str());
    return;
  }
  if (block_ms == 0) (void)session.controller().stopRangingSession(kSessionId);
  double slowest_us = 0;
  for (auto _ : state) {
    const auto start = std::chrono::steady_clock::now();
    int32_t count = 0;
    if (!session.controller().getSessionCount(&count).isOk()) {
      state.SkipWithError("the call failed");
      break;
    }
    const std::chrono::duration<double, std::micro> took = std::chrono::steady_clock::now() - start;
    slowest_us = std::max(slowest_us, took.count());
  }
  state.counters["slowest_us"] = slowest_us;
}
BENCHMARK(BM_BinderCallWhileRanging)->Arg(0)->Arg(20)->Arg(200)->UseRealTime();

}  // namespace
}  // namespace dalix
}  // namespace hardware
