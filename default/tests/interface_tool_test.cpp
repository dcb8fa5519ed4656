#include "net/interface_tool.h"

// glibc's <net/if.h> must come before the kernel headers that would
// define struct ifreq a second time.
#include <net/if.h>

#include <errno.h>
#include <linux/ethtool.h>
#include <linux/sockios.h>
#include <string.h>

#include <functional>
#include <map>
#include <string>

#include <gtest/gtest.h>

#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using ::android::base::ERROR;
using MacAddress = InterfaceTool::MacAddress;

constexpr char kTag[] = "dalix.uwb.InterfaceTool";
// Fifteen characters: the longest name that fits an ifreq.
constexpr char kIface[] = "uwbfake01234567";
static_assert(sizeof(kIface) == IFNAMSIZ, "the name and its NUL fill the field");

// Answers in the kernel's place with the flags and permanent address kept here, counting
// every request; a request can fail with EINTR a few times first.
class FakeKernelInterfaceTool : public InterfaceTool {
 public:
  std::map<unsigned long, int> requests;
  std::map<unsigned long, int> interruptions;
  short flags = IFF_BROADCAST | IFF_MULTICAST;
  // Answers SIOCETHTOOL: 0 for success or the errno to fail with.
  std::function<int(ethtool_perm_addr*)> ethtool;

 protected:
  int Ioctl(int /*fd*/, unsigned long request, ifreq* ifr) override {
    ++requests[request];
    int error = 0;
    if (interruptions[request] > 0) {
      --interruptions[request];
      error = EINTR;
    } else if (request == SIOCGIFFLAGS) {
      ifr->ifr_flags = flags;
    } else if (request == SIOCSIFFLAGS) {
      flags = ifr->ifr_flags;
    } else if (request == SIOCETHTOOL) {
      error = ethtool(reinterpret_cast<ethtool_perm_addr*>(ifr->ifr_data));
    }
    errno = error;
    return error == 0 ? 0 : -1;
  }
};

class InterfaceToolTest : public ::testing::Test {
 protected:
  LogCapture log_;
  FakeKernelInterfaceTool tool_;
};

TEST_F(InterfaceToolTest, LongNamesAreRefusedBeforeAnyIoctl) {
  const std::string too_long = std::string(kIface) + "8";
  EXPECT_FALSE(tool_.GetUpState(too_long.c_str()));
  EXPECT_FALSE(tool_.SetUpState(too_long.c_str(), true));
  EXPECT_FALSE(tool_.SetMacAddress(too_long.c_str(), MacAddress{}));
  EXPECT_EQ(MacAddress{}, tool_.GetFactoryMacAddress(too_long.c_str()));
  EXPECT_TRUE(tool_.requests.empty());
  EXPECT_EQ(4, log_.Count(ERROR, "Interface name is too long: " + too_long, kTag)) << log_.Text();
}

TEST_F(InterfaceToolTest, UpAndDownKeepOtherFlagsAndSkipWhatIsAlreadySo) {
  tool_.interruptions[SIOCSIFFLAGS] = 2;  // the first change is retried twice
  const struct {
    bool up;
    int set_flags;
  } steps[] = {{true, 3}, {true, 0}, {false, 1}, {false, 0}, {true, 1}};
  for (const auto& step : steps) {
    SCOPED_TRACE(step.up);
    tool_.requests.clear();
    EXPECT_TRUE(tool_.SetUpState(kIface, step.up));
    EXPECT_EQ(step.set_flags, tool_.requests[SIOCSIFFLAGS]);
    EXPECT_EQ(IFF_BROADCAST | IFF_MULTICAST | (step.up ? IFF_UP : 0), tool_.flags);
  }
  EXPECT_TRUE(log_.Entries().empty()) << log_.Text();
}

// The simulator's interface tool answers with eight bytes or fails; other
// sizes are only built here.
TEST_F(InterfaceToolTest, FactoryAddressNeedsExactlyEightBytesBack) {
  const MacAddress factory{0xa1, 0xb2, 0xc3, 0xd4, 0xe5, 0xf6, 0x07, 0x18};
  for (uint32_t size : {8u, 6u, 16u, 0u}) {
    SCOPED_TRACE(size);
    tool_.ethtool = [&](ethtool_perm_addr* answer) {
      if (answer->cmd != ETHTOOL_GPERMADDR || answer->size != factory.size()) return EINVAL;
      answer->size = size;
      memcpy(answer->data, factory.data(), factory.size());
      return 0;
    };
    EXPECT_EQ(size == 8 ? factory : MacAddress{}, tool_.GetFactoryMacAddress(kIface));
  }
  EXPECT_TRUE(log_.Entries().empty()) << log_.Text();
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
