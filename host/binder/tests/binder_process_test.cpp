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

constexpr char kDescriptor[] = "test.IThing";

class IThing : public ndk::ICInterface {};

class Thing : public ndk::BnCInterface<IThing> {
  ndk::SpAIBinder createBinder() override {
    return ndk::host::NewLocalBinder(kDescriptor, ref<ndk::ICInterface>());
  }
};

struct DeathRecord {
  int calls = 0;
  std::thread::id thread;
};

void RecordDeath(void* cookie) {
  auto* record = static_cast<DeathRecord*>(cookie);
  ++record->calls;
  record->thread = std::this_thread::get_id();
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
  ndk::SpAIBinder binder_ = thing_->asBinder();
  ndk::ScopedAIBinder_DeathRecipient recipient_{AIBinder_DeathRecipient_new(RecordDeath)};
};

TEST_F(BinderProcessTest, ClientCallWaitsForThePollingThread) {
  std::thread::id ran_on;  // written by the call only, which runs on this thread
  binder_status_t result = STATUS_UNKNOWN_ERROR;
  std::thread client([&] {
    result = ndk::host::Transact(binder_.get(), [&] { ran_on = std::this_thread::get_id(); });
  });
  ASSERT_TRUE(Readable(fd_));
  EXPECT_EQ(std::thread::id(), ran_on) << "the call ran before the commands were handled";
  EXPECT_EQ(STATUS_OK, ABinderProcess_handlePolledCommands());
  client.join();
  EXPECT_EQ(std::this_thread::get_id(), ran_on);
  EXPECT_EQ(STATUS_OK, result);
  EXPECT_FALSE(Readable(fd_, 0));
}

TEST_F(BinderProcessTest, ManyClientsAreServedOneCallAtATime) {
  constexpr int kClients = 4, kCallsEach = 50;
  int total = 0;  // only the calls touch it, and they all run on this thread
  std::atomic<int> finished{0};
  std::vector<std::thread> clients(kClients);
  for (std::thread& client : clients) {
    client = std::thread([&] {
      for (int n = 0; n < kCallsEach; ++n) ndk::host::Transact(binder_.get(), [&] { ++total; });
      ++finished;
    });
  }
  while (finished < kClients) {
    if (Readable(fd_, 20)) ABinderProcess_handlePolledCommands();
  }
  for (std::thread& client : clients) client.join();
  EXPECT_EQ(kClients * kCallsEach, total);
}

TEST_F(BinderProcessTest, CallsFromTheServingThreadRunAtOnce) {
  int runs = 0;
  EXPECT_EQ(STATUS_OK, ndk::host::Transact(binder_.get(), [&] { ++runs; }));
  EXPECT_EQ(1, runs);
  EXPECT_FALSE(Readable(fd_, 0));

  // Handled on a thread other than the one that set up polling: the calls a
  // handler makes must not queue behind the handler itself.
  std::thread client([&] {
    ndk::host::Transact(binder_.get(),
                        [&] { ndk::host::Transact(binder_.get(), [&] { ++runs; }); });
  });
  ASSERT_TRUE(Readable(fd_));
  std::thread([] { ABinderProcess_handlePolledCommands(); }).join();
  client.join();
  EXPECT_EQ(2, runs);
}

TEST_F(BinderProcessTest, KilledBinderNotifiesEachLinkOnceOnThePollingThread) {
  DeathRecord first, second, unlinked;
  for (DeathRecord* record : {&first, &second, &unlinked}) {
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder_.get(), recipient_.get(), record));
  }
  EXPECT_EQ(STATUS_OK, AIBinder_unlinkToDeath(binder_.get(), recipient_.get(), &unlinked));
  EXPECT_EQ(STATUS_NAME_NOT_FOUND,
            AIBinder_unlinkToDeath(binder_.get(), recipient_.get(), &unlinked));
  EXPECT_TRUE(AIBinder_isAlive(binder_.get()));

  std::thread([this] { ndk::host::KillBinder(binder_.get()); }).join();
  EXPECT_FALSE(AIBinder_isAlive(binder_.get()));
  EXPECT_EQ(STATUS_DEAD_OBJECT, AIBinder_ping(binder_.get()));
  EXPECT_EQ(0, first.calls) << "delivered before the commands were handled";
  ASSERT_TRUE(Readable(fd_));
  ABinderProcess_handlePolledCommands();
  ndk::host::KillBinder(binder_.get());
  ABinderProcess_handlePolledCommands();

  EXPECT_EQ(1, first.calls);
  EXPECT_EQ(1, second.calls);
  EXPECT_EQ(0, unlinked.calls);
  EXPECT_EQ(std::this_thread::get_id(), first.thread);
  EXPECT_EQ(STATUS_DEAD_OBJECT, AIBinder_linkToDeath(binder_.get(), recipient_.get(), &first));
  EXPECT_EQ(STATUS_DEAD_OBJECT, ndk::host::Transact(binder_.get(), [] {}));
}

// The cookie of a link that counts its deaths and, when asked, deletes its
// own recipient from inside the call.
struct SelfDeletingLink {
  AIBinder_DeathRecipient* recipient;
  bool delete_in_callback;
  int calls = 0;
};

void OnLinkDeath(void* cookie) {
  auto* link = static_cast<SelfDeletingLink*>(cookie);
  ++link->calls;
  if (link->delete_in_callback) AIBinder_DeathRecipient_delete(link->recipient);
}

TEST_F(BinderProcessTest, DeletedRecipientIsNeverCalledAndMayDeleteItself) {
  enum When { kBeforeDeath, kWhileQueued, kInItsCallback };
  for (When when : {kBeforeDeath, kWhileQueued, kInItsCallback}) {
    SCOPED_TRACE(when);
    ndk::SpAIBinder binder = ndk::SharedRefBase::make<Thing>()->asBinder();
    SelfDeletingLink link{AIBinder_DeathRecipient_new(OnLinkDeath), when == kInItsCallback};
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder.get(), link.recipient, &link));
    if (when == kBeforeDeath) AIBinder_DeathRecipient_delete(link.recipient);
    ndk::host::KillBinder(binder.get());
    if (when == kWhileQueued) AIBinder_DeathRecipient_delete(link.recipient);
    ABinderProcess_handlePolledCommands();
    EXPECT_EQ(when == kInItsCallback ? 1 : 0, link.calls);
  }
}

TEST_F(BinderProcessTest, BinderKeepsItsObjectAndALivingObjectKeepsItsBinder) {
  // Service code links to a client object's binder without holding the
  // binder; a later kill of that binder must still reach the link.
  auto thing = ndk::SharedRefBase::make<Thing>();
  std::weak_ptr<Thing> watch = thing;
  AIBinder* first = thing->asBinder().get();
  DeathRecord record;
  ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(thing->asBinder().get(), recipient_.get(), &record));
  ndk::SpAIBinder binder = thing->asBinder();
  EXPECT_EQ(first, binder.get());
  EXPECT_EQ(1, AIBinder_debugGetRefCount(binder.get()));
  ndk::host::KillBinder(binder.get());
  binder.set(nullptr);
  EXPECT_FALSE(AIBinder_isAlive(thing->asBinder().get()));
  ABinderProcess_handlePolledCommands();
  EXPECT_EQ(1, record.calls);

  binder = thing->asBinder();
  thing.reset();
  EXPECT_FALSE(watch.expired()) << "the binder must keep its object";
  ndk::ScopedAIBinder_Weak weak(AIBinder_Weak_new(binder.get()));
  EXPECT_EQ(binder, weak.promote());
  binder.set(nullptr);
  EXPECT_TRUE(watch.expired());
  EXPECT_EQ(nullptr, weak.promote().get());
}

}  // namespace

namespace {

// make() is the only owner the device tolerates; anything else aborts here
// at the first ref() or at destruction instead of being owned twice there.
TEST(SharedRefBaseDeathTest, ObjectsNotMadeByMakeAbort) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(std::make_shared<Thing>(), "not created by SharedRefBase::make\\(\\) was destroyed");
  EXPECT_DEATH({ Thing on_stack; }, "was destroyed");
  EXPECT_DEATH((void)std::make_shared<Thing>()->asBinder(), "was asked for ref\\(\\)");
}

}  // namespace
