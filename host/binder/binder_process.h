#pragma once

#include <condition_variable>
#include <deque>
#include <functional>
#include <mutex>
#include <thread>
#include <vector>

#include <android-base/unique_fd.h>
#include <android/binder_ibinder.h>

// The binder state of this process: the queue of commands that wait for the
// service thread (proxy calls and death notifications), the descriptor that
// signals them, and the death links. The platform keeps the same state once
// per process, so there is exactly one. Every member is thread-safe.
class BinderProcess {
 public:
  static BinderProcess& Get();

  // The polled descriptor; records the caller as the service thread.
  int SetupPolling();
  void HandlePolledCommands();
  binder_status_t Transact(AIBinder* binder, const std::function<void()>& call);

  binder_status_t LinkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient, void* cookie);
  binder_status_t UnlinkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient,
                                void* cookie);
  // Drops every link of |recipient|, delivered or not.
  void ForgetRecipient(AIBinder_DeathRecipient* recipient);
  void Kill(AIBinder* binder);
  void Reset();

 private:
  struct Call {
    const std::function<void()>* function;
    bool done = false;
    binder_status_t status = STATUS_OK;
  };
  // A link holds a weak reference to its binder.
  struct Link {
    AIBinder* binder;
    AIBinder_DeathRecipient* recipient;
    void* cookie;
  };
  // Either a call from another thread or a death notification.
  struct Command {
    Call* call;
    Link death;
  };

  BinderProcess();
  bool OnServiceThread() const;
  void Signal();
  void DrainSignal();

  android::base::unique_fd event_fd_;
  mutable std::mutex mutex_;
  std::condition_variable call_done_;
  std::deque<Command> commands_;
  std::vector<Link> links_;
  std::thread::id service_thread_;
};
