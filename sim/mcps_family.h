#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <map>

#include "sim/family_handler.h"
#include "sim/radio_store.h"
#include "sim/responder.h"

namespace hardware {
namespace dalix {
namespace sim {

class FiraRegionSim;

// The simulated UWB MAC driver's "mcps802154" family: radio discovery,
// scheduler and region selection, and calibration, served from a RadioStore.
// Requests are checked as strictly as the driver checks them. Runs on the
// simulator thread; SetMaxPayload may be called from any thread.
class McpsFamily : public FamilyHandler {
 public:
  explicit McpsFamily(RadioStore* radios);

  // Serves one more command; |attrs| are the request's top-level attributes,
  // already checked against the request policy. Set before the simulator
  // starts.
  using CommandHandler = std::function<void(const Request&, nlattr** attrs, Responder&)>;
  void SetCommandHandler(uint8_t cmd, CommandHandler handler);

  void HandleRequest(const Request& request, Responder& responder) override;

  // Requests whose netlink payload exceeds |bytes| are refused with EMSGSIZE,
  // as the kernel refuses a message larger than a page. Defaults to a page
  // less the netlink header.
  void SetMaxPayload(int bytes) { max_payload_ = bytes; }
  // Serves region calls with |fira| (borrowed); without it they are
  // refused. Attach before the simulator starts.
  void AttachFiraRegion(FiraRegionSim* fira) { fira_ = fira; }

 private:
  void GetHw(const Request& request, nlattr** attrs, Responder& responder);
  void SetScheduler(const Request& request, nlattr** attrs, Responder& responder);
  void SetCalibrations(nlattr** attrs, Responder& responder);

  RadioStore* radios_;
  std::atomic<int> max_payload_;
  std::map<uint8_t, CommandHandler> command_handlers_;
  FiraRegionSim* fira_ = nullptr;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
