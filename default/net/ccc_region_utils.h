#pragma once

#include <stdint.h>

#include <netlink/attr.h>
#include <netlink/msg.h>

#include "net/nl_socket_factory.h"

namespace hardware {
namespace dalix {

// Starts CCC sessions through the UWB MAC driver's test-mode command: one
// request carrying a test-data nest, answered by one reply whose test data
// holds the driver's return code. Service thread only; each request blocks it
// until the reply or the receive timeout.
class CccRegionUtils {
 public:
  // The value the driver is always given for a session start, and that the
  // caller gets back.
  static constexpr uint32_t kCccStartU32Param = 123000;

  explicit CccRegionUtils(NlSocketFactory* factory);
  virtual ~CccRegionUtils();
  CccRegionUtils(const CccRegionUtils&) = delete;
  CccRegionUtils& operator=(const CccRegionUtils&) = delete;

  // The family id that McpsUtils resolved; 0 leaves every request unsent.
  virtual void SetMcpsNetId(uint32_t id);
  // Starts a session on |channel|. |first| and |timeref| are accepted for the
  // caller's sake and not sent: the driver's start takes only the channel and
  // the fixed value, which is written to |*u32_param| and sent from there.
  // True when the driver replied, whatever its return code said.
  virtual bool StartCccSession(uint32_t hw_index, uint32_t first, uint64_t timeref, uint8_t channel,
                               uint32_t* u32_param);

  // Reads one test-mode reply. True when the return code reports success,
  // which the driver signals with a non-zero code; the session start does not
  // act on it.
  static bool ParseTestModeCmdResponse(nl_msg* msg);

 private:
  // Header, hardware index, the open test-data nest and the test command.
  bool StartRegionMessage(nl_msg* msg, uint32_t hw_index, uint8_t cmd, nlattr** testdata);

  NlSocketFactory* factory_;
  uint32_t mcps_net_id_ = 0;
};

}  // namespace dalix
}  // namespace hardware
