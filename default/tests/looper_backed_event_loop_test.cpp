#include "looper/looper_backed_event_loop.h"

#include <fcntl.h>
#include <unistd.h>

#include <string>
#include <thread>
#include <vector>

#include <android-base/unique_fd.h>
#include <gtest/gtest.h>

#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

using android::base::unique_fd;

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
  void TearDown() override {
    loop_.StopWatchFileDescriptor(read_end_.get());
    loop_.StopWatchFileDescriptor(write_end_.get());
  }

  // One iteration of the looper the loop object bound to this thread.
  static void PollOnce(int timeout_ms) {
    android::Looper::getForThread()->pollOnce(timeout_ms, nullptr, nullptr, nullptr);
  }

  void WriteBytes(size_t count) {
    std::string bytes(count, 'x');
    ASSERT_EQ(static_cast<ssize_t>(count), write(write_end_.get(), bytes.data(), count));
  }

  static void ReadOneByte(int fd) {
    char byte;
    ASSERT_EQ(1, read(fd, &byte, 1));
  }

  LooperBackedEventLoop loop_;
  unique_fd read_end_;
  unique_fd write_end_;
};

TEST_F(LooperBackedEventLoopTest, WatchStopAndWatchAgain) {
  std::vector<std::string> calls;
  ASSERT_TRUE(loop_.WatchFileDescriptor(read_end_.get(), EventLoop::kModeInput, [&](int fd) {
    EXPECT_EQ(read_end_.get(), fd);
    ReadOneByte(fd);
    calls.push_back("first");
  }));
  WriteBytes(1);
  PollOnce(1000);
  EXPECT_EQ(std::vector<std::string>{"first"}, calls);

  EXPECT_TRUE(loop_.StopWatchFileDescriptor(read_end_.get()));
  EXPECT_FALSE(loop_.StopWatchFileDescriptor(read_end_.get()));
  WriteBytes(1);
  PollOnce(0);
  EXPECT_EQ(1u, calls.size());

  ASSERT_TRUE(loop_.WatchFileDescriptor(read_end_.get(), EventLoop::kModeInput, [&](int fd) {
    ReadOneByte(fd);
    calls.push_back("second");
  }));
  PollOnce(1000);
  EXPECT_EQ((std::vector<std::string>{"first", "second"}), calls);
}

TEST_F(LooperBackedEventLoopTest, CallbackStaysRegisteredAcrossCalls) {
  int calls = 0;
  ASSERT_TRUE(loop_.WatchFileDescriptor(read_end_.get(), EventLoop::kModeInput, [&](int fd) {
    ReadOneByte(fd);
    if (++calls == 3) loop_.Quit();
  }));
  WriteBytes(3);
  loop_.Poll();
  EXPECT_EQ(3, calls);
}

TEST_F(LooperBackedEventLoopTest, OutputModeReportsWritableDescriptor) {
  int ready_fd = -1;
  ASSERT_TRUE(loop_.WatchFileDescriptor(write_end_.get(), EventLoop::kModeOutput,
                                        [&](int fd) { ready_fd = fd; }));
  PollOnce(1000);
  EXPECT_EQ(write_end_.get(), ready_fd);
}

TEST_F(LooperBackedEventLoopTest, InvalidModeIsRefusedAndLogged) {
  LogCapture log;
  bool called = false;
  EXPECT_FALSE(loop_.WatchFileDescriptor(read_end_.get(), static_cast<EventLoop::ReadyMode>(2),
                                         [&](int) { called = true; }));
  // This file has no tag either, so its line shows the process's default tag.
  LOG(INFO) << "default tag";
  EXPECT_TRUE(log.Contains(android::base::ERROR, "Invalid mode for WatchFileDescriptor().",
                           log.Entries().back().tag.c_str()))
      << log.Text();
  WriteBytes(1);
  PollOnce(0);
  EXPECT_FALSE(called);
  EXPECT_FALSE(loop_.StopWatchFileDescriptor(read_end_.get()));
}

TEST_F(LooperBackedEventLoopTest, TaskPostedFromCallbackRunsOnTheNextPoll) {
  std::vector<std::string> order;
  ASSERT_TRUE(loop_.WatchFileDescriptor(read_end_.get(), EventLoop::kModeInput, [&](int fd) {
    ReadOneByte(fd);
    loop_.PostTask([&] { order.push_back("task"); });
    order.push_back("callback done");
  }));
  WriteBytes(1);
  PollOnce(1000);
  EXPECT_EQ(std::vector<std::string>{"callback done"}, order);
  PollOnce(1000);
  EXPECT_EQ((std::vector<std::string>{"callback done", "task"}), order);
}

TEST_F(LooperBackedEventLoopTest, TaskPostedFromAnotherThreadRunsOnTheLoopThread) {
  std::thread::id ran_on;
  std::thread poster([&] {
    loop_.PostTask([&] {
      ran_on = std::this_thread::get_id();
      loop_.Quit();
    });
  });
  loop_.Poll();
  poster.join();
  EXPECT_EQ(std::this_thread::get_id(), ran_on);
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
