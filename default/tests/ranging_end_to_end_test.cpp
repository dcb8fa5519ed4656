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
#include <tuple>
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
#include "sim/world.h"
#include "simple_ranging_controller.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

namespace uwb = aidl::hardware::dalix::uwb;

constexpr uint32_t kHw = 0;
constexpr char kIface[] = "wpan0";
constexpr int64_t kPeerA = 0x0a0a, kPeerB = 0x0b0b, kNobody = 0x0f0f;

// A peer standing |distance_m| away in the direction of |azimuth| and
// |elevation| from a radio at the origin looking along x.
sim::Peer StandingPeer(uint16_t short_address, int64_t extended, double distance_m, double azimuth,
                       double elevation) {
  sim::Peer peer;
  peer.short_address = short_address;
  peer.extended_address = static_cast<uint64_t>(extended);
  peer.motion = sim::Motion::Standing({distance_m * cos(elevation) * cos(azimuth),
                                       distance_m * cos(elevation) * sin(azimuth),
                                       distance_m * sin(elevation)});
  return peer;
}

// Keeps each request's first result; counts them all.
class RecordingCallback : public uwb::BnSimpleRangingCallback {
 public:
  ndk::ScopedAStatus onRangingResult(const uwb::RangingResult& result) override {
    std::lock_guard<std::mutex> lock(mutex_);
    first_.emplace(result.id, result);
    ++count_;
    changed_.notify_all();
    return ndk::ScopedAStatus::ok();
  }
  std::map<int32_t, uwb::RangingResult> WaitForFirst(size_t requests) {
    std::unique_lock<std::mutex> lock(mutex_);
    changed_.wait_for(lock, std::chrono::seconds(5), [&] { return first_.size() == requests; });
    return first_;
  }
  int count() {
    std::lock_guard<std::mutex> lock(mutex_);
    return count_;
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  std::map<int32_t, uwb::RangingResult> first_;
  int count_ = 0;
};

class RangingEndToEndTest : public ::testing::Test {
 protected:
  void SetUp() override {
    radios_.AddRadio(kHw, 0u);
    world_.AddPeer(StandingPeer(0xa, kPeerA, 2.5, 0.5, -0.25));
    world_.AddPeer(StandingPeer(0xb, kPeerB, 8.0, -1.0, 0.1));
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
  sim::World world_;
  sim::McpsFamily mcps_family_{&radios_};
  sim::Nl802154Family nl802154_family_{&devices_};
  sim::DriverSimulator simulator_;
  sim::SimpleRangingSim ranging_{&simulator_, &radios_, &devices_, &world_};
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
    std::map<int32_t, uwb::RangingResult> first = callback->WaitForFirst(3);
    ASSERT_EQ(first.size(), 3u);
    // One fixed-point step of phase is about 2e-4 rad of angle near the axis.
    for (auto [id, peer, short_address] :
         {std::tuple(1, kPeerA, 0xa), std::tuple(2, kPeerB, 0xb)}) {
      sim::Observation truth = *world_.Truth(kHw, short_address, 0);
      EXPECT_EQ(first[id].peerAddress, peer);
      EXPECT_EQ(first[id].measurement, std::lround(truth.distance_m * 100));
      EXPECT_NEAR(first[id].firstAngleRad, truth.azimuth_rad, 1e-3);
      EXPECT_NEAR(first[id].secondAngleRad, truth.elevation_rad, 1e-3);
    }
    // A peer out of reach: reported, but nothing measured.
    EXPECT_EQ(first[3].measurement, INT32_MIN);
    EXPECT_TRUE(std::isnan(first[3].firstAngleRad) && std::isnan(first[3].secondAngleRad));

    ASSERT_TRUE(simple_->stop().isOk());
    EXPECT_FALSE(devices_.FindByName(kIface)->up);
    // The reports end with the ranging socket: nothing more reaches the client.
    const int delivered = callback->count();
    std::this_thread::sleep_for(std::chrono::milliseconds(100));
    EXPECT_EQ(callback->count(), delivered);
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
