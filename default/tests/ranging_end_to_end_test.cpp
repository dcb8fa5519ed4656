// Simple ranging and CCC through binder proxies, from a client thread, to
// controllers served on their own event loop, against the simulated driver.

#include <aidl/aidl/hardware/dalix/uwb/BnSimpleRangingCallback.h>
#include <android/binder_process.h>
#include <binder_host/host.h>

#include <atomic>
#include <chrono>
#include <cmath>
#include <condition_variable>
#include <future>
#include <map>
#include <mutex>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "ccc_controller.h"
#include "looper/looper_backed_event_loop.h"
#include "net/mcps802154.h"
#include "net/nl802154.h"
#include "sim/ccc_test_mode_sim.h"
#include "sim/driver_simulator.h"
#include "sim/mcps_family.h"
#include "sim/nl802154_family.h"
#include "sim/sim_interface_tool.h"
#include "sim/sim_nl_socket_factory.h"
#include "sim/simple_ranging_sim.h"
#include "simple_ranging_controller.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

namespace uwb = aidl::hardware::dalix::uwb;

constexpr uint32_t kHw = 0;
constexpr char kIface[] = "wpan0";
constexpr int64_t kPeerA = 0x0a0a, kPeerB = 0x0b0b, kNobody = 0x0f0f;

// Peers at fixed places: distance (cm), azimuth and elevation (rad).
class FixedPeers : public sim::PeerAngleSource {
 public:
  std::optional<sim::PeerObservation> Observe(uint32_t, uint64_t peer) override {
    if (peer == kPeerA) return sim::PeerObservation{250, 0.5, -0.25};
    if (peer == kPeerB) return sim::PeerObservation{800, -1.0, 0.1};
    return std::nullopt;
  }
};

class RecordingCallback : public uwb::BnSimpleRangingCallback {
 public:
  ndk::ScopedAStatus onRangingResult(const uwb::RangingResult& result) override {
    std::lock_guard<std::mutex> lock(mutex_);
    results_[result.id].push_back(result);
    changed_.notify_all();
    return ndk::ScopedAStatus::ok();
  }
  int Count() {
    std::lock_guard<std::mutex> lock(mutex_);
    int count = 0;
    for (const auto& [id, results] : results_) count += static_cast<int>(results.size());
    return count;
  }
  // The first result of each of |ids|, once every one has come.
  std::map<int32_t, uwb::RangingResult> WaitForEach(const std::vector<int32_t>& ids) {
    std::unique_lock<std::mutex> lock(mutex_);
    std::map<int32_t, uwb::RangingResult> first;
    changed_.wait_for(lock, std::chrono::seconds(5), [&] {
      for (int32_t id : ids) {
        if (results_[id].empty()) return false;
      }
      return true;
    });
    for (int32_t id : ids) {
      if (!results_[id].empty()) first[id] = results_[id].front();
    }
    return first;
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  std::map<int32_t, std::vector<uwb::RangingResult>> results_;
};

class RangingEndToEndTest : public ::testing::Test {
 protected:
  void SetUp() override {
    radios_.AddRadio(kHw, 0u);
    std::string error;
    ASSERT_TRUE(devices_.AddDevice({kIface, 0}, &error)) << error;
    mcps_family_.SetCommandHandler(MCPS802154_CMD_SET_RANGING_REQUESTS,
                                   [this](auto& request, nlattr** attrs, auto& responder) {
                                     ranging_.SetRangingRequests(request, attrs, responder);
                                   });
    mcps_family_.SetCommandHandler(MCPS802154_CMD_TESTMODE,
                                   [this](auto& request, nlattr** attrs, auto& responder) {
                                     test_mode_.TestMode(request, attrs, responder);
                                   });
    simulator_.RegisterFamily(kMcpsFamilyName, &mcps_family_);
    simulator_.RegisterFamily(kNl802154FamilyName, &nl802154_family_);
    ASSERT_TRUE(simulator_.Start());
    std::promise<void> ready;
    service_ = std::thread([this, &ready] { Serve(&ready); });
    ready.get_future().wait();
    simple_ = uwb::ISimpleRangingController::fromBinder(simple_binder_);
    ccc_ = uwb::ICccController::fromBinder(ccc_binder_);
    ASSERT_NE(simple_, nullptr);
    ASSERT_NE(ccc_, nullptr);
  }

  void TearDown() override {
    simple_.reset();
    ccc_.reset();
    simple_binder_ = ccc_binder_ = ndk::SpAIBinder();
    if (LooperBackedEventLoop* loop = loop_.load()) loop->Quit();
    if (service_.joinable()) service_.join();
    simulator_.Stop();
    ndk::host::ResetForTesting();
  }

  // The service thread: its objects as the daemon assembles them, then the loop.
  void Serve(std::promise<void>* ready) {
    LooperBackedEventLoop loop;
    int binder_fd = -1;
    ABinderProcess_setupPolling(&binder_fd);
    loop.WatchFileDescriptor(binder_fd, EventLoop::kModeInput,
                             [](int) { ABinderProcess_handlePolledCommands(); });
    sim::SimNlSocketFactory factory(&loop, simulator_.port());
    McpsUtils mcps(&factory);
    IeeeUtils ieee(&factory);
    CccRegionUtils ccc(&factory);
    sim::SimInterfaceTool tool(&devices_);
    if (mcps.Start() && ieee.Setup()) {
      ccc.SetMcpsNetId(mcps.GetNetId());
      simple_binder_ =
          ndk::SharedRefBase::make<SimpleRangingController>(kIface, kHw, &tool, &mcps, &ieee)
              ->asBinder();
      ccc_binder_ =
          ndk::SharedRefBase::make<CccController>(kIface, kHw, &tool, &mcps, &ccc)->asBinder();
      loop_ = &loop;
    }
    ready->set_value();
    if (loop_ != nullptr) loop.Poll();
    loop_ = nullptr;
  }

  sim::RadioStore radios_;
  sim::WpanDeviceStore devices_;
  FixedPeers peers_;
  sim::McpsFamily mcps_family_{&radios_};
  sim::Nl802154Family nl802154_family_{&devices_};
  sim::DriverSimulator simulator_;
  sim::SimpleRangingSim ranging_{&simulator_, &radios_, &devices_, &peers_};
  sim::CccTestModeSim test_mode_{&radios_};
  std::thread service_;
  std::atomic<LooperBackedEventLoop*> loop_ = nullptr;
  ndk::SpAIBinder simple_binder_, ccc_binder_;
  std::shared_ptr<uwb::ISimpleRangingController> simple_;
  std::shared_ptr<uwb::ICccController> ccc_;
  LogCapture log_;
};

uwb::RangingRequest Request(int32_t id, int64_t peer) {
  uwb::RangingRequest request;
  request.id = id;
  request.peerAddress = peer;
  return request;
}

TEST_F(RangingEndToEndTest, BothModesDeliverTheAnglesOfTheSimulatedPeers) {
  for (bool responder : {false, true}) {
    SCOPED_TRACE(responder ? "responder" : "initiator");
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    ASSERT_TRUE(simple_->setCallback(callback).isOk());
    ndk::ScopedAStatus started = responder ? simple_->startResponderMode(0x1234, 0x0102, 9)
                                           : simple_->startInitiatorMode(0x1234, 0x0102, 9);
    ASSERT_TRUE(started.isOk()) << started.getDescription();
    EXPECT_EQ(radios_.Radio(kHw)->node_type, responder ? 1 : 0);
    sim::WpanDevice device = *devices_.FindByName(kIface);
    EXPECT_TRUE(device.up);
    EXPECT_EQ(device.pan_id, 0x1234);
    EXPECT_EQ(device.channel, 9);

    ASSERT_TRUE(
        simple_->setRangings({Request(1, kPeerA), Request(2, kPeerB), Request(3, kNobody)}).isOk());
    std::map<int32_t, uwb::RangingResult> first = callback->WaitForEach({1, 2, 3});
    ASSERT_EQ(first.size(), 3u);
    // One fixed-point step of phase is about 2e-4 rad of angle near the axis.
    const struct {
      int32_t id;
      int64_t peer;
      int32_t distance;
      double azimuth, elevation;
    } expected[] = {{1, kPeerA, 250, 0.5, -0.25}, {2, kPeerB, 800, -1.0, 0.1}};
    for (const auto& e : expected) {
      EXPECT_EQ(first[e.id].peerAddress, e.peer);
      EXPECT_EQ(first[e.id].measurement, e.distance);
      EXPECT_NEAR(first[e.id].firstAngleRad, e.azimuth, 1e-3);
      EXPECT_NEAR(first[e.id].secondAngleRad, e.elevation, 1e-3);
    }
    // A peer out of reach: reported, but nothing measured.
    EXPECT_EQ(first[3].measurement, INT32_MIN);
    EXPECT_TRUE(std::isnan(first[3].firstAngleRad) && std::isnan(first[3].secondAngleRad));

    ASSERT_TRUE(simple_->stop().isOk());
    EXPECT_FALSE(devices_.FindByName(kIface)->up);
    // The reports end with the ranging socket: nothing more reaches the client.
    const int delivered = callback->Count();
    std::this_thread::sleep_for(std::chrono::milliseconds(100));
    EXPECT_EQ(callback->Count(), delivered);
  }
}

TEST_F(RangingEndToEndTest, CccStartsWhateverTheDriversCodeAndFailsAsMinusSeven) {
  ASSERT_TRUE(ccc_->openCccSession().isOk());
  EXPECT_TRUE(devices_.FindByName(kIface)->up);
  for (std::optional<uint8_t> code : {std::optional<uint8_t>(1), std::optional<uint8_t>(0)}) {
    test_mode_.SetReturnCode(code);
    int64_t result = 0;
    ASSERT_TRUE(ccc_->startCccSession(1, 2, 9, &result).isOk());
    EXPECT_EQ(result, 123000);
  }
  EXPECT_EQ(log_.Count(android::base::ERROR, "ParseTestModeCmdResponse: Error on the command",
                       "dalix.uwb.CccRegionUtils"),
            1);
  std::vector<sim::CccTestModeSim::Start> starts = test_mode_.Starts();
  ASSERT_EQ(starts.size(), 2u);
  EXPECT_EQ(starts[1].channel, 9);
  EXPECT_EQ(starts[1].u32_param, 123000u);

  sim::Fault refuse;
  refuse.kind = sim::Fault::Kind::kError;
  refuse.error = EPERM;
  simulator_.SetCommandFault(kMcpsFamilyName, MCPS802154_CMD_TESTMODE, refuse);
  int64_t result = 0;
  EXPECT_EQ(ccc_->startCccSession(1, 2, 9, &result).getExceptionCode(), -7);
  EXPECT_EQ(result, 0);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
