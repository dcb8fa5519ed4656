#pragma once

#include <stdint.h>

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/RangingRequest.h>
#include <aidl/aidl/hardware/dalix/uwb/RangingResult.h>
#include <netlink/msg.h>

#include "net/config_utils.h"
#include "net/nl_socket_factory.h"

namespace hardware {
namespace dalix {

// What the driver tells about one radio.
struct McpsHwInfo {
  uint32_t hw_index = 0;
  // The number in the radio's 802.15.4 phy name ("phy3" -> 3).
  uint32_t phy_index = 0;
  std::string scheduler;
};

// The scheduler that the driver runs on a radio. Values other than these are
// sent as their decimal text.
enum class McpsScheduler : int8_t {
  kDefault = 0,
  kSimpleRanging = 1,
  kEndless = 2,
};

// Client of the UWB MAC driver's generic netlink family: radio discovery,
// scheduler and region selection, calibration transfer and simple ranging.
// Each request opens its own socket from the factory and blocks until the
// driver answers. Service thread only.
class McpsUtils {
 public:
  enum SlotDuration : int32_t {
    kNoSlotDuration = -1,
    kSimpleRangingSlotDuration = 16,
  };
  enum NodeType : int32_t {
    kNoNodeType = -1,
    kInitiator = 0,
    kResponder = 1,
  };
  // The generated types by their own namespace: the service's shorter alias
  // lives in uwb_aidl.h, which this header must stay includable beside.
  using RangingRequest = ::aidl::aidl::hardware::dalix::uwb::RangingRequest;
  using RangingResult = ::aidl::aidl::hardware::dalix::uwb::RangingResult;
  using RangingResultHandler = std::function<void(const RangingResult&)>;

  explicit McpsUtils(NlSocketFactory* socket_factory);
  virtual ~McpsUtils();
  McpsUtils(const McpsUtils&) = delete;
  McpsUtils& operator=(const McpsUtils&) = delete;

  // Resolves the family id; every other operation needs it.
  virtual bool Start();
  virtual uint32_t GetNetId() const;
  // Every radio in the driver's dump order. |ok| tells whether the dump
  // completed; the radios read before a failure are returned anyway.
  virtual std::vector<McpsHwInfo> ListHardware(bool* ok);
  virtual McpsHwInfo GetHardwareInfo(uint32_t hw_index, bool* ok);
  // SET_SCHEDULER_PARAMS instead of SET_SCHEDULER when |params_only|. -1 for
  // both |slot_duration| and |node_type| sends no parameters at all.
  virtual bool SetScheduler(uint32_t hw_index, McpsScheduler scheduler,
                            SlotDuration slot_duration, NodeType node_type, bool params_only);
  // The "endless" scheduler carrying the "fira" region.
  virtual bool SetFiraRegion(uint32_t hw_index);
  // Copies every key of |config| to the driver, in as many messages as one
  // page each allows. False if any key was skipped or the driver refused one;
  // the others are still sent.
  virtual bool SetCalibration(uint32_t hw_index, ConfigUtils* config);
  // Simple ranging. Installs |requests| on the radio and watches a socket of
  // their own for the driver's reports; an empty list stops ranging without
  // asking the driver. Needs a handler subscribed first.
  virtual bool SetRangingRequests(uint32_t hw_index, const std::vector<RangingRequest>& requests);
  // Replaces the handler that receives every result, on the service thread.
  virtual void SubscribeRangingResults(RangingResultHandler handler);
  // Stops the reports and forgets the requests and the handler.
  virtual void UnsubscribeRangingResults();
  // Writes the generic netlink header and the hardware index into an empty
  // message.
  virtual bool SetMcpsCommand(nl_msg* msg, uint32_t hw_index, uint8_t cmd, int flags);
  virtual bool RangingRequestsToNlMsg(nl_msg* msg, uint32_t hw_index,
                                      const std::vector<RangingRequest>& requests);

  // Ends the report deliveries, if any: the watch holds the socket weakly.
  void CloseRangingSocket();
  // Receive callback of the ranging socket: turns one RANGING_REPORT into a
  // result for the handler. Anything else is logged and dropped. NL_STOP.
  int OnRangingResult(nl_msg* msg);

  // The simple ranging requests installed now, for diagnostics.
  virtual std::vector<RangingRequest> InstalledRangingRequests() const {
    return ranging_requests_;
  }

  // Reads one NEW_HW message. False when the index or the phy name is missing
  // (|info| untouched) or when the phy name carries no number after "phy"
  // (|hw_index| and |scheduler| already filled in).
  static bool ParseHwInfo(nl_msg* msg, McpsHwInfo* info);
  // The text sent for |scheduler|.
  static std::string SchedulerName(McpsScheduler scheduler);
  // Largest payload of one calibration message: a page less the netlink header.
  static int CalibrationPayloadBudget();

 private:
  NlSocketFactory* socket_factory_;
  uint32_t net_id_ = 0;
  RangingResultHandler ranging_handler_;
  std::shared_ptr<NlSocket> ranging_socket_;
  std::vector<RangingRequest> ranging_requests_;
};

}  // namespace dalix
}  // namespace hardware
