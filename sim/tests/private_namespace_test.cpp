#include "sim/private_namespace.h"

#include <net/if.h>
#include <unistd.h>

#include <future>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

// The test program's main entered the namespace before this runs.
TEST(PrivateNamespaceTest, ProcessIsRootOfAnEmptyNetwork) {
  EXPECT_EQ(0u, getuid());
  EXPECT_EQ(0u, getgid());
  std::vector<std::string> names;
  struct if_nameindex* interfaces = if_nameindex();
  ASSERT_NE(nullptr, interfaces);
  for (struct if_nameindex* it = interfaces; it->if_index != 0; ++it) names.push_back(it->if_name);
  if_freenameindex(interfaces);
  EXPECT_EQ(std::vector<std::string>{"lo"}, names);
}

TEST(PrivateNamespaceTest, RefusedOnceTheProcessRunsASecondThread) {
  LogCapture log;
  std::promise<void> release;
  std::thread second([future = release.get_future()]() mutable { future.wait(); });
  bool entered = EnterPrivateNamespace();
  release.set_value();
  second.join();

  EXPECT_FALSE(entered);
  std::vector<LogCapture::Entry> entries = log.Entries();
  ASSERT_EQ(1u, entries.size()) << log.Text();
  EXPECT_EQ(android::base::ERROR, entries[0].severity);
  EXPECT_NE(std::string::npos, entries[0].message.find("second thread")) << log.Text();
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
