// Simple ranging and CCC end to end: a client thread opens the whole service
// and drives the radio's controllers through their binder proxies, against
// the simulated driver.

#include <aidl/aidl/hardware/dalix/uwb/BnSimpleRangingCallback.h>

#include <chrono>
#include <cmath>
#include <condition_variable>
#include <map>
#include <mutex>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>

#include "net/mcps802154.h"
#include "net/nl802154.h"
#include "sim/ccc_test_mode_sim.h"
#include "sim/simple_ranging_sim.h"
#include "sim/world.h"
#include "tests/e2e_fixture.h"
#include "uwb_aidl.h"
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

class RangingEndToEndTest : public EndToEndTest {
 protected:
  void SetUp() override {
    EndToEndTest::SetUp();
    AddRadio(kHw, 0, kIface);
    world_.AddPeer(StandingPeer(0xa, kPeerA, 2.5, 0.5, -0.25));
    world_.AddPeer(StandingPeer(0xb, kPeerB, 8.0, -1.0, 0.1));
    StartService();
    std::shared_ptr<uwb::IUwbIface> iface = OpenIface(kIface);
    ASSERT_NE(iface, nullptr);
    ASSERT_TRUE(iface->simpleRangingController(&simple_).isOk());
    ASSERT_TRUE(iface->cccController(&ccc_).isOk());
  }

  void TearDown() override {
    simple_.reset();
    ccc_.reset();
    EndToEndTest::TearDown();
  }

  sim::RadioStore& radios_ = driver_.radios();
  sim::WpanDeviceStore& devices_ = driver_.devices();
  sim::World& world_ = driver_.world();
  sim::CccTestModeSim& test_mode_ = driver_.ccc_test_mode();
  sim::DriverSimulator& simulator_ = driver_.simulator();
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
