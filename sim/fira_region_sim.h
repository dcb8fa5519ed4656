#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <utility>
#include <vector>

#include <netlink/attr.h>

#include "sim/driver_simulator.h"
#include "sim/family_handler.h"
#include "sim/fira_notification.h"
#include "sim/radio_store.h"
#include "sim/responder.h"
#include "sim/world.h"

namespace hardware {
namespace dalix {
namespace sim {

// A controlee as the driver keeps it.
struct SimFiraControlee {
  uint16_t short_address = 0;
  std::optional<uint32_t> sub_session_id;

  bool operator==(const SimFiraControlee& other) const {
    return short_address == other.short_address && sub_session_id == other.sub_session_id;
  }
};

// One FiRa session as the simulated driver holds it.
struct SimFiraSession {
  uint32_t hw_index = 0;
  uint32_t session_id = 0;
  bool active = false;
  // Every session parameter received, by attribute id: the value of a
  // fixed-size parameter, widened; the key bytes for the static STS key.
  std::map<int, uint32_t> params;
  std::vector<uint8_t> static_sts_key;
  int set_params_calls = 0;
  std::vector<SimFiraControlee> controlees;
  // Where notifications go: the port and family of the start request.
  uint32_t port = 0;
  int family_id = 0;
  // Ranging data index of the next notification.
  uint32_t next_index = 0;
  // Rounds run since the start, and notifications the client could take.
  int rounds = 0;
  int notifications_sent = 0;

  std::optional<uint32_t> Param(int attr) const;
};

// The FiRa region of the simulated driver: serves MCPS802154_CMD_CALL_REGION
// on a radio whose scheduler carries it, keeps the sessions, and while a
// session runs sends one session notification per ranging block to the port
// that started it, measured in the World. Requests are checked as the driver
// checks them. HandleCall, DropSessions and the ranging rounds run on the
// simulator thread; the inspection and set-up methods may be called from any
// thread.
//
// Must outlive the simulator's thread, like the families.
class FiraRegionSim {
 public:
  FiraRegionSim(DriverSimulator* simulator, RadioStore* radios, World* world);
  FiraRegionSim(const FiraRegionSim&) = delete;
  FiraRegionSim& operator=(const FiraRegionSim&) = delete;

  // One region call; |attrs| are the request's top-level attributes, already
  // checked against the family's request policy.
  void HandleCall(const Request& request, nlattr** attrs, Responder& responder);
  // The radio's scheduler was replaced: its sessions are gone, without a
  // word to anyone, as in the driver.
  void DropSessions(uint32_t hw_index);

  // Ranging happens only while |is_up| says the radio's interface is up.
  // Without it, every radio ranges.
  void SetRadioUpCheck(std::function<bool(uint32_t hw_index)> is_up);
  // Sends the first notification of a session before the start is
  // acknowledged, as a driver that ranges at once may.
  void SetNotifyOnStart(bool notify);

  std::optional<SimFiraSession> Session(uint32_t hw_index, uint32_t session_id) const;
  std::vector<SimFiraSession> Sessions() const;

  // What one round of |session| reports at |timestamp_ns| (CLOCK_MONOTONIC),
  // as the notification carries it.
  FiraNotificationData RoundData(const SimFiraSession& session, uint64_t timestamp_ns);

 private:
  using Key = std::pair<uint32_t, uint32_t>;

  int InitSession(uint32_t hw_index, uint32_t session_id);
  int SetParams(SimFiraSession* session, nlattr* params);
  int ChangeControlees(SimFiraSession* session, nlattr* list, bool add);
  int StartSession(SimFiraSession* session, const Request& request);
  int StopSession(SimFiraSession* session);
  // Runs one round of the session of |key| if it still runs as started for
  // |generation|, and schedules the next.
  void Round(Key key, uint64_t generation);
  void ScheduleRound(Key key, uint64_t generation, uint32_t delay_ms);
  // Sends the notification of one round of |session|; locked.
  void SendRound(SimFiraSession* session);
  void SendStopped(const SimFiraSession& session);
  static uint32_t RoundIntervalMs(const SimFiraSession& session);

  DriverSimulator* const simulator_;
  RadioStore* const radios_;
  World* const world_;

  mutable std::mutex mutex_;
  std::map<Key, SimFiraSession> sessions_;
  // Bumped whenever a session starts, stops or goes, so that rounds
  // scheduled before know they are stale.
  std::map<Key, uint64_t> generations_;
  uint64_t next_generation_ = 1;
  std::function<bool(uint32_t)> is_up_;
  bool notify_on_start_ = false;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
