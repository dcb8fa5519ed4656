// Simple ranging reports from a hostile driver: McpsUtils::OnRangingResult,
// the receive callback of the ranging socket, on arbitrary reports, with
// requests installed so that every report reaches the attribute parsers and
// the angle conversion. Reports come unasked rather than as answers, so the
// input is one report (see fuzz/generic_message.h) handed to the callback
// directly. Every result must carry angles that asin can give.

#include <math.h>
#include <stdint.h>
#include <stdlib.h>

#include <memory>

#include "fuzz/generic_message.h"
#include "net/mcps_utils.h"

namespace hardware {
namespace dalix {
namespace {

// Takes the requests and watches nothing: reports are handed in directly.
class AcceptingSocket : public NlSocket {
 public:
  AcceptingSocket() : NlSocket(nullptr) {}
  void DisableAutoAck() override {}
  bool SendAndAwaitAck(nl_msg*, std::function<int(nl_msg*)>) override { return true; }
  bool WatchNetlinkSocket(std::weak_ptr<NlSocket>, const std::function<int(nl_msg*)>&) override {
    return true;
  }
};

class AcceptingFactory : public NlSocketFactory {
 public:
  AcceptingFactory() : NlSocketFactory(nullptr) {}
  std::unique_ptr<NlSocket> Create() override { return std::make_unique<AcceptingSocket>(); }
};

void CheckAngle(float angle) {
  if (!isnan(angle) && fabsf(angle) > static_cast<float>(M_PI_2) + 1e-6f) abort();
}

McpsUtils* RangingMcpsUtils() {
  static AcceptingFactory factory;
  static McpsUtils* mcps = [] {
    auto* utils = new McpsUtils(&factory);
    utils->SubscribeRangingResults([](const McpsUtils::RangingResult& result) {
      CheckAngle(result.firstAngleRad);
      CheckAngle(result.secondAngleRad);
    });
    std::vector<McpsUtils::RangingRequest> requests(3);
    for (int i = 0; i < 3; ++i) requests[i].id = i;
    if (!utils->SetRangingRequests(0, requests)) abort();
    return utils;
  }();
  return mcps;
}

}  // namespace
}  // namespace dalix
}  // namespace hardware

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using namespace hardware::dalix;
  UniqueNlMsg msg;
  if (!fuzz::FrameGenericMessage(data, size, &msg)) return 0;
  RangingMcpsUtils()->OnRangingResult(msg.get());
  return 0;
}
