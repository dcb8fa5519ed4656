#pragma once

#include <functional>

#include <gmock/gmock.h>

#include "looper/event_loop.h"

namespace hardware {
namespace dalix {

class MockEventLoop : public EventLoop {
 public:
  MOCK_METHOD(void, PostTask, (const std::function<void()>& task), (override));
  MOCK_METHOD(bool, WatchFileDescriptor,
              (int fd, ReadyMode mode, const std::function<void(int)>& callback), (override));
  MOCK_METHOD(bool, StopWatchFileDescriptor, (int fd), (override));
};

}  // namespace dalix
}  // namespace hardware
