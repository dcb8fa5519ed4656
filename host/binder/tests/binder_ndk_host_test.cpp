#include <poll.h>

#include <atomic>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <fstream>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include <android/binder_auto_utils.h>
#include <android/binder_ibinder.h>
#include <android/binder_interface_utils.h>
#include <android/binder_process.h>
#include <android/binder_status.h>
#include <binder_host/host.h>
#include <gtest/gtest.h>

#include "vintf_manifest.h"

namespace {

using ndk::ScopedAStatus;

class IThing : public ndk::ICInterface {};

class Thing : public ndk::BnCInterface<IThing> {
  ndk::SpAIBinder createBinder() override {
    return ndk::host::NewLocalBinder("test.IThing", ref<ndk::ICInterface>());
  }
};

// A death link's cookie: counts its calls, and may delete its recipient in one.
struct Link {
  AIBinder_DeathRecipient* recipient;
  bool delete_in_callback = false;
  int calls = 0;
};

void OnDeath(void* cookie) {
  auto* link = static_cast<Link*>(cookie);
  ++link->calls;
  if (link->delete_in_callback) AIBinder_DeathRecipient_delete(link->recipient);
}

// The long timeout only turns a broken queue into a failure instead of a hang.
bool Readable(int fd, int timeout_ms = 10000) {
  struct pollfd entry = {fd, POLLIN, 0};
  return poll(&entry, 1, timeout_ms) == 1 && (entry.revents & POLLIN) != 0;
}

class BinderProcessTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_EQ(STATUS_OK, ABinderProcess_setupPolling(&fd_));
    ABinderProcess_handlePolledCommands();  // drains what an earlier test left signalled
  }
  void TearDown() override { ndk::host::ResetForTesting(); }

  int fd_ = -1;
  std::shared_ptr<Thing> thing_ = ndk::SharedRefBase::make<Thing>();
  // Held by no one: a living object keeps its binder, which service code
  // relies on when it links to a client object's binder without holding it.
  AIBinder* const binder_ = thing_->asBinder().get();
  ndk::ScopedAIBinder_DeathRecipient recipient_{AIBinder_DeathRecipient_new(OnDeath)};
};

// Calls from other threads wait for a thread handling the polled commands and
// run there one at a time; the calls they make run at once, not queued.
TEST_F(BinderProcessTest, ClientCallsWaitForAHandlingThreadAndRunThereOneAtATime) {
  constexpr int kClients = 4, kCallsEach = 50;
  std::vector<std::thread::id> ran_on;  // only the calls touch it, and one at a time
  std::atomic<int> finished{0};
  std::vector<std::thread> clients(kClients);
  for (std::thread& client : clients) {
    client = std::thread([&] {
      for (int n = 0; n < kCallsEach; ++n) {
        EXPECT_EQ(STATUS_OK, ndk::host::Transact(binder_, [&] {
                    ndk::host::Transact(binder_,
                                        [&] { ran_on.push_back(std::this_thread::get_id()); });
                  }));
      }
      ++finished;
    });
  }
  ASSERT_TRUE(Readable(fd_));
  std::thread handler([&] {
    while (finished < kClients) {
      if (Readable(fd_, 20)) ABinderProcess_handlePolledCommands();
    }
  });
  const std::thread::id handler_id = handler.get_id();
  handler.join();
  for (std::thread& client : clients) client.join();
  EXPECT_EQ(std::vector(kClients * kCallsEach, handler_id), ran_on);
  ABinderProcess_handlePolledCommands();
  EXPECT_FALSE(Readable(fd_, 0)) << "handling leaves the descriptor signalled";
}

// A recipient deleted before the death or while its notice is queued is never
// called; one called may delete itself from inside the call.
TEST_F(BinderProcessTest, KilledBinderNotifiesEachLiveLinkOnceOnThePollingThread) {
  Link first{recipient_.get()}, second{recipient_.get()}, unlinked{recipient_.get()};
  Link before{AIBinder_DeathRecipient_new(OnDeath)}, queued{AIBinder_DeathRecipient_new(OnDeath)};
  Link in_callback{AIBinder_DeathRecipient_new(OnDeath), true};
  for (Link* link : {&first, &second, &unlinked, &before, &queued, &in_callback}) {
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder_, link->recipient, link));
  }
  EXPECT_EQ(STATUS_OK, AIBinder_unlinkToDeath(binder_, recipient_.get(), &unlinked));
  EXPECT_EQ(STATUS_NAME_NOT_FOUND, AIBinder_unlinkToDeath(binder_, recipient_.get(), &unlinked));
  AIBinder_DeathRecipient_delete(before.recipient);

  std::thread([this] { ndk::host::KillBinder(binder_); }).join();
  EXPECT_FALSE(AIBinder_isAlive(thing_->asBinder().get()));
  EXPECT_EQ(0, first.calls) << "delivered before this thread handled the commands";
  AIBinder_DeathRecipient_delete(queued.recipient);
  ASSERT_TRUE(Readable(fd_));
  ABinderProcess_handlePolledCommands();
  ndk::host::KillBinder(binder_);
  ABinderProcess_handlePolledCommands();

  EXPECT_EQ((std::vector{1, 1, 0, 0, 0, 1}),
            (std::vector{first.calls, second.calls, unlinked.calls, before.calls, queued.calls,
                         in_callback.calls}));
  EXPECT_EQ(STATUS_DEAD_OBJECT, AIBinder_linkToDeath(binder_, recipient_.get(), &first));
  EXPECT_EQ(STATUS_DEAD_OBJECT, ndk::host::Transact(binder_, [] {}));
}

TEST_F(BinderProcessTest, BinderKeepsItsObject) {
  std::weak_ptr<Thing> watch = thing_;
  ndk::SpAIBinder binder = thing_->asBinder();
  thing_.reset();
  EXPECT_FALSE(watch.expired());
  binder.set(nullptr);
  EXPECT_TRUE(watch.expired());
}

// The platform's own texts, which clients and bug reports show: each names
// every part of its status, with the numbers clients compare.
TEST(StatusTest, EachConstructorDescribesItsParts) {
  static_assert(STATUS_UNKNOWN_ERROR == INT32_MIN && STATUS_FAILED_TRANSACTION == INT32_MIN + 2 &&
                STATUS_DEAD_OBJECT == -EPIPE);
  const std::pair<ScopedAStatus, std::string> cases[] = {
      {ScopedAStatus::fromStatus(STATUS_OK), "No error"},
      {ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_ARGUMENT, "bad"),
       "Status(-3, EX_ILLEGAL_ARGUMENT): 'bad'"},
      {ScopedAStatus::fromExceptionCodeWithMessage(EX_ILLEGAL_STATE, nullptr),
       "Status(-5, EX_ILLEGAL_STATE): ''"},
      {ScopedAStatus::fromExceptionCode(EX_TRANSACTION_FAILED),
       "Status(-129, EX_TRANSACTION_FAILED): 'FAILED_TRANSACTION: '"},
      {ScopedAStatus::fromStatus(-EIO),
       "Status(-129, EX_TRANSACTION_FAILED): '-5 (Input/output error): '"},
      {ScopedAStatus::fromServiceSpecificError(-7), "Status(-8, EX_SERVICE_SPECIFIC): '-7: '"},
  };
  for (const auto& [status, description] : cases) {
    EXPECT_EQ(description, status.getDescription());
    EXPECT_EQ(description == "No error", status.isOk()) << description;
  }
}

// What crashes on the device aborts here, naming the misuse: an object not
// owned through make() (owned twice there), reading an empty status.
TEST(MisuseDeathTest, AbortsNamingTheMisuse) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(std::make_shared<Thing>(), "not created by SharedRefBase::make\\(\\) was destroyed");
  EXPECT_DEATH((void)std::make_shared<Thing>()->asBinder(), "was asked for ref\\(\\)");
  ScopedAStatus held = ScopedAStatus::fromServiceSpecificError(1);
  ScopedAStatus taken = std::move(held);
  EXPECT_FALSE(held.isOk());  // NOLINT(bugprone-use-after-move): the point of the test
  EXPECT_DEATH((void)held.getExceptionCode(), "AStatus_getExceptionCode: the status is empty");
  EXPECT_DEATH((void)ScopedAStatus().getDescription(), "AStatus_getDescription: ");
}

// A HAL entry of package a.b in |format| with |body| inside.
std::string Hal(const std::string& body, const std::string& format = "aidl") {
  return "<manifest><hal format='" + format + "'><name>a.b</name>" + body + "</hal></manifest>";
}

TEST(VintfManifestTest, DeclaresTheAidlInstancesOfAWellFormedManifestOnly) {
  const struct {
    std::string xml;
    const char* declared = nullptr;      // declared, at |version|, as the first instance
    const char* not_declared = nullptr;  // not declared; null: the manifest must not load
    int version = 0;
  } cases[] = {
      {Hal("<version>2</version><fqname>IFoo/default</fqname>"), "a.b.IFoo/default",
       "a.b.IFoo/default2", 2},
      {Hal("<interface><name>IFoo</name><instance>x</instance><instance>y</instance></interface>"),
       "a.b.IFoo/x", "a.c.IFoo/y", 1},
      {Hal("<fqname>@1.0::IFoo/default</fqname>", "hidl"), nullptr, "a.b.IFoo/default"},
      {"<manifest><hal format='aidl'><name>a.b</name></manifest>"},  // not well-formed
      {"<compatibility-matrix/>"},
      {Hal("<version>1x</version><fqname>IFoo/default</fqname>")},
      {Hal("<version>0</version><fqname>IFoo/default</fqname>")},
      {Hal("<fqname>IFoo/</fqname>")},
      {Hal("")},
  };
  const std::string path = ::testing::TempDir() + "vintf_manifest_test.xml";
  for (const auto& c : cases) {
    SCOPED_TRACE(c.xml);
    std::ofstream(path) << c.xml;
    std::string error;
    std::optional<ndk::host::VintfManifest> manifest = ndk::host::VintfManifest::Load(path, &error);
    ASSERT_EQ(c.not_declared != nullptr, manifest.has_value()) << error;
    if (!manifest.has_value()) {
      EXPECT_NE(std::string::npos, error.find(path)) << error;
      continue;
    }
    EXPECT_FALSE(manifest->Declares(c.not_declared));
    if (c.declared == nullptr) continue;
    EXPECT_TRUE(manifest->Declares(c.declared));
    EXPECT_EQ(c.declared, manifest->instances().front().Name());
    EXPECT_EQ(c.version, manifest->instances().front().version);
  }
  std::remove(path.c_str());
}

}  // namespace
