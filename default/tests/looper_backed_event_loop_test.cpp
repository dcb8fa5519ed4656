#include "looper/looper_backed_event_loop.h"

#include <fcntl.h>
#include <unistd.h>

#include <string>
#include <vector>

#include <android-base/unique_fd.h>
#include <gtest/gtest.h>

#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using Calls = std::vector<std::string>;

class LooperBackedEventLoopTest : public ::testing::Test {
 protected:
  void SetUp() override {
    int fds[2];
    ASSERT_EQ(0, pipe2(fds, O_NONBLOCK | O_CLOEXEC));
    read_end_.reset(fds[0]);
    write_end_.reset(fds[1]);
  }

  // The looper belongs to the thread and outlives each test's loop object, so
  // no registration may leak into the next test.
  void TearDown() override { loop_.StopWatchFileDescriptor(read_end_.get()); }

  // One iteration of the looper the loop object bound to this thread.
  static void PollOnce(int timeout_ms) {
    android::Looper::getForThread()->pollOnce(timeout_ms, nullptr, nullptr, nullptr);
  }

  void WriteBytes(size_t count) {
    std::string bytes(count, 'x');
    ASSERT_EQ(static_cast<ssize_t>(count), write(write_end_.get(), bytes.data(), count));
  }

  // Watches the read end; each wake-up takes one byte and records |name|,
  // and the third one quits the loop.
  bool WatchReads(const std::string& name) {
    return loop_.WatchFileDescriptor(read_end_.get(), EventLoop::kModeInput, [this, name](int fd) {
      EXPECT_EQ(read_end_.get(), fd);
      char byte;
      ASSERT_EQ(1, read(fd, &byte, 1));
      calls_.push_back(name);
      if (calls_.size() == 3) loop_.Quit();
    });
  }

  LooperBackedEventLoop loop_;
  android::base::unique_fd read_end_;
  android::base::unique_fd write_end_;
  Calls calls_;
};

// Output mode is what the netlink sockets watch; the simulated family tests
// run it through this loop.
TEST_F(LooperBackedEventLoopTest, WatchStaysUntilStoppedAndCanBeWatchedAgain) {
  ASSERT_TRUE(WatchReads("first"));
  WriteBytes(3);
  loop_.Poll();
  EXPECT_EQ(Calls(3, "first"), calls_);

  // Only a watched descriptor can be stopped, and only once.
  EXPECT_TRUE(loop_.StopWatchFileDescriptor(read_end_.get()));
  EXPECT_FALSE(loop_.StopWatchFileDescriptor(read_end_.get()));
  EXPECT_FALSE(loop_.StopWatchFileDescriptor(write_end_.get()));
  WriteBytes(1);
  PollOnce(0);
  EXPECT_EQ(3u, calls_.size());

  ASSERT_TRUE(WatchReads("second"));
  PollOnce(1000);
  EXPECT_EQ("second", calls_.back());
}

TEST_F(LooperBackedEventLoopTest, InvalidModeIsRefusedAndLogged) {
  LogCapture log;
  EXPECT_FALSE(loop_.WatchFileDescriptor(read_end_.get(), static_cast<EventLoop::ReadyMode>(2),
                                         [](int) { ADD_FAILURE() << "refused watch called"; }));
  // This file has no tag either, so its line shows the process's default tag.
  LOG(INFO) << "default tag";
  EXPECT_TRUE(log.Contains(android::base::ERROR, "Invalid mode for WatchFileDescriptor().",
                           log.Entries().back().tag.c_str()))
      << log.Text();
  WriteBytes(1);
  PollOnce(0);
  EXPECT_FALSE(loop_.StopWatchFileDescriptor(read_end_.get()));
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
