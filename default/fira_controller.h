#pragma once

// FiraController: the binder object through which one client runs FiRa
// two-way-ranging sessions on one radio. It keeps the table of sessions and
// their states, keeps the driver's scheduler on the FiRa region and the
// radio's interface down while sessions are configured and up while any
// runs, and passes the driver's results on to the client's session callback.
// Every call, binder or driver, runs on the service's event-loop thread.

#include <stdint.h>

#include <chrono>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "looper/event_loop.h"
#include "net/config_utils.h"
#include "net/fira_region_utils.h"
#include "net/ieee_utils.h"
#include "net/interface_tool.h"
#include "net/mcps_utils.h"
#include "uwb_aidl.h"

namespace hardware {
namespace dalix {

class FiraController : public aidl::hardware::dalix::uwb::BnFiraController, public FiraCallback {
 public:
  using FiraCapabilities = aidl::hardware::dalix::uwb::FiraCapabilities;
  using FiraRangingData = aidl::hardware::dalix::uwb::FiraRangingData;
  using FiraTwrMeasurement = aidl::hardware::dalix::uwb::FiraTwrMeasurement;
  using FiraTwrSession = aidl::hardware::dalix::uwb::FiraTwrSession;
  using IFiraSessionCallback = aidl::hardware::dalix::uwb::IFiraSessionCallback;
  using IFiraStateCallback = aidl::hardware::dalix::uwb::IFiraStateCallback;
  using UwbAddress = aidl::hardware::dalix::uwb::UwbAddress;

  enum SessionState {
    kInitialized = 0,  // created and configured, not ranging
    kRunning = 1,
  };

  // The driver clients and the loop are borrowed and must outlive the
  // controller. Nothing is sent to the driver until a client calls.
  FiraController(std::string name, uint32_t hw_index, InterfaceTool* interface_tool,
                 McpsUtils* mcps_utils, IeeeUtils* ieee_utils, FiraRegionUtils* fira_region_utils,
                 EventLoop* event_loop);
  ~FiraController() override;
  FiraController(const FiraController&) = delete;
  FiraController& operator=(const FiraController&) = delete;

  // IFiraController.
  ndk::ScopedAStatus setStateCallback(const std::shared_ptr<IFiraStateCallback>& callback) override;
  ndk::ScopedAStatus clearStateCallback() override;
  ndk::ScopedAStatus setSessionCallback(
      const std::shared_ptr<IFiraSessionCallback>& callback) override;
  ndk::ScopedAStatus clearSessionCallback() override;
  ndk::ScopedAStatus getCapabilities(FiraCapabilities* capabilities) override;
  ndk::ScopedAStatus initNewTwrSession(const FiraTwrSession& session) override;
  ndk::ScopedAStatus updateTwrSession(const FiraTwrSession& session) override;
  ndk::ScopedAStatus startRangingSession(int32_t session_id) override;
  ndk::ScopedAStatus updateTwoWayRangingBlockStriding(int32_t session_id,
                                                      int32_t block_striding_value) override;
  ndk::ScopedAStatus addControlees(
      int32_t session_id, const std::vector<UwbAddress>& controlees,
      const std::optional<std::vector<int32_t>>& sub_session_ids) override;
  ndk::ScopedAStatus removeControlees(int32_t session_id,
                                      const std::vector<UwbAddress>& controlees) override;
  ndk::ScopedAStatus stopRangingSession(int32_t session_id) override;
  ndk::ScopedAStatus getSessionCount(int32_t* count) override;
  ndk::ScopedAStatus deinitSession(int32_t session_id) override;
  ndk::ScopedAStatus reset() override;

  // FiraCallback: the driver's reports for this radio.
  void OnTwrResult(const FiraRangingData& data,
                   const std::vector<FiraTwrMeasurement>& measurements) override;
  void OnSessionStopped(uint32_t session_id) override;

  // Appends what a dump shows of this radio's FiRa sessions: each session's
  // state and the notifications it has received.
  void Dump(std::string* out) const;

  // Hands the radio's HAL properties on to the FiRa region client.
  bool SetProperties(ConfigUtils& config);

  // What the controller believes the driver holds, for diagnostics.
  const std::map<uint32_t, SessionState>& sessions() const { return sessions_; }
  uint32_t running_count() const { return running_count_; }

  // Refuses a session configuration that the service cannot run; OK or the
  // first failed check's illegal-argument status.
  static ndk::ScopedAStatus CheckTwrSessionFields(const FiraTwrSession& session);

 private:
  // Makes sure the driver's scheduler carries the FiRa region, taking the
  // interface down first when the scheduler has to change.
  ndk::ScopedAStatus SetFiraRegion();
  ndk::ScopedAStatus HasFiraRegion(bool* has_region);
  // When the region has gone (someone else changed the scheduler), the
  // driver has dropped every session: forget them too and fail.
  ndk::ScopedAStatus CheckFiraRegionSet();
  // Once no session runs: stop listening for results, take the interface down.
  void UnsubscribeRangingCallbackIfNecessary();
  // Forgets every session, as the driver has.
  void DropAllSessions();
  bool IsFiraScheduler(bool* ok);

  const std::string name_;
  const uint32_t hw_index_;
  InterfaceTool* const interface_tool_;
  McpsUtils* const mcps_utils_;
  IeeeUtils* const ieee_utils_;
  EventLoop* const event_loop_;
  FiraRegionUtils* const fira_region_utils_;
  std::shared_ptr<IFiraSessionCallback> session_callback_;
  // Kept for the client; the service has nothing to tell it.
  std::shared_ptr<IFiraStateCallback> state_callback_;
  std::map<uint32_t, SessionState> sessions_;
  // Notifications received per session id, for the dump.
  struct Notifications {
    uint64_t received = 0;
    int32_t last_index = 0;
    std::chrono::steady_clock::time_point last_time;
  };
  std::map<uint32_t, Notifications> notifications_;
  // Sessions in kRunning. Follows the driver's stop reports, which may come
  // for sessions this controller never started, so it is not clamped.
  uint32_t running_count_ = 0;
};

}  // namespace dalix
}  // namespace hardware
