#include <poll.h>

#include <atomic>
#include <memory>
#include <thread>
#include <vector>

#include <android/binder_auto_utils.h>
#include <android/binder_ibinder.h>
#include <android/binder_interface_utils.h>
#include <android/binder_process.h>
#include <binder_host/host.h>
#include <gtest/gtest.h>

namespace {

class IThing : public ndk::ICInterface {};

class Thing : public ndk::BnCInterface<IThing> {
  ndk::SpAIBinder createBinder() override {
    return ndk::host::NewLocalBinder("test.IThing", ref<ndk::ICInterface>());
  }
};

// The cookie of a death link: counts its calls and, when asked, deletes its
// own recipient from inside the call.
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
    ndk::host::ResetForTesting();
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

TEST_F(BinderProcessTest, ClientCallsWaitForThePollingThreadAndRunThereOneAtATime) {
  constexpr int kClients = 4, kCallsEach = 50;
  std::vector<std::thread::id> ran_on;  // only the calls touch it, and they run on this thread
  std::atomic<int> finished{0};
  std::vector<std::thread> clients(kClients);
  for (std::thread& client : clients) {
    client = std::thread([&] {
      for (int n = 0; n < kCallsEach; ++n) {
        EXPECT_EQ(STATUS_OK, ndk::host::Transact(
                                 binder_, [&] { ran_on.push_back(std::this_thread::get_id()); }));
      }
      ++finished;
    });
  }
  ASSERT_TRUE(Readable(fd_));
  EXPECT_TRUE(ran_on.empty()) << "a call ran before the commands were handled";
  while (finished < kClients) {
    if (Readable(fd_, 20)) ABinderProcess_handlePolledCommands();
  }
  for (std::thread& client : clients) client.join();
  EXPECT_EQ(std::vector(kClients * kCallsEach, std::this_thread::get_id()), ran_on);
  ABinderProcess_handlePolledCommands();
  EXPECT_FALSE(Readable(fd_, 0)) << "handling leaves the descriptor signalled";
}

// Handled on a thread other than the one that set up polling, the calls a
// handler makes must not queue behind the handler itself.
TEST_F(BinderProcessTest, CallsFromAHandlingThreadRunAtOnce) {
  int runs = 0;
  std::thread client([&] {
    ndk::host::Transact(binder_, [&] { ndk::host::Transact(binder_, [&] { ++runs; }); });
  });
  ASSERT_TRUE(Readable(fd_));
  std::thread([] { ABinderProcess_handlePolledCommands(); }).join();
  client.join();
  EXPECT_EQ(1, runs);
}

TEST_F(BinderProcessTest, KilledBinderNotifiesEachLinkOnceOnThePollingThread) {
  Link first{recipient_.get()}, second{recipient_.get()}, unlinked{recipient_.get()};
  for (Link* link : {&first, &second, &unlinked}) {
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder_, recipient_.get(), link));
  }
  EXPECT_EQ(STATUS_OK, AIBinder_unlinkToDeath(binder_, recipient_.get(), &unlinked));
  EXPECT_EQ(STATUS_NAME_NOT_FOUND, AIBinder_unlinkToDeath(binder_, recipient_.get(), &unlinked));
  EXPECT_TRUE(AIBinder_isAlive(binder_));

  std::thread([this] { ndk::host::KillBinder(binder_); }).join();
  EXPECT_FALSE(AIBinder_isAlive(thing_->asBinder().get()));
  EXPECT_EQ(STATUS_DEAD_OBJECT, AIBinder_ping(binder_));
  EXPECT_EQ(0, first.calls) << "delivered before this thread handled the commands";
  ASSERT_TRUE(Readable(fd_));
  ABinderProcess_handlePolledCommands();
  ndk::host::KillBinder(binder_);
  ABinderProcess_handlePolledCommands();

  EXPECT_EQ((std::vector{1, 1, 0}), (std::vector{first.calls, second.calls, unlinked.calls}));
  EXPECT_EQ(STATUS_DEAD_OBJECT, AIBinder_linkToDeath(binder_, recipient_.get(), &first));
  EXPECT_EQ(STATUS_DEAD_OBJECT, ndk::host::Transact(binder_, [] {}));
}

TEST_F(BinderProcessTest, DeletedRecipientIsNeverCalledAndMayDeleteItself) {
  enum When { kBeforeDeath, kWhileQueued, kInItsCallback };
  for (When when : {kBeforeDeath, kWhileQueued, kInItsCallback}) {
    SCOPED_TRACE(when);
    ndk::SpAIBinder binder = ndk::SharedRefBase::make<Thing>()->asBinder();
    Link link{AIBinder_DeathRecipient_new(OnDeath), when == kInItsCallback};
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder.get(), link.recipient, &link));
    if (when == kBeforeDeath) AIBinder_DeathRecipient_delete(link.recipient);
    ndk::host::KillBinder(binder.get());
    if (when == kWhileQueued) AIBinder_DeathRecipient_delete(link.recipient);
    ABinderProcess_handlePolledCommands();
    EXPECT_EQ(when == kInItsCallback ? 1 : 0, link.calls);
  }
}

TEST_F(BinderProcessTest, BinderKeepsItsObject) {
  std::weak_ptr<Thing> watch = thing_;
  ndk::SpAIBinder binder = thing_->asBinder();
  EXPECT_EQ(binder_, binder.get());
  EXPECT_EQ(1, AIBinder_debugGetRefCount(binder.get()));
  thing_.reset();
  EXPECT_FALSE(watch.expired());
  ndk::ScopedAIBinder_Weak weak(AIBinder_Weak_new(binder.get()));
  EXPECT_EQ(binder, weak.promote());
  binder.set(nullptr);
  EXPECT_TRUE(watch.expired());
  EXPECT_EQ(nullptr, weak.promote().get());
}

// make() is the only owner the device tolerates; anything else aborts here
// at the first ref() or at destruction instead of being owned twice there.
TEST(SharedRefBaseDeathTest, ObjectsNotMadeByMakeAbort) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(std::make_shared<Thing>(), "not created by SharedRefBase::make\\(\\) was destroyed");
  EXPECT_DEATH({ Thing on_stack; }, "was destroyed");
  EXPECT_DEATH((void)std::make_shared<Thing>()->asBinder(), "was asked for ref\\(\\)");
}

}  // namespace
