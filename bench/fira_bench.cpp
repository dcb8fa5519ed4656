// The FiRa region's hot paths: one session notification of 1, 8 or 16
// measurements from the ranging socket to the FiraCallback, its decoding
// alone, and next to it the floor: the bare policy-checked libnl parse of the
// same bytes, which any decoder must do. Then the encoding of a full session
// configuration.

#include <cstdint>
#include <memory>
#include <vector>

#include <android-base/logging.h>
#include <benchmark/benchmark.h>
#include <netlink/genl/genl.h>
#include <utils/Looper.h>

#include "looper/looper_backed_event_loop.h"
#include "net/fira_region.h"
#include "net/fira_region_utils.h"
#include "net/mcps_utils.h"
#include "net/unique_nl_msg.h"
#include "sim/driver_simulator.h"
#include "sim/fira_notification.h"
#include "sim/fira_region_sim.h"
#include "sim/mcps_family.h"
#include "sim/sim_nl_socket_factory.h"

namespace hardware {
namespace dalix {
namespace {

namespace uwb = ::aidl::hardware::dalix::uwb;

constexpr uint32_t kHw = 0;
constexpr uint32_t kSession = 9;

class CountingCallback : public FiraCallback {
 public:
  void OnTwrResult(const FiraRangingData&,
                   const std::vector<FiraTwrMeasurement>& measurements) override {
    measurements_ += measurements.size();
  }
  void OnSessionStopped(uint32_t) override {}
  uint64_t measurements_ = 0;
};

// A notification with |count| peers, each with distance and every angle.
UniqueNlMsg Notification(int family_id, int count) {
  sim::FiraNotificationData data;
  data.hw_index = kHw;
  data.session_id = kSession;
  data.index = 1;
  data.timestamp_ns = 1000;
  data.measurements.emplace();
  for (int i = 0; i < count; ++i) {
    sim::FiraMeasurementData& m = data.measurements->emplace_back();
    m.short_address = static_cast<uint16_t>(0x100 + i);
    m.status = 0;
    m.line_of_sight = true;
    m.distance_cm = 100 + i;
    m.aoa_azimuth = sim::FiraAoaData{0, 1000, 200, -300};
    m.aoa_elevation = sim::FiraAoaData{1, -300, 200, 1000};
    m.azimuth = 1000;
    m.elevation = -600;
    m.azimuth_fom = 200;
    m.elevation_fom = 200;
  }
  UniqueNlMsg msg;
  sim::EncodeFiraNotification(msg.get(), family_id, data);
  return msg;
}

// The floor: every nest parsed with its policy, nothing converted or copied.
int BareParse(nl_msg* msg) {
  nlattr* top[MCPS802154_ATTR_MAX + 1];
  nlattr* call[MCPS802154_REGION_CALL_ATTR_MAX + 1];
  nlattr* ntf[FIRA_SESSION_NTF_ATTR_MAX + 1];
  nlattr* data[FIRA_RANGING_DATA_ATTR_MAX + 1];
  if (genlmsg_parse(nlmsg_hdr(msg), 0, top, MCPS802154_ATTR_MAX,
                    kFiraRegionCallMessagePolicy.data()) != 0 ||
      nla_parse_nested(call, MCPS802154_REGION_CALL_ATTR_MAX,
                       top[MCPS802154_ATTR_SCHEDULER_REGION_CALL],
                       kFiraRegionCallPolicy.data()) != 0 ||
      nla_parse_nested(ntf, FIRA_SESSION_NTF_ATTR_MAX,
                       call[MCPS802154_REGION_CALL_ATTR_CALL_PARAMS],
                       kFiraSessionNtfPolicy.data()) != 0 ||
      nla_parse_nested(data, FIRA_RANGING_DATA_ATTR_MAX, ntf[FIRA_SESSION_NTF_ATTR_RANGING_DATA],
                       kFiraRangingDataPolicy.data()) != 0) {
    return -1;
  }
  int parsed = 0;
  nlattr* entry;
  int remaining;
  nla_for_each_nested(entry, data[FIRA_RANGING_DATA_ATTR_MEASUREMENTS], remaining) {
    nlattr* fields[FIRA_MEASUREMENT_ATTR_MAX + 1];
    nlattr* aoa[FIRA_AOA_ATTR_MAX + 1];
    nla_parse_nested(fields, FIRA_MEASUREMENT_ATTR_MAX, entry, kFiraMeasurementPolicy.data());
    for (int nest : {FIRA_MEASUREMENT_ATTR_AOA_AZIMUTH, FIRA_MEASUREMENT_ATTR_AOA_ELEVATION}) {
      nla_parse_nested(aoa, FIRA_AOA_ATTR_MAX, fields[nest], kFiraAoaPolicy.data());
    }
    ++parsed;
  }
  return parsed;
}

void BM_BareParse(benchmark::State& state) {
  UniqueNlMsg msg = Notification(0x1d, static_cast<int>(state.range(0)));
  for (auto _ : state) benchmark::DoNotOptimize(BareParse(msg.get()));
}
BENCHMARK(BM_BareParse)->Arg(1)->Arg(8)->Arg(16);

void BM_DecodeAndDispatch(benchmark::State& state) {
  UniqueNlMsg msg = Notification(0x1d, static_cast<int>(state.range(0)));
  FiraRegionUtils fira(nullptr);
  CountingCallback callback;
  fira.SubscribeCallback(kHw, &callback);
  for (auto _ : state) fira.OnRangingResult(msg.get());
  if (callback.measurements_ != state.iterations() * state.range(0)) {
    state.SkipWithError("measurements lost");
  }
}
BENCHMARK(BM_DecodeAndDispatch)->Arg(1)->Arg(8)->Arg(16);

// Through the kernel: the simulated driver's socket sends the notification
// to the ranging socket of a started session, and the service's looper reads
// and dispatches it. The send is the benchmark's own cost, included.
void BM_SocketToCallback(benchmark::State& state) {
  sim::RadioStore radios;
  sim::World world;
  sim::McpsFamily family(&radios);
  sim::DriverSimulator simulator;
  sim::FiraRegionSim region(&simulator, &radios, &world);
  radios.AddRadio(kHw, 0u);
  family.AttachFiraRegion(&region);
  const int family_id = simulator.RegisterFamily(kMcpsFamilyName, &family);
  LooperBackedEventLoop loop;
  sim::SimNlSocketFactory factory(&loop, simulator.port());
  McpsUtils mcps(&factory);
  FiraRegionUtils fira(&factory);
  CountingCallback callback;
  uwb::FiraTwrSession session;
  session.id = kSession;
  session.rangingRoundUsage = uwb::RangingRoundUsage(2);
  session.deviceAddress.address = {0, 1};
  session.slotDurationRstu = session.slotsPerRangingRound = 1;
  // Rounds of its own far apart: the benchmark sends the notifications.
  session.rangingBlockDurationMs = 60000;
  session.channelNumber = 9;
  session.preambleCodeIndex = 10;
  session.stsConfig = uwb::FiraStsConfig(1);
  fira.SubscribeCallback(kHw, &callback);
  if (!simulator.Start() || !mcps.Start() || !mcps.SetFiraRegion(kHw)) {
    state.SkipWithError("no simulated driver");
    return;
  }
  fira.SetMcpsNetId(mcps.GetNetId());
  if (!fira.InitSession(kHw, kSession) || !fira.ConfigTwrSession(kHw, session) ||
      !fira.StartSession(kHw, kSession)) {
    state.SkipWithError("session did not start");
    return;
  }
  const uint32_t port = region.Session(kHw, kSession)->port;
  UniqueNlMsg msg = Notification(family_id, static_cast<int>(state.range(0)));
  nlmsghdr* header = nlmsg_hdr(msg.get());
  android::sp<android::Looper> looper = android::Looper::getForThread();
  for (auto _ : state) {
    simulator.SendRaw(port, header, header->nlmsg_len);
    looper->pollOnce(1000);
  }
  if (callback.measurements_ != state.iterations() * state.range(0)) {
    state.SkipWithError("notifications lost");
  }
  fira.UnsubscribeCallback(kHw);
  simulator.Stop();
}
BENCHMARK(BM_SocketToCallback)->Arg(1)->Arg(8)->Arg(16);

void BM_ConfigTwrSessionEncoding(benchmark::State& state) {
  // Requests go to a socket that acknowledges at once, without a syscall.
  class AckingSocket : public NlSocket {
   public:
    AckingSocket() : NlSocket(nullptr) {}
    bool SendAndAwaitAck(nl_msg* msg, std::function<int(nl_msg*)>) override {
      benchmark::DoNotOptimize(nlmsg_hdr(msg)->nlmsg_len);
      return true;
    }
  };
  class AckingFactory : public NlSocketFactory {
   public:
    AckingFactory() : NlSocketFactory(nullptr) {}
    std::unique_ptr<NlSocket> Create() override { return std::make_unique<AckingSocket>(); }
  };
  AckingFactory factory;
  FiraRegionUtils fira(&factory);
  fira.SetMcpsNetId(0x1d);
  uwb::FiraTwrSession session;
  session.id = kSession;
  session.deviceType = uwb::DeviceType(1);
  session.rangingRoundUsage = uwb::RangingRoundUsage(2);
  session.deviceAddress.address = {0, 1};
  session.destAddressList = {session.deviceAddress};
  session.isBlockStridingEnabled = session.isHoppingEnabled = true;
  session.maxRangingRoundRetries = 3;
  session.stsConfig = uwb::FiraStsConfig(0);
  session.staticStsIV = {1, 2, 3, 4, 5, 6};
  session.vendorId = {7, 8};
  session.aoaType = uwb::AoaType(2);
  session.aoaResultRequest = uwb::AoaResultRequest(1);
  session.resultReportConfig = {true, true, true, true};
  for (auto _ : state) {
    if (!fira.ConfigTwrSession(kHw, session)) state.SkipWithError("not encoded");
  }
}
BENCHMARK(BM_ConfigTwrSessionEncoding);

}  // namespace
}  // namespace dalix
}  // namespace hardware
