#include <cstring>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include <aidl/aidl/hardware/dalix/uwb/BnUwb.h>
#include <aidl/aidl/hardware/dalix/uwb/BnUwbClientCallback.h>
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

class TestUwb : public uwb::BnUwb {
 public:
  ScopedAStatus open(const std::shared_ptr<uwb::IUwbClientCallback>& callback) override {
    client = callback;
    return ScopedAStatus::ok();
  }
  ScopedAStatus listIfaceNames(std::vector<std::string>* names) override {
    *names = {"uwb0", "\xff"};  // not UTF-8: the reply cannot be written
    return ScopedAStatus::ok();
  }
  ScopedAStatus getIface(const std::string&, std::shared_ptr<uwb::IUwbIface>*) override {
    return ScopedAStatus::ok();
  }
  ScopedAStatus close() override {
    return ScopedAStatus::fromExceptionCodeWithMessage(EX_TRANSACTION_FAILED, "lost on the way");
  }
  // Refuses, naming what arrived.
  ScopedAStatus loadCalibration(int64_t hw_index, const std::string& path) override {
    const std::string message = std::to_string(hw_index) + ":" + path;
    return ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT, message.c_str());
  }
  ScopedAStatus listHardwareIndex(std::vector<int64_t>* indices) override {
    *indices = {42};  // written on failure on purpose: the caller must not see it
    return ScopedAStatus::fromStatus(STATUS_UNKNOWN_ERROR);
  }

  std::shared_ptr<uwb::IUwbClientCallback> client;
};

class ClientCallback : public uwb::BnUwbClientCallback {};

// Client and service share this thread, the one that set up polling, so
// calls run at once; they pass the same boundary checks as from any other
// thread.
class InterfaceTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ndk::host::ResetForTesting();
    int fd = -1;
    ASSERT_EQ(STATUS_OK, ABinderProcess_setupPolling(&fd));
    ASSERT_EQ(EX_NONE, AServiceManager_addService(service_->asBinder().get(), instance_.c_str()));
    proxy_ = uwb::IUwb::fromBinder(ndk::SpAIBinder(AServiceManager_getService(instance_.c_str())));
    ASSERT_NE(nullptr, std::dynamic_pointer_cast<uwb::BpUwb>(proxy_));
  }
  void TearDown() override { ndk::host::ResetForTesting(); }

  const std::string instance_ = std::string(uwb::IUwb::descriptor) + "/default";
  std::shared_ptr<TestUwb> service_ = ndk::SharedRefBase::make<TestUwb>();
  std::shared_ptr<uwb::IUwb> proxy_;
};

TEST_F(InterfaceTest, ProxiesReturnResultsOnlyOnSuccess) {
  EXPECT_EQ(nullptr, uwb::IUwbIface::fromBinder(service_->asBinder()));
  int32_t version = 0;
  std::string hash;
  EXPECT_TRUE(proxy_->getInterfaceVersion(&version).isOk());
  EXPECT_TRUE(proxy_->getInterfaceHash(&hash).isOk());
  EXPECT_EQ(std::make_pair(1, std::string(uwb::IUwb::hash)), std::make_pair(version, hash));
  std::vector<int64_t> indices = {7};
  EXPECT_EQ(STATUS_UNKNOWN_ERROR, proxy_->listHardwareIndex(&indices).getStatus());
  EXPECT_EQ(std::vector<int64_t>{7}, indices) << "out-value written on failure";
  std::vector<std::string> names = {"kept"};
  EXPECT_EQ(STATUS_BAD_VALUE, proxy_->listIfaceNames(&names).getStatus());
  EXPECT_EQ(std::vector<std::string>{"kept"}, names);

  // An interface passed along reaches the other side as a proxy to the same
  // binder, not as the object itself.
  auto callback = ndk::SharedRefBase::make<ClientCallback>();
  ASSERT_TRUE(proxy_->open(callback).isOk());
  EXPECT_NE(std::static_pointer_cast<uwb::IUwbClientCallback>(callback), service_->client);
  EXPECT_EQ(callback->asBinder(), service_->client->asBinder());
}

// What a real process boundary refuses or strips, the emulated one does too.
TEST_F(InterfaceTest, CallsFailAsTheyWouldCrossingAProcessBoundary) {
  // Request: token header, descriptor, int64, then the path's length, its
  // UTF-16 characters and terminator.
  const size_t fixed = 12 + 4 + (std::strlen(uwb::IUwb::descriptor) + 1) * 2 + 8 + 4 + 2;
  const size_t fits = (ndk::host::ParcelCheck::kMaxTransactionBytes - fixed) / 2 - 1;
  const std::pair<std::string, binder_status_t> paths[] = {
      {"caf\xc3\xa9 \xf0\x9f\x93\xa1", STATUS_OK},
      {"stray \x80", STATUS_BAD_VALUE},
      {"truncated \xe2\x82", STATUS_BAD_VALUE},
      {"overlong \xc0\xaf", STATUS_BAD_VALUE},
      {"surrogate \xed\xa0\x80", STATUS_BAD_VALUE},
      {std::string(fits, 'a'), STATUS_OK},
      {std::string(fits + 2, 'a'), STATUS_FAILED_TRANSACTION},
  };
  for (const auto& [path, refused_with] : paths) {
    // A refused request fails without reaching the service.
    SCOPED_TRACE(path.substr(0, 20));
    ScopedAStatus status = proxy_->loadCalibration(-5, path);
    EXPECT_EQ(refused_with, status.getStatus());
    EXPECT_EQ(refused_with == STATUS_OK ? "-5:" + path : "", status.getMessage());
  }
  EXPECT_EQ("Status(-129, EX_TRANSACTION_FAILED): 'FAILED_TRANSACTION: '",
            proxy_->close().getDescription());
}

// What the device maker installs declares exactly the instance the service
// registers, at the version the library was frozen at; the registry, as the
// device's, takes no name the fragment does not declare.
TEST_F(InterfaceTest, OnlyTheFragmentsInstanceRegistersAtTheFrozenVersion) {
  std::string error;
  std::optional<ndk::host::VintfManifest> manifest =
      ndk::host::VintfManifest::Load(DALIX_VINTF_FRAGMENT, &error);
  ASSERT_TRUE(manifest.has_value()) << error;
  ASSERT_EQ(1u, manifest->instances().size());
  const int32_t frozen_version = uwb::IUwb::version;  // a copy: the constant has no definition
  EXPECT_EQ(frozen_version, manifest->instances().front().version);
  for (const std::string& name :
       {instance_ + "2", "x" + instance_, std::string(uwb::IUwb::descriptor)}) {
    EXPECT_EQ(EX_ILLEGAL_ARGUMENT,
              AServiceManager_addService(service_->asBinder().get(), name.c_str()))
        << name;
    EXPECT_EQ(nullptr, AServiceManager_checkService(name.c_str())) << name;
  }
}

}  // namespace
