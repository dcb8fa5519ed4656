#pragma once

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/BnFiraSessionCallback.h>

#include "uwb_aidl.h"

namespace hardware {
namespace dalix {

// A client's session callback that records what the service tells it: each
// call as its short name and session id ("onAdded7", with "?" when a failure
// carries a reason other than 0), and every result. The service calls it on
// its thread while the test reads and waits on its own.
class FiraClientCallback : public aidl::hardware::dalix::uwb::BnFiraSessionCallback {
 public:
  using Addresses = std::vector<aidl::hardware::dalix::uwb::UwbAddress>;
  struct Result {
    aidl::hardware::dalix::uwb::FiraRangingData data;
    std::vector<aidl::hardware::dalix::uwb::FiraTwrMeasurement> measurements;
  };

  ndk::ScopedAStatus onTwrResult(
      const aidl::hardware::dalix::uwb::FiraRangingData& data,
      const std::vector<aidl::hardware::dalix::uwb::FiraTwrMeasurement>& measurements) override {
    return Record("onResult", data.sessionId, 0, Result{data, measurements});
  }
  ndk::ScopedAStatus onControleesAdded(int32_t id, const Addresses&) override {
    return Record("onAdded", id);
  }
  ndk::ScopedAStatus onControleesAddFailed(int32_t id, const Addresses&, int32_t reason) override {
    return Record("onAddFailed", id, reason);
  }
  ndk::ScopedAStatus onControleesRemoved(int32_t id, const Addresses&) override {
    return Record("onRemoved", id);
  }
  ndk::ScopedAStatus onControleesRemoveFailed(int32_t id, const Addresses&,
                                              int32_t reason) override {
    return Record("onRemoveFailed", id, reason);
  }
  ndk::ScopedAStatus onSessionStopped(int32_t id) override { return Record("onStopped", id); }

  std::vector<std::string> Events() {
    std::lock_guard<std::mutex> lock(mutex_);
    return events_;
  }
  bool WaitForEvent(const std::string& event) {
    std::unique_lock<std::mutex> lock(mutex_);
    return changed_.wait_for(lock, std::chrono::seconds(5), [&] {
      return std::find(events_.begin(), events_.end(), event) != events_.end();
    });
  }
  // Every result once there are more than |count|; none after 5 s.
  std::vector<Result> WaitForResults(size_t count) {
    std::unique_lock<std::mutex> lock(mutex_);
    changed_.wait_for(lock, std::chrono::seconds(5), [&] { return results_.size() > count; });
    return results_.size() > count ? results_ : std::vector<Result>();
  }

 private:
  ndk::ScopedAStatus Record(const char* name, int32_t id, int32_t reason = 0,
                            std::optional<Result> result = std::nullopt) {
    std::lock_guard<std::mutex> lock(mutex_);
    events_.push_back(name + std::to_string(id) + (reason != 0 ? "?" : ""));
    if (result.has_value()) results_.push_back(std::move(*result));
    changed_.notify_all();
    // The service must not care what a client answers.
    return ndk::ScopedAStatus::fromExceptionCode(EX_TRANSACTION_FAILED);
  }

  std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<std::string> events_;
  std::vector<Result> results_;
};

}  // namespace dalix
}  // namespace hardware
