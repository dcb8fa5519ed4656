#include "fira_controller.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <set>
#include <string>
#include <tuple>
#include <vector>

#include <android-base/strings.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "net/mcps802154.h"
#include "sim/fira_client_callback.h"
#include "tests/fira_session_builder.h"
#include "tests/log_capture.h"
#include "tests/mock_driver_clients.h"
#include "tests/mock_event_loop.h"

namespace hardware {
namespace dalix {
namespace {

using aidl::hardware::dalix::uwb::AoaType;
using aidl::hardware::dalix::uwb::DeviceType;
using aidl::hardware::dalix::uwb::FiraStsConfig;
using aidl::hardware::dalix::uwb::FiraTwrSession;
using aidl::hardware::dalix::uwb::UwbAddress;
using ndk::ScopedAStatus;
using ::testing::_;
using ::testing::SizeIs;
using ::testing::StrEq;
using ::testing::StrictMock;

constexpr char kTag[] = "dalix.uwb.FiraController";
constexpr uint32_t kHw = 3;

// The region calls the controller makes; the others keep their own code.
class MockFiraRegionUtils : public FiraRegionUtils {
 public:
  MockFiraRegionUtils() : FiraRegionUtils(nullptr) {}
  MOCK_METHOD(void, SubscribeCallback, (uint32_t hw_index, FiraCallback* callback), (override));
  MOCK_METHOD(void, UnsubscribeCallback, (uint32_t hw_index), (override));
  MOCK_METHOD(bool, InitSession, (uint32_t hw_index, uint32_t session_id), (override));
  MOCK_METHOD(bool, StartSession, (uint32_t hw_index, uint32_t session_id), (override));
  MOCK_METHOD(bool, StopSession, (uint32_t hw_index, uint32_t session_id), (override));
  MOCK_METHOD(bool, DeinitSession, (uint32_t hw_index, uint32_t session_id), (override));
  MOCK_METHOD(bool, ConfigTwrSession, (uint32_t hw_index, const FiraTwrSession& session),
              (override));
  MOCK_METHOD(bool, AddControlees,
              (uint32_t hw_index, uint32_t session_id, const std::vector<UwbAddress>& controlees,
               const std::vector<int32_t>* sub_session_ids),
              (override));
  MOCK_METHOD(bool, RemoveControlees,
              (uint32_t hw_index, uint32_t session_id, const std::vector<UwbAddress>& controlees),
              (override));
  MOCK_METHOD(bool, UpdateBlockStriding, (uint32_t hw_index, uint32_t session_id, uint32_t value),
              (override));
};

// Each case changes one field of a controlee's session (or two: the first
// failure in check order wins).
#define SET(field, value) [](FiraTwrSession& s) { s.field = value; }
auto Sts(FiraStsConfig config, size_t vendor_id_size, size_t iv_size) {
  return [=](FiraTwrSession& s) {
    std::tie(s.stsConfig, s.vendorId, s.staticStsIV) = std::make_tuple(
        config, std::vector<uint8_t>(vendor_id_size), std::vector<uint8_t>(iv_size));
  };
}
TEST(CheckTwrSessionFieldsTest, FirstFailedCheckGivesItsMessage) {
  const std::string kShortOnly = "only short addresses are supported in Fira 1.1";
  const std::string kStaticSize =
      "Session with static STS needs to pass vendorId value with size of ";
  const struct {
    std::function<void(FiraTwrSession&)> change;
    std::string message;  // empty when the session passes
  } cases[] = {
      {SET(initiationTimeMs, (s.deviceAddress.address.pop_back(), -1)),
       "deviceAddress has incorrect size, " + kShortOnly},
      {SET(slotsPerRangingRound, INT32_MIN), "slotsPerRangingRound cannot be negative."},
      {SET(aoaType, AoaType(3)), "Unsupported AoaType: 3"},
      {SET(sessionPriority, 101), "Incorrect sessionPriority value 101"},
      {SET(sessionPriority, -1), "Incorrect sessionPriority value 4294967295"},
      {SET(inBandTerminationAttemptCount, 0), "Incorrect inBandTerminationAttemptCount value 0"},
      {SET(inBandTerminationAttemptCount, 11), "Incorrect inBandTerminationAttemptCount value 11"},
      {SET(channelNumber, 16), "Incorrect channel value 16"},
      {SET(sfdId, 5), "Incorrect sfdId value 5"},
      {SET(destAddressList, (std::vector<UwbAddress>{{{0, 2}}, {{1, 2, 3}}})),
       "destAddressList contains an incorrect address, " + kShortOnly},
      {Sts(FiraStsConfig::STATIC, 0, 6), kStaticSize + "2"},
      {Sts(FiraStsConfig::STATIC, 2, 5), kStaticSize + "6"},
      {Sts(FiraStsConfig::DYNAMIC, 2, 0),
       "Session without static STS should not pass vendorId value"},
      {Sts(FiraStsConfig::DYNAMIC_FOR_CONTROLEE_INDIVIDUAL_KEY, 0, 6),
       "Session without static STS should not pass staticStsIV value"},
  };
  for (const auto& c : cases) {
    FiraTwrSession session = ValidFiraSession(1);
    session.deviceType = DeviceType::CONTROLEE;
    c.change(session);
    const ndk::ScopedAStatus status = FiraController::CheckTwrSessionFields(session);
    EXPECT_EQ(c.message.empty() ? EX_NONE : EX_ILLEGAL_ARGUMENT, status.getExceptionCode());
    EXPECT_EQ(c.message, status.getMessage());
  }
}
#undef SET

// One call on the controller.
using Op = std::function<ScopedAStatus(FiraController&)>;

// The controller on strict mocks that play one radio. Every call reaching the
// mocks or the client's callback is logged under a short name (Hw: hardware
// info, Up?/Up0/Up1: interface state/down/up, Fira/Sched: scheduler set,
// Addr: short address), so a case states its status, traffic, sessions and
// running count as one line; posted tasks run after "|".
class FiraControllerTest : public ::testing::Test {
 protected:
  enum Begin { kEmpty, kInit, kRun, kRunInit, kInitNoCallback };
  struct Case {
    Begin start;
    Op op;
    const char* world;  // "!Name" refuses those calls, "@name" sets the scheduler
    std::string expected;
  };

  auto Record(const char* name) {
    return [this, name](uint32_t, uint32_t id, const auto&...) { return Answer(name, id); };
  }

  void SetUp() override {
    EXPECT_CALL(mcps_, GetHardwareInfo(kHw, _)).WillRepeatedly([this](uint32_t, bool* ok) {
      *ok = Answer("Hw");
      return McpsHwInfo{kHw, 0, scheduler_};
    });
    EXPECT_CALL(mcps_, SetFiraRegion(kHw)).WillRepeatedly([this](auto) {
      return Answer("Fira") && (scheduler_ = kMcpsSchedulerEndless, true);
    });
    EXPECT_CALL(mcps_, SetScheduler(kHw, McpsScheduler::kDefault, McpsUtils::kNoSlotDuration,
                                    McpsUtils::kNoNodeType, false))
        .WillRepeatedly([this](auto...) {
          return Answer("Sched") && (scheduler_ = kMcpsSchedulerDefault, true);
        });
    EXPECT_CALL(iface_, GetUpState(StrEq("uwb0"))).WillRepeatedly([this](auto) {
      return Answer("Up?") && up_;
    });
    EXPECT_CALL(iface_, SetUpState(StrEq("uwb0"), _)).WillRepeatedly([this](auto, bool up) {
      return Answer("Up", up) && (up_ = up, true);
    });
    EXPECT_CALL(ieee_, SetShortMacAddress(StrEq("uwb0"), std::vector<uint8_t>{0, 1}))
        .WillRepeatedly([this](auto...) { return Answer("Addr"); });
    EXPECT_CALL(fira_, SubscribeCallback(kHw, _)).WillRepeatedly([this](auto, FiraCallback* cb) {
      EXPECT_EQ(static_cast<FiraCallback*>(controller_.get()), cb);
      Answer("Sub");
    });
    EXPECT_CALL(fira_, UnsubscribeCallback(kHw)).WillRepeatedly([this](auto) { Answer("Unsub"); });
    EXPECT_CALL(fira_, InitSession(kHw, _)).WillRepeatedly(Record("Init"));
    EXPECT_CALL(fira_, StartSession(kHw, _)).WillRepeatedly(Record("Start"));
    EXPECT_CALL(fira_, StopSession(kHw, _)).WillRepeatedly(Record("Stop"));
    EXPECT_CALL(fira_, DeinitSession(kHw, _)).WillRepeatedly(Record("Deinit"));
    EXPECT_CALL(fira_, RemoveControlees(kHw, _, SizeIs(1))).WillRepeatedly(Record("Del"));
    EXPECT_CALL(fira_, UpdateBlockStriding(kHw, _, 4)).WillRepeatedly(Record("Stride"));
    EXPECT_CALL(fira_, ConfigTwrSession(kHw, _)).WillRepeatedly([this](auto, const auto& s) {
      return Answer("Config", s.id);
    });
    EXPECT_CALL(fira_, AddControlees(kHw, _, _, _))
        .WillRepeatedly([this](auto, uint32_t id, const auto&, const auto* sub_ids) {
          return Answer(sub_ids == nullptr ? "Add" : "Add+", id);
        });
    EXPECT_CALL(loop_, PostTask(_)).WillRepeatedly([this](const std::function<void()>& task) {
      Answer("Post");
      tasks_.push_back(task);
    });
  }

  bool Answer(const std::string& name, int64_t arg = -1) {
    calls_.push_back(arg < 0 ? name : name + std::to_string(arg));
    return refused_.count(name) == 0;
  }

  // Brings a fresh controller to |start| through its own operations.
  void Reach(Begin start) {
    controller_ = ndk::SharedRefBase::make<FiraController>("uwb0", kHw, &iface_, &mcps_, &ieee_,
                                                           &fira_, &loop_);
    scheduler_ = kMcpsSchedulerDefault;
    up_ = true;
    callback_ = ndk::SharedRefBase::make<sim::FiraClientCallback>();
    if (start != kInitNoCallback) (void)controller_->setSessionCallback(callback_);
    if (start != kEmpty) (void)controller_->initNewTwrSession(ValidFiraSession(1));
    if (start == kRun || start == kRunInit) (void)controller_->startRangingSession(1);
    if (start == kRunInit) (void)controller_->initNewTwrSession(ValidFiraSession(2));
  }

  // "<exception> <message>|<traffic>|<sessions as id:state> #<running count>"
  std::string Outcome(const ScopedAStatus& status) {
    std::string text = std::to_string(status.getExceptionCode());
    if (status.getExceptionCode() == EX_SERVICE_SPECIFIC) {
      text += "/" + std::to_string(status.getServiceSpecificError());
    }
    if (*status.getMessage() != '\0') text += std::string(" ") + status.getMessage();
    text += "|" + android::base::Join(calls_, ' ') + "|";
    for (const auto& [id, state] : controller_->sessions()) {
      text += std::to_string(id) + ":" + std::to_string(state) + " ";
    }
    return text + "#" + std::to_string(controller_->running_count());
  }

  void Run(const Case& c) {
    refused_.clear();
    Reach(c.start);
    calls_.clear();
    tasks_.clear();
    for (const std::string& token : android::base::Split(c.world, " ")) {
      if (token[0] == '!') refused_.insert(token.substr(1));
      if (token[0] == '@') scheduler_ = token.substr(1);
    }
    LogCapture log;
    const ScopedAStatus status = c.op(*controller_);
    const std::vector<std::string> during = callback_->Events();
    calls_.insert(calls_.end(), during.begin(), during.end());
    if (!tasks_.empty()) calls_.push_back("|");
    for (const auto& task : tasks_) task();
    const std::vector<std::string> after = callback_->Events();
    calls_.insert(calls_.end(), after.begin() + during.size(), after.end());
    EXPECT_EQ(c.expected, Outcome(status));
    for (const auto& line : log.Entries()) {
      if (line.severity == android::base::ERROR && line.tag == kTag) errors_ += line.message + "\n";
    }
  }

  std::vector<std::string> calls_;
  std::string scheduler_;
  bool up_ = false;
  std::set<std::string> refused_;
  std::vector<std::function<void()>> tasks_;
  std::string errors_;  // the controller's own ERROR lines, across cases
  StrictMock<MockMcpsUtils> mcps_;
  StrictMock<MockInterfaceTool> iface_;
  StrictMock<MockIeeeUtils> ieee_;
  StrictMock<MockFiraRegionUtils> fira_;
  StrictMock<MockEventLoop> loop_;
  std::shared_ptr<sim::FiraClientCallback> callback_;
  std::shared_ptr<FiraController> controller_;
};

// A call of the controller's |method| with the arguments that follow.
#define OP(method, ...) [=](FiraController& c) { return c.method(__VA_ARGS__); }

Op Stopped(uint32_t id) {
  return [id](FiraController& c) {
    c.OnSessionStopped(id);
    return ScopedAStatus::ok();
  };
}

TEST_F(FiraControllerTest, EveryOperationFromEveryState) {
  const std::vector<UwbAddress> kOne = {{{0, 7}}}, kTwo = {{{0, 7}}, {{0, 8}}};
  const std::string kNoCallback = "-7 You need to register callbacks on the controller first.||";
  FiraTwrSession controlee = ValidFiraSession(2);
  controlee.deviceType = DeviceType::CONTROLEE;
  const Case cases[] = {
      // A controlee's session: no controlees to add.
      {kInit, OP(initNewTwrSession, controlee), "", "0|Hw Init2 Config2 Up? Addr|1:0 2:0 #0"},
      {kRun, OP(initNewTwrSession, ValidFiraSession(1)), "",
       "-3 Session with id 1 already exist||1:1 #1"},
      {kEmpty, OP(initNewTwrSession, ValidFiraSession(1, {})), "",
       "-3 The device is controller of the session, destAddressList should not be empty||#0"},

      {kInit, OP(updateTwrSession, ValidFiraSession(1)), "", "0|Hw Config1|1:0 #0"},
      {kRun, OP(updateTwrSession, ValidFiraSession(1)), "",
       "-5 Running session cannot be updated||1:1 #1"},
      // Someone else changed the scheduler: the driver dropped every session.
      {kRunInit, OP(updateTwrSession, ValidFiraSession(2)), "@default", "-7|Hw Unsub Up?|#0"},

      {kRunInit, OP(startRangingSession, 2), "", "0|Hw Up? Up1 Start2|1:1 2:1 #2"},
      {kInitNoCallback, OP(startRangingSession, 9), "", kNoCallback + "1:0 #0"},
      {kInit, OP(startRangingSession, -1), "", "-3 Unknown session id 4294967295||1:0 #0"},
      {kRun, OP(startRangingSession, 1), "", "-5 The session is already running||1:1 #1"},
      {kInit, OP(startRangingSession, 1), "!Up", "-7|Hw Up? Up1|1:0 #0"},
      // A refused start is rolled back; the last one unsubscribes.
      {kInit, OP(startRangingSession, 1), "!Start",
       "-7|Hw Up? Up1 Sub Start1 Unsub Up? Up0|1:0 #0"},
      {kRunInit, OP(startRangingSession, 2), "!Start", "-7|Hw Up? Up1 Start2|1:1 2:0 #1"},

      {kInit, OP(updateTwoWayRangingBlockStriding, 1, 4), "!Stride",
       "-8/1 Netlink failure|Stride1|1:0 #0"},
      {kRun, OP(updateTwoWayRangingBlockStriding, 9, -1), "",
       "-3 Block striding value cannot be negative||1:1 #1"},

      // Controlee outcomes reach the client only after its call returned.
      {kRun, OP(addControlees, 1, kTwo, std::nullopt), "", "0|Add1 Post | onAdded1|1:1 #1"},
      {kInit, OP(addControlees, 1, kTwo, std::vector<int32_t>{5, 6}), "!Add+",
       "0|Add+1 Post | onAddFailed1|1:0 #0"},
      {kInit, OP(addControlees, 2, kTwo, std::nullopt), "", "-3 Unknown session id 2||1:0 #0"},
      {kInit, OP(addControlees, 1, kTwo, std::vector<int32_t>{5}), "",
       "-3 Controlees size and sub-session id size do not match||1:0 #0"},
      {kInit, OP(removeControlees, 1, kOne), "", "0|Del1 Post | onRemoved1|1:0 #0"},
      {kRun, OP(removeControlees, 1, kOne), "!Del", "0|Del1 Post | onRemoveFailed1|1:1 #1"},

      // The session runs until the driver reports its stop.
      {kRun, OP(stopRangingSession, 1), "", "0|Hw Stop1|1:1 #1"},
      {kRun, OP(stopRangingSession, 2), "", "-3 Unknown session id 2||1:1 #1"},
      {kRunInit, OP(stopRangingSession, 2), "", "-5 The session isn't started.||1:1 2:0 #1"},
      {kRun, OP(stopRangingSession, 1), "@simple-ranging", "-7|Hw Unsub Up? Up0|#0"},

      {kRunInit, OP(deinitSession, 2), "", "0|Hw Deinit2|1:1 #1"},
      {kRun, OP(deinitSession, 1), "", "-5 The session is started, call stop first.||1:1 #1"},
      {kRunInit, OP(deinitSession, 2), "@default", "0|Hw Unsub Up?|#0"},

      {kRun, OP(reset), "", "0|Up? Up0 Hw Sched Unsub Up?|#0"},

      {kRunInit, Stopped(1), "", "0|Unsub Up? onStopped1|1:0 2:0 #0"},
      {kRun, Stopped(1), "!Up", "0|Unsub Up? Up0 onStopped1|1:0 #0"},
      // Unknown ids are recorded, and the count is not guarded.
      {kEmpty, Stopped(5), "", "0|onStopped5|5:0 #4294967295"},
  };
  for (const Case& c : cases) Run(c);
  EXPECT_EQ(
      "CheckFiraRegionSet: Fira has been stopped, all session are lost.\n"
      "startRangingSession: Failed to up iface uwb0\n"
      "CheckFiraRegionSet: Fira has been stopped, all session are lost.\n"
      "things gone bad, can't down fira iface\n",
      errors_);
}

#undef OP

}  // namespace
}  // namespace dalix
}  // namespace hardware
