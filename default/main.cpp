#define LOG_TAG "dalix.uwb.main"

#include <memory>

#include "net/interface_tool.h"
#include "net/nl_socket_factory.h"
#include "service_main.h"

namespace {

// The device: netlink sockets to the kernel, ioctls on real interfaces.
class DevicePlatform : public hardware::dalix::ServicePlatform {
 public:
  std::unique_ptr<hardware::dalix::NlSocketFactory> NewSocketFactory(
      hardware::dalix::EventLoop* event_loop) override {
    return std::make_unique<hardware::dalix::NlSocketFactory>(event_loop);
  }
  std::unique_ptr<hardware::dalix::InterfaceTool> NewInterfaceTool() override {
    return std::make_unique<hardware::dalix::InterfaceTool>();
  }
};

}  // namespace

int main() {
  DevicePlatform platform;
  return hardware::dalix::RunService(&platform);
}
