#pragma once

#include <cstdint>

#include "net/unique_nl_msg.h"
#include "sim/driver_simulator.h"
#include "sim/family_handler.h"
#include "sim/responder.h"

namespace hardware {
namespace dalix {
namespace sim {

// The "dalix_test" family (test_family_defs.h): a stored value, a dump and
// an event subscription, enough to drive every kind of answer the transport
// must handle. Runs on the simulator thread.
class TestFamily : public FamilyHandler {
 public:
  // |simulator| carries the events; it is not used before the first request.
  explicit TestFamily(DriverSimulator* simulator);

  void HandleRequest(const Request& request, Responder& responder) override;

  // A client's request of |cmd|, built as the service builds its own.
  static UniqueNlMsg NewRequest(int family_id, uint8_t cmd);

 private:
  DriverSimulator* simulator_;
  uint32_t value_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
