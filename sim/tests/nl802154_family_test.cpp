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

std::string NlError(const char* exchange, int error) {
  return std::string(exchange) + ": Nl error: " + std::to_string(-error);
}

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

  WpanDevice Device(const std::string& name) { return devices_.FindByName(name).value(); }

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

TEST_F(Nl802154FamilyTest, ListsInterfacesInOrderLeavingOutThoseWithoutNameOrPhy) {
  WpanDeviceConfig nameless{"wpan1", 1};
  nameless.dump_without_name = true;
  WpanDeviceConfig phyless{"wpan2", 2};
  phyless.dump_without_phy = true;
  for (const WpanDeviceConfig& config : {WpanDeviceConfig{"wpan0", 0}, nameless, phyless,
                                         WpanDeviceConfig{"uwb12", 12}}) {
    Add(config);
  }
  // However the kernel packs the dump, every entry is read: all in one
  // datagram with NLMSG_DONE, one per datagram, two or so per datagram.
  for (size_t bytes : {DriverSimulator::kDefaultDumpDatagramBytes, size_t{0}, size_t{120}}) {
    SCOPED_TRACE(bytes);
    simulator_.SetDumpDatagramBytes(bytes);
    log_.Reset();
    bool ok = false;
    const std::vector<DevInfo> devices = utils_.ListDevices(&ok);
    EXPECT_TRUE(ok);
    ASSERT_EQ(2u, devices.size());
    EXPECT_EQ("wpan0", devices[0].name);
    EXPECT_EQ(0u, devices[0].phy_index);
    EXPECT_EQ("uwb12", devices[1].name);
    EXPECT_EQ(12u, devices[1].phy_index);
    EXPECT_EQ(2, log_.Count(android::base::ERROR,
                            "operator(): Incorrect attr in NL802154_CMD_GET_INTERFACE dump", kTag))
        << log_.Text();
  }
}

TEST_F(Nl802154FamilyTest, PhyChannelsComeFromTheUwbPageOnlyAndAreAppended) {
  WpanDeviceConfig uwb{"wpan0", 7};
  uwb.pages = {{0, {1, 2, 3}}, {4, {9, 5, 6}}, {5, {1}}};
  WpanDeviceConfig narrowband{"wpan1", 8};
  narrowband.pages = {{0, {11, 26}}, {2, {1}}};
  Add(uwb);
  Add(narrowband);
  const struct {
    const char* iface;
    uint32_t phy;
    std::vector<int> channels;
  } cases[] = {{"wpan0", 7, {2, 9, 5, 6}}, {"wpan1", 8, {2}}};
  for (const auto& c : cases) {
    PhyInfo info;
    info.channels = {2};  // kept: the channels are added to what the caller has
    EXPECT_TRUE(utils_.GetPhyInfo(c.iface, &info)) << c.iface;
    EXPECT_EQ(c.phy, info.phy_index);
    EXPECT_EQ(c.channels, info.channels);
  }
}

TEST_F(Nl802154FamilyTest, ChannelsOutOfRangeAreRefusedBeforeSending) {
  WpanDeviceConfig config{"wpan0", 0};
  config.pages = {{0, {3}}, {4, {0, 5, 9, 15}}};
  Add(config);
  for (int channel : {0, 15, 9}) {
    EXPECT_TRUE(utils_.SetChannel("wpan0", channel)) << channel;
    EXPECT_EQ(kNl802154UwbPage, Device("wpan0").page);
    EXPECT_EQ(channel, Device("wpan0").channel);
  }
  EXPECT_TRUE(log_.Contains(android::base::INFO, "SetChannel: Set channel to 15", kTag));
  const int sent = family_.request_count();
  EXPECT_FALSE(utils_.SetChannel("wpan0", 16));
  EXPECT_FALSE(utils_.SetChannel("wpan0", -1));
  EXPECT_EQ(sent, family_.request_count());
  // In range, but not a channel of the UWB page: the driver refuses it.
  EXPECT_FALSE(utils_.SetChannel("wpan0", 3));
  EXPECT_EQ(sent + 1, family_.request_count());
  EXPECT_TRUE(log_.Contains(android::base::WARNING, NlError("SendAndAwaitAck", EINVAL)))
      << log_.Text();
  EXPECT_EQ(9, Device("wpan0").channel);
}

TEST_F(Nl802154FamilyTest, PanIdAndShortAddressAreKeptWhileTheInterfaceIsDown) {
  Add({"wpan0", 0});
  Add({"wpan1", 1});
  EXPECT_TRUE(utils_.SetPanId("wpan1", 0xcafe));
  EXPECT_TRUE(utils_.SetShortMacAddress("wpan1", {0xab, 0xcd}));
  EXPECT_EQ(0xcafe, Device("wpan1").pan_id);
  EXPECT_EQ(0xabcd, Device("wpan1").short_address);
  EXPECT_EQ(0xffff, Device("wpan0").pan_id);
  EXPECT_TRUE(log_.Contains(android::base::INFO, "SetPanId: Set pan id to 51966", kTag));

  const int sent = family_.request_count();
  EXPECT_FALSE(utils_.SetShortMacAddress("wpan1", {1, 2, 3}));
  EXPECT_EQ(sent, family_.request_count());
  EXPECT_TRUE(log_.Contains(android::base::ERROR,
                            "SetShortMacAddress: Incorrect short address, size is 3", kTag));

  ASSERT_TRUE(interface_tool_.SetUpState("wpan1", true));
  EXPECT_FALSE(utils_.SetPanId("wpan1", 7));
  EXPECT_FALSE(utils_.SetShortMacAddress("wpan1", {0, 7}));
  EXPECT_EQ(2, log_.Count(android::base::WARNING, NlError("SendAndAwaitAck", EBUSY)))
      << log_.Text();
  EXPECT_EQ(0xcafe, Device("wpan1").pan_id);
  EXPECT_EQ(0xabcd, Device("wpan1").short_address);
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
  EXPECT_TRUE(log_.Contains(android::base::WARNING, NlError("SendAndAwaitResponse", ENODEV)))
      << log_.Text();
}

TEST_F(Nl802154FamilyTest, RemovedInterfaceDisappearsWithItsVeth) {
  Add({"wpan0", 0});
  Add({"wpan1", 1});
  EXPECT_EQ(if_nametoindex("wpan0"), Device("wpan0").ifindex);
  ASSERT_TRUE(devices_.RemoveDevice("wpan0"));
  EXPECT_EQ(0u, if_nametoindex("wpan0"));
  bool ok = false;
  const std::vector<DevInfo> devices = utils_.ListDevices(&ok);
  ASSERT_EQ(1u, devices.size());
  EXPECT_EQ("wpan1", devices[0].name);
  std::string error;
  EXPECT_FALSE(devices_.AddDevice({"wpan1", 5}, &error));  // the name is taken
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
