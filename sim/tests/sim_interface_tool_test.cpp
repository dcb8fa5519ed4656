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

std::string SystemError(const char* what, const char* iface, int error) {
  return std::string(what) + " for " + iface + " (" + strerror(error) + ")";
}

class SimInterfaceToolTest : public ::testing::Test {
 protected:
  void SetUp() override {
    for (uint32_t phy : {0u, 1u}) {
      WpanDeviceConfig config{"wpan" + std::to_string(phy), phy};
      config.factory_address = kFactory[phy];
      std::string error;
      ASSERT_TRUE(devices_.AddDevice(config, &error)) << error;
    }
  }

  WpanDevice Device(const char* name) { return *devices_.FindByName(name); }

  const MacAddress kFactory[2] = {{0x10, 0x20, 0x30, 0x40, 0x50, 0x60, 0x70, 0x80},
                                  {0x11, 0x21, 0x31, 0x41, 0x51, 0x61, 0x71, 0x81}};
  WpanDeviceStore devices_;
  SimInterfaceTool tool_{&devices_};
  // The production tool sees only the kernel: it checks the mirroring.
  InterfaceTool kernel_;
  LogCapture log_;
};

TEST_F(SimInterfaceToolTest, UpStateIsKeptPerInterfaceAndMirroredOntoTheVeth) {
  for (bool up : {true, false}) {
    EXPECT_TRUE(tool_.SetUpState("wpan0", up));
    EXPECT_EQ(up, kernel_.GetUpState("wpan0"));
    EXPECT_EQ(up, tool_.GetUpState("wpan0"));
    EXPECT_EQ(up, Device("wpan0").up);
    EXPECT_FALSE(Device("wpan1").up);
  }
  EXPECT_TRUE(log_.Entries().empty()) << log_.Text();
}

TEST_F(SimInterfaceToolTest, ExtendedAddressIsKeptPerInterfaceWhileDown) {
  // An extended address may have any first byte, unlike an Ethernet one.
  const MacAddress mac{0x01, 0x23, 0x45, 0x67, 0x89, 0xab, 0xcd, 0xef};
  EXPECT_TRUE(tool_.SetMacAddress("wpan1", mac));
  EXPECT_EQ(mac, Device("wpan1").extended_address);
  EXPECT_EQ(MacAddress{}, Device("wpan0").extended_address);
  EXPECT_EQ(kFactory[0], tool_.GetFactoryMacAddress("wpan0"));
  EXPECT_EQ(kFactory[1], tool_.GetFactoryMacAddress("wpan1"));
  EXPECT_TRUE(log_.Entries().empty()) << log_.Text();

  ASSERT_TRUE(tool_.SetUpState("wpan0", true));
  errno = 0;
  EXPECT_FALSE(tool_.SetMacAddress("wpan0", mac));
  EXPECT_EQ(EBUSY, errno);
  EXPECT_EQ(1, log_.Count(android::base::ERROR,
                          SystemError("Could not set interface MAC address", "wpan0", EBUSY), kTag))
      << log_.Text();
  EXPECT_EQ(MacAddress{}, Device("wpan0").extended_address);
}

TEST_F(SimInterfaceToolTest, AddressesOfInterfacesOutsideTheDriverAreRefused) {
  // "lo" is real but not the driver's.
  errno = 0;
  EXPECT_FALSE(tool_.SetMacAddress("lo", MacAddress{}));
  EXPECT_EQ(ENODEV, errno);
  EXPECT_EQ(MacAddress{}, tool_.GetFactoryMacAddress("lo"));
  EXPECT_EQ(1, log_.Count(android::base::ERROR,
                          SystemError("Could not set interface MAC address", "lo", ENODEV), kTag))
      << log_.Text();
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
