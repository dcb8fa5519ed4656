#include "binder_process.h"

#include <errno.h>
#include <stdint.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <algorithm>

#include "binder_object.h"

// The death callback of a recipient; the links refer to it by address.
struct AIBinder_DeathRecipient {
  AIBinder_DeathRecipient_onBinderDied on_died;
};

namespace {

// True on a thread while it runs ABinderProcess_handlePolledCommands, so that
// the calls a handler makes through proxies run at once instead of waiting
// for itself.
thread_local bool handling_commands = false;

}  // namespace

BinderProcess& BinderProcess::Get() {
  // Lives as long as the process, like the platform's own process state;
  // never destroyed, so that no exit-time destructor races a late caller.
  static BinderProcess* process = new BinderProcess();
  return *process;
}

BinderProcess::BinderProcess() : event_fd_(eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC)) {}

int BinderProcess::SetupPolling() {
  std::lock_guard<std::mutex> lock(mutex_);
  service_thread_ = std::this_thread::get_id();
  return event_fd_.get();
}

bool BinderProcess::OnServiceThread() const {
  if (handling_commands) return true;
  std::lock_guard<std::mutex> lock(mutex_);
  return service_thread_ == std::this_thread::get_id();
}

void BinderProcess::Signal() {
  const uint64_t one = 1;
  // The counter cannot overflow in practice; a failed write would only delay
  // the commands until the next signal.
  (void)!write(event_fd_.get(), &one, sizeof(one));
}

void BinderProcess::DrainSignal() {
  uint64_t count;
  (void)!read(event_fd_.get(), &count, sizeof(count));
}

void BinderProcess::HandlePolledCommands() {
  // Reading the counter first: whatever is queued after this read signals
  // again and is handled by the next call, so the descriptor never stays
  // quiet while commands wait.
  DrainSignal();
  size_t pending;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    pending = commands_.size();
  }
  const bool was_handling = handling_commands;
  handling_commands = true;
  for (; pending > 0; --pending) {
    Command command{nullptr, {}};
    AIBinder_DeathRecipient_onBinderDied on_died = nullptr;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      // Reset or a deleted recipient may have removed entries meanwhile.
      if (commands_.empty()) break;
      command = commands_.front();
      commands_.pop_front();
      // Read under the lock: the recipient may be deleted (even by its own
      // callback) once it is out of the queue.
      if (command.call == nullptr) on_died = command.death.recipient->on_died;
    }
    if (command.call != nullptr) {
      (*command.call->function)();
      std::lock_guard<std::mutex> lock(mutex_);
      command.call->done = true;
      call_done_.notify_all();
    } else {
      on_died(command.death.cookie);
      ndk::host::internal::DecWeak(command.death.binder);
    }
  }
  handling_commands = was_handling;
}

binder_status_t BinderProcess::Transact(AIBinder* binder, const std::function<void()>& call) {
  if (binder == nullptr) return STATUS_UNEXPECTED_NULL;
  if (!binder->alive) return STATUS_DEAD_OBJECT;
  if (OnServiceThread()) {
    call();
    return STATUS_OK;
  }
  Call queued{&call};
  {
    std::lock_guard<std::mutex> lock(mutex_);
    commands_.push_back(Command{&queued, {}});
  }
  Signal();
  std::unique_lock<std::mutex> lock(mutex_);
  call_done_.wait(lock, [&queued] { return queued.done; });
  return queued.status;
}

binder_status_t BinderProcess::LinkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient,
                                           void* cookie) {
  if (binder == nullptr || recipient == nullptr) return STATUS_UNEXPECTED_NULL;
  std::lock_guard<std::mutex> lock(mutex_);
  // Checked under the lock so that a concurrent kill either sees this link
  // or makes the link fail.
  if (!binder->alive) return STATUS_DEAD_OBJECT;
  ndk::host::internal::IncWeak(binder);
  links_.push_back(Link{binder, recipient, cookie});
  return STATUS_OK;
}

binder_status_t BinderProcess::UnlinkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient,
                                             void* cookie) {
  if (binder == nullptr || recipient == nullptr) return STATUS_UNEXPECTED_NULL;
  std::lock_guard<std::mutex> lock(mutex_);
  auto link = std::find_if(links_.begin(), links_.end(), [&](const Link& l) {
    return l.binder == binder && l.recipient == recipient && l.cookie == cookie;
  });
  if (link == links_.end()) return STATUS_NAME_NOT_FOUND;
  AIBinder* linked = link->binder;
  links_.erase(link);
  ndk::host::internal::DecWeak(linked);
  return STATUS_OK;
}

void BinderProcess::ForgetRecipient(AIBinder_DeathRecipient* recipient) {
  std::lock_guard<std::mutex> lock(mutex_);
  for (auto it = links_.begin(); it != links_.end();) {
    if (it->recipient == recipient) {
      ndk::host::internal::DecWeak(it->binder);
      it = links_.erase(it);
    } else {
      ++it;
    }
  }
  for (auto it = commands_.begin(); it != commands_.end();) {
    if (it->call == nullptr && it->death.recipient == recipient) {
      ndk::host::internal::DecWeak(it->death.binder);
      it = commands_.erase(it);
    } else {
      ++it;
    }
  }
}

void BinderProcess::Kill(AIBinder* binder) {
  if (binder == nullptr) return;
  bool queued = false;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    if (!binder->alive.exchange(false)) return;
    // The links move, with their weak references, into the queue: each one
    // is notified once.
    for (auto it = links_.begin(); it != links_.end();) {
      if (it->binder == binder) {
        commands_.push_back(Command{nullptr, *it});
        it = links_.erase(it);
        queued = true;
      } else {
        ++it;
      }
    }
  }
  if (queued) Signal();
}

void BinderProcess::Reset() {
  std::lock_guard<std::mutex> lock(mutex_);
  for (Command& command : commands_) {
    if (command.call != nullptr) {
      command.call->status = STATUS_DEAD_OBJECT;
      command.call->done = true;
    } else {
      ndk::host::internal::DecWeak(command.death.binder);
    }
  }
  commands_.clear();
  for (Link& link : links_) ndk::host::internal::DecWeak(link.binder);
  links_.clear();
  service_thread_ = std::thread::id();
  call_done_.notify_all();
  DrainSignal();
}

extern "C" {

bool ABinderProcess_setThreadPoolMaxThreadCount(uint32_t /*num_threads*/) {
  // Nothing to size: every command runs on the service thread.
  return true;
}

void ABinderProcess_startThreadPool(void) {}

binder_status_t ABinderProcess_setupPolling(int* fd) {
  if (fd == nullptr) return STATUS_UNEXPECTED_NULL;
  const int event_fd = BinderProcess::Get().SetupPolling();
  if (event_fd < 0) return STATUS_NO_INIT;
  *fd = event_fd;
  return STATUS_OK;
}

binder_status_t ABinderProcess_handlePolledCommands(void) {
  BinderProcess::Get().HandlePolledCommands();
  return STATUS_OK;
}

AIBinder_DeathRecipient* AIBinder_DeathRecipient_new(AIBinder_DeathRecipient_onBinderDied on_died) {
  if (on_died == nullptr) return nullptr;
  return new AIBinder_DeathRecipient{on_died};
}

void AIBinder_DeathRecipient_delete(AIBinder_DeathRecipient* recipient) {
  if (recipient == nullptr) return;
  BinderProcess::Get().ForgetRecipient(recipient);
  delete recipient;
}

binder_status_t AIBinder_linkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient,
                                     void* cookie) {
  return BinderProcess::Get().LinkToDeath(binder, recipient, cookie);
}

binder_status_t AIBinder_unlinkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient,
                                       void* cookie) {
  return BinderProcess::Get().UnlinkToDeath(binder, recipient, cookie);
}

}  // extern "C"
