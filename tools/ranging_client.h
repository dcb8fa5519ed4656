#pragma once

#include <stdint.h>

#include <chrono>
#include <condition_variable>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/IFiraController.h>
#include <aidl/aidl/hardware/dalix/uwb/ISimpleRangingController.h>
#include <aidl/aidl/hardware/dalix/uwb/IUwb.h>
#include <aidl/aidl/hardware/dalix/uwb/IUwbClientCallback.h>

namespace hardware {
namespace dalix {
namespace tools {

// How a peer is ranged.
enum class RangingMode { kFira, kSimpleRanging };

// The latest result of one peer on one radio, and how results have come.
struct PeerReading {
  RangingMode mode = RangingMode::kFira;
  std::string radio;
  // The 2-byte short address in FiRa, the extended address in simple ranging.
  uint64_t address = 0;
  // Whether the latest result was a measurement; a failed one keeps the
  // previous values below.
  bool measured = false;
  double distance_m = 0;
  // NaN when the result carries no such angle.
  double azimuth_rad = 0;
  double elevation_rad = 0;
  // 1 line of sight, 0 none, -1 unknown (simple ranging never tells).
  int line_of_sight = -1;
  // When the radio measured, CLOCK_MONOTONIC of the device; 0 when the
  // result does not say (simple ranging).
  int64_t timestamp_ns = 0;
  uint64_t results = 0;
  uint64_t failures = 0;
  // Over the last second.
  double updates_per_second = 0;
};

// One FiRa two-way-ranging session run as the controller and initiator,
// ranging with every controlee at once.
struct FiraOptions {
  int32_t session_id = 1;
  uint16_t own_address = 0x0001;
  std::vector<uint16_t> controlees;
  int32_t channel = 9;
  int32_t block_duration_ms = 200;
};

// Simple ranging as the initiator with every peer.
struct SimpleRangingOptions {
  int32_t pan_id = 0x00ca;
  int64_t own_address = 0x0000000000000001;
  int32_t channel = 9;
  std::vector<int64_t> peers;
};

// A client of the HAL for tools: opens it with a client callback, lists the
// radios, runs a FiRa session on one radio and simple ranging on another,
// and keeps every peer's latest result. Calls are blocking binder calls made
// on the caller's thread; results arrive on the service's thread and are
// kept under a lock, so Readings() may be called from anywhere.
class RangingClient {
 public:
  // Called for every result of every peer, on the thread that delivers it.
  using ResultListener = std::function<void(const PeerReading&)>;

  explicit RangingClient(std::shared_ptr<aidl::aidl::hardware::dalix::uwb::IUwb> uwb);
  ~RangingClient();
  RangingClient(const RangingClient&) = delete;
  RangingClient& operator=(const RangingClient&) = delete;

  // Each returns false with the failed call and its status in |error|.
  bool Open(std::string* error);
  bool ListRadios(std::vector<std::string>* radios, std::string* error);
  bool StartFira(const std::string& radio, const FiraOptions& options, std::string* error);
  bool StartSimpleRanging(const std::string& radio, const SimpleRangingOptions& options,
                          std::string* error);
  // Stops what runs (FiRa: stop, wait for the driver's stop report, deinit;
  // simple ranging: stop) and closes the HAL. Carries on past a failure and
  // reports the first one.
  bool Stop(std::string* error);

  void SetResultListener(ResultListener listener);
  // The binder that stands for this client with the HAL once it is open
  // (the one whose death closes the HAL); null before.
  ndk::SpAIBinder client_binder();
  // By radio, then mode, then address.
  std::vector<PeerReading> Readings() const;

  // The session every FiRa run uses, for tools that want to show it.
  static aidl::aidl::hardware::dalix::uwb::FiraTwrSession MakeFiraSession(
      const FiraOptions& options);

 private:
  class ClientCallback;
  class FiraCallback;
  class SimpleRangingCallback;
  struct Key {
    std::string radio;
    RangingMode mode;
    uint64_t address;
    bool operator<(const Key& other) const;
  };
  struct Track {
    PeerReading reading;
    std::vector<std::chrono::steady_clock::time_point> recent;
  };

  void Record(const Key& key, const std::optional<PeerReading>& measurement);
  void OnFiraStopped(int32_t session_id);

  std::shared_ptr<aidl::aidl::hardware::dalix::uwb::IUwb> uwb_;
  std::shared_ptr<ClientCallback> client_callback_;
  bool open_ = false;

  std::shared_ptr<aidl::aidl::hardware::dalix::uwb::IFiraController> fira_;
  std::shared_ptr<FiraCallback> fira_callback_;
  std::optional<int32_t> fira_session_;
  std::shared_ptr<aidl::aidl::hardware::dalix::uwb::ISimpleRangingController> simple_;
  std::shared_ptr<SimpleRangingCallback> simple_callback_;

  mutable std::mutex mutex_;
  std::condition_variable fira_stopped_;
  bool fira_stop_reported_ = false;
  std::map<Key, Track> tracks_;
  ResultListener listener_;
};

const char* ModeName(RangingMode mode);

}  // namespace tools
}  // namespace dalix
}  // namespace hardware
