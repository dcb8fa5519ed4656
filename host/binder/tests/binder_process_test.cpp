#include <poll.h>

#include <atomic>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <android/binder_auto_utils.h>
#include <android/binder_ibinder.h>
#include <android/binder_interface_utils.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <binder_host/host.h>
#include <gtest/gtest.h>

namespace {

constexpr char kDescriptor[] = "test.IThing";
// Bounds the wait for the polled descriptor so that a broken queue fails
// the test instead of hanging it; never reached when the code works.
constexpr int kReadableTimeoutMs = 10000;

class IThing : public ndk::ICInterface {};

class Thing : public ndk::BnCInterface<IThing> {
 public:
  explicit Thing(bool* destroyed = nullptr) : destroyed_(destroyed) {}
  ~Thing() override {
    if (destroyed_ != nullptr) *destroyed_ = true;
  }

 protected:
  ndk::SpAIBinder createBinder() override {
    return ndk::host::NewLocalBinder(kDescriptor, ref<ndk::ICInterface>());
  }

 private:
  bool* destroyed_;
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

bool Readable(int fd, int timeout_ms) {
  struct pollfd entry = {fd, POLLIN, 0};
  return poll(&entry, 1, timeout_ms) == 1 && (entry.revents & POLLIN) != 0;
}

class BinderProcessTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ndk::host::ResetForTesting();
    ASSERT_EQ(STATUS_OK, ABinderProcess_setupPolling(&fd_));
    ASSERT_GE(fd_, 0);
    // Whatever an earlier test left signalled is drained here.
    ABinderProcess_handlePolledCommands();
  }
  void TearDown() override { ndk::host::ResetForTesting(); }

  int fd_ = -1;
  std::shared_ptr<Thing> thing_ = ndk::SharedRefBase::make<Thing>();
  ndk::SpAIBinder binder_ = thing_->asBinder();
};

TEST_F(BinderProcessTest, ClientCallWaitsForThePollingThread) {
  std::atomic<bool> ran{false};
  std::thread::id ran_on;
  binder_status_t result = STATUS_UNKNOWN_ERROR;
  std::thread client([&] {
    result = ndk::host::Transact(binder_.get(), [&] {
      ran_on = std::this_thread::get_id();
      ran = true;
    });
  });

  ASSERT_TRUE(Readable(fd_, kReadableTimeoutMs));
  EXPECT_FALSE(ran) << "the call ran before the commands were handled";
  EXPECT_EQ(STATUS_OK, ABinderProcess_handlePolledCommands());
  client.join();

  EXPECT_TRUE(ran);
  EXPECT_EQ(std::this_thread::get_id(), ran_on);
  EXPECT_EQ(STATUS_OK, result);
  EXPECT_FALSE(Readable(fd_, 0));
}

TEST_F(BinderProcessTest, ManyClientsAreServedOneCallAtATime) {
  constexpr int kClients = 4;
  constexpr int kCallsEach = 50;
  int total = 0;  // touched only by the calls, which all run on this thread
  std::atomic<int> finished{0};
  std::vector<std::thread> clients;
  for (int i = 0; i < kClients; ++i) {
    clients.emplace_back([&] {
      for (int n = 0; n < kCallsEach; ++n) {
        EXPECT_EQ(STATUS_OK, ndk::host::Transact(binder_.get(), [&] { ++total; }));
      }
      ++finished;
    });
  }
  while (finished < kClients) {
    if (Readable(fd_, 20)) ABinderProcess_handlePolledCommands();
  }
  for (std::thread& client : clients) client.join();
  EXPECT_EQ(kClients * kCallsEach, total);
}

TEST_F(BinderProcessTest, CallsOnTheServiceThreadRunAtOnce) {
  int runs = 0;
  EXPECT_EQ(STATUS_OK, ndk::host::Transact(binder_.get(), [&] { ++runs; }));
  EXPECT_EQ(1, runs);
  EXPECT_FALSE(Readable(fd_, 0));
}

TEST_F(BinderProcessTest, HandlerRunsNestedCallsOfAnyThreadAtOnce) {
  // A service thread other than the one that set up polling: while it
  // handles a command, the calls it makes must not queue behind itself.
  std::thread service_thread;
  int nested_runs = 0;
  std::thread client([&] {
    ndk::host::Transact(binder_.get(), [&] {
      ndk::host::Transact(binder_.get(), [&] { ++nested_runs; });
    });
  });
  ASSERT_TRUE(Readable(fd_, kReadableTimeoutMs));
  service_thread = std::thread([] { ABinderProcess_handlePolledCommands(); });
  service_thread.join();
  client.join();
  EXPECT_EQ(1, nested_runs);
}

TEST_F(BinderProcessTest, KilledBinderNotifiesEachLinkOnceOnThePollingThread) {
  ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(RecordDeath));
  DeathRecord first, second;
  ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder_.get(), recipient.get(), &first));
  ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder_.get(), recipient.get(), &second));
  EXPECT_TRUE(AIBinder_isAlive(binder_.get()));

  std::thread harness([this] { ndk::host::KillBinder(binder_.get()); });
  harness.join();
  EXPECT_FALSE(AIBinder_isAlive(binder_.get()));
  EXPECT_EQ(STATUS_DEAD_OBJECT, AIBinder_ping(binder_.get()));
  EXPECT_EQ(0, first.calls) << "delivered before the commands were handled";
  ASSERT_TRUE(Readable(fd_, kReadableTimeoutMs));

  ABinderProcess_handlePolledCommands();
  ndk::host::KillBinder(binder_.get());
  ABinderProcess_handlePolledCommands();

  EXPECT_EQ(1, first.calls);
  EXPECT_EQ(1, second.calls);
  EXPECT_EQ(std::this_thread::get_id(), first.thread);
  EXPECT_EQ(STATUS_DEAD_OBJECT, AIBinder_linkToDeath(binder_.get(), recipient.get(), &first));
  EXPECT_EQ(STATUS_DEAD_OBJECT, ndk::host::Transact(binder_.get(), [] {}));
}

TEST_F(BinderProcessTest, RemovedLinksAreNeverNotified) {
  const struct {
    const char* what;
    bool remove_after_kill;
    bool by_delete;  // else by unlink
  } cases[] = {
      {"recipient deleted before the death", false, true},
      {"recipient deleted while the notice is queued", true, true},
      {"link removed before the death", false, false},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    auto thing = ndk::SharedRefBase::make<Thing>();
    ndk::SpAIBinder binder = thing->asBinder();
    AIBinder_DeathRecipient* recipient = AIBinder_DeathRecipient_new(RecordDeath);
    DeathRecord record;
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder.get(), recipient, &record));
    auto remove = [&] {
      if (c.by_delete) {
        AIBinder_DeathRecipient_delete(recipient);
        recipient = nullptr;
      } else {
        EXPECT_EQ(STATUS_OK, AIBinder_unlinkToDeath(binder.get(), recipient, &record));
        EXPECT_EQ(STATUS_NAME_NOT_FOUND,
                  AIBinder_unlinkToDeath(binder.get(), recipient, &record));
      }
    };
    if (!c.remove_after_kill) remove();
    ndk::host::KillBinder(binder.get());
    if (c.remove_after_kill) remove();
    ABinderProcess_handlePolledCommands();
    EXPECT_EQ(0, record.calls);
    AIBinder_DeathRecipient_delete(recipient);
  }
}

TEST_F(BinderProcessTest, RecipientMayDeleteItselfFromItsCallback) {
  struct SelfDeleting {
    AIBinder_DeathRecipient* recipient;
    int calls = 0;
  } state{AIBinder_DeathRecipient_new([](void* cookie) {
    auto* self = static_cast<SelfDeleting*>(cookie);
    ++self->calls;
    AIBinder_DeathRecipient_delete(self->recipient);
  })};
  ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(binder_.get(), state.recipient, &state));
  ndk::host::KillBinder(binder_.get());
  ABinderProcess_handlePolledCommands();
  EXPECT_EQ(1, state.calls);
}

TEST_F(BinderProcessTest, NullArgumentsAreRefused) {
  ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(RecordDeath));
  EXPECT_EQ(STATUS_UNEXPECTED_NULL, AIBinder_linkToDeath(nullptr, recipient.get(), nullptr));
  EXPECT_EQ(STATUS_UNEXPECTED_NULL, AIBinder_linkToDeath(binder_.get(), nullptr, nullptr));
  EXPECT_EQ(STATUS_UNEXPECTED_NULL, ndk::host::Transact(nullptr, [] {}));
  EXPECT_EQ(STATUS_UNEXPECTED_NULL, ABinderProcess_setupPolling(nullptr));
  EXPECT_EQ(nullptr, AIBinder_DeathRecipient_new(nullptr));
  EXPECT_FALSE(AIBinder_isAlive(nullptr));
}

TEST_F(BinderProcessTest, ResetFailsQueuedCalls) {
  bool ran = false;
  binder_status_t result = STATUS_OK;
  std::thread client(
      [&] { result = ndk::host::Transact(binder_.get(), [&] { ran = true; }); });
  ASSERT_TRUE(Readable(fd_, kReadableTimeoutMs));
  ndk::host::ResetForTesting();
  client.join();
  EXPECT_EQ(STATUS_DEAD_OBJECT, result);
  EXPECT_FALSE(ran);
}

TEST_F(BinderProcessTest, BinderKeepsItsObjectAndStaysTheSameWhileHeld) {
  bool destroyed = false;
  auto thing = ndk::SharedRefBase::make<Thing>(&destroyed);
  ndk::SpAIBinder binder = thing->asBinder();
  EXPECT_EQ(binder, thing->asBinder());
  EXPECT_EQ(kDescriptor, std::string(ndk::host::GetDescriptor(binder.get())));
  EXPECT_EQ(thing, ndk::host::GetLocalObject(binder.get()));

  std::weak_ptr<Thing> watch = thing;
  thing.reset();
  EXPECT_FALSE(destroyed) << "the binder must keep its object";
  ndk::ScopedAIBinder_Weak weak(AIBinder_Weak_new(binder.get()));
  EXPECT_EQ(binder, weak.promote());
  binder.set(nullptr);
  EXPECT_TRUE(destroyed);
  EXPECT_EQ(nullptr, weak.promote().get());
}

TEST_F(BinderProcessTest, LivingObjectKeepsItsBinderWithDeathStateAndLinks) {
  // Service code links to a client object's binder without keeping the
  // binder; a later kill of that object's binder must still reach the link.
  auto thing = ndk::SharedRefBase::make<Thing>();
  ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(RecordDeath));
  DeathRecord record;
  AIBinder* first = thing->asBinder().get();
  ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(thing->asBinder().get(), recipient.get(), &record));

  ndk::SpAIBinder again = thing->asBinder();
  EXPECT_EQ(first, again.get());
  EXPECT_EQ(1, AIBinder_debugGetRefCount(again.get()));
  ndk::host::KillBinder(again.get());
  again.set(nullptr);
  EXPECT_FALSE(AIBinder_isAlive(thing->asBinder().get()));
  EXPECT_EQ(thing, ndk::host::GetLocalObject(thing->asBinder().get()));
  ABinderProcess_handlePolledCommands();
  EXPECT_EQ(1, record.calls);
}

TEST_F(BinderProcessTest, ServiceManagerFindsWhatWasAdded) {
  const std::string name = std::string(kDescriptor) + "/default";
  EXPECT_EQ(nullptr, AServiceManager_checkService(name.c_str()));
  ASSERT_EQ(EX_NONE, AServiceManager_addService(binder_.get(), name.c_str()));
  ndk::SpAIBinder found(AServiceManager_getService(name.c_str()));
  EXPECT_EQ(binder_, found);

  auto other = ndk::SharedRefBase::make<Thing>();
  ASSERT_EQ(EX_NONE, AServiceManager_addService(other->asBinder().get(), name.c_str()));
  EXPECT_EQ(other->asBinder(), ndk::SpAIBinder(AServiceManager_checkService(name.c_str())));
  EXPECT_EQ(nullptr, AServiceManager_checkService("other/default"));
  EXPECT_EQ(EX_ILLEGAL_ARGUMENT, AServiceManager_addService(nullptr, name.c_str()));
  EXPECT_EQ(EX_ILLEGAL_ARGUMENT, AServiceManager_addService(binder_.get(), nullptr));
}

}  // namespace
