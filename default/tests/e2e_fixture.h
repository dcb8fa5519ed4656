#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/BnUwbClientCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/IUwb.h>
#include <android/binder_manager.h>
#include <gtest/gtest.h>

#include "service_main.h"
#include "sim/service_thread.h"
#include "sim/simulated_driver.h"

namespace hardware {
namespace dalix {

// The whole service end to end: the simulated driver, the service running
// its own start-up path on a thread of its own, and the test's thread as a
// client that reaches it through the host binder's service manager. A test
// adds radios and peers, starts the service, and calls |uwb_|; tear-down
// closes the HAL and stops the service, so the next test starts closed.
class EndToEndTest : public ::testing::Test {
 protected:
  using IUwb = aidl::aidl::hardware::dalix::uwb::IUwb;
  // The client's stand-in at open: the HAL only watches it for death.
  class Client : public aidl::aidl::hardware::dalix::uwb::BnUwbClientCallback {};

  void SetUp() override { ASSERT_TRUE(driver_.Start()); }

  void TearDown() override {
    if (uwb_ != nullptr) {
      EXPECT_TRUE(uwb_->close().isOk());
    }
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
    uwb_ = IUwb::fromBinder(
        ndk::SpAIBinder(AServiceManager_checkService(ServiceInstanceName().c_str())));
    ASSERT_NE(uwb_, nullptr);
  }

  // Opens the HAL for a new client and returns the radio |ifname|.
  std::shared_ptr<aidl::aidl::hardware::dalix::uwb::IUwbIface> OpenIface(
      const std::string& ifname) {
    std::shared_ptr<aidl::aidl::hardware::dalix::uwb::IUwbIface> iface;
    EXPECT_TRUE(uwb_->open(ndk::SharedRefBase::make<Client>()).isOk());
    EXPECT_TRUE(uwb_->getIface(ifname, &iface).isOk());
    return iface;
  }

  std::vector<std::string> Names() {
    std::vector<std::string> names;
    EXPECT_TRUE(uwb_->listIfaceNames(&names).isOk());
    return names;
  }

  bool IsUp(const std::string& ifname) {
    std::optional<sim::WpanDevice> device = driver_.devices().FindByName(ifname);
    return device.has_value() && device->up;
  }

  sim::SimulatedDriver driver_;
  sim::ServiceThread service_{driver_.port(), &driver_.devices()};
  std::shared_ptr<IUwb> uwb_;
};

}  // namespace dalix
}  // namespace hardware
