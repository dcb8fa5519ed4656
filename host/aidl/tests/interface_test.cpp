#include <poll.h>

#include <atomic>
#include <cstring>
#include <iterator>
#include <tuple>
#include <utility>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/BnUwb.h>
#include <aidl/aidl/hardware/dalix/uwb/BnUwbClientCallback.h>
#include <aidl/aidl/hardware/dalix/uwb/BnUwbIface.h>
#include <aidl/aidl/hardware/dalix/uwb/BpUwb.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <binder_host/host.h>
#include <binder_host/parcel_check.h>
#include <gtest/gtest.h>

#include "vintf_manifest.h"

namespace {

namespace uwb = ::aidl::aidl::hardware::dalix::uwb;
using ndk::ScopedAStatus;

class TestIface : public uwb::BnUwbIface {
 public:
  ScopedAStatus firaController(std::shared_ptr<uwb::IFiraController>*) override {
    return ScopedAStatus::fromExceptionCode(EX_UNSUPPORTED_OPERATION);
  }
  ScopedAStatus cccController(std::shared_ptr<uwb::ICccController>*) override {
    return ScopedAStatus::ok();
  }
  ScopedAStatus simpleRangingController(std::shared_ptr<uwb::ISimpleRangingController>*) override {
    return ScopedAStatus::ok();
  }
};

// Each operation answers in a way a test can tell apart and records the
// thread it ran on.
class TestUwb : public uwb::BnUwb {
 public:
  ScopedAStatus open(const std::shared_ptr<uwb::IUwbClientCallback>& callback) override {
    client = callback;
    return Ran(ScopedAStatus::ok());
  }
  ScopedAStatus listIfaceNames(std::vector<std::string>* names) override {
    *names = iface_names;
    return Ran(ScopedAStatus::ok());
  }
  ScopedAStatus getIface(const std::string&, std::shared_ptr<uwb::IUwbIface>* out) override {
    *out = iface;
    return Ran(ScopedAStatus::ok());
  }
  ScopedAStatus close() override { return Ran(close_status()); }
  ScopedAStatus loadCalibration(int64_t hw_index, const std::string& path) override {
    const std::string message = std::to_string(hw_index) + ":" + path;
    return Ran(ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT, message.c_str()));
  }
  ScopedAStatus listHardwareIndex(std::vector<int64_t>* indices) override {
    *indices = {42};  // written on failure on purpose: the caller must not see it
    return Ran(ScopedAStatus::fromStatus(STATUS_UNKNOWN_ERROR));
  }

  ScopedAStatus Ran(ScopedAStatus status) {
    callers.push_back(std::this_thread::get_id());
    return status;
  }

  std::vector<std::thread::id> callers;
  std::vector<std::string> iface_names = {"uwb0", "uwb1"};
  ScopedAStatus (*close_status)() = [] {
    return ScopedAStatus::fromServiceSpecificErrorWithMessage(1, "Netlink failure");
  };
  std::shared_ptr<uwb::IUwbClientCallback> client;
  std::shared_ptr<TestIface> iface = ndk::SharedRefBase::make<TestIface>();
};

class ClientCallback : public uwb::BnUwbClientCallback {};

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
  EXPECT_EQ(nullptr, uwb::IUwbIface::fromBinder(service_->asBinder()));
  EXPECT_EQ(nullptr, Lookup(instance_ + "2"));
  std::vector<std::string> names;
  std::vector<int64_t> indices = {7};
  std::shared_ptr<uwb::IUwbIface> iface;
  int32_t version = 0;
  std::string hash;
  auto callback = ndk::SharedRefBase::make<ClientCallback>();
  std::vector<ScopedAStatus> s;
  RunClient([&] {
    std::shared_ptr<uwb::IUwb> proxy = Lookup(instance_);
    ASSERT_NE(nullptr, std::dynamic_pointer_cast<uwb::BpUwb>(proxy));
    s.push_back(proxy->listIfaceNames(&names));
    s.push_back(proxy->getIface("uwb0", &iface));
    s.push_back(proxy->listHardwareIndex(&indices));
    s.push_back(proxy->getInterfaceVersion(&version));
    s.push_back(proxy->getInterfaceHash(&hash));
    s.push_back(proxy->loadCalibration(-5, "/tmp/cal.conf"));
    s.push_back(proxy->close());
    s.push_back(proxy->open(callback));
    std::shared_ptr<uwb::IFiraController> fira;
    if (iface != nullptr) s.push_back(iface->firaController(&fira));
  });
  ASSERT_EQ(9u, s.size());
  EXPECT_TRUE(s[0].isOk() && s[1].isOk() && s[7].isOk());
  EXPECT_EQ((std::vector<std::string>{"uwb0", "uwb1"}), names);
  EXPECT_EQ(STATUS_UNKNOWN_ERROR, s[2].getStatus());
  EXPECT_EQ(std::vector<int64_t>{7}, indices) << "out-value written on failure";
  EXPECT_EQ(1, version);
  EXPECT_EQ(uwb::IUwb::hash, hash);
  EXPECT_EQ(EX_ILLEGAL_ARGUMENT, s[5].getExceptionCode());
  EXPECT_STREQ("-5:/tmp/cal.conf", s[5].getMessage());
  EXPECT_EQ(1, s[6].getServiceSpecificError());
  EXPECT_STREQ("Netlink failure", s[6].getMessage());
  // The service links to the client's death through the binder it was given.
  ASSERT_NE(nullptr, service_->client);
  EXPECT_EQ(callback->asBinder(), service_->client->asBinder());
  EXPECT_EQ(6u, service_->callers.size());
  for (std::thread::id caller : service_->callers) EXPECT_EQ(std::this_thread::get_id(), caller);

  // The client got a proxy, not the service's own object.
  EXPECT_NE(std::static_pointer_cast<uwb::IUwbIface>(service_->iface), iface);
  EXPECT_EQ(service_->iface->asBinder(), iface->asBinder());
  EXPECT_EQ(EX_UNSUPPORTED_OPERATION, s[8].getExceptionCode());
}

// What a real process boundary refuses or strips, the emulated one does too.
TEST_F(InterfaceTest, CallsFailAsTheyWouldCrossingAProcessBoundary) {
  // Request: token header, descriptor, int64, then the path's length, its
  // UTF-16 characters and terminator.
  const size_t fixed = 12 + 4 + (std::strlen(uwb::IUwb::descriptor) + 1) * 2 + 8 + 4 + 2;
  const size_t fits = (ndk::host::ParcelCheck::kMaxTransactionBytes - fixed) / 2 - 1;
  const std::pair<std::string, binder_status_t> paths[] = {
      {"caf\xc3\xa9 \xf0\x9f\x93\xa1", STATUS_OK},  {"stray \x80", STATUS_BAD_VALUE},
      {"truncated \xe2\x82", STATUS_BAD_VALUE},         {"overlong \xc0\xaf", STATUS_BAD_VALUE},
      {"surrogate \xed\xa0\x80", STATUS_BAD_VALUE},    {std::string(fits, 'a'), STATUS_OK},
      {std::string(fits + 2, 'a'), STATUS_FAILED_TRANSACTION},
  };
  // Answers of close(): exception, transport status and message as the caller sees them.
  const std::tuple<ScopedAStatus (*)(), binder_exception_t, binder_status_t, const char*>
      answers[] = {
          {[] { return ScopedAStatus::fromExceptionCodeWithMessage(EX_TRANSACTION_FAILED, "x"); },
           EX_TRANSACTION_FAILED, STATUS_FAILED_TRANSACTION, ""},
          {[] { return ScopedAStatus::fromStatus(STATUS_NO_MEMORY); }, EX_TRANSACTION_FAILED,
           STATUS_NO_MEMORY, ""},
      };
  service_->iface_names = {"uwb0", "\xff"};
  std::vector<ScopedAStatus> results;
  std::vector<std::string> names = {"kept"};
  RunClient([&] {
    std::shared_ptr<uwb::IUwb> proxy = Lookup(instance_);
    for (const auto& [path, _] : paths) results.push_back(proxy->loadCalibration(1, path));
    for (const auto& answer : answers) {
      service_->close_status = std::get<0>(answer);  // read while this thread waits
      results.push_back(proxy->close());
    }
    results.push_back(proxy->listIfaceNames(&names));
  });
  ASSERT_EQ(std::size(paths) + std::size(answers) + 1, results.size());
  size_t i = 0;
  for (const auto& [path, refused_with] : paths) {
    // A refused request fails without reaching the service, which would
    // answer EX_ILLEGAL_ARGUMENT.
    SCOPED_TRACE(path.substr(0, 20));
    EXPECT_EQ(refused_with, results[i].getStatus());
    EXPECT_EQ(refused_with == STATUS_OK, results[i++].getExceptionCode() == EX_ILLEGAL_ARGUMENT);
  }
  for (const auto& [_, exception, transport, message] : answers) {
    EXPECT_EQ(exception, results[i].getExceptionCode());
    EXPECT_EQ(transport, results[i].getStatus());
    EXPECT_STREQ(message, results[i++].getMessage());
  }
  EXPECT_EQ(STATUS_BAD_VALUE, results[i].getStatus()) << "a reply that cannot be written";
  EXPECT_EQ(std::vector<std::string>{"kept"}, names);
}

// What the device maker installs must declare exactly the instance the
// service registers, at the version the interface library was frozen at.
TEST(VintfFragmentTest, DeclaresTheRootInstanceAtTheFrozenVersion) {
  std::string error;
  std::optional<ndk::host::VintfManifest> manifest =
      ndk::host::VintfManifest::Load(DALIX_VINTF_FRAGMENT, &error);
  ASSERT_TRUE(manifest.has_value()) << error;
  ASSERT_EQ(1u, manifest->instances().size());
  const ndk::host::VintfManifest::Instance& declared = manifest->instances().front();
  EXPECT_EQ(std::string(uwb::IUwb::descriptor) + "/default", declared.Name());
  const int32_t frozen_version = uwb::IUwb::version;  // a copy: the constant has no definition
  EXPECT_EQ(frozen_version, declared.version);
}

}  // namespace
