#pragma once

#include <functional>
#include <string>

#include "looper/event_loop.h"
#include "sim/driver_simulator.h"
#include "sim/mcps_family.h"
#include "sim/nl802154_family.h"
#include "sim/radio_store.h"
#include "sim/sim_nl_socket_factory.h"
#include "sim/wpan_device_store.h"

namespace hardware {
namespace dalix {
namespace fuzz {

// Writes a fuzz target's seed corpus from what the simulated driver really
// says: the service's own clients run their exchanges against the simulator
// and every datagram it answers with is recorded as a ScriptedDriver script.
// Runs on the seed program's main thread; the simulator has its own.
class SeedRecorder {
 public:
  explicit SeedRecorder(std::string directory);
  ~SeedRecorder();

  // Starts the simulator with both families; false (with a log line) when
  // the process could not get its private namespace or the port.
  bool Start();

  sim::RadioStore& radios() { return radios_; }
  sim::WpanDeviceStore& devices() { return devices_; }
  sim::DriverSimulator& simulator() { return simulator_; }
  NlSocketFactory* factory() { return &factory_; }

  // Runs |exchanges| and returns what the simulator answered, one answer per
  // request, sequence numbers made relative to each request's.
  std::string Record(const std::function<void()>& exchanges);
  // Writes |script| as the corpus file |name|; false on I/O error.
  bool Write(const std::string& name, const std::string& script);

 private:
  const std::string directory_;
  sim::RadioStore radios_;
  sim::WpanDeviceStore devices_;
  sim::McpsFamily mcps_;
  sim::Nl802154Family nl802154_;
  sim::DriverSimulator simulator_;
  sim::SimNlSocketFactory factory_;
};

}  // namespace fuzz
}  // namespace dalix
}  // namespace hardware
