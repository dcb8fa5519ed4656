#pragma once

#include <stdint.h>

#include <map>
#include <memory>
#include <optional>
#include <vector>

#include <netlink/attr.h>
#include <netlink/msg.h>

#include "net/config_utils.h"
#include "net/fira_callback.h"
#include "net/nl_socket.h"
#include "net/nl_socket_factory.h"
#include "uwb_aidl.h"

namespace hardware {
namespace dalix {

// Client of the driver's FiRa region: builds the region calls that set up,
// start, stop and tear down FiRa two-way-ranging sessions and their
// controlees, keeps each radio's antenna configuration, and decodes the
// session notifications that arrive on the one shared ranging socket into
// FiraCallback calls. The driver keeps the sessions; this object keeps only
// the callbacks and antenna settings per hardware index. Service thread only.
class FiraRegionUtils {
 public:
  using FiraTwrSession = aidl::hardware::dalix::uwb::FiraTwrSession;
  using UwbAddress = aidl::hardware::dalix::uwb::UwbAddress;
  using FiraTwrMeasurement = aidl::hardware::dalix::uwb::FiraTwrMeasurement;
  using FiraAntennaMeasurement = aidl::hardware::dalix::uwb::FiraAntennaMeasurement;

  // Antenna configuration of one radio, from its HAL property file. Each
  // field is a small index, or kFiraNoAntennaPair (255) when not configured.
  // A fresh entry is all zero until SetProperties fills it; a radio without
  // entry is taken as DefaultHwConfig().
  struct HwConfig {
    uint32_t antenna_pair_azimuth = 0;
    uint32_t antenna_pair_elevation = 0;
    uint32_t tx_antenna = 0;
  };
  // Deliberately asymmetric: azimuth pair 0, no elevation pair, antenna 0.
  static HwConfig DefaultHwConfig();

  explicit FiraRegionUtils(NlSocketFactory* socket_factory);
  virtual ~FiraRegionUtils();
  FiraRegionUtils(const FiraRegionUtils&) = delete;
  FiraRegionUtils& operator=(const FiraRegionUtils&) = delete;

  // The generic netlink id of the driver's family; 0 until resolved, and
  // every request fails until then.
  virtual void SetMcpsNetId(uint32_t id);
  // Sets or replaces who receives the notifications of |hw_index|; not owned.
  virtual void SubscribeCallback(uint32_t hw_index, FiraCallback* callback);
  // Forgets |hw_index|; once nobody is left, closes the ranging socket.
  virtual void UnsubscribeCallback(uint32_t hw_index);
  virtual bool InitSession(uint32_t hw_index, uint32_t session_id);
  // Sent on the ranging socket (opened and watched on first use), so that
  // notifications the driver sends at once are not lost. Needs a callback.
  virtual bool StartSession(uint32_t hw_index, uint32_t session_id);
  virtual bool StopSession(uint32_t hw_index, uint32_t session_id);
  virtual bool DeinitSession(uint32_t hw_index, uint32_t session_id);
  // Sends every parameter of |session| that the driver must know, checking
  // the values it cannot take.
  virtual bool ConfigTwrSession(uint32_t hw_index, const FiraTwrSession& session);
  // |sub_session_ids| may be null; when given it must be as long as
  // |controlees|.
  virtual bool AddControlees(uint32_t hw_index, uint32_t session_id,
                             const std::vector<UwbAddress>& controlees,
                             const std::vector<int32_t>* sub_session_ids);
  virtual bool RemoveControlees(uint32_t hw_index, uint32_t session_id,
                                const std::vector<UwbAddress>& controlees);
  virtual bool UpdateBlockStriding(uint32_t hw_index, uint32_t session_id, uint32_t value);
  // Reads the antenna keys of |config| into the HwConfig of |hw_index|. False
  // unless all three are present and valid; valid ones are stored anyway.
  virtual bool SetProperties(uint32_t hw_index, ConfigUtils& config);

  // Handler of the ranging socket: decodes one session notification and calls
  // the radio's FiraCallback. Always NL_STOP; bad messages are logged and
  // dropped.
  int OnRangingResult(nl_msg* msg);
  // Every measurement of a ranging data nest (parsed with
  // kFiraRangingDataPolicy) that is well formed and whose peer still ranges.
  static std::vector<FiraTwrMeasurement> ParseMeasurements(const HwConfig& hw_config,
                                                           nlattr** ranging_data_attrs,
                                                           uint64_t timestamp_ns);
  // One angle nest; the caller sets the kind. |antenna_pair| is
  // kFiraNoAntennaPair when the nest names none.
  static bool ParseAntennaMeasurement(nlattr* attr, FiraAntennaMeasurement* measurement,
                                      uint8_t* antenna_pair);
  // Drops the ranging socket, which closes once nothing else holds it.
  void CloseRangingSocket();
  // The CALL_PARAMS nest of a received FiRa region call, with its hardware
  // index and call id; null (logged) for anything else. |hw_index| is set as
  // soon as it is read, even if a later check fails.
  nlattr* GetCallContent(nl_msg* msg, uint32_t* hw_index, uint8_t* call);

  // The stored antenna configuration of |hw_index|, if any.
  std::optional<HwConfig> GetHwConfig(uint32_t hw_index) const;

 private:
  bool SetMcpsCommand(nl_msg* msg, uint32_t hw_index, uint8_t cmd, int flags);
  bool StartCallMessage(nl_msg* msg, uint32_t hw_index, uint8_t call, nlattr** region_nest,
                        nlattr** params_nest);
  bool EndCallMessage(nl_msg* msg, nlattr* region_nest, nlattr* params_nest);
  bool CreateSessionStateMsg(nl_msg* msg, uint32_t hw_index, uint8_t call, uint32_t session_id);
  // InitSession, StopSession and DeinitSession on a one-shot socket.
  bool SendSessionState(uint32_t hw_index, uint8_t call, uint32_t session_id);
  bool SendControlees(const char* caller, uint32_t hw_index, uint8_t call, uint32_t session_id,
                      const std::vector<UwbAddress>& controlees,
                      const std::vector<int32_t>* sub_session_ids);
  HwConfig HwConfigOrDefault(uint32_t hw_index) const;

  bool PutMainSessionParams(nl_msg* msg, const FiraTwrSession& session);
  bool PutTimingsParams(nl_msg* msg, const FiraTwrSession& session);
  bool PutBehaviorParams(nl_msg* msg, const FiraTwrSession& session);
  bool PutRadioParams(nl_msg* msg, const FiraTwrSession& session);
  bool PutAntennaParams(nl_msg* msg, const FiraTwrSession& session, const HwConfig& hw_config);
  bool PutCryptoParams(nl_msg* msg, const FiraTwrSession& session);
  bool PutReportParams(nl_msg* msg, const FiraTwrSession& session);
  bool PutShortAddress(nl_msg* msg, int attr, const UwbAddress& address);
  bool PutControlees(nl_msg* msg, const std::vector<UwbAddress>& controlees,
                     const std::vector<int32_t>* sub_session_ids);

  NlSocketFactory* socket_factory_;
  uint32_t mcps_net_id_;
  std::map<uint32_t, FiraCallback*> callbacks_;
  std::shared_ptr<NlSocket> ranging_socket_;
  std::map<uint32_t, HwConfig> hw_configs_;
};

}  // namespace dalix
}  // namespace hardware
