// The root service end to end: the real start-up path on a service thread,
// the simulated driver behind it, and a client calling the root object and
// the radios' controllers through the host binder from the test's thread.
#include "uwb.h"

#include <chrono>
#include <cmath>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <tuple>
#include <utility>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/BnSimpleRangingCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/BnUwbClientCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/IUwb.h>
#include <android-base/file.h>
#include <android/binder_manager.h>
#include <binder_host/host.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "net/mcps802154.h"
#include "net/nl802154.h"
#include "service_main.h"
#include "sim/service_thread.h"
#include "sim/simulated_driver.h"
#include "tests/log_capture.h"
#include "tools/ranging_client.h"
#include "tools/service_dump.h"

namespace hardware {
namespace dalix {
namespace {

namespace uwb = aidl::aidl::hardware::dalix::uwb;
using ::testing::ContainsRegex;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

// Polls |done| for up to five seconds; results come on the service's thread.
bool WaitFor(const std::function<bool()>& done) {
  for (int i = 0; i < 500 && !done(); ++i) {
    std::this_thread::sleep_for(std::chrono::milliseconds(10));
  }
  return done();
}

// The simulated driver, the service running its own start-up path on a
// thread of its own, and the test's thread as a client that reaches it
// through the host binder's service manager. Tear-down closes the HAL and
// stops the service, so the next test starts closed.
class UwbTest : public ::testing::Test {
 protected:
  class Client : public uwb::BnUwbClientCallback {};

  void SetUp() override { ASSERT_TRUE(driver_.Start()); }
  void TearDown() override {
    EXPECT_TRUE(uwb_ == nullptr || uwb_->close().isOk());
    uwb_.reset();
    service_.Stop();
  }

  // A radio driving phy |phy|, with its network interface unless |ifname|
  // is empty.
  void AddRadio(uint32_t hw_index, uint32_t phy, const std::string& ifname) {
    std::string error;
    ASSERT_TRUE(driver_.AddRadio(hw_index, phy, ifname, &error)) << error;
  }
  void StartService() {
    service_.Start();
    uwb_ = uwb::IUwb::fromBinder(
        ndk::SpAIBinder(AServiceManager_checkService(ServiceInstanceName().c_str())));
    ASSERT_NE(uwb_, nullptr);
  }
  std::vector<std::string> Names() {
    std::vector<std::string> names;
    EXPECT_TRUE(uwb_->listIfaceNames(&names).isOk());
    return names;
  }

  sim::SimulatedDriver driver_;
  sim::ServiceThread service_{driver_.port(), &driver_.devices()};
  std::shared_ptr<uwb::IUwb> uwb_;
};

TEST_F(UwbTest, OneLiveClientAtATimeWhoseDeathStopsFiraRangingAndFreesTheHal) {
  AddRadio(0, 0, "wpan0");
  sim::Peer peer{0x1001, 0, sim::Motion::Circle({2, 0, 0}, 1, 1)};
  driver_.world().AddPeer(peer);
  LogCapture log;
  StartService();
  for (auto [family, message] :
       {std::pair(kMcpsFamilyName, "Failed to find MCPS netlink, check the kernel module"),
        std::pair(kNl802154FamilyName, "Failed to find IEEE netlink, check the kernel module")}) {
    driver_.simulator().SetFamilyPresent(family, false);
    ndk::ScopedAStatus status = uwb_->open(ndk::SharedRefBase::make<Client>());
    EXPECT_EQ(status.getExceptionCode(), EX_SERVICE_SPECIFIC);
    EXPECT_EQ(status.getServiceSpecificError(), 1);
    EXPECT_STREQ(status.getMessage(), message);
    driver_.simulator().SetFamilyPresent(family, true);
  }
  // Session 1 from 0x0001 to the peer, on channel 9, a block every 20 ms.
  const tools::FiraOptions options{1, 0x0001, {peer.short_address}, 9, 20};
  {
    // With both families back, a client gets in; a second one is refused
    // while the first lives, and the first one's ranging goes on.
    tools::RangingClient client(uwb_);
    std::string error;
    ASSERT_TRUE(client.Open(&error) && client.StartFira("wpan0", options, &error)) << error;
    ndk::ScopedAStatus refused = uwb_->open(ndk::SharedRefBase::make<Client>());
    EXPECT_EQ(refused.getExceptionCode(), EX_ILLEGAL_STATE);
    EXPECT_STREQ(refused.getMessage(), "HAL is already open");
    ASSERT_TRUE(WaitFor([&] {
      const std::vector<tools::PeerReading> readings = client.Readings();
      return !readings.empty() && readings[0].results >= 3;
    }));
    const std::string dump = tools::DumpService(uwb_->asBinder().get());
    EXPECT_THAT(dump, HasSubstr("UWB HAL: open, client alive, 1 radio(s)"));
    EXPECT_THAT(dump, HasSubstr("radio wpan0: hw index 0, phy 0, scheduler endless, interface up"));
    EXPECT_THAT(dump, HasSubstr("FiRa: 1 session(s), 1 running"));
    EXPECT_THAT(dump, ContainsRegex("session 1: running, [0-9]+ notification"));

    // The death is handled before the next call: both go through the
    // service thread in order.
    ndk::host::KillBinder(client.client_binder().get());
    EXPECT_THAT(Names(), IsEmpty());
    EXPECT_TRUE(
        log.Contains(android::base::INFO, "LambdaOnDeath Uwb service has died", "dalix.Uwb"));
    EXPECT_FALSE(driver_.devices().FindByName("wpan0").value().up);
    EXPECT_EQ(driver_.radios().Radio(0)->scheduler, kMcpsSchedulerDefault);
    EXPECT_TRUE(driver_.fira_region().Sessions().empty());
  }

  // Session 1 again, which a leftover of the dead client's would refuse;
  // stopping closes the HAL.
  tools::RangingClient next(uwb_);
  std::string error;
  EXPECT_TRUE(next.Open(&error) && next.StartFira("wpan0", options, &error)) << error;
  EXPECT_TRUE(next.Stop(&error)) << error;
  EXPECT_THAT(Names(), IsEmpty());
}

TEST_F(UwbTest, PairsDevicesWithRadiosByPhyAndLoadsCalibrationByHardwareIndex) {
  AddRadio(3, 1, "wpan1");  // its device is on phy 1
  AddRadio(5, 0, "");       // a radio without a network device
  // A device on a phy no radio drives.
  std::string error;
  ASSERT_TRUE(driver_.devices().AddDevice(sim::WpanDeviceConfig{"wpan9", 9}, &error)) << error;
  StartService();
  TemporaryDir dir;
  const std::string file = std::string(dir.path) + "/calibration";
  ASSERT_TRUE(
      android::base::WriteStringToFile("xtal_trim = 17\nch9.ant0.tx_delay = 16450\n", file));
  // Before the open; then a radio without an interface; then a file that
  // is not there, whose service-specific failure carries no code of its own.
  for (auto [hw_index, path, exception, message] :
       {std::tuple(3, file, EX_ILLEGAL_STATE, "UWB HAL is not opened"),
        std::tuple(5, file, EX_ILLEGAL_ARGUMENT, "Unkown hw index"),
        std::tuple(3, file + ".missing", EX_SERVICE_SPECIFIC, "Failed to load calibration")}) {
    ndk::ScopedAStatus status = uwb_->loadCalibration(hw_index, path);
    EXPECT_EQ(status.getExceptionCode(), exception);
    EXPECT_STREQ(status.getMessage(), message);
    EXPECT_EQ(status.getServiceSpecificError(), 0);
    EXPECT_THAT(driver_.radios().Radio(3)->calibration, IsEmpty());
    if (exception == EX_ILLEGAL_STATE) {
      ASSERT_TRUE(uwb_->open(ndk::SharedRefBase::make<Client>()).isOk());
    }
  }
  ASSERT_TRUE(uwb_->loadCalibration(3, file).isOk());
  EXPECT_EQ(driver_.radios().Radio(3)->calibration,
            (std::map<std::string, uint32_t>{{"ch9.ant0.tx_delay", 16450}, {"xtal_trim", 17}}));

  EXPECT_THAT(Names(), ElementsAre("wpan1"));
  std::vector<int64_t> indices;
  ASSERT_TRUE(uwb_->listHardwareIndex(&indices).isOk());
  EXPECT_THAT(indices, ElementsAre(3, 5));
  std::shared_ptr<uwb::IUwbIface> iface;
  ndk::ScopedAStatus status = uwb_->getIface("wpan9", &iface);
  EXPECT_EQ(status.getExceptionCode(), EX_ILLEGAL_ARGUMENT);
  EXPECT_STREQ(status.getMessage(), "Unknown iface wpan9");

  // A refused listing is an unknown error and leaves the caller's list alone.
  driver_.simulator().SetCommandFault(kMcpsFamilyName, MCPS802154_CMD_GET_HW,
                                      sim::Fault{sim::Fault::Kind::kError, EIO});
  EXPECT_EQ(uwb_->listHardwareIndex(&indices).getStatus(), STATUS_UNKNOWN_ERROR);
  EXPECT_THAT(indices, ElementsAre(3, 5));
}

// Keeps each request's first result.
class FirstResults : public uwb::BnSimpleRangingCallback {
 public:
  ndk::ScopedAStatus onRangingResult(const uwb::RangingResult& result) override {
    std::lock_guard<std::mutex> lock(mutex_);
    first_.emplace(result.id, result);
    return ndk::ScopedAStatus::ok();
  }
  std::map<int32_t, uwb::RangingResult> first() {
    std::lock_guard<std::mutex> lock(mutex_);
    return first_;
  }

 private:
  std::mutex mutex_;
  std::map<int32_t, uwb::RangingResult> first_;
};

// Simple ranging, then CCC, on one radio.
TEST_F(UwbTest, RangesTheSimulatedPeersInBothModesAndStartsCccWhateverTheDriversCode) {
  constexpr int64_t kPeerA = 0x0a0a, kPeerB = 0x0b0b, kNobody = 0x0f0f;
  AddRadio(0, 0, "wpan0");
  driver_.world().AddPeer(sim::Peer{0xa, kPeerA, sim::Motion::Standing({2.1, 1.2, -0.6})});
  driver_.world().AddPeer(sim::Peer{0xb, kPeerB, sim::Motion::Standing({4.3, -6.7, 0.8})});
  StartService();
  ASSERT_TRUE(uwb_->open(ndk::SharedRefBase::make<Client>()).isOk());
  std::shared_ptr<uwb::IUwbIface> iface;
  ASSERT_TRUE(uwb_->getIface("wpan0", &iface).isOk());
  std::shared_ptr<uwb::ISimpleRangingController> simple;
  ASSERT_TRUE(iface->simpleRangingController(&simple).isOk());
  for (bool responder : {false, true}) {
    SCOPED_TRACE(responder ? "responder" : "initiator");
    auto callback = ndk::SharedRefBase::make<FirstResults>();
    ASSERT_TRUE(simple->setCallback(callback).isOk());
    ndk::ScopedAStatus started = responder ? simple->startResponderMode(0x1234, 0x0102, 9)
                                           : simple->startInitiatorMode(0x1234, 0x0102, 9);
    ASSERT_TRUE(started.isOk()) << started.getDescription();
    ASSERT_TRUE(simple->setRangings({{1, 0, kPeerA}, {2, 0, kPeerB}, {3, 0, kNobody}}).isOk());
    std::map<int32_t, uwb::RangingResult> first;
    ASSERT_TRUE(WaitFor([&] { return (first = callback->first()).size() == 3; }));
    // One fixed-point step of phase is about 2e-4 rad of angle near the axis.
    for (auto [id, peer, short_address] :
         {std::tuple(1, kPeerA, 0xa), std::tuple(2, kPeerB, 0xb)}) {
      sim::Observation truth = *driver_.world().Truth(0, short_address, 0);
      EXPECT_EQ(first[id].peerAddress, peer);
      EXPECT_EQ(first[id].measurement, std::lround(truth.distance_m * 100));
      EXPECT_NEAR(first[id].firstAngleRad, truth.azimuth_rad, 1e-3);
      EXPECT_NEAR(first[id].secondAngleRad, truth.elevation_rad, 1e-3);
    }
    // A peer out of reach: reported, but nothing measured.
    EXPECT_EQ(first[3].measurement, INT32_MIN);
    EXPECT_TRUE(std::isnan(first[3].firstAngleRad) && std::isnan(first[3].secondAngleRad));

    ASSERT_TRUE(simple->stop().isOk());
  }

  // CCC: the start succeeds and reports 123000 whatever code the driver
  // returns, and a refused start is -7.
  std::shared_ptr<uwb::ICccController> ccc;
  ASSERT_TRUE(iface->cccController(&ccc).isOk());
  LogCapture log;
  ASSERT_TRUE(ccc->openCccSession().isOk());
  for (uint8_t code : {1, 0}) {
    driver_.ccc_test_mode().SetReturnCode(code);
    int64_t result = 0;
    ASSERT_TRUE(ccc->startCccSession(1, 2, 9, &result).isOk());
    EXPECT_EQ(result, 123000);
  }
  EXPECT_EQ(log.Count(android::base::ERROR, "ParseTestModeCmdResponse: Error on the command",
                      "dalix.uwb.CccRegionUtils"),
            1);
  std::vector<sim::CccTestModeSim::Start> starts = driver_.ccc_test_mode().Starts();
  ASSERT_EQ(starts.size(), 2u);
  EXPECT_EQ(starts[1].channel, 9);
  EXPECT_EQ(starts[1].u32_param, 123000u);

  driver_.simulator().SetCommandFault(kMcpsFamilyName, MCPS802154_CMD_TESTMODE,
                                      sim::Fault{sim::Fault::Kind::kError, EPERM});
  int64_t result = 0;
  EXPECT_EQ(ccc->startCccSession(1, 2, 9, &result).getExceptionCode(), -7);
  EXPECT_EQ(result, 0);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
