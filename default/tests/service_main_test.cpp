// The daemon's start-up, run whole in a child process as on a device: the
// real socket factory and interface tool, and no UWB driver anywhere.
#include "service_main.h"

#include <sys/wait.h>
#include <unistd.h>

#include <string>
#include <thread>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/IUwb.h>
#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/strings.h>
#include <android-base/unique_fd.h>
#include <android/binder_manager.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace hardware {
namespace dalix {
namespace {

namespace uwb = aidl::aidl::hardware::dalix::uwb;
using ::testing::ElementsAre;

// The device's platform, plus a probe that, once the service serves, looks
// it up as a client would, calls it, and ends the loop.
class ProbedDevicePlatform : public ServicePlatform {
 public:
  explicit ProbedDevicePlatform(int report_fd) : report_fd_(report_fd) {}
  ~ProbedDevicePlatform() override {
    if (probe_.joinable()) probe_.join();
  }

  std::unique_ptr<NlSocketFactory> NewSocketFactory(EventLoop* event_loop) override {
    return std::make_unique<NlSocketFactory>(event_loop);
  }
  std::unique_ptr<InterfaceTool> NewInterfaceTool() override {
    return std::make_unique<InterfaceTool>();
  }
  void OnServing(LooperBackedEventLoop* event_loop) override {
    probe_ = std::thread([this, event_loop] {
      Report("serving");
      ndk::SpAIBinder binder(AServiceManager_checkService(ServiceInstanceName().c_str()));
      std::shared_ptr<uwb::IUwb> service = uwb::IUwb::fromBinder(binder);
      if (service != nullptr) {
        std::vector<std::string> names;
        Report("registered, interfaces " +
               std::to_string(service->listIfaceNames(&names).isOk() ? names.size() : -1));
        std::vector<int64_t> indices;
        Report("hardware index status " +
               std::to_string(service->listHardwareIndex(&indices).getStatus()));
      }
      event_loop->Quit();
    });
  }

  void Report(const std::string& line) {
    android::base::WriteStringToFd(line + "\n", report_fd_);
  }

 private:
  const int report_fd_;
  std::thread probe_;
};

TEST(ServiceMainTest, StartsAndRegistersInAChildProcessWithoutADriver) {
  int fds[2];
  ASSERT_EQ(pipe(fds), 0);
  android::base::unique_fd read_end(fds[0]);
  android::base::unique_fd write_end(fds[1]);
  const pid_t child = fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    read_end.reset();
    const int report_fd = write_end.get();
    android::base::SetLogger([report_fd](android::base::LogId, android::base::LogSeverity,
                                         const char* tag, const char*, unsigned int,
                                         const char* message) {
      if (std::string(tag) == "dalix.uwb.main") {
        android::base::WriteStringToFd(std::string("log: ") + message + "\n", report_fd);
      }
    });
    int result;
    {
      ProbedDevicePlatform platform(report_fd);
      result = RunService(&platform);
    }
    _exit(result);
  }
  write_end.reset();
  std::string report;
  android::base::ReadFdToString(read_end.get(), &report);
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  ASSERT_TRUE(WIFEXITED(status)) << report;
  EXPECT_EQ(WEXITSTATUS(status), 0) << report;
  // Start-up runs to the end and the service answers before any driver is
  // asked; asking for the hardware is what first touches the driver, and
  // with none there it fails.
  std::vector<std::string> lines = android::base::Split(report, "\n");
  EXPECT_THAT(lines, ElementsAre("log: UWB HAL start", "serving", "registered, interfaces 0",
                                 "hardware index status " + std::to_string(STATUS_UNKNOWN_ERROR),
                                 "log: UWB HAL is about to exit", ""));
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
