#include "sim/nl802154_family.h"

#include <errno.h>
#include <net/if.h>
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

std::string NlError(const char* exchange, int error) {
  return std::string(exchange) + ": Nl error: " + std::to_string(-error);
}

std::string MacAddressError(const char* iface, int error) {
  return std::string("Could not set interface MAC address for ") + iface + " (" + strerror(error) +
         ")";
}

// The service's IeeeUtils against the simulated family, over real sockets
// and real interfaces; beside it the simulator's interface tool, which keeps
// what a veth cannot hold.
class Nl802154FamilyTest : public ::testing::Test {
 protected:
  void SetUp() override {
    simulator_.RegisterFamily(kNl802154FamilyName, &family_);
    ASSERT_TRUE(simulator_.Start());
    ASSERT_TRUE(utils_.Setup());
  }

  void Add(const WpanDeviceConfig& config) {
    std::string error;
    ASSERT_TRUE(devices_.AddDevice(config, &error)) << error;
  }

  WpanDevice Device(const std::string& name) { return devices_.FindByName(name).value(); }

  Listing List() {
    bool ok = false;
    Listing found;
    for (const DevInfo& device : utils_.ListDevices(&ok)) {
      found.emplace_back(device.name, device.phy_index);
    }
    EXPECT_TRUE(ok);
    return found;
  }

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

TEST_F(Nl802154FamilyTest, ListsEveryInterfaceHoweverPackedAndForgetsARemovedOne) {
  for (uint32_t phy : {0, 1}) Add({"wpan" + std::to_string(phy), phy});
  Add({"uwb12", 12});
  // All in one datagram with NLMSG_DONE, one per datagram, two or so per datagram.
  for (size_t bytes : {DriverSimulator::kDefaultDumpDatagramBytes, size_t{0}, size_t{120}}) {
    SCOPED_TRACE(bytes);
    simulator_.SetDumpDatagramBytes(bytes);
    EXPECT_EQ(List(), (Listing{{"wpan0", 0}, {"wpan1", 1}, {"uwb12", 12}}));
  }

  // A removed interface goes with its veth.
  ASSERT_TRUE(devices_.RemoveDevice("wpan0"));
  EXPECT_EQ(0u, if_nametoindex("wpan0"));
  EXPECT_EQ(List(), (Listing{{"wpan1", 1}, {"uwb12", 12}}));
  std::string error;
  EXPECT_FALSE(devices_.AddDevice({"uwb12", 5}, &error));  // the name is taken
}

TEST_F(Nl802154FamilyTest, PhyChannelsComeFromTheUwbPageOnlyAndAreAppended) {
  WpanDeviceConfig uwb{"wpan0", 7};
  uwb.pages = {{0, {1, 2, 3}}, {4, {9, 5, 6}}, {5, {1}}};
  WpanDeviceConfig narrowband{"wpan1", 8};
  narrowband.pages = {{0, {11, 26}}, {2, {1}}};
  Add(uwb);
  Add(narrowband);
  PhyInfo info;
  info.channels = {2};  // kept: the channels are added to what the caller has
  EXPECT_TRUE(utils_.GetPhyInfo("wpan0", &info));
  EXPECT_EQ(7u, info.phy_index);
  EXPECT_EQ((std::vector<int>{2, 9, 5, 6}), info.channels);
  info.channels.clear();
  EXPECT_TRUE(utils_.GetPhyInfo("wpan1", &info));  // no UWB page: nothing to add
  EXPECT_EQ(8u, info.phy_index);
  EXPECT_TRUE(info.channels.empty());
}

TEST_F(Nl802154FamilyTest, RefusedBeforeSendingOrByTheDriver) {
  WpanDeviceConfig config{"wpan0", 0};
  config.pages = {{0, {3}}, {4, {0, 5, 9, 15}}};
  Add(config);
  for (int channel : {0, 15}) {
    EXPECT_TRUE(utils_.SetChannel("wpan0", channel)) << channel;
    EXPECT_EQ(channel, Device("wpan0").channel);
  }
  EXPECT_EQ(kNl802154UwbPage, Device("wpan0").page);
  const int sent = family_.request_count();
  EXPECT_FALSE(utils_.SetChannel("wpan0", 16));
  EXPECT_FALSE(utils_.SetChannel("wpan0", -1));
  EXPECT_FALSE(utils_.SetShortMacAddress("wpan0", {1, 2, 3}));
  // No interface of that name at all.
  PhyInfo info;
  EXPECT_FALSE(utils_.GetPhyInfo("wpan9", &info));
  EXPECT_FALSE(utils_.SetChannel("wpan9", 5));
  EXPECT_FALSE(utils_.SetPanId("wpan9", 1));
  EXPECT_FALSE(utils_.SetShortMacAddress("wpan9", {0, 1}));
  EXPECT_EQ(sent, family_.request_count());
  EXPECT_TRUE(log_.Contains(ERROR, "SetShortMacAddress: Incorrect short address, size is 3", kTag));
  EXPECT_EQ(4, log_.Count(ERROR,
                          std::string("SetIeeeCommand: Failed to resolve iface wpan9: ") +
                              strerror(ENODEV),
                          kTag));

  // In range but not on the UWB page, or on "lo", real but not the driver's.
  EXPECT_FALSE(utils_.SetChannel("wpan0", 3));
  EXPECT_FALSE(utils_.GetPhyInfo("lo", &info));
  EXPECT_FALSE(utils_.SetChannel("lo", 5));
  EXPECT_EQ(sent + 3, family_.request_count());
  EXPECT_EQ(15, Device("wpan0").channel);
  EXPECT_TRUE(log_.Contains(WARNING, NlError("SendAndAwaitAck", EINVAL))) << log_.Text();
  EXPECT_TRUE(log_.Contains(WARNING, NlError("SendAndAwaitResponse", ENODEV))) << log_.Text();
  EXPECT_FALSE(interface_tool_.SetMacAddress("lo", MacAddress{}));
  EXPECT_EQ(MacAddress{}, interface_tool_.GetFactoryMacAddress("lo"));
  EXPECT_EQ(1, log_.Count(ERROR, MacAddressError("lo", ENODEV), kToolTag)) << log_.Text();
}

// As in the kernel, an interface takes new addresses only while it is down.
TEST_F(Nl802154FamilyTest, AddressesAreRefusedWhileTheInterfaceIsUp) {
  WpanDeviceConfig config{"wpan0", 0};
  config.factory_address = {0x10, 0x20, 0x30, 0x40, 0x50, 0x60, 0x70, 0x80};
  Add(config);
  EXPECT_EQ(config.factory_address, interface_tool_.GetFactoryMacAddress("wpan0"));
  ASSERT_TRUE(interface_tool_.SetUpState("wpan0", true));
  EXPECT_FALSE(utils_.SetPanId("wpan0", 7));
  EXPECT_FALSE(utils_.SetShortMacAddress("wpan0", {0, 7}));
  EXPECT_FALSE(interface_tool_.SetMacAddress("wpan0", config.factory_address));
  const WpanDevice device = Device("wpan0");
  EXPECT_EQ(std::make_tuple(0xffff, 0xffff, MacAddress{}),
            std::make_tuple(device.pan_id, device.short_address, device.extended_address));
  EXPECT_EQ(2, log_.Count(WARNING, NlError("SendAndAwaitAck", EBUSY))) << log_.Text();
  EXPECT_EQ(1, log_.Count(ERROR, MacAddressError("wpan0", EBUSY), kToolTag)) << log_.Text();
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
