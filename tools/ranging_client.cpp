#include "tools/ranging_client.h"

#include <math.h>
#include <string.h>

#include <algorithm>
#include <tuple>
#include <utility>

#include <aidl/aidl/hardware/dalix/uwb/BnFiraSessionCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/BnSimpleRangingCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/BnUwbClientCallback.h>

namespace hardware {
namespace dalix {
namespace tools {

namespace uwb = aidl::aidl::hardware::dalix::uwb;

namespace {

// The driver reports FiRa and simple ranging distances in centimetres.
constexpr double kMetresPerUnit = 0.01;
// How long the driver gets to report a stopped session before deinit.
constexpr std::chrono::seconds kStopReportTimeout(3);
constexpr std::chrono::seconds kRateWindow(1);

bool Check(const ndk::ScopedAStatus& status, const char* call, std::string* error) {
  if (status.isOk()) return true;
  if (error != nullptr && error->empty()) *error = std::string(call) + ": " + status.getDescription();
  return false;
}

uwb::UwbAddress ShortAddress(uint16_t address) {
  uwb::UwbAddress result;
  result.address = {static_cast<uint8_t>(address >> 8), static_cast<uint8_t>(address & 0xff)};
  return result;
}

// A result names its peer by the 16-bit address in memory order; any other
// size is read as a big-endian number.
uint64_t AddressValue(const uwb::UwbAddress& address) {
  if (address.address.size() == sizeof(uint16_t)) {
    uint16_t value;
    memcpy(&value, address.address.data(), sizeof(value));
    return value;
  }
  uint64_t value = 0;
  for (uint8_t byte : address.address) value = (value << 8) | byte;
  return value;
}

}  // namespace

const char* ModeName(RangingMode mode) {
  return mode == RangingMode::kFira ? "FiRa" : "simple";
}

bool RangingClient::Key::operator<(const Key& other) const {
  return std::tie(radio, mode, address) < std::tie(other.radio, other.mode, other.address);
}

// The HAL calls nothing on it: it only stands for this client's life.
class RangingClient::ClientCallback : public uwb::BnUwbClientCallback {};

class RangingClient::FiraCallback : public uwb::BnFiraSessionCallback {
 public:
  FiraCallback(RangingClient* client, std::string radio)
      : client_(client), radio_(std::move(radio)) {}

  ndk::ScopedAStatus onTwrResult(const uwb::FiraRangingData& /*data*/,
                                 const std::vector<uwb::FiraTwrMeasurement>& measurements)
      override {
    for (const uwb::FiraTwrMeasurement& measurement : measurements) {
      const Key key{radio_, RangingMode::kFira, AddressValue(measurement.address)};
      if (measurement.status != 0) {
        client_->Record(key, std::nullopt);
        continue;
      }
      PeerReading reading;
      reading.distance_m = measurement.distance * kMetresPerUnit;
      reading.azimuth_rad = measurement.azimuthRad;
      reading.elevation_rad = measurement.elevationRad;
      const auto los = static_cast<uint8_t>(measurement.lineOfSight);
      reading.line_of_sight = los <= 1 ? los : -1;
      reading.timestamp_ns = measurement.timestampNs;
      client_->Record(key, reading);
    }
    return ndk::ScopedAStatus::ok();
  }
  ndk::ScopedAStatus onControleesAdded(int32_t, const std::vector<uwb::UwbAddress>&) override {
    return ndk::ScopedAStatus::ok();
  }
  ndk::ScopedAStatus onControleesAddFailed(int32_t, const std::vector<uwb::UwbAddress>&,
                                           int32_t) override {
    return ndk::ScopedAStatus::ok();
  }
  ndk::ScopedAStatus onControleesRemoved(int32_t, const std::vector<uwb::UwbAddress>&) override {
    return ndk::ScopedAStatus::ok();
  }
  ndk::ScopedAStatus onControleesRemoveFailed(int32_t, const std::vector<uwb::UwbAddress>&,
                                              int32_t) override {
    return ndk::ScopedAStatus::ok();
  }
  ndk::ScopedAStatus onSessionStopped(int32_t session_id) override {
    client_->OnFiraStopped(session_id);
    return ndk::ScopedAStatus::ok();
  }

 private:
  RangingClient* const client_;
  const std::string radio_;
};

class RangingClient::SimpleRangingCallback : public uwb::BnSimpleRangingCallback {
 public:
  SimpleRangingCallback(RangingClient* client, std::string radio)
      : client_(client), radio_(std::move(radio)) {}

  ndk::ScopedAStatus onRangingResult(const uwb::RangingResult& result) override {
    const Key key{radio_, RangingMode::kSimpleRanging, static_cast<uint64_t>(result.peerAddress)};
    // A failed measurement carries no angles.
    if (result.measurement < 0 || isnan(result.firstAngleRad)) {
      client_->Record(key, std::nullopt);
      return ndk::ScopedAStatus::ok();
    }
    PeerReading reading;
    reading.distance_m = result.measurement * kMetresPerUnit;
    reading.azimuth_rad = result.firstAngleRad;
    reading.elevation_rad = result.secondAngleRad;
    client_->Record(key, reading);
    return ndk::ScopedAStatus::ok();
  }

 private:
  RangingClient* const client_;
  const std::string radio_;
};

RangingClient::RangingClient(std::shared_ptr<uwb::IUwb> uwb) : uwb_(std::move(uwb)) {}

RangingClient::~RangingClient() {
  std::string ignored;
  Stop(&ignored);
}

bool RangingClient::Open(std::string* error) {
  client_callback_ = ndk::SharedRefBase::make<ClientCallback>();
  if (!Check(uwb_->open(client_callback_), "open", error)) return false;
  open_ = true;
  return true;
}

bool RangingClient::ListRadios(std::vector<std::string>* radios, std::string* error) {
  return Check(uwb_->listIfaceNames(radios), "listIfaceNames", error);
}

uwb::FiraTwrSession RangingClient::MakeFiraSession(const FiraOptions& options) {
  uwb::FiraTwrSession session;
  session.id = options.session_id;
  session.deviceType = uwb::DeviceType::CONTROLLER;
  session.deviceRole = uwb::DeviceRole::INITIATOR;
  session.rangingRoundUsage = uwb::RangingRoundUsage::DS_TWR;
  session.multiNodeMode = options.controlees.size() > 1 ? uwb::MultiNodeMode::ONE_TO_MANY
                                                        : uwb::MultiNodeMode::UNICAST;
  session.deviceAddress = ShortAddress(options.own_address);
  for (uint16_t controlee : options.controlees) {
    session.destAddressList.push_back(ShortAddress(controlee));
  }
  session.initiationTimeMs = 0;
  session.slotDurationRstu = 2400;
  session.slotsPerRangingRound = 25;
  session.rangingBlockDurationMs = options.block_duration_ms;
  session.maxRangingRoundRetries = 0;
  session.sessionPriority = 50;
  session.rangingRoundControl.hasResultReportPhase = true;
  session.rangingRoundControl.hasDeferredMode = true;
  session.inBandTerminationAttemptCount = 1;
  session.channelNumber = options.channel;
  session.preambleCodeIndex = 10;
  session.rframeConfig = uwb::RframeConfig::SP3;
  session.prfMode = uwb::PrfMode::BPRF;
  session.preambleDuration = uwb::PreambleDuration::T64_SYMBOLS;
  session.sfdId = 2;
  session.stsSegmentCount = 1;
  session.psduDataRate = uwb::PsduDataRate::RATE_6M81;
  session.bprfPhrDataRate = uwb::BprfPhrDataRate::RATE_850K;
  session.fcsType = uwb::FcsType::CRC_16;
  session.aoaType = uwb::AoaType::AZIMUTH_AND_ELEVATION;
  session.stsConfig = uwb::FiraStsConfig::STATIC;
  session.vendorId = {0x07, 0x08};
  session.staticStsIV = {0x01, 0x02, 0x03, 0x04, 0x05, 0x06};
  session.aoaResultRequest = uwb::AoaResultRequest::REQ_AOA_RESULTS;
  session.resultReportConfig.hasTimeOfFlightReport = true;
  session.resultReportConfig.hasAngleOfArrivalAzimuthReport = true;
  session.resultReportConfig.hasAngleOfArrivalElevationReport = true;
  session.resultReportConfig.hasAngleOfArrivalFigureOfMeritReport = true;
  return session;
}

bool RangingClient::StartFira(const std::string& radio, const FiraOptions& options,
                              std::string* error) {
  std::shared_ptr<uwb::IUwbIface> iface;
  if (!Check(uwb_->getIface(radio, &iface), "getIface", error)) return false;
  if (!Check(iface->firaController(&fira_), "firaController", error)) return false;
  fira_callback_ = ndk::SharedRefBase::make<FiraCallback>(this, radio);
  if (!Check(fira_->setSessionCallback(fira_callback_), "setSessionCallback", error)) {
    return false;
  }
  if (!Check(fira_->initNewTwrSession(MakeFiraSession(options)), "initNewTwrSession", error)) {
    return false;
  }
  fira_session_ = options.session_id;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    fira_stop_reported_ = false;
  }
  return Check(fira_->startRangingSession(options.session_id), "startRangingSession", error);
}

bool RangingClient::StartSimpleRanging(const std::string& radio,
                                       const SimpleRangingOptions& options, std::string* error) {
  std::shared_ptr<uwb::IUwbIface> iface;
  if (!Check(uwb_->getIface(radio, &iface), "getIface", error)) return false;
  if (!Check(iface->simpleRangingController(&simple_), "simpleRangingController", error)) {
    return false;
  }
  simple_callback_ = ndk::SharedRefBase::make<SimpleRangingCallback>(this, radio);
  if (!Check(simple_->setCallback(simple_callback_), "setCallback", error)) return false;
  if (!Check(simple_->startInitiatorMode(options.pan_id, options.own_address, options.channel),
             "startInitiatorMode", error)) {
    return false;
  }
  std::vector<uwb::RangingRequest> requests;
  for (size_t i = 0; i < options.peers.size(); ++i) {
    uwb::RangingRequest request;
    request.id = static_cast<int32_t>(i + 1);
    request.peerAddress = options.peers[i];
    requests.push_back(request);
  }
  return Check(simple_->setRangings(requests), "setRangings", error);
}

bool RangingClient::Stop(std::string* error) {
  bool ok = true;
  if (fira_ != nullptr && fira_session_.has_value()) {
    // A session that never started (or already stopped) refuses the stop;
    // deinit is still due.
    if (fira_->stopRangingSession(*fira_session_).isOk()) {
      std::unique_lock<std::mutex> lock(mutex_);
      if (!fira_stopped_.wait_for(lock, kStopReportTimeout, [this] { return fira_stop_reported_; })) {
        if (error != nullptr && error->empty()) *error = "stopRangingSession: no stop report";
        ok = false;
      }
    }
    ok = Check(fira_->deinitSession(*fira_session_), "deinitSession", error) && ok;
    fira_session_.reset();
  }
  if (simple_ != nullptr) {
    ok = Check(simple_->stop(), "stop", error) && ok;
    simple_.reset();
  }
  if (open_) {
    ok = Check(uwb_->close(), "close", error) && ok;
    open_ = false;
  }
  return ok;
}

void RangingClient::OnFiraStopped(int32_t /*session_id*/) {
  std::lock_guard<std::mutex> lock(mutex_);
  fira_stop_reported_ = true;
  fira_stopped_.notify_all();
}

ndk::SpAIBinder RangingClient::client_binder() {
  return client_callback_ != nullptr ? client_callback_->asBinder() : ndk::SpAIBinder();
}

void RangingClient::SetResultListener(ResultListener listener) {
  std::lock_guard<std::mutex> lock(mutex_);
  listener_ = std::move(listener);
}

void RangingClient::Record(const Key& key, const std::optional<PeerReading>& measurement) {
  const auto now = std::chrono::steady_clock::now();
  std::lock_guard<std::mutex> lock(mutex_);
  Track& track = tracks_[key];
  PeerReading& reading = track.reading;
  reading.mode = key.mode;
  reading.radio = key.radio;
  reading.address = key.address;
  ++reading.results;
  if (measurement.has_value()) {
    reading.measured = true;
    reading.distance_m = measurement->distance_m;
    reading.azimuth_rad = measurement->azimuth_rad;
    reading.elevation_rad = measurement->elevation_rad;
    reading.line_of_sight = measurement->line_of_sight;
    reading.timestamp_ns = measurement->timestamp_ns;
    track.recent.push_back(now);
  } else {
    reading.measured = false;
    ++reading.failures;
  }
  auto stale = std::find_if(track.recent.begin(), track.recent.end(),
                            [&now](auto time) { return now - time <= kRateWindow; });
  track.recent.erase(track.recent.begin(), stale);
  reading.updates_per_second = static_cast<double>(track.recent.size());
  if (listener_) listener_(reading);
}

std::vector<PeerReading> RangingClient::Readings() const {
  std::lock_guard<std::mutex> lock(mutex_);
  std::vector<PeerReading> readings;
  for (const auto& [key, track] : tracks_) readings.push_back(track.reading);
  return readings;
}

}  // namespace tools
}  // namespace dalix
}  // namespace hardware
