#include "sim/nl802154_family.h"

#include <errno.h>
#include <string.h>

#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "looper/looper_backed_event_loop.h"
#include "net/ieee_utils.h"
#include "net/nl802154.h"
#include "sim/driver_simulator.h"
#include "sim/sim_interface_tool.h"
#include "sim/sim_nl_socket_factory.h"
#include "sim/wpan_device_store.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

using ::android::base::ERROR;
using ::android::base::WARNING;
using MacAddress = InterfaceTool::MacAddress;
// Interfaces as the service lists them: name and phy.
using Listing = std::vector<std::pair<std::string, uint32_t>>;

constexpr char kTag[] = "dalix.uwb.IeeeUtils";
constexpr char kToolTag[] = "dalix.uwb.InterfaceTool";
constexpr MacAddress kFactoryAddress = {0x10, 0x20, 0x30, 0x40, 0x50, 0x60, 0x70, 0x80};

std::string NlError(const char* exchange, int error) {
  return std::string(exchange) + ": Nl error: " + std::to_string(-error);
}

std::string SystemError(const std::string& what, const char* iface, int error) {
  return what + " for " + iface + " (" + strerror(error) + ")";
}

// The service's IeeeUtils against the simulated family, over real sockets and real interfaces;
// beside it the simulator's interface tool. Every test starts with "wpan0" on phy 7.
class Nl802154FamilyTest : public ::testing::Test {
 protected:
  void SetUp() override {
    simulator_.RegisterFamily(kNl802154FamilyName, &family_);
    ASSERT_TRUE(simulator_.Start());
    ASSERT_TRUE(utils_.Setup());
    WpanDeviceConfig config{"wpan0", 7};
    config.pages = {{0, {1, 2, 3}}, {4, {0, 9, 5, 15}}, {5, {1}}};
    config.factory_address = kFactoryAddress;
    std::string error;
    ASSERT_TRUE(devices_.AddDevice(config, &error)) << error;
  }

  WpanDevice Device() { return devices_.FindByName("wpan0").value(); }

  // Declared in the order the borrowers need: the simulator goes first.
  WpanDeviceStore devices_;
  Nl802154Family family_{&devices_};
  DriverSimulator simulator_;
  LooperBackedEventLoop loop_;
  SimNlSocketFactory factory_{&loop_, simulator_.port()};
  IeeeUtils utils_{&factory_};
  SimInterfaceTool interface_tool_{&devices_};
  LogCapture log_;
};

TEST_F(Nl802154FamilyTest, ListsEveryInterfaceHoweverPackedUntilTheFamilyIsGone) {
  std::string error;
  ASSERT_TRUE(devices_.AddDevice({"wpan1", 1}, &error) && devices_.AddDevice({"uwb12", 12}, &error))
      << error;
  // All in one datagram with NLMSG_DONE, one per datagram, two or so per datagram.
  for (size_t bytes : {DriverSimulator::kDefaultDumpDatagramBytes, size_t{0}, size_t{120}}) {
    SCOPED_TRACE(bytes);
    simulator_.SetDumpDatagramBytes(bytes);
    bool ok = false;
    Listing found;
    for (const DevInfo& device : utils_.ListDevices(&ok)) {
      found.emplace_back(device.name, device.phy_index);
    }
    EXPECT_TRUE(ok);
    EXPECT_EQ(found, (Listing{{"wpan0", 7}, {"wpan1", 1}, {"uwb12", 12}}));
  }
  simulator_.SetFamilyPresent(kNl802154FamilyName, false);
  EXPECT_FALSE(IeeeUtils(&factory_).Setup());
  EXPECT_EQ(1, log_.Count(ERROR, "Setup Generic netlink nl802154 not found.", kTag)) << log_.Text();
}

TEST_F(Nl802154FamilyTest, ChannelsComeFromTheUwbPageOnly) {
  PhyInfo info;
  info.channels = {2};  // kept: the channels are added to what the caller has
  EXPECT_TRUE(utils_.GetPhyInfo("wpan0", &info));
  EXPECT_EQ(7u, info.phy_index);
  EXPECT_EQ((std::vector<int>{2, 0, 9, 5, 15}), info.channels);
  for (int channel : {0, 15}) {
    EXPECT_TRUE(utils_.SetChannel("wpan0", channel)) << channel;
    EXPECT_EQ(channel, Device().channel);
  }
  EXPECT_EQ(kNl802154UwbPage, Device().page);
  // In range but not on the UWB page.
  EXPECT_FALSE(utils_.SetChannel("wpan0", 3));
  EXPECT_EQ(15, Device().channel);
  EXPECT_TRUE(log_.Contains(WARNING, NlError("SendAndAwaitAck", EINVAL))) << log_.Text();
}

TEST_F(Nl802154FamilyTest, RefusedBeforeSendingOrByTheDriver) {
  EXPECT_FALSE(utils_.SetChannel("wpan0", 16));
  EXPECT_FALSE(utils_.SetChannel("wpan0", -1));
  EXPECT_FALSE(utils_.SetShortMacAddress("wpan0", {1, 2, 3}));
  // No interface of that name at all.
  PhyInfo info;
  EXPECT_FALSE(utils_.GetPhyInfo("wpan9", &info));
  EXPECT_FALSE(utils_.SetChannel("wpan9", 5));
  EXPECT_FALSE(utils_.SetPanId("wpan9", 1));
  EXPECT_FALSE(utils_.SetShortMacAddress("wpan9", {0, 1}));
  EXPECT_EQ(0, family_.request_count());
  EXPECT_TRUE(log_.Contains(ERROR, "SetShortMacAddress: Incorrect short address, size is 3", kTag));
  EXPECT_EQ(4, log_.Count(ERROR,
                          std::string("SetIeeeCommand: Failed to resolve iface wpan9: ") +
                              strerror(ENODEV),
                          kTag));

  errno = 0;
  EXPECT_FALSE(interface_tool_.SetUpState("wpan9", true));
  EXPECT_EQ(ENODEV, errno);  // kept across the log line
  EXPECT_EQ(1, log_.Count(ERROR, SystemError("Could not read interface state", "wpan9", ENODEV),
                          kToolTag));

  // "lo" is real but not the driver's.
  EXPECT_FALSE(utils_.GetPhyInfo("lo", &info));
  EXPECT_EQ(1, family_.request_count());
  EXPECT_TRUE(log_.Contains(WARNING, NlError("SendAndAwaitResponse", ENODEV))) << log_.Text();
  EXPECT_EQ(MacAddress{}, interface_tool_.GetFactoryMacAddress("lo"));
  EXPECT_EQ(1, log_.Count(ERROR, SystemError("Could not get factory address MAC", "lo", ENODEV),
                          kToolTag))
      << log_.Text();
}

// As in the kernel, an interface takes new addresses only while it is down.
TEST_F(Nl802154FamilyTest, AddressesAreTakenOnlyWhileTheInterfaceIsDown) {
  EXPECT_EQ(kFactoryAddress, interface_tool_.GetFactoryMacAddress("wpan0"));
  const MacAddress extended{0x02, 0x11, 0x22, 0x33, 0x44, 0x55, 0x66, 0x77};
  for (bool up : {true, false}) {
    SCOPED_TRACE(up);
    ASSERT_TRUE(interface_tool_.SetUpState("wpan0", up));
    EXPECT_EQ(up, interface_tool_.GetUpState("wpan0"));
    EXPECT_EQ(!up, utils_.SetPanId("wpan0", 0xabcd));
    EXPECT_EQ(!up, utils_.SetShortMacAddress("wpan0", {0x12, 0x34}));
    EXPECT_EQ(!up, interface_tool_.SetMacAddress("wpan0", extended));
    const WpanDevice device = Device();
    EXPECT_EQ(up ? std::make_tuple(0xffff, 0xffff, MacAddress{})
                 : std::make_tuple(0xabcd, 0x1234, extended),
              std::make_tuple(device.pan_id, device.short_address, device.extended_address));
  }
  EXPECT_EQ(2, log_.Count(WARNING, NlError("SendAndAwaitAck", EBUSY))) << log_.Text();
  EXPECT_EQ(1, log_.Count(ERROR, SystemError("Could not set interface MAC address", "wpan0", EBUSY),
                          kToolTag))
      << log_.Text();
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
