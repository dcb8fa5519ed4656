#define LOG_TAG "dalix.uwb.NlSocketFactoryTest"

#include "net/nl_socket_factory.h"

#include <fcntl.h>
#include <sys/resource.h>
#include <unistd.h>

#include <functional>
#include <memory>

#include <gtest/gtest.h>
#include <netlink/genl/genl.h>

#include "net/unique_nl_msg.h"
#include "sim/driver_simulator.h"
#include "sim/sim_nl_socket_factory.h"
#include "sim/test_family.h"
#include "sim/test_family_defs.h"
#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using android::base::ERROR;

// While alive, the process cannot open another descriptor, so every socket
// connect fails as it does on a process out of descriptors.
class DescriptorsExhausted {
 public:
  DescriptorsExhausted() {
    getrlimit(RLIMIT_NOFILE, &saved_);
    int lowest_free = open("/dev/null", O_RDONLY | O_CLOEXEC);
    close(lowest_free);
    rlimit limit = saved_;
    limit.rlim_cur = lowest_free;
    setrlimit(RLIMIT_NOFILE, &limit);
  }
  ~DescriptorsExhausted() { setrlimit(RLIMIT_NOFILE, &saved_); }

 private:
  rlimit saved_;
};

UniqueNlMsg TestRequest(int family_id, uint8_t cmd) {
  UniqueNlMsg msg;
  genlmsg_put(msg.get(), NL_AUTO_PORT, NL_AUTO_SEQ, family_id, 0, 0, cmd,
              sim::kTestFamilyVersion);
  return msg;
}

// The production factory and the simulator's one behave alike when no
// socket can be made.
struct FactoryCase {
  const char* name;
  std::function<std::unique_ptr<NlSocketFactory>()> make;
};

class NlSocketFactoryFailureTest : public ::testing::TestWithParam<FactoryCase> {
 protected:
  LogCapture log_;
  std::unique_ptr<NlSocketFactory> factory_ = GetParam().make();
};

TEST_P(NlSocketFactoryFailureTest, CreateReturnsNothingWhenSetupFails) {
  std::unique_ptr<NlSocket> socket;
  {
    DescriptorsExhausted exhausted;
    socket = factory_->Create();
  }
  EXPECT_EQ(nullptr, socket);
  EXPECT_TRUE(log_.Contains(ERROR, "Setup: Failed to connect to generic netlink",
                            "dalix.uwb.NlSocket"))
      << log_.Text();
}

TEST_P(NlSocketFactoryFailureTest, OneShotsLogBadAllocUnderTheCallersTag) {
  UniqueNlMsg msg = TestRequest(sim::DriverSimulator::kFirstFamilyId, sim::kTestCmdGet);
  bool called = false;
  bool ack_result;
  bool response_result;
  {
    DescriptorsExhausted exhausted;
    ack_result = factory_->SendAndAwaitAck(msg.get());
    response_result = factory_->SendAndAwaitResponse(
        msg.get(), [&called](nl_msg*) { called = true; }, sim::kTestCmdValue);
  }
  EXPECT_FALSE(ack_result);
  EXPECT_FALSE(response_result);
  EXPECT_FALSE(called);
  EXPECT_EQ(1, log_.Count(ERROR, "SendAndAwaitAck: BAD_ALLOC: cannot allocate NlSocket",
                          LOG_TAG))
      << log_.Text();
  EXPECT_EQ(1, log_.Count(ERROR, "SendAndAwaitResponse: BAD_ALLOC: cannot allocate NlSocket",
                          LOG_TAG))
      << log_.Text();
}

INSTANTIATE_TEST_SUITE_P(
    Factories, NlSocketFactoryFailureTest,
    ::testing::Values(FactoryCase{"Kernel",
                                  [] { return std::make_unique<NlSocketFactory>(nullptr); }},
                      FactoryCase{"Simulator",
                                  [] {
                                    return std::make_unique<sim::SimNlSocketFactory>(
                                        nullptr, sim::DriverSimulator::kDefaultPort);
                                  }}),
    [](const ::testing::TestParamInfo<FactoryCase>& info) { return info.param.name; });

TEST(NlSocketFactoryTest, OneShotsUseASocketOfTheirOwn) {
  sim::DriverSimulator simulator;
  sim::TestFamily family(&simulator);
  int family_id = simulator.RegisterFamily(sim::kTestFamilyName, &family);
  ASSERT_TRUE(simulator.Start());
  sim::SimNlSocketFactory factory(nullptr, simulator.port());

  UniqueNlMsg set = TestRequest(family_id, sim::kTestCmdSet);
  nla_put_u32(set.get(), sim::kTestAttrValue, 77);
  EXPECT_TRUE(factory.SendAndAwaitAck(set.get()));

  uint32_t value = 0;
  UniqueNlMsg get = TestRequest(family_id, sim::kTestCmdGet);
  EXPECT_TRUE(factory.SendAndAwaitResponse(
      get.get(),
      [&value](nl_msg* msg) {
        nlattr* attrs[sim::kTestAttrMax + 1];
        ASSERT_EQ(0, genlmsg_parse(nlmsg_hdr(msg), 0, attrs, sim::kTestAttrMax,
                                   sim::kTestPolicy));
        ASSERT_NE(nullptr, attrs[sim::kTestAttrValue]);
        value = nla_get_u32(attrs[sim::kTestAttrValue]);
      },
      sim::kTestCmdValue));
  EXPECT_EQ(77u, value);

  // The caller still owns its message; the factory left it intact.
  EXPECT_EQ(family_id, nlmsg_hdr(get.get())->nlmsg_type);
  simulator.Stop();
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
