// Whole FiRa sessions: a client on the test thread calls FiraController
// through its binder proxy; the controller runs on the harness's service
// thread with the real driver clients against the simulated driver.

#include <cmath>
#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "fira_controller.h"
#include "sim/fira_client_callback.h"
#include "sim/service_harness.h"
#include "tests/fira_session_builder.h"

namespace hardware {
namespace dalix {
namespace {

namespace uwb = aidl::hardware::dalix::uwb;

class FiraControllerE2eTest : public ::testing::Test {
 protected:
  // Starts the harness with |radios| and gives the client a proxy of each
  // radio's controller, with its callback set.
  void Start(std::vector<sim::ServiceHarness::Radio> radios) {
    harness_ = std::make_unique<sim::ServiceHarness>(radios);
    std::string error;
    ASSERT_TRUE(harness_->Start(&error)) << error;
    harness_->RunOnService([&] {
      for (const auto& radio : radios) {
        auto controller = ndk::SharedRefBase::make<FiraController>(
            radio.iface, radio.hw_index, harness_->interface_tool(), harness_->mcps_utils(),
            harness_->ieee_utils(), harness_->fira_region_utils(), harness_->event_loop());
        proxies_.push_back(uwb::IFiraController::fromBinder(controller->asBinder()));
      }
    });
    for (auto& proxy : proxies_) {
      callbacks_.push_back(ndk::SharedRefBase::make<sim::FiraClientCallback>());
      ASSERT_TRUE(proxy->setSessionCallback(callbacks_.back()).isOk());
    }
  }
  // The controllers go on the service thread, once it is done with them.
  void TearDown() override {
    if (harness_ != nullptr) harness_->RunOnService([this] { proxies_.clear(); });
  }

  // A session ranging every 20 ms with |peers|, which the world places on a
  // circle, a line and a spot around the radio.
  uwb::FiraTwrSession MovingPeers(int32_t id, const std::vector<uint16_t>& peers) {
    const sim::Motion motions[] = {sim::Motion::Circle({0, 0, 0}, 3, 1.5),
                                   sim::Motion::Line({1, -2, 0}, {0, 1, 0}, 2),
                                   sim::Motion::Standing({4, 4, 1})};
    for (size_t i = 0; i < peers.size(); ++i) {
      sim::Peer peer;
      peer.short_address = peers[i];
      peer.motion = motions[i % 3];
      harness_->world().AddPeer(peer);
    }
    uwb::FiraTwrSession session = ValidFiraSession(id, peers);
    session.rangingBlockDurationMs = 20;
    return session;
  }

  // Results of |radio| arrive for session |id| and carry each peer's true
  // distance, in centimetres, at the result's time.
  void ExpectRanging(int radio, int32_t id, const std::vector<uint16_t>& peers) {
    const auto first = callbacks_[radio]->WaitForResult(1);
    ASSERT_TRUE(first.has_value());
    const auto last = callbacks_[radio]->WaitForResult(first->arrival + 3);
    ASSERT_TRUE(last.has_value());
    EXPECT_EQ(id, last->data.sessionId);
    EXPECT_LT(first->data.index, last->data.index);
    ASSERT_EQ(peers.size(), last->measurements.size());
    for (size_t i = 0; i < peers.size(); ++i) {
      const uwb::FiraTwrMeasurement& m = last->measurements[i];
      EXPECT_EQ(0, m.status);
      const auto truth = harness_->world().Truth(
          radio, peers[i], harness_->world().SecondsAt(static_cast<uint64_t>(m.timestampNs)));
      ASSERT_TRUE(truth.has_value());
      EXPECT_NEAR(truth->distance_m * 100, m.distance, 1) << "peer " << peers[i];
    }
  }

  std::unique_ptr<sim::ServiceHarness> harness_;
  std::vector<std::shared_ptr<uwb::IFiraController>> proxies_;
  std::vector<std::shared_ptr<sim::FiraClientCallback>> callbacks_;
};

TEST_F(FiraControllerE2eTest, ClientRunsAWholeSession) {
  Start({{0, "uwb0"}});
  uwb::IFiraController& fira = *proxies_[0];
  ASSERT_TRUE(fira.initNewTwrSession(MovingPeers(7, {0x0002, 0x0003, 0x0004})).isOk());
  ASSERT_TRUE(fira.startRangingSession(7).isOk());
  ExpectRanging(0, 7, {0x0002, 0x0003, 0x0004});

  ASSERT_TRUE(fira.addControlees(7, {{{0x00, 0x05}}}, std::nullopt).isOk());
  EXPECT_TRUE(callbacks_[0]->WaitForEvent("onAdded7"));
  ASSERT_TRUE(fira.removeControlees(7, {{{0x00, 0x05}}}).isOk());
  EXPECT_TRUE(callbacks_[0]->WaitForEvent("onRemoved7"));
  // The driver refuses to remove a controlee it does not have.
  ASSERT_TRUE(fira.removeControlees(7, {{{0x00, 0x05}}}).isOk());
  EXPECT_TRUE(callbacks_[0]->WaitForEvent("onRemoveFailed7"));

  ASSERT_TRUE(fira.stopRangingSession(7).isOk());
  EXPECT_TRUE(callbacks_[0]->WaitForEvent("onStopped7"));
  int32_t count = -1;
  EXPECT_TRUE(fira.getSessionCount(&count).isOk());
  EXPECT_EQ(1, count);
  EXPECT_TRUE(fira.deinitSession(7).isOk());
  EXPECT_TRUE(fira.getSessionCount(&count).isOk());
  EXPECT_EQ(0, count);
  EXPECT_FALSE(harness_->devices().FindByName("uwb0")->up);
}

TEST_F(FiraControllerE2eTest, TwoRadiosRangeAtOnce) {
  Start({{0, "uwb0"}, {1, "uwb1"}});
  ASSERT_TRUE(proxies_[0]->initNewTwrSession(MovingPeers(1, {0x0002, 0x0003})).isOk());
  ASSERT_TRUE(proxies_[1]->initNewTwrSession(MovingPeers(2, {0x0004})).isOk());
  ASSERT_TRUE(proxies_[0]->startRangingSession(1).isOk());
  ASSERT_TRUE(proxies_[1]->startRangingSession(2).isOk());
  ExpectRanging(0, 1, {0x0002, 0x0003});
  ExpectRanging(1, 2, {0x0004});
  for (int radio : {0, 1}) {
    ASSERT_TRUE(proxies_[radio]->stopRangingSession(radio + 1).isOk());
    EXPECT_TRUE(callbacks_[radio]->WaitForEvent("onStopped" + std::to_string(radio + 1)));
  }
}

TEST_F(FiraControllerE2eTest, SchedulerChangedUnderneathLosesTheSessions) {
  Start({{0, "uwb0"}});
  ASSERT_TRUE(proxies_[0]->initNewTwrSession(MovingPeers(3, {0x0002})).isOk());
  ASSERT_TRUE(proxies_[0]->startRangingSession(3).isOk());
  ExpectRanging(0, 3, {0x0002});
  harness_->RunOnService([&] {
    ASSERT_TRUE(harness_->mcps_utils()->SetScheduler(
        0, McpsScheduler::kDefault, McpsUtils::kNoSlotDuration, McpsUtils::kNoNodeType, false));
  });
  EXPECT_EQ(EX_UNSUPPORTED_OPERATION, proxies_[0]->stopRangingSession(3).getExceptionCode());
  int32_t count = -1;
  EXPECT_TRUE(proxies_[0]->getSessionCount(&count).isOk());
  EXPECT_EQ(0, count);
  EXPECT_FALSE(harness_->devices().FindByName("uwb0")->up);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
