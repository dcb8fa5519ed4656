// The root service end to end: the real start-up path on a service thread,
// the simulated driver behind it, and a client calling through the host
// binder from the test's thread.
#include "uwb.h"

#include <stdio.h>
#include <unistd.h>

#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include <binder_host/host.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "net/mcps802154.h"
#include "net/nl802154.h"
#include "tests/e2e_fixture.h"
#include "tests/log_capture.h"
#include "tools/ranging_client.h"
#include "tools/service_dump.h"

namespace hardware {
namespace dalix {
namespace {

namespace uwb = aidl::aidl::hardware::dalix::uwb;
using ::testing::ContainsRegex;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

using UwbTest = EndToEndTest;

struct OpenCase {
  const char* name;
  const char* missing_family;
  int32_t service_specific;
  const char* message;
};

void PrintTo(const OpenCase& test, std::ostream* os) { *os << test.name; }

class UwbOpenTest : public UwbTest, public ::testing::WithParamInterface<OpenCase> {};

TEST_P(UwbOpenTest, OpensOnlyWithBothFamilies) {
  AddRadio(0, 0, "wpan0");
  if (GetParam().missing_family != nullptr) {
    driver_.simulator().SetFamilyPresent(GetParam().missing_family, false);
  }
  StartService();
  ndk::ScopedAStatus status = uwb_->open(ndk::SharedRefBase::make<Client>());
  if (GetParam().message == nullptr) {
    ASSERT_TRUE(status.isOk()) << status.getDescription();
    EXPECT_THAT(Names(), ElementsAre("wpan0"));
    return;
  }
  EXPECT_EQ(status.getExceptionCode(), EX_SERVICE_SPECIFIC);
  EXPECT_EQ(status.getServiceSpecificError(), GetParam().service_specific);
  EXPECT_STREQ(status.getMessage(), GetParam().message);
  EXPECT_THAT(Names(), IsEmpty());
  // Still closed: with the family back, a new client gets in.
  driver_.simulator().SetFamilyPresent(GetParam().missing_family, true);
  EXPECT_TRUE(uwb_->open(ndk::SharedRefBase::make<Client>()).isOk());
}

INSTANTIATE_TEST_SUITE_P(
    Families, UwbOpenTest,
    ::testing::Values(
        OpenCase{"Both", nullptr, 0, nullptr},
        OpenCase{"NoMcps", kMcpsFamilyName, 1,
                 "Failed to find MCPS netlink, check the kernel module"},
        OpenCase{"NoNl802154", kNl802154FamilyName, 1,
                 "Failed to find IEEE netlink, check the kernel module"}),
    [](const auto& info) { return std::string(info.param.name); });

TEST_F(UwbTest, PairsDevicesWithRadiosByPhy) {
  AddRadio(3, 1, "wpan1");  // its device is on phy 1
  AddRadio(5, 0, "");       // a radio without a network device
  sim::WpanDeviceConfig stray;
  stray.name = "wpan9";     // a device on a phy no radio drives
  stray.phy_index = 9;
  std::string error;
  ASSERT_TRUE(driver_.devices().AddDevice(stray, &error)) << error;
  StartService();

  EXPECT_THAT(Names(), IsEmpty());
  ASSERT_TRUE(uwb_->open(ndk::SharedRefBase::make<Client>()).isOk());
  EXPECT_THAT(Names(), ElementsAre("wpan1"));

  std::vector<int64_t> indices;
  ASSERT_TRUE(uwb_->listHardwareIndex(&indices).isOk());
  EXPECT_THAT(indices, ElementsAre(3, 5));

  std::shared_ptr<uwb::IUwbIface> iface;
  EXPECT_TRUE(uwb_->getIface("wpan1", &iface).isOk());
  EXPECT_NE(iface, nullptr);
  std::shared_ptr<uwb::IUwbIface> unknown;
  ndk::ScopedAStatus status = uwb_->getIface("wpan9", &unknown);
  EXPECT_EQ(status.getExceptionCode(), EX_ILLEGAL_ARGUMENT);
  EXPECT_STREQ(status.getMessage(), "Unknown iface wpan9");
  EXPECT_EQ(unknown, nullptr);
}

TEST_F(UwbTest, HardwareListingRefusedIsAnUnknownError) {
  AddRadio(0, 0, "wpan0");
  StartService();
  ASSERT_TRUE(uwb_->open(ndk::SharedRefBase::make<Client>()).isOk());
  sim::Fault refuse;
  refuse.kind = sim::Fault::Kind::kError;
  refuse.error = EIO;
  driver_.simulator().SetCommandFault(kMcpsFamilyName, MCPS802154_CMD_GET_HW, refuse);
  std::vector<int64_t> indices = {42};
  ndk::ScopedAStatus status = uwb_->listHardwareIndex(&indices);
  EXPECT_EQ(status.getStatus(), STATUS_UNKNOWN_ERROR);
  EXPECT_THAT(indices, ElementsAre(42));
}

TEST_F(UwbTest, OneLiveClientAtATimeAndADeadOneIsReplaced) {
  AddRadio(0, 0, "wpan0");
  StartService();
  auto first = ndk::SharedRefBase::make<Client>();
  ASSERT_TRUE(uwb_->open(first).isOk());
  std::shared_ptr<uwb::IUwbIface> first_iface;
  ASSERT_TRUE(uwb_->getIface("wpan0", &first_iface).isOk());

  ndk::ScopedAStatus refused = uwb_->open(ndk::SharedRefBase::make<Client>());
  EXPECT_EQ(refused.getExceptionCode(), EX_ILLEGAL_STATE);
  EXPECT_STREQ(refused.getMessage(), "HAL is already open");
  std::shared_ptr<uwb::IUwbIface> same;
  ASSERT_TRUE(uwb_->getIface("wpan0", &same).isOk());
  EXPECT_EQ(same->asBinder().get(), first_iface->asBinder().get());

  // The second client opens once the first has died; the death is handled
  // before the open because both go through the service thread in order.
  ASSERT_TRUE(driver_.devices().FindByName("wpan0").has_value());
  ndk::host::KillBinder(first->asBinder().get());
  ASSERT_TRUE(uwb_->open(ndk::SharedRefBase::make<Client>()).isOk());
  std::shared_ptr<uwb::IUwbIface> second_iface;
  ASSERT_TRUE(uwb_->getIface("wpan0", &second_iface).isOk());
  EXPECT_NE(second_iface->asBinder().get(), first_iface->asBinder().get());
  EXPECT_FALSE(IsUp("wpan0"));
}

TEST_F(UwbTest, ClientDeathClosesTheHal) {
  AddRadio(0, 0, "wpan0");
  StartService();
  auto client = ndk::SharedRefBase::make<Client>();
  ASSERT_TRUE(uwb_->open(client).isOk());
  LogCapture log;
  ndk::host::KillBinder(client->asBinder().get());
  EXPECT_THAT(Names(), IsEmpty());
  EXPECT_TRUE(log.Contains(android::base::INFO, "LambdaOnDeath Uwb service has died", "dalix.Uwb"));
}

TEST_F(UwbTest, ClientDeathDuringFiraRangingStopsTheRadioAndTheNextClientStartsClean) {
  AddRadio(0, 0, "wpan0");
  sim::Peer peer;
  peer.short_address = 0x1001;
  peer.motion = sim::Motion::Circle({2, 0, 0}, 1, 1);
  driver_.world().AddPeer(peer);
  StartService();
  tools::FiraOptions options;
  options.controlees = {peer.short_address};
  options.block_duration_ms = 20;
  {
    tools::RangingClient client(uwb_);
    std::mutex mutex;
    std::condition_variable changed;
    int results = 0;
    client.SetResultListener([&](const tools::PeerReading&) {
      std::lock_guard<std::mutex> lock(mutex);
      ++results;
      changed.notify_all();
    });
    std::string error;
    ASSERT_TRUE(client.Open(&error) && client.StartFira("wpan0", options, &error)) << error;
    std::unique_lock<std::mutex> lock(mutex);
    ASSERT_TRUE(changed.wait_for(lock, std::chrono::seconds(5), [&] { return results >= 3; }));
    lock.unlock();
    EXPECT_TRUE(IsUp("wpan0"));

    const std::string dump = tools::DumpService(uwb_->asBinder().get());
    EXPECT_THAT(dump, HasSubstr("UWB HAL: open, client alive, 1 radio(s)"));
    EXPECT_THAT(dump, HasSubstr("radio wpan0: hw index 0, phy 0, scheduler endless, interface up"));
    EXPECT_THAT(dump, HasSubstr("FiRa: 1 session(s), 1 running"));
    EXPECT_THAT(dump, ContainsRegex("session 1: running, [0-9]+ notification"));

    ndk::host::KillBinder(client.client_binder().get());
    EXPECT_THAT(Names(), IsEmpty());
    EXPECT_FALSE(IsUp("wpan0"));
    EXPECT_EQ(driver_.radios().Radio(0)->scheduler, kMcpsSchedulerDefault);
    EXPECT_TRUE(driver_.fira_region().Sessions().empty());
  }

  ASSERT_TRUE(uwb_->open(ndk::SharedRefBase::make<Client>()).isOk());
  std::shared_ptr<uwb::IUwbIface> iface;
  std::shared_ptr<uwb::IFiraController> fira;
  ASSERT_TRUE(uwb_->getIface("wpan0", &iface).isOk());
  ASSERT_TRUE(iface->firaController(&fira).isOk());
  int32_t sessions = -1;
  ASSERT_TRUE(fira->getSessionCount(&sessions).isOk());
  EXPECT_EQ(sessions, 0);
  EXPECT_TRUE(fira->initNewTwrSession(tools::RangingClient::MakeFiraSession(options)).isOk());
  EXPECT_THAT(tools::DumpService(uwb_->asBinder().get()),
              HasSubstr("session 1: initialized, no notification"));
}

TEST_F(UwbTest, CloseOnAClosedHalOnlyLogsTheInternalClose) {
  StartService();
  LogCapture log;
  EXPECT_TRUE(uwb_->close().isOk());
  std::vector<LogCapture::Entry> service_lines;
  for (const LogCapture::Entry& entry : log.Entries()) {
    if (entry.tag.rfind("dalix.", 0) == 0) service_lines.push_back(entry);
  }
  ASSERT_EQ(service_lines.size(), 1u) << log.Text();
  EXPECT_EQ(service_lines[0].message, "InternalClose");
}

struct CalibrationCase {
  const char* name;
  bool open;
  int64_t hw_index;
  bool file_exists;
  binder_exception_t exception;
  const char* message;
};

void PrintTo(const CalibrationCase& test, std::ostream* os) { *os << test.name; }

class UwbCalibrationTest : public UwbTest,
                           public ::testing::WithParamInterface<CalibrationCase> {};

TEST_P(UwbCalibrationTest, LoadsIntoTheRadioOfTheIndex) {
  const CalibrationCase& test = GetParam();
  AddRadio(7, 0, "wpan0");
  StartService();
  if (test.open) {
    ASSERT_TRUE(uwb_->open(ndk::SharedRefBase::make<Client>()).isOk());
  }
  char path[] = "/tmp/uwb_calibration_XXXXXX";
  const int fd = mkstemp(path);
  ASSERT_GE(fd, 0);
  const std::string content = "xtal_trim = 17\nch9.ant0.tx_delay = 16450\n";
  ASSERT_EQ(write(fd, content.data(), content.size()), static_cast<ssize_t>(content.size()));
  close(fd);
  if (!test.file_exists) unlink(path);

  ndk::ScopedAStatus status = uwb_->loadCalibration(test.hw_index, path);
  unlink(path);
  EXPECT_EQ(status.getExceptionCode(), test.exception);
  if (test.message != nullptr) {
    EXPECT_STREQ(status.getMessage(), test.message);
  }
  if (test.exception == EX_SERVICE_SPECIFIC) {
    EXPECT_EQ(status.getServiceSpecificError(), 0);
  }
  const std::map<std::string, uint32_t> calibration = driver_.radios().Radio(7)->calibration;
  if (test.exception == EX_NONE) {
    EXPECT_EQ(calibration.at("xtal_trim"), 17u);
    EXPECT_EQ(calibration.at("ch9.ant0.tx_delay"), 16450u);
  } else {
    EXPECT_EQ(calibration.count("xtal_trim"), 0u);
  }
}

INSTANTIATE_TEST_SUITE_P(
    Cases, UwbCalibrationTest,
    ::testing::Values(
        CalibrationCase{"NotOpen", false, 7, true, EX_ILLEGAL_STATE, "UWB HAL is not opened"},
        CalibrationCase{"UnknownIndex", true, 8, true, EX_ILLEGAL_ARGUMENT, "Unkown hw index"},
        CalibrationCase{"NegativeIndex", true, -1, true, EX_ILLEGAL_ARGUMENT, "Unkown hw index"},
        CalibrationCase{"MissingFile", true, 7, false, EX_SERVICE_SPECIFIC,
                        "Failed to load calibration"},
        CalibrationCase{"Loaded", true, 7, true, EX_NONE, nullptr}),
    [](const auto& info) { return std::string(info.param.name); });

}  // namespace
}  // namespace dalix
}  // namespace hardware
