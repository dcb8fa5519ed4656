#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include <android-base/unique_fd.h>
#include <netlink/msg.h>

#include "net/unique_nl_msg.h"
#include "sim/family_handler.h"
#include "sim/fault.h"

namespace hardware {
namespace dalix {
namespace sim {

// Plays the kernel's side of generic netlink for the host build: a
// NETLINK_USERSOCK socket bound to a fixed port, served by one thread of its
// own, that answers the controller (family resolution) and hands every other
// request to the family registered for its message type. Public methods are
// safe from any thread; families and posted tasks run on the simulator thread.
// The process must be in a private network namespace (EnterPrivateNamespace),
// which keeps the fixed port to itself.
//
// Families are borrowed: destroy (or Stop()) the simulator before them.
class DriverSimulator {
 public:
  // Chosen outside the ports libnl and the kernel pick for their own sockets.
  static constexpr uint32_t kDefaultPort = 0x5AD1C0DE;
  static constexpr int kFirstFamilyId = 0x1A;
  static constexpr int kControllerVersion = 2;

  explicit DriverSimulator(uint32_t port = kDefaultPort);
  ~DriverSimulator();
  DriverSimulator(const DriverSimulator&) = delete;
  DriverSimulator& operator=(const DriverSimulator&) = delete;

  // Binds the port and starts serving. False, with a log line, when the port
  // cannot be bound; true at once when already running.
  bool Start();
  // Stops serving and unbinds: clients sending afterwards get ECONNREFUSED.
  // Pending posted tasks are dropped.
  void Stop();
  bool IsRunning() const;
  uint32_t port() const { return port_; }

  // Makes |family| resolvable as |name| and returns the id requests carry.
  // Registering a name again replaces its handler and keeps its id.
  int RegisterFamily(const std::string& name, FamilyHandler* family);
  // A family that is not present no longer resolves (-ENOENT) and its
  // requests are refused with ENOENT, as when the driver goes away.
  void SetFamilyPresent(const std::string& name, bool present);
  // The id given to |name|, or -1.
  int FamilyId(const std::string& name) const;

  // Applies |fault| to every request of |family| ...
  void SetFault(const std::string& family, const Fault& fault);
  // ... or to its requests of |cmd| only, which takes precedence.
  void SetCommandFault(const std::string& family, uint8_t cmd, const Fault& fault);
  void ClearFaults();

  // A message of |family_id| and |cmd| with sequence 0, for SendEvent().
  static UniqueNlMsg NewEvent(int family_id, uint8_t cmd);
  // Sends |msg| to |port| without blocking. False when nobody holds the port
  // or its receive buffer is full. Any thread.
  bool SendEvent(uint32_t port, nl_msg* msg);
  // Sends raw bytes as one datagram, for messages no builder would make.
  bool SendRaw(uint32_t port, const void* data, size_t size);

  // Runs |task| on the simulator thread after |delay|, in due order. Tasks
  // still pending at Stop() are dropped.
  void Post(std::function<void()> task,
            std::chrono::milliseconds delay = std::chrono::milliseconds(0));

  // Requests received so far (controller requests included).
  int RequestCount() const;

  // Called with every datagram the simulator puts on the wire, on the thread
  // that sends it, before it is sent: lets a tool record what the driver
  // says. An empty function removes it.
  using SendObserver = std::function<void(uint32_t port, const uint8_t* data, size_t size)>;
  void SetSendObserver(SendObserver observer);

 private:
  struct Family {
    int id;
    FamilyHandler* handler;
    bool present;
    std::optional<Fault> fault;
    std::map<uint8_t, Fault> command_faults;
  };
  struct Task {
    std::chrono::steady_clock::time_point due;
    uint64_t order;
    std::function<void()> run;
  };

  void Serve();
  void RunDueTasks();
  std::chrono::milliseconds NextTaskDelay();
  void HandleDatagram(uint32_t sender, const uint8_t* data, size_t size);
  void HandleMessage(uint32_t sender, const nlmsghdr* header);
  void HandleController(const Request& request, const nlmsghdr* header);
  // Looks up the family of |type| and takes one use of the fault that
  // applies to |cmd|. False if no present family has that id.
  bool TakeFamily(int type, uint8_t cmd, FamilyHandler** handler, Fault* fault);
  bool SendMessage(uint32_t port, const nlmsghdr* header);
  void SendError(uint32_t port, const nlmsghdr* request, int error);
  void SendDone(uint32_t port, const nlmsghdr* request);
  static void SendMalformedReply(Responder& responder, uint8_t cmd);

  const uint32_t port_;
  android::base::unique_fd socket_;
  android::base::unique_fd wake_;
  std::thread thread_;

  mutable std::mutex mutex_;
  bool running_;
  std::map<std::string, Family> families_;
  int next_family_id_;
  std::vector<Task> tasks_;
  uint64_t next_task_order_;
  int request_count_;
  SendObserver send_observer_;
};

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
