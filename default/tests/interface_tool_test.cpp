#include "net/interface_tool.h"

// glibc's <net/if.h> must come before the kernel headers that would
// define struct ifreq a second time.
#include <net/if.h>

#include <errno.h>
#include <fcntl.h>
#include <linux/ethtool.h>
#include <linux/if_arp.h>
#include <linux/if_tun.h>
#include <linux/sockios.h>
#include <sched.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <map>
#include <string>
#include <vector>

#include <android-base/unique_fd.h>
#include <gtest/gtest.h>

#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using android::base::unique_fd;
using MacAddress = InterfaceTool::MacAddress;

constexpr char kTag[] = "dalix.uwb.InterfaceTool";
// Fifteen characters: the longest name that fits an ifreq.
constexpr char kTapName[] = "uwbtap012345678";
constexpr char kTooLongName[] = "uwbtap0123456789";
static_assert(sizeof(kTapName) == IFNAMSIZ, "the name and its NUL fill the field");

// Passes every request to the kernel while recording it; can make a request
// fail with EINTR a few times first, or stand in for the kernel's answer to
// the permanent-address request.
class WatchedInterfaceTool : public InterfaceTool {
 public:
  std::vector<unsigned long> requests;
  std::map<unsigned long, int> interruptions;
  // When set, SIOCETHTOOL is answered with this size and these bytes.
  bool fake_permanent_address = false;
  uint32_t permanent_size = 0;
  MacAddress permanent_bytes{};
  // When non-zero, SIOCETHTOOL fails with this error instead.
  int permanent_error = 0;

  int Count(unsigned long request) const {
    int count = 0;
    for (unsigned long r : requests) count += r == request;
    return count;
  }

 protected:
  int Ioctl(int fd, unsigned long request, ifreq* ifr) override {
    requests.push_back(request);
    if (interruptions[request] > 0) {
      --interruptions[request];
      errno = EINTR;
      return -1;
    }
    if (request == SIOCETHTOOL && permanent_error != 0) {
      errno = permanent_error;
      return -1;
    }
    if (request == SIOCETHTOOL && fake_permanent_address) {
      auto* header = reinterpret_cast<ethtool_perm_addr*>(ifr->ifr_data);
      if (header->cmd != ETHTOOL_GPERMADDR || header->size != permanent_bytes.size()) {
        errno = EINVAL;
        return -1;
      }
      header->size = permanent_size;
      memcpy(ifr->ifr_data + sizeof(ethtool_perm_addr), permanent_bytes.data(),
             permanent_bytes.size());
      return 0;
    }
    return InterfaceTool::Ioctl(fd, request, ifr);
  }
};

// Checks that need no interface of ours: argument checks and interfaces that
// do not exist. They run for any user.
class InterfaceToolTest : public ::testing::Test {
 protected:
  LogCapture log_;
  WatchedInterfaceTool tool_;
};

TEST_F(InterfaceToolTest, NameTooLongForIfreqIsRefusedBeforeAnyIoctl) {
  const std::string expected = std::string("Interface name is too long: ") + kTooLongName;
  EXPECT_FALSE(tool_.GetUpState(kTooLongName));
  EXPECT_FALSE(tool_.SetUpState(kTooLongName, true));
  EXPECT_FALSE(tool_.SetMacAddress(kTooLongName, MacAddress{2, 1, 2, 3, 4, 5, 6, 7}));
  EXPECT_EQ(MacAddress{}, tool_.GetFactoryMacAddress(kTooLongName));
  EXPECT_TRUE(tool_.requests.empty());
  EXPECT_EQ(4, log_.Count(android::base::ERROR, expected, kTag)) << log_.Text();
}

TEST_F(InterfaceToolTest, MissingInterfaceFailsWithSystemErrorAndKeepsErrno) {
  errno = 0;
  EXPECT_FALSE(tool_.SetUpState("nosuchuwb0", true));
  EXPECT_EQ(ENODEV, errno);
  EXPECT_FALSE(tool_.GetUpState("nosuchuwb0"));
  EXPECT_EQ(MacAddress{}, tool_.GetFactoryMacAddress("nosuchuwb0"));
  // Only the flags were read: nothing is changed on an unknown interface.
  EXPECT_EQ(3, tool_.Count(SIOCGIFFLAGS));
  EXPECT_EQ(3u, tool_.requests.size());
  EXPECT_EQ(3, log_.Count(android::base::ERROR,
                          "Could not read interface state for nosuchuwb0 (No such device)", kTag))
      << log_.Text();
}

TEST_F(InterfaceToolTest, InterruptedIoctlIsRetriedNotReported) {
  // The loopback interface exists in every network namespace.
  const bool up = tool_.GetUpState("lo");
  tool_.requests.clear();
  tool_.interruptions[SIOCGIFFLAGS] = 3;
  EXPECT_EQ(up, tool_.GetUpState("lo"));
  EXPECT_EQ(4, tool_.Count(SIOCGIFFLAGS));
  EXPECT_TRUE(log_.Entries().empty()) << log_.Text();
}

// The kernel side, on a TAP device switched to the IEEE 802.15.4 link type in
// a network namespace of its own, so the machine's interfaces stay untouched.
// Creating either needs root.
class InterfaceToolKernelTest : public InterfaceToolTest {
 protected:
  void SetUp() override {
    if (geteuid() != 0) {
      GTEST_SKIP() << "needs root: /dev/net/tun and new network namespaces are root-only";
    }
    original_netns_.reset(open("/proc/self/ns/net", O_RDONLY | O_CLOEXEC));
    ASSERT_GE(original_netns_.get(), 0) << strerror(errno);
    if (unshare(CLONE_NEWNET) != 0) {
      original_netns_.reset();
      GTEST_SKIP() << "cannot create a network namespace: " << strerror(errno);
    }
    tun_.reset(open("/dev/net/tun", O_RDWR | O_CLOEXEC));
    if (tun_.get() < 0) {
      GTEST_SKIP() << "needs root: /dev/net/tun cannot be opened (" << strerror(errno) << ")";
    }
    ifreq ifr{};
    ifr.ifr_flags = IFF_TAP | IFF_NO_PI;
    memcpy(ifr.ifr_name, kTapName, sizeof(kTapName));
    ASSERT_EQ(0, ioctl(tun_.get(), TUNSETIFF, &ifr)) << strerror(errno);
    // The link type can change only while the device is down, as it is now.
    ASSERT_EQ(0, ioctl(tun_.get(), TUNSETLINK, static_cast<unsigned long>(ARPHRD_IEEE802154)))
        << strerror(errno);
    control_.reset(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    ASSERT_GE(control_.get(), 0);
  }

  void TearDown() override {
    tun_.reset();
    if (original_netns_.get() >= 0) {
      ASSERT_EQ(0, setns(original_netns_.get(), CLONE_NEWNET)) << strerror(errno);
    }
  }

  // The kernel's own view, read without the tool.
  short Flags() {
    ifreq ifr{};
    memcpy(ifr.ifr_name, kTapName, sizeof(kTapName));
    EXPECT_EQ(0, ioctl(control_.get(), SIOCGIFFLAGS, &ifr)) << strerror(errno);
    return ifr.ifr_flags;
  }

  sockaddr HardwareAddress() {
    ifreq ifr{};
    memcpy(ifr.ifr_name, kTapName, sizeof(kTapName));
    EXPECT_EQ(0, ioctl(control_.get(), SIOCGIFHWADDR, &ifr)) << strerror(errno);
    return ifr.ifr_hwaddr;
  }

  unique_fd original_netns_;
  unique_fd tun_;
  unique_fd control_;
};

TEST_F(InterfaceToolKernelTest, UpAndDownKeepOtherFlagsAndSkipWhatIsAlreadySo) {
  const short others = Flags() & (IFF_BROADCAST | IFF_MULTICAST);
  ASSERT_FALSE(Flags() & IFF_UP);
  // The first change is interrupted twice and retried.
  tool_.interruptions[SIOCSIFFLAGS] = 2;
  const struct {
    bool up;
    int set_flags;
  } steps[] = {{true, 3}, {true, 0}, {false, 1}, {false, 0}, {true, 1}};
  for (const auto& step : steps) {
    SCOPED_TRACE(step.up);
    tool_.requests.clear();
    EXPECT_TRUE(tool_.SetUpState(kTapName, step.up));
    EXPECT_EQ(step.set_flags, tool_.Count(SIOCSIFFLAGS));
    EXPECT_EQ(step.up, (Flags() & IFF_UP) != 0);
    EXPECT_EQ(step.up, tool_.GetUpState(kTapName));
    EXPECT_EQ(others, Flags() & (IFF_BROADCAST | IFF_MULTICAST));
  }
  EXPECT_TRUE(log_.Entries().empty()) << log_.Text();
}

TEST_F(InterfaceToolKernelTest, AddressIsWrittenWithTheIeee802154FamilyOrRefused) {
  const MacAddress mac{0x02, 0x11, 0x22, 0x33, 0x44, 0x55, 0x66, 0x77};
  ASSERT_TRUE(tool_.SetMacAddress(kTapName, mac)) << log_.Text();
  const sockaddr written = HardwareAddress();
  EXPECT_EQ(ARPHRD_IEEE802154, written.sa_family);
  // A TAP device holds six bytes; they arrive in the caller's order.
  EXPECT_EQ(0, memcmp(written.sa_data, mac.data(), 6));

  // The low bit of the first byte marks a group address, which the kernel
  // does not give a device.
  errno = 0;
  EXPECT_FALSE(tool_.SetMacAddress(kTapName, MacAddress{0x01, 1, 2, 3, 4, 5, 6, 7}));
  EXPECT_EQ(EADDRNOTAVAIL, errno);
  EXPECT_EQ(1, log_.Count(android::base::ERROR,
                          std::string("Could not set interface MAC address for ") + kTapName + " (" +
                              strerror(EADDRNOTAVAIL) + ")",
                          kTag))
      << log_.Text();
  EXPECT_EQ(0, memcmp(HardwareAddress().sa_data, mac.data(), 6));
}

TEST_F(InterfaceToolKernelTest, FactoryAddressNeedsExactlyEightBytesBack) {
  // The TAP device itself answers with its six-byte permanent address.
  EXPECT_EQ(MacAddress{}, tool_.GetFactoryMacAddress(kTapName));
  EXPECT_EQ(1, tool_.Count(SIOCETHTOOL));

  const MacAddress factory{0xa1, 0xb2, 0xc3, 0xd4, 0xe5, 0xf6, 0x07, 0x18};
  tool_.fake_permanent_address = true;
  tool_.permanent_bytes = factory;
  const struct {
    uint32_t size;
    MacAddress expected;
  } cases[] = {{8, factory}, {6, MacAddress{}}, {16, MacAddress{}}, {0, MacAddress{}}};
  for (const auto& c : cases) {
    SCOPED_TRACE(c.size);
    tool_.permanent_size = c.size;
    EXPECT_EQ(c.expected, tool_.GetFactoryMacAddress(kTapName));
  }
  EXPECT_TRUE(log_.Entries().empty()) << log_.Text();

  tool_.permanent_error = EOPNOTSUPP;
  errno = 0;
  EXPECT_EQ(MacAddress{}, tool_.GetFactoryMacAddress(kTapName));
  EXPECT_EQ(EOPNOTSUPP, errno);
  EXPECT_EQ(1, log_.Count(android::base::ERROR,
                          std::string("Could not get factory address MAC for ") + kTapName + " (" +
                              strerror(EOPNOTSUPP) + ")",
                          kTag))
      << log_.Text();
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
