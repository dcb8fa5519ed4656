#include "sim/nl802154_family.h"

#include <errno.h>
#include <net/if.h>
#include <string.h>

#include <string>
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

constexpr char kTag[] = "dalix.uwb.IeeeUtils";

// The service's IeeeUtils against the simulated family, over real sockets
// and real interfaces.
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

  WpanDevice Device(const std::string& name) {
    std::optional<WpanDevice> device = devices_.FindByName(name);
    EXPECT_TRUE(device.has_value()) << name;
    return device.value_or(WpanDevice{});
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

TEST_F(Nl802154FamilyTest, ListsInterfacesInOrderWithTheirPhys) {
  bool ok = false;
  Add({"wpan0", 0});
  Add({"wpan1", 1});
  Add({"uwb12", 12});
  const std::vector<DevInfo> devices = utils_.ListDevices(&ok);
  EXPECT_TRUE(ok);
  ASSERT_EQ(3u, devices.size());
  EXPECT_EQ("wpan0", devices[0].name);
  EXPECT_EQ(0u, devices[0].phy_index);
  EXPECT_EQ("wpan1", devices[1].name);
  EXPECT_EQ(1u, devices[1].phy_index);
  EXPECT_EQ("uwb12", devices[2].name);
  EXPECT_EQ(12u, devices[2].phy_index);
}

TEST_F(Nl802154FamilyTest, InterfacesListedWithoutNameOrPhyAreLeftOut) {
  WpanDeviceConfig nameless{"wpan1", 1};
  nameless.dump_without_name = true;
  WpanDeviceConfig phyless{"wpan2", 2};
  phyless.dump_without_phy = true;
  Add({"wpan0", 0});
  Add(nameless);
  Add(phyless);
  Add({"wpan3", 3});

  bool ok = false;
  const std::vector<DevInfo> devices = utils_.ListDevices(&ok);
  EXPECT_TRUE(ok);
  ASSERT_EQ(2u, devices.size());
  EXPECT_EQ("wpan0", devices[0].name);
  EXPECT_EQ("wpan3", devices[1].name);
  EXPECT_EQ(2, log_.Count(android::base::ERROR,
                          "operator(): Incorrect attr in NL802154_CMD_GET_INTERFACE dump", kTag))
      << log_.Text();
}

TEST_F(Nl802154FamilyTest, PhyChannelsComeFromTheUwbPageOnly) {
  WpanDeviceConfig uwb{"wpan0", 7};
  uwb.pages = {{0, {1, 2, 3}}, {4, {9, 5, 6}}, {5, {1}}};
  WpanDeviceConfig narrowband{"wpan1", 8};
  narrowband.pages = {{0, {11, 26}}, {2, {1}}};
  Add(uwb);
  Add(narrowband);

  PhyInfo info;
  EXPECT_TRUE(utils_.GetPhyInfo("wpan0", &info));
  EXPECT_EQ(7u, info.phy_index);
  EXPECT_EQ((std::vector<int>{9, 5, 6}), info.channels);

  PhyInfo other;
  EXPECT_TRUE(utils_.GetPhyInfo("wpan1", &other));
  EXPECT_EQ(8u, other.phy_index);
  EXPECT_TRUE(other.channels.empty());
}

TEST_F(Nl802154FamilyTest, ChannelsInRangeAreSentAndKept) {
  WpanDeviceConfig config{"wpan0", 0};
  config.pages = {{0, {3}}, {4, {0, 5, 9, 15}}};
  Add(config);
  for (int channel : {0, 15, 9}) {
    EXPECT_TRUE(utils_.SetChannel("wpan0", channel)) << channel;
    EXPECT_EQ(kNl802154UwbPage, Device("wpan0").page);
    EXPECT_EQ(channel, Device("wpan0").channel);
  }
  const int sent = family_.request_count();
  EXPECT_FALSE(utils_.SetChannel("wpan0", 16));
  EXPECT_FALSE(utils_.SetChannel("wpan0", -1));
  EXPECT_EQ(sent, family_.request_count());
  // In range, but not a channel of the UWB page: the driver refuses it.
  EXPECT_FALSE(utils_.SetChannel("wpan0", 3));
  EXPECT_EQ(sent + 1, family_.request_count());
  EXPECT_TRUE(log_.Contains(android::base::WARNING,
                            "SendAndAwaitAck: Nl error: " + std::to_string(-EINVAL)))
      << log_.Text();
  EXPECT_EQ(9, Device("wpan0").channel);
}

TEST_F(Nl802154FamilyTest, PanIdAndShortAddressAreKept) {
  Add({"wpan0", 0});
  Add({"wpan1", 1});
  EXPECT_TRUE(utils_.SetPanId("wpan1", 0xcafe));
  EXPECT_TRUE(utils_.SetShortMacAddress("wpan1", {0xab, 0xcd}));
  EXPECT_EQ(0xcafe, Device("wpan1").pan_id);
  EXPECT_EQ(0xabcd, Device("wpan1").short_address);
  // The other interface is untouched.
  EXPECT_EQ(0xffff, Device("wpan0").pan_id);
  EXPECT_EQ(0xffff, Device("wpan0").short_address);

  const int sent = family_.request_count();
  EXPECT_FALSE(utils_.SetShortMacAddress("wpan1", {1, 2, 3}));
  EXPECT_EQ(sent, family_.request_count());
  EXPECT_TRUE(log_.Contains(android::base::ERROR,
                            "SetShortMacAddress: Incorrect short address, size is 3", kTag));
  EXPECT_EQ(0xabcd, Device("wpan1").short_address);
}

TEST_F(Nl802154FamilyTest, AddressesCannotChangeWhileTheInterfaceIsUp) {
  Add({"wpan0", 0});
  ASSERT_TRUE(interface_tool_.SetUpState("wpan0", true));
  EXPECT_FALSE(utils_.SetPanId("wpan0", 7));
  EXPECT_FALSE(utils_.SetShortMacAddress("wpan0", {0, 7}));
  EXPECT_EQ(2, log_.Count(android::base::WARNING,
                          "SendAndAwaitAck: Nl error: " + std::to_string(-EBUSY)))
      << log_.Text();
  ASSERT_TRUE(interface_tool_.SetUpState("wpan0", false));
  EXPECT_TRUE(utils_.SetPanId("wpan0", 7));
  EXPECT_EQ(7, Device("wpan0").pan_id);
}

TEST_F(Nl802154FamilyTest, UnknownInterfaceIsRefused) {
  Add({"wpan0", 0});
  // No interface of that name at all: nothing reaches the driver.
  const int sent = family_.request_count();
  PhyInfo info;
  EXPECT_FALSE(utils_.GetPhyInfo("wpan9", &info));
  EXPECT_FALSE(utils_.SetChannel("wpan9", 5));
  EXPECT_FALSE(utils_.SetPanId("wpan9", 1));
  EXPECT_FALSE(utils_.SetShortMacAddress("wpan9", {0, 1}));
  EXPECT_EQ(sent, family_.request_count());
  EXPECT_EQ(4, log_.Count(android::base::ERROR,
                          std::string("SetIeeeCommand: Failed to resolve iface wpan9: ") +
                              strerror(ENODEV),
                          kTag));

  // An interface the kernel has but the driver does not: the driver refuses.
  EXPECT_FALSE(utils_.GetPhyInfo("lo", &info));
  EXPECT_FALSE(utils_.SetChannel("lo", 5));
  EXPECT_EQ(sent + 2, family_.request_count());
  EXPECT_TRUE(log_.Contains(android::base::WARNING,
                            "SendAndAwaitResponse: Nl error: " + std::to_string(-ENODEV)))
      << log_.Text();
}

TEST_F(Nl802154FamilyTest, RemovedInterfaceDisappearsWithItsVeth) {
  Add({"wpan0", 0});
  Add({"wpan1", 1});
  const unsigned int index = if_nametoindex("wpan0");
  ASSERT_NE(0u, index);
  EXPECT_EQ(index, Device("wpan0").ifindex);
  ASSERT_TRUE(devices_.RemoveDevice("wpan0"));
  EXPECT_EQ(0u, if_nametoindex("wpan0"));
  EXPECT_FALSE(devices_.RemoveDevice("wpan0"));

  bool ok = false;
  const std::vector<DevInfo> devices = utils_.ListDevices(&ok);
  ASSERT_EQ(1u, devices.size());
  EXPECT_EQ("wpan1", devices[0].name);

  std::string error;
  EXPECT_FALSE(devices_.AddDevice({"wpan1", 5}, &error));
  EXPECT_FALSE(error.empty());
  EXPECT_FALSE(devices_.AddDevice({"wpan0123456789ab", 5}, &error));
  EXPECT_FALSE(error.empty());
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
