#include <cstring>
#include <fstream>
#include <memory>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <binder_host/host.h>
#include <binder_host/parcel_check.h>
#include <gtest/gtest.h>

#include "uwb_aidl.h"
#include "vintf_manifest.h"

namespace {

namespace uwb = ::aidl::aidl::hardware::dalix::uwb;
using ndk::ScopedAStatus;

// What the platform's back end makes of the package, checked at build time.
static_assert(std::is_same_v<std::underlying_type_t<uwb::AoaType>, int8_t>);
static_assert(uwb::IFiraController::TRANSACTION_reset == FIRST_CALL_TRANSACTION + 14);

// Every field in declaration order, enumerations by name, byte arrays unsigned:
// the forms of the service's session log line (its refusals print unnamed values).
TEST(GeneratedTypesTest, ParcelablesPrintAndCompareFieldByField) {
  const uwb::RangingRoundControl control{true, uwb::MeasurementReportType::RESPONDER_TO_INITIATOR,
                                         false};
  EXPECT_EQ(
      "RangingRoundControl{hasResultReportPhase: true, "
      "measurementReportType: RESPONDER_TO_INITIATOR, hasDeferredMode: false}",
      control.toString());
  EXPECT_EQ("UwbAddress{address: [18, 255]}", (uwb::UwbAddress{{0x12, 0xff}}.toString()));
  EXPECT_NE(uwb::RangingRoundControl{}, control);
}

TEST(GeneratedTypesTest, InterfacesCarryTheFrozenVersionAndHash) {
  static_assert(uwb::IUwb::version == 1 && uwb::ISimpleRangingCallback::version == 1);
  std::ifstream file(DALIX_AIDL_HASH_FILE);
  std::string recorded;
  file >> recorded;
  EXPECT_EQ(recorded, uwb::IUwb::hash);
  EXPECT_EQ(recorded, uwb::ISimpleRangingCallback::hash);
}

class TestUwb : public uwb::BnUwb {
 public:
  ScopedAStatus open(const std::shared_ptr<uwb::IUwbClientCallback>&) override {
    return ScopedAStatus::ok();
  }
  ScopedAStatus listIfaceNames(std::vector<std::string>* names) override {
    *names = {"uwb0", "\xff"};  // not UTF-8: the reply cannot be written
    return ScopedAStatus::ok();
  }
  ScopedAStatus getIface(const std::string&, std::shared_ptr<uwb::IUwbIface>*) override {
    return ScopedAStatus::ok();
  }
  ScopedAStatus close() override { return ScopedAStatus::ok(); }
  ScopedAStatus loadCalibration(int64_t hw_index, const std::string& path) override {
    const std::string message = std::to_string(hw_index) + ":" + path;
    return ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT, message.c_str());
  }
  ScopedAStatus listHardwareIndex(std::vector<int64_t>* indices) override {
    *indices = {42};  // written on failure on purpose: the caller must not see it
    return ScopedAStatus::fromExceptionCodeWithMessage(EX_TRANSACTION_FAILED, "lost on the way");
  }
};

// Client and service share this thread, the one that set up polling, so calls
// run at once, through the same boundary checks as from any other thread.
class InterfaceTest : public ::testing::Test {
 protected:
  void SetUp() override {
    int fd = -1;
    ASSERT_EQ(STATUS_OK, ABinderProcess_setupPolling(&fd));
    ASSERT_EQ(EX_NONE, AServiceManager_addService(service_->asBinder().get(), instance_.c_str()));
    proxy_ = uwb::IUwb::fromBinder(ndk::SpAIBinder(AServiceManager_getService(instance_.c_str())));
    ASSERT_NE(nullptr, proxy_);
  }
  void TearDown() override { ndk::host::ResetForTesting(); }

  const std::string instance_ = std::string(uwb::IUwb::descriptor) + "/default";
  std::shared_ptr<TestUwb> service_ = ndk::SharedRefBase::make<TestUwb>();
  std::shared_ptr<uwb::IUwb> proxy_;
};

// What a real process boundary refuses or strips, the emulated one does too;
// a failed call leaves the caller's out-values as they were.
TEST_F(InterfaceTest, CallsFailAsTheyWouldCrossingAProcessBoundary) {
  EXPECT_EQ(nullptr, uwb::IUwbIface::fromBinder(service_->asBinder()));
  std::vector<int64_t> indices = {7};
  EXPECT_EQ("Status(-129, EX_TRANSACTION_FAILED): 'FAILED_TRANSACTION: '",
            proxy_->listHardwareIndex(&indices).getDescription());
  EXPECT_EQ(std::vector<int64_t>{7}, indices);
  std::vector<std::string> names = {"kept"};
  EXPECT_EQ(STATUS_BAD_VALUE, proxy_->listIfaceNames(&names).getStatus());
  EXPECT_EQ(std::vector<std::string>{"kept"}, names);

  // Request: header, descriptor, int64, then the path's length, UTF-16 and terminator.
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
}

// The registry, as the device's, takes only what the fragment declares: the
// service's instance, at the version the library was frozen at.
TEST_F(InterfaceTest, OnlyTheFragmentsInstanceRegistersAtTheFrozenVersion) {
  std::string error;
  auto manifest = ndk::host::VintfManifest::Load(DALIX_VINTF_FRAGMENT, &error);
  ASSERT_TRUE(manifest.has_value()) << error;
  const int32_t frozen_version = uwb::IUwb::version;  // a copy: the constant has no definition
  EXPECT_EQ(frozen_version, manifest->instances().at(0).version);
  const std::string other = instance_ + "2";
  EXPECT_EQ(EX_ILLEGAL_ARGUMENT,
            AServiceManager_addService(service_->asBinder().get(), other.c_str()));
  EXPECT_EQ(nullptr, AServiceManager_checkService(other.c_str()));
}

}  // namespace
