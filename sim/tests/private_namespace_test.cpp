#include "sim/private_namespace.h"

#include <future>
#include <thread>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace sim {
namespace {

// The test program's main entered the namespace before this runs; the
// family tests over real interfaces show the process is root of an empty
// network there.
TEST(PrivateNamespaceTest, RefusedOnceTheProcessRunsASecondThread) {
  LogCapture log;
  std::promise<void> release;
  std::thread second([future = release.get_future()]() mutable { future.wait(); });
  EXPECT_FALSE(EnterPrivateNamespace());
  release.set_value();
  second.join();

  std::vector<LogCapture::Entry> entries = log.Entries();
  ASSERT_EQ(1u, entries.size()) << log.Text();
  EXPECT_EQ(android::base::ERROR, entries[0].severity);
  EXPECT_THAT(entries[0].message, ::testing::HasSubstr("already runs a second thread"));
}

}  // namespace
}  // namespace sim
}  // namespace dalix
}  // namespace hardware
