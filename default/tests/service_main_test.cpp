// The daemon's start-up and exit, run whole on a thread of its own with the
// device's platform: the real socket factory and interface tool, and no UWB
// driver anywhere.
#include "service_main.h"

#include <future>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/IUwb.h>
#include <android/binder_manager.h>
#include <binder_host/host.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/log_capture.h"

namespace hardware {
namespace dalix {
namespace {

namespace uwb = aidl::aidl::hardware::dalix::uwb;
using ::testing::ElementsAre;

class DevicePlatform : public ServicePlatform {
 public:
  std::unique_ptr<NlSocketFactory> NewSocketFactory(EventLoop* event_loop) override {
    return std::make_unique<NlSocketFactory>(event_loop);
  }
  std::unique_ptr<InterfaceTool> NewInterfaceTool() override {
    return std::make_unique<InterfaceTool>();
  }
  void OnServing(LooperBackedEventLoop* event_loop) override { serving.set_value(event_loop); }

  std::promise<LooperBackedEventLoop*> serving;
};

std::vector<std::string> MainLines(const LogCapture& log) {
  std::vector<std::string> lines;
  for (const LogCapture::Entry& entry : log.Entries()) {
    if (entry.tag == "dalix.uwb.main") lines.push_back(entry.message);
  }
  return lines;
}

TEST(ServiceMainTest, StartsRegistersServesAndExitsWithoutADriver) {
  LogCapture log;
  DevicePlatform platform;
  std::future<LooperBackedEventLoop*> serving = platform.serving.get_future();
  int result = -1;
  std::thread service([&] { result = RunService(&platform); });
  LooperBackedEventLoop* event_loop = serving.get();
  EXPECT_THAT(MainLines(log), ElementsAre("UWB HAL start"));

  // Registered under its instance name before it serves; asking for the
  // hardware is what first touches the driver, and with none there it fails.
  const std::string instance = std::string(uwb::IUwb::descriptor) + "/default";
  std::shared_ptr<uwb::IUwb> client =
      uwb::IUwb::fromBinder(ndk::SpAIBinder(AServiceManager_checkService(instance.c_str())));
  if (client != nullptr) {
    std::vector<int64_t> indices;
    EXPECT_EQ(client->listHardwareIndex(&indices).getStatus(), STATUS_UNKNOWN_ERROR);
  } else {
    ADD_FAILURE() << "not registered";
  }
  client.reset();
  event_loop->Quit();
  service.join();
  ndk::host::ResetForTesting();
  EXPECT_EQ(result, 0);
  EXPECT_THAT(MainLines(log), ElementsAre("UWB HAL start", "UWB HAL is about to exit"));
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
