// FiRa session notifications from a hostile driver: GetCallContent, the
// notification and ranging-data parsing, ParseMeasurements and
// ParseAntennaMeasurement, as the ranging socket's handler runs them.
//
// The input is one notification in the form of fuzz/generic_message.h, so
// that mutations land in the nests rather than in headers the socket layer
// would have rejected. Radios 0 to 3 have a callback; radio 1 has its antenna
// pairs configured.
#include <cstddef>
#include <cstdint>
#include <vector>

#include "fuzz/generic_message.h"
#include "net/config_utils.h"
#include "net/fira_callback.h"
#include "net/fira_region_utils.h"

namespace {

using hardware::dalix::FiraCallback;
using hardware::dalix::FiraRegionUtils;

// Results are dropped: what is under test is how they were decoded.
class Sink : public FiraCallback {
 public:
  void OnTwrResult(const FiraRangingData&, const std::vector<FiraTwrMeasurement>&) override {}
  void OnSessionStopped(uint32_t) override {}
};

FiraRegionUtils& Fira() {
  static Sink sink;
  static FiraRegionUtils* fira = [] {
    auto* utils = new FiraRegionUtils(nullptr);
    for (uint32_t hw = 0; hw < 4; ++hw) utils->SubscribeCallback(hw, &sink);
    hardware::dalix::ConfigUtils config;
    config.Set("antenna_pair_azimuth", "1");
    config.Set("antenna_pair_elevation", "2");
    config.Set("tx_antenna", "0");
    utils->SetProperties(1, config);
    return utils;
  }();
  return *fira;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  hardware::dalix::UniqueNlMsg msg;
  if (hardware::dalix::fuzz::FrameGenericMessage(data, size, &msg)) {
    Fira().OnRangingResult(msg.get());
  }
  return 0;
}
