#include <poll.h>

#include <atomic>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/BnFiraController.h>
#include <aidl/aidl/hardware/dalix/uwb/BnSimpleRangingCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/BnUwb.h>
#include <aidl/aidl/hardware/dalix/uwb/BnUwbClientCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/BnUwbIface.h>
#include <aidl/aidl/hardware/dalix/uwb/BpUwb.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <binder_host/host.h>
#include <gtest/gtest.h>

namespace {

namespace uwb = ::aidl::aidl::hardware::dalix::uwb;
using ndk::ScopedAStatus;

// A radio object that only knows which thread called it.
class TestIface : public uwb::BnUwbIface {
 public:
  ScopedAStatus firaController(std::shared_ptr<uwb::IFiraController>*) override {
    caller = std::this_thread::get_id();
    return ScopedAStatus::fromExceptionCode(EX_UNSUPPORTED_OPERATION);
  }
  ScopedAStatus cccController(std::shared_ptr<uwb::ICccController>*) override {
    return ScopedAStatus::ok();
  }
  ScopedAStatus simpleRangingController(std::shared_ptr<uwb::ISimpleRangingController>*) override {
    return ScopedAStatus::ok();
  }
  std::thread::id caller;
};

// A small root service: each operation answers in a way a test can tell
// apart, and records the thread it ran on.
class TestUwb : public uwb::BnUwb {
 public:
  ScopedAStatus open(const std::shared_ptr<uwb::IUwbClientCallback>& callback) override {
    Record();
    client = callback;
    return ScopedAStatus::ok();
  }
  ScopedAStatus listIfaceNames(std::vector<std::string>* names) override {
    Record();
    *names = {"uwb0", "uwb1"};
    return ScopedAStatus::ok();
  }
  ScopedAStatus getIface(const std::string& name, std::shared_ptr<uwb::IUwbIface>* out) override {
    Record();
    if (name != "uwb0") {
      return ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT,
                                                         ("no iface " + name).c_str());
    }
    *out = iface;
    return ScopedAStatus::ok();
  }
  ScopedAStatus close() override {
    Record();
    return ScopedAStatus::fromServiceSpecificErrorWithMessage(1, "Netlink failure");
  }
  ScopedAStatus loadCalibration(int64_t hw_index, const std::string& path) override {
    Record();
    last_calibration = std::to_string(hw_index) + ":" + path;
    return ScopedAStatus::fromExceptionCode(EX_ILLEGAL_STATE);
  }
  ScopedAStatus listHardwareIndex(std::vector<int64_t>* indices) override {
    Record();
    // Written on failure on purpose: the caller must not see it.
    *indices = {42};
    return ScopedAStatus::fromStatus(STATUS_UNKNOWN_ERROR);
  }

  void Record() { callers.push_back(std::this_thread::get_id()); }

  std::vector<std::thread::id> callers;
  std::shared_ptr<uwb::IUwbClientCallback> client;
  std::string last_calibration;
  std::shared_ptr<TestIface> iface = ndk::SharedRefBase::make<TestIface>();
};

class ClientCallback : public uwb::BnUwbClientCallback {};

class RangingCallback : public uwb::BnSimpleRangingCallback {
 public:
  ScopedAStatus onRangingResult(const uwb::RangingResult& result) override {
    results.push_back(result);
    return ScopedAStatus::ok();
  }
  std::vector<uwb::RangingResult> results;
};

struct DeathRecord {
  int calls = 0;
  std::thread::id thread;
};

class InterfaceTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ndk::host::ResetForTesting();
    ASSERT_EQ(STATUS_OK, ABinderProcess_setupPolling(&fd_));
    ASSERT_EQ(EX_NONE, AServiceManager_addService(service_->asBinder().get(), instance_.c_str()));
  }
  void TearDown() override { ndk::host::ResetForTesting(); }

  // Runs |client| on its own thread while this thread serves binder the way
  // the service's event loop does: wait for the descriptor, then handle.
  void RunClient(const std::function<void()>& client) {
    std::atomic<bool> done{false};
    std::thread thread([&] {
      client();
      done = true;
    });
    while (!done) {
      struct pollfd entry = {fd_, POLLIN, 0};
      if (poll(&entry, 1, 20) == 1) ABinderProcess_handlePolledCommands();
    }
    thread.join();
  }

  static std::shared_ptr<uwb::IUwb> Lookup(const std::string& instance) {
    return uwb::IUwb::fromBinder(ndk::SpAIBinder(AServiceManager_getService(instance.c_str())));
  }

  int fd_ = -1;
  const std::string instance_ = std::string(uwb::IUwb::descriptor) + "/default";
  std::shared_ptr<TestUwb> service_ = ndk::SharedRefBase::make<TestUwb>();
};

TEST_F(InterfaceTest, ClientCallsRunOnTheServiceThreadWithTheirResults) {
  std::vector<std::string> names;
  std::vector<int64_t> indices = {7};
  std::shared_ptr<uwb::IUwbIface> iface;
  int32_t version = 0;
  std::string hash;
  std::vector<ScopedAStatus> statuses;
  RunClient([&] {
    std::shared_ptr<uwb::IUwb> proxy = Lookup(instance_);
    ASSERT_NE(nullptr, proxy);
    statuses.push_back(proxy->listIfaceNames(&names));
    statuses.push_back(proxy->getIface("uwb0", &iface));
    statuses.push_back(proxy->listHardwareIndex(&indices));
    statuses.push_back(proxy->getInterfaceVersion(&version));
    statuses.push_back(proxy->getInterfaceHash(&hash));
    statuses.push_back(proxy->loadCalibration(-5, "/tmp/cal.conf"));
  });

  ASSERT_EQ(6u, statuses.size());
  EXPECT_TRUE(statuses[0].isOk());
  EXPECT_EQ((std::vector<std::string>{"uwb0", "uwb1"}), names);
  EXPECT_TRUE(statuses[1].isOk());
  EXPECT_EQ(STATUS_UNKNOWN_ERROR, statuses[2].getStatus());
  EXPECT_EQ(std::vector<int64_t>{7}, indices) << "out-value written on failure";
  EXPECT_EQ(1, version);
  EXPECT_EQ(uwb::IUwb::hash, hash);
  EXPECT_EQ(EX_ILLEGAL_STATE, statuses[5].getExceptionCode());
  EXPECT_EQ("-5:/tmp/cal.conf", service_->last_calibration);
  for (std::thread::id caller : service_->callers) EXPECT_EQ(std::this_thread::get_id(), caller);
  EXPECT_EQ(4u, service_->callers.size());

  // The client got a proxy, not the service's own object, and calls through
  // it come to this thread as well.
  ASSERT_NE(nullptr, iface);
  EXPECT_NE(std::static_pointer_cast<uwb::IUwbIface>(service_->iface), iface);
  EXPECT_EQ(service_->iface->asBinder(), iface->asBinder());
  ScopedAStatus fira_status;
  RunClient([&] {
    std::shared_ptr<uwb::IFiraController> fira;
    fira_status = iface->firaController(&fira);
  });
  EXPECT_EQ(EX_UNSUPPORTED_OPERATION, fira_status.getExceptionCode());
  EXPECT_EQ(std::this_thread::get_id(), service_->iface->caller);
}

TEST_F(InterfaceTest, FailuresReachTheClientUnchanged) {
  std::vector<ScopedAStatus> statuses;
  RunClient([&] {
    std::shared_ptr<uwb::IUwb> proxy = Lookup(instance_);
    std::shared_ptr<uwb::IUwbIface> iface;
    statuses.push_back(proxy->getIface("uwb9", &iface));
    statuses.push_back(proxy->close());
    EXPECT_EQ(nullptr, iface);
  });
  ASSERT_EQ(2u, statuses.size());
  EXPECT_EQ(EX_ILLEGAL_ARGUMENT, statuses[0].getExceptionCode());
  EXPECT_STREQ("no iface uwb9", statuses[0].getMessage());
  EXPECT_EQ(EX_SERVICE_SPECIFIC, statuses[1].getExceptionCode());
  EXPECT_EQ(1, statuses[1].getServiceSpecificError());
  EXPECT_STREQ("Netlink failure", statuses[1].getMessage());
}

TEST_F(InterfaceTest, ClientDeathReachesTheServiceThroughItsCallbackBinder) {
  auto callback = ndk::SharedRefBase::make<ClientCallback>();
  RunClient([&] { EXPECT_TRUE(Lookup(instance_)->open(callback).isOk()); });
  ASSERT_NE(nullptr, service_->client);
  ndk::SpAIBinder client_binder = service_->client->asBinder();
  EXPECT_EQ(callback->asBinder(), client_binder);

  ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new([](void* cookie) {
    auto* record = static_cast<DeathRecord*>(cookie);
    ++record->calls;
    record->thread = std::this_thread::get_id();
  }));
  DeathRecord record;
  ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(client_binder.get(), recipient.get(), &record));

  std::thread harness([&] { ndk::host::KillBinder(callback->asBinder().get()); });
  harness.join();
  EXPECT_FALSE(AIBinder_isAlive(client_binder.get()));
  struct pollfd entry = {fd_, POLLIN, 0};
  ASSERT_EQ(1, poll(&entry, 1, 10000));
  ABinderProcess_handlePolledCommands();
  EXPECT_EQ(1, record.calls);
  EXPECT_EQ(std::this_thread::get_id(), record.thread);
}

TEST_F(InterfaceTest, CallbacksRunAtOnceFromTheServiceThreadAndFailOnceDead) {
  auto callback = ndk::SharedRefBase::make<RangingCallback>();
  std::shared_ptr<uwb::ISimpleRangingCallback> proxy =
      uwb::ISimpleRangingCallback::fromBinder(callback->asBinder());
  ASSERT_NE(nullptr, proxy);
  uwb::RangingResult result;
  result.id = 3;
  result.measurement = 150;
  EXPECT_TRUE(proxy->onRangingResult(result).isOk());
  ASSERT_EQ(1u, callback->results.size());
  EXPECT_EQ(result, callback->results[0]);

  ndk::host::KillBinder(callback->asBinder().get());
  EXPECT_EQ(STATUS_DEAD_OBJECT, proxy->onRangingResult(result).getStatus());
  EXPECT_EQ(1u, callback->results.size());
}

TEST_F(InterfaceTest, FromBinderChecksTheInterface) {
  EXPECT_EQ(nullptr, uwb::IUwb::fromBinder(ndk::SpAIBinder()));
  EXPECT_EQ(nullptr, uwb::IUwbIface::fromBinder(service_->asBinder()));
  EXPECT_EQ(nullptr, Lookup("aidl.hardware.dalix.uwb.IUwb/other"));
  EXPECT_NE(nullptr, std::dynamic_pointer_cast<uwb::BpUwb>(Lookup(instance_)));
}

}  // namespace
