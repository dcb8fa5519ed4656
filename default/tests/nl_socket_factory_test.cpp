#define LOG_TAG "dalix.uwb.NlSocketFactoryTest"

#include "net/nl_socket_factory.h"

#include <fcntl.h>
#include <sys/resource.h>
#include <unistd.h>

#include <memory>
#include <string>

#include <gtest/gtest.h>
#include <netlink/genl/genl.h>

#include "net/ieee_utils.h"
#include "net/mcps_utils.h"
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

// The production factory and the simulator's behave alike when no socket can
// be made.
TEST(NlSocketFactoryTest, NothingWithoutDescriptors) {
  NlSocketFactory kernel(nullptr);
  sim::SimNlSocketFactory simulated(nullptr, sim::DriverSimulator::kDefaultPort);
  for (NlSocketFactory* factory : {&kernel, static_cast<NlSocketFactory*>(&simulated)}) {
    SCOPED_TRACE(factory == &kernel ? "kernel" : "simulator");
    // With descriptors to spare the same factory succeeds, so what fails
    // below is the exhaustion alone. This first socket and log line also let
    // a sanitizer runtime set up what it opens descriptors for.
    ASSERT_NE(nullptr, factory->Create());
    LOG(INFO) << "descriptors available";
    LogCapture log;
    UniqueNlMsg msg;  // never sent
    bool called = false;
    std::unique_ptr<NlSocket> socket;
    bool acked, answered, mcps_acked, ieee_listed;
    McpsUtils mcps(factory);
    IeeeUtils ieee(factory);
    {
      DescriptorsExhausted exhausted;
      socket = factory->Create();
      acked = factory->SendAndAwaitAck(msg.get(), "dalix.uwb.Caller");
      answered = factory->SendAndAwaitResponse(
          msg.get(), [&called](nl_msg*) { called = true; }, sim::kTestCmdValue,
          "dalix.uwb.Caller");
      // Two clients built into one program: each line names its own client,
      // whatever order the objects were linked in.
      mcps_acked = mcps.SetFiraRegion(0);
      ieee.ListDevices(&ieee_listed);
    }
    EXPECT_EQ(nullptr, socket);
    EXPECT_FALSE(acked || answered || called || mcps_acked || ieee_listed);
    EXPECT_EQ(5,
              log.Count(ERROR, "Setup: Failed to connect to generic netlink", "dalix.uwb.NlSocket"))
        << log.Text();
    const std::string ack_line = "SendAndAwaitAck: BAD_ALLOC: cannot allocate NlSocket";
    EXPECT_EQ(1, log.Count(ERROR, ack_line, "dalix.uwb.Caller"));
    EXPECT_EQ(1, log.Count(ERROR, ack_line, "dalix.uwb.McpsUtils")) << log.Text();
    const std::string response_line = "SendAndAwaitResponse: BAD_ALLOC: cannot allocate NlSocket";
    EXPECT_EQ(1, log.Count(ERROR, response_line, "dalix.uwb.Caller"));
    EXPECT_EQ(1, log.Count(ERROR, response_line, "dalix.uwb.IeeeUtils")) << log.Text();
  }
}

TEST(NlSocketFactoryTest, OneShotsUseASocketOfTheirOwn) {
  sim::DriverSimulator simulator;
  sim::TestFamily family(&simulator);
  int family_id = simulator.RegisterFamily(sim::kTestFamilyName, &family);
  ASSERT_TRUE(simulator.Start());
  sim::SimNlSocketFactory factory(nullptr, simulator.port());

  UniqueNlMsg set = sim::TestFamily::NewRequest(family_id, sim::kTestCmdSet);
  nla_put_u32(set.get(), sim::kTestAttrValue, 77);
  EXPECT_TRUE(factory.SendAndAwaitAck(set.get(), LOG_TAG));
  uint32_t value = 0;
  UniqueNlMsg get = sim::TestFamily::NewRequest(family_id, sim::kTestCmdGet);
  EXPECT_TRUE(factory.SendAndAwaitResponse(
      get.get(),
      [&value](nl_msg* msg) {
        nlattr* attr = nlmsg_find_attr(nlmsg_hdr(msg), GENL_HDRLEN, sim::kTestAttrValue);
        if (attr != nullptr) value = nla_get_u32(attr);
      },
      sim::kTestCmdValue, LOG_TAG));
  EXPECT_EQ(77u, value);
  // The caller still owns its message, intact.
  EXPECT_EQ(family_id, nlmsg_hdr(get.get())->nlmsg_type);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
