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
namespace sim {

// A client's FiRa session callback for the simulated platform: records each
// call as its short name and session id ("onAdded7", with "?" when a failure
// carries a reason other than 0) and keeps the last result, for a test or
// benchmark thread to wait on while the service calls in on its own thread.
class FiraClientCallback : public aidl::hardware::dalix::uwb::BnFiraSessionCallback {
 public:
  using Addresses = std::vector<aidl::hardware::dalix::uwb::UwbAddress>;
  struct Result {
    aidl::hardware::dalix::uwb::FiraRangingData data;
    std::vector<aidl::hardware::dalix::uwb::FiraTwrMeasurement> measurements;
    size_t arrival = 0;  // 1 for the first result received
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
  // The |count|th result once it arrived (the latest if more did), or
  // nothing after 5 s.
  std::optional<Result> WaitForResult(size_t count) {
    std::unique_lock<std::mutex> lock(mutex_);
    if (!changed_.wait_for(lock, std::chrono::seconds(5), [&] { return results_ >= count; })) {
      return std::nullopt;
    }
    return last_result_;
  }

 private:
  ndk::ScopedAStatus Record(const char* name, int32_t id, int32_t reason = 0,
                            std::optional<Result> result = std::nullopt) {
    std::lock_guard<std::mutex> lock(mutex_);
    events_.push_back(name + std::to_string(id) + (reason != 0 ? "?" : ""));
    if (result.has_value()) {
      last_result_ = std::move(*result);
      last_result_.arrival = ++results_;
    }
    changed_.notify_all();
    // The service must not care what a client answers.
    return ndk::ScopedAStatus::fromExceptionCode(EX_TRANSACTION_FAILED);
  }

  std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<std::string> events_;
  size_t results_ = 0;
  Result last_result_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
