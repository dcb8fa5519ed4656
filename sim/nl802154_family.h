#pragma once

#include <stdint.h>

#include <atomic>

#include "sim/family_handler.h"
#include "sim/wpan_device_store.h"

namespace hardware {
namespace dalix {
namespace sim {

// The simulated driver's side of "nl802154": lists the interfaces of a
// WpanDeviceStore, describes their phys and applies channel, PAN id and
// short address requests to them, refusing what the kernel refuses. Runs on
// the simulator thread; the store is borrowed.
class Nl802154Family : public FamilyHandler {
 public:
  explicit Nl802154Family(WpanDeviceStore* devices) : devices_(devices) {}

  void HandleRequest(const Request& request, Responder& responder) override;

  // Requests handled so far, refused ones included. Any thread.
  int request_count() const { return request_count_.load(); }

 private:
  void ListInterfaces(const Request& request, nlattr** attrs, Responder& responder);
  void DescribePhy(nlattr** attrs, Responder& responder);
  void SetChannel(nlattr** attrs, Responder& responder);
  void SetPanId(nlattr** attrs, Responder& responder);
  void SetShortAddress(nlattr** attrs, Responder& responder);

  WpanDeviceStore* const devices_;
  std::atomic<int> request_count_{0};
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
