#include "sim/sim_interface_tool.h"

#include <errno.h>
#include <string.h>

#include <string>

#include <gtest/gtest.h>

#include "sim/wpan_device_store.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

using MacAddress = InterfaceTool::MacAddress;

constexpr char kTag[] = "dalix.uwb.InterfaceTool";

class SimInterfaceToolTest : public ::testing::Test {
 protected:
  void SetUp() override {
    WpanDeviceConfig first{"wpan0", 0};
    first.factory_address = kFactory0;
    WpanDeviceConfig second{"wpan1", 1};
    second.factory_address = kFactory1;
    std::string error;
    ASSERT_TRUE(devices_.AddDevice(first, &error)) << error;
    ASSERT_TRUE(devices_.AddDevice(second, &error)) << error;
  }

  bool StoredUp(const char* name) { return devices_.FindByName(name)->up; }

  const MacAddress kFactory0{0x10, 0x20, 0x30, 0x40, 0x50, 0x60, 0x70, 0x80};
  const MacAddress kFactory1{0x11, 0x21, 0x31, 0x41, 0x51, 0x61, 0x71, 0x81};
  WpanDeviceStore devices_;
  SimInterfaceTool tool_{&devices_};
  // The production tool sees only the kernel: it checks the mirroring.
  InterfaceTool kernel_;
  LogCapture log_;
};

TEST_F(SimInterfaceToolTest, UpAndDownReachTheRealInterface) {
  EXPECT_FALSE(tool_.GetUpState("wpan0"));
  EXPECT_TRUE(tool_.SetUpState("wpan0", true));
  EXPECT_TRUE(kernel_.GetUpState("wpan0"));
  EXPECT_TRUE(tool_.GetUpState("wpan0"));
  EXPECT_TRUE(StoredUp("wpan0"));
  EXPECT_FALSE(StoredUp("wpan1"));

  EXPECT_TRUE(tool_.SetUpState("wpan0", false));
  EXPECT_FALSE(kernel_.GetUpState("wpan0"));
  EXPECT_FALSE(StoredUp("wpan0"));
  EXPECT_TRUE(log_.Entries().empty()) << log_.Text();
}

TEST_F(SimInterfaceToolTest, ExtendedAddressIsKeptPerInterfaceAsGiven) {
  // An extended address may have any first byte, unlike an Ethernet one.
  const MacAddress mac{0x01, 0x23, 0x45, 0x67, 0x89, 0xab, 0xcd, 0xef};
  EXPECT_TRUE(tool_.SetMacAddress("wpan1", mac));
  EXPECT_EQ(mac, devices_.FindByName("wpan1")->extended_address);
  EXPECT_EQ(MacAddress{}, devices_.FindByName("wpan0")->extended_address);
  EXPECT_EQ(kFactory0, tool_.GetFactoryMacAddress("wpan0"));
  EXPECT_EQ(kFactory1, tool_.GetFactoryMacAddress("wpan1"));
  EXPECT_TRUE(log_.Entries().empty()) << log_.Text();
}

TEST_F(SimInterfaceToolTest, ExtendedAddressCannotChangeWhileUp) {
  const MacAddress mac{0x02, 0, 0, 0, 0, 0, 0, 0x01};
  ASSERT_TRUE(tool_.SetUpState("wpan0", true));
  errno = 0;
  EXPECT_FALSE(tool_.SetMacAddress("wpan0", mac));
  EXPECT_EQ(EBUSY, errno);
  EXPECT_EQ(1, log_.Count(android::base::ERROR,
                          std::string("Could not set interface MAC address for wpan0 (") +
                              strerror(EBUSY) + ")",
                          kTag))
      << log_.Text();
  EXPECT_EQ(MacAddress{}, devices_.FindByName("wpan0")->extended_address);
}

TEST_F(SimInterfaceToolTest, InterfacesOutsideTheDriverFailAsTheKernelWould) {
  // Real but not an 802.15.4 interface: its flags are readable, its
  // addresses are not the driver's.
  EXPECT_FALSE(tool_.SetMacAddress("lo", MacAddress{}));
  EXPECT_EQ(MacAddress{}, tool_.GetFactoryMacAddress("lo"));
  EXPECT_EQ(1, log_.Count(android::base::ERROR,
                          std::string("Could not set interface MAC address for lo (") +
                              strerror(ENODEV) + ")",
                          kTag))
      << log_.Text();
  // Not there at all, or a name no interface can have.
  EXPECT_EQ(MacAddress{}, tool_.GetFactoryMacAddress("wpan7"));
  EXPECT_FALSE(tool_.SetUpState("wpan0123456789ab", true));
  EXPECT_TRUE(log_.Contains(android::base::ERROR,
                            std::string("Could not read interface state for wpan7 (") +
                                strerror(ENODEV) + ")",
                            kTag));
  EXPECT_TRUE(log_.Contains(android::base::ERROR, "Interface name is too long: wpan0123456789ab",
                            kTag));
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
