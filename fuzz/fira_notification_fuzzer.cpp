// FiRa session notifications from a hostile driver: GetCallContent, the
// notification and ranging-data parsing, ParseMeasurements and
// ParseAntennaMeasurement, as the ranging socket's handler runs them.
//
// Structure-aware: the input's first byte is the generic netlink command,
// the rest the message's attributes, so that mutations land in the nests
// rather than in headers the socket layer would have rejected. Radios 0 to 3
// have a callback; radio 1 has its antenna pairs configured.
#include <cstddef>
#include <cstdint>
#include <vector>

#include <netlink/genl/genl.h>
#include <netlink/msg.h>

#include "fuzz/scripted_driver.h"
#include "net/config_utils.h"
#include "net/fira_callback.h"
#include "net/fira_region_utils.h"

namespace {

using hardware::dalix::FiraCallback;
using hardware::dalix::FiraRegionUtils;

// Touches every decoded field, so that reading them is part of the run.
class Sink : public FiraCallback {
 public:
  void OnTwrResult(const FiraRangingData& data,
                   const std::vector<FiraTwrMeasurement>& measurements) override {
    total_ += data.index;
    for (const auto& m : measurements) {
      total_ += m.distance + m.status + m.address.address.size() + m.antennaMeasurements.size();
    }
  }
  void OnSessionStopped(uint32_t session_id) override { total_ += session_id; }

 private:
  uint64_t total_ = 0;
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

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
  hardware::dalix::fuzz::SilenceLogs();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 1 || size > 8192) return 0;
  nl_msg* msg = nlmsg_alloc_size(NLMSG_HDRLEN + GENL_HDRLEN + NLMSG_ALIGN(size));
  genlmsg_put(msg, 0, 0, 0x1d, 0, 0, data[0], 1);
  nlmsg_append(msg, const_cast<uint8_t*>(data + 1), size - 1, 0);
  Fira().OnRangingResult(msg);
  nlmsg_free(msg);
  return 0;
}
