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
#include <string.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <functional>
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

std::string SystemError(const char* what, const char* iface, int error) {
  return std::string(what) + " for " + iface + " (" + strerror(error) + ")";
}

// Passes every request to the kernel while recording it. A request can fail
// with EINTR a few times first, and the permanent-address request can be
// answered in the kernel's place.
class WatchedInterfaceTool : public InterfaceTool {
 public:
  int Count(unsigned long request) const {
    return std::count(requests.begin(), requests.end(), request);
  }

  std::vector<unsigned long> requests;
  std::map<unsigned long, int> interruptions;
  // When set, answers SIOCETHTOOL: 0 for success or the errno to fail with.
  std::function<int(ethtool_perm_addr*)> ethtool;

 protected:
  int Ioctl(int fd, unsigned long request, ifreq* ifr) override {
    requests.push_back(request);
    if (interruptions[request] > 0) {
      --interruptions[request];
      errno = EINTR;
      return -1;
    }
    if (request == SIOCETHTOOL && ethtool) {
      const int error = ethtool(reinterpret_cast<ethtool_perm_addr*>(ifr->ifr_data));
      errno = error;
      return error == 0 ? 0 : -1;
    }
    return InterfaceTool::Ioctl(fd, request, ifr);
  }
};

// Argument checks and interfaces that do not exist: these run for any user.
class InterfaceToolTest : public ::testing::Test {
 protected:
  LogCapture log_;
  WatchedInterfaceTool tool_;
};

TEST_F(InterfaceToolTest, LongNamesAreRefusedBeforeAnyIoctlAndInterruptedIoctlsRetried) {
  EXPECT_FALSE(tool_.GetUpState(kTooLongName));
  EXPECT_FALSE(tool_.SetUpState(kTooLongName, true));
  EXPECT_FALSE(tool_.SetMacAddress(kTooLongName, MacAddress{2, 1, 2, 3, 4, 5, 6, 7}));
  EXPECT_EQ(MacAddress{}, tool_.GetFactoryMacAddress(kTooLongName));
  EXPECT_TRUE(tool_.requests.empty());
  EXPECT_EQ(4, log_.Count(android::base::ERROR,
                          std::string("Interface name is too long: ") + kTooLongName, kTag))
      << log_.Text();

  tool_.requests.clear();
  tool_.interruptions[SIOCGIFFLAGS] = 3;
  errno = 0;
  EXPECT_FALSE(tool_.SetUpState("nosuchuwb0", true));
  EXPECT_EQ(ENODEV, errno);
  // Retried until the kernel answered; nothing is set on an unknown interface.
  EXPECT_EQ((std::vector<unsigned long>(4, SIOCGIFFLAGS)), tool_.requests);
  EXPECT_EQ(1,
            log_.Count(android::base::ERROR,
                       SystemError("Could not read interface state", "nosuchuwb0", ENODEV), kTag))
      << log_.Text();
}

// A TAP device switched to the IEEE 802.15.4 link type. The test program
// runs in a network namespace of its own, so the machine's interfaces stay
// untouched; the device goes away with its descriptor.
class InterfaceToolKernelTest : public InterfaceToolTest {
 protected:
  void SetUp() override {
    if (geteuid() != 0) GTEST_SKIP() << "needs root: /dev/net/tun is root-only";
    tun_.reset(open("/dev/net/tun", O_RDWR | O_CLOEXEC));
    if (tun_.get() < 0) {
      GTEST_SKIP() << "needs root: /dev/net/tun cannot be opened (" << strerror(errno) << ")";
    }
    ifreq ifr = Request();
    ifr.ifr_flags = IFF_TAP | IFF_NO_PI;
    ASSERT_EQ(0, ioctl(tun_.get(), TUNSETIFF, &ifr)) << strerror(errno);
    // The link type can change only while the device is down, as it is now.
    ASSERT_EQ(0, ioctl(tun_.get(), TUNSETLINK, static_cast<unsigned long>(ARPHRD_IEEE802154)))
        << strerror(errno);
    control_.reset(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    ASSERT_GE(control_.get(), 0);
  }

  static ifreq Request() {
    ifreq ifr{};
    memcpy(ifr.ifr_name, kTapName, sizeof(kTapName));
    return ifr;
  }

  // The kernel's own view, read without the tool.
  ifreq Query(unsigned long request) {
    ifreq ifr = Request();
    EXPECT_EQ(0, ioctl(control_.get(), request, &ifr)) << strerror(errno);
    return ifr;
  }
  short Flags() { return Query(SIOCGIFFLAGS).ifr_flags; }

  unique_fd tun_;
  unique_fd control_;
};

TEST_F(InterfaceToolKernelTest, UpAndDownKeepOtherFlagsAndSkipWhatIsAlreadySo) {
  const short others = Flags() & (IFF_BROADCAST | IFF_MULTICAST);
  ASSERT_FALSE(Flags() & IFF_UP);
  tool_.interruptions[SIOCSIFFLAGS] = 2;  // the first change is retried twice
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
  const sockaddr written = Query(SIOCGIFHWADDR).ifr_hwaddr;
  EXPECT_EQ(ARPHRD_IEEE802154, written.sa_family);
  // A TAP device holds six bytes; they arrive in the caller's order.
  EXPECT_EQ(0, memcmp(written.sa_data, mac.data(), 6));

  // The kernel gives no device a group address (low bit of the first byte).
  errno = 0;
  EXPECT_FALSE(tool_.SetMacAddress(kTapName, MacAddress{0x01, 1, 2, 3, 4, 5, 6, 7}));
  EXPECT_EQ(EADDRNOTAVAIL, errno);
  EXPECT_EQ(
      1,
      log_.Count(android::base::ERROR,
                 SystemError("Could not set interface MAC address", kTapName, EADDRNOTAVAIL), kTag))
      << log_.Text();
}

TEST_F(InterfaceToolKernelTest, FactoryAddressNeedsExactlyEightBytesBack) {
  // The TAP device itself answers with its six-byte permanent address.
  EXPECT_EQ(MacAddress{}, tool_.GetFactoryMacAddress(kTapName));
  EXPECT_EQ(1, tool_.Count(SIOCETHTOOL));

  const MacAddress factory{0xa1, 0xb2, 0xc3, 0xd4, 0xe5, 0xf6, 0x07, 0x18};
  for (uint32_t size : {8u, 6u, 16u, 0u}) {
    SCOPED_TRACE(size);
    tool_.ethtool = [&](ethtool_perm_addr* answer) {
      if (answer->cmd != ETHTOOL_GPERMADDR || answer->size != factory.size()) return EINVAL;
      answer->size = size;
      memcpy(answer->data, factory.data(), factory.size());
      return 0;
    };
    EXPECT_EQ(size == 8 ? factory : MacAddress{}, tool_.GetFactoryMacAddress(kTapName));
  }
  EXPECT_TRUE(log_.Entries().empty()) << log_.Text();

  tool_.ethtool = [](ethtool_perm_addr*) { return EOPNOTSUPP; };
  errno = 0;
  EXPECT_EQ(MacAddress{}, tool_.GetFactoryMacAddress(kTapName));
  EXPECT_EQ(EOPNOTSUPP, errno);
  EXPECT_EQ(
      1, log_.Count(android::base::ERROR,
                    SystemError("Could not get factory address MAC", kTapName, EOPNOTSUPP), kTag))
      << log_.Text();
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
