#pragma once

#include <stdint.h>

#include <utility>
#include <vector>

#include "net/fira_callback.h"

namespace hardware {
namespace dalix {

// Test double of the FiRa controller's side: keeps every result and stop.
struct FiraCallbackRecorder : FiraCallback {
  void OnTwrResult(const FiraRangingData& data,
                   const std::vector<FiraTwrMeasurement>& measurements) override {
    results.emplace_back(data, measurements);
  }
  void OnSessionStopped(uint32_t session_id) override { stopped.push_back(session_id); }

  std::vector<std::pair<FiraRangingData, std::vector<FiraTwrMeasurement>>> results;
  std::vector<uint32_t> stopped;
};

}  // namespace dalix
}  // namespace hardware
