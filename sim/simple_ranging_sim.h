#pragma once

#include <cstdint>
#include <map>
#include <mutex>
#include <optional>
#include <vector>

#include <netlink/attr.h>
#include <netlink/msg.h>

#include "sim/driver_simulator.h"
#include "sim/radio_store.h"
#include "sim/responder.h"
#include "sim/world.h"
#include "sim/wpan_device_store.h"

namespace hardware {
namespace dalix {
namespace sim {

// One RANGING_REPORT as the simulated driver sends it; an absent field is
// left out of the message.
struct RangingReport {
  std::optional<uint32_t> request_id;
  std::optional<uint32_t> measurement;
  std::optional<int32_t> pdoa_1;
  std::optional<int32_t> pdoa_2;
};

// The simulated driver's simple ranging: SET_RANGING_REQUESTS on a radio that
// runs the "simple-ranging" scheduler, then one RANGING_REPORT per request
// each slot period, sent to the port that installed the list, while the
// radio's interface is up. Each report measures the peer in the World (by
// its extended address), its angles sent as the phase differences that the
// service turns back into angles; a peer unknown, out of range or stopped
// gets a report without a measurement. Runs on the simulator thread; the installed lists may be
// read from any thread.
class SimpleRangingSim {
 public:
  // One installed request, as received.
  struct Request {
    uint32_t id = 0;
    uint32_t parameter = 0;
    uint64_t peer = 0;
  };

  // All borrowed; |devices| may be null (every radio counts as up).
  SimpleRangingSim(DriverSimulator* simulator, RadioStore* radios, WpanDeviceStore* devices,
                   World* world);

  // Handles MCPS802154_CMD_SET_RANGING_REQUESTS; |attrs| parsed at top level.
  void SetRangingRequests(const sim::Request& request, nlattr** attrs, Responder& responder);

  // The list installed on |hw_index|, empty when ranging is stopped.
  std::vector<Request> Installed(uint32_t hw_index) const;
  // Reports sent so far, over all radios.
  int ReportsSent() const;

  // The phase difference that the driver reports for an angle of arrival,
  // in its fixed point, and the report message itself.
  static int32_t AngleToPhase(double angle_rad);
  static bool EncodeRangingReport(nl_msg* msg, uint32_t hw_index, const RangingReport& report);

 private:
  struct Ranging {
    uint32_t port = 0;
    int family_id = 0;
    int slot_ms = 0;
    std::vector<Request> requests;
    // Bumped by every new list, so that the ticks of an older one end.
    uint64_t generation = 0;
  };

  void Tick(uint32_t hw_index, uint64_t generation);
  RangingReport Measure(uint32_t hw_index, const Request& request);
  bool InterfaceUp(uint32_t hw_index) const;

  DriverSimulator* const simulator_;
  RadioStore* const radios_;
  WpanDeviceStore* const devices_;
  World* const world_;
  mutable std::mutex mutex_;
  std::map<uint32_t, Ranging> ranging_;
  int reports_sent_ = 0;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
