#define LOG_TAG "dalix.fuzz.SeedRecorder"

#include "fuzz/seed_recorder.h"

#include <sys/stat.h>

#include <mutex>
#include <vector>

#include <android-base/file.h>
#include <android-base/logging.h>
#include <linux/netlink.h>

#include "fuzz/scripted_driver.h"
#include "net/mcps802154.h"
#include "net/nl802154.h"
#include "sim/private_namespace.h"

namespace hardware {
namespace dalix {
namespace fuzz {

SeedRecorder::SeedRecorder(std::string directory)
    : directory_(std::move(directory)),
      mcps_(&radios_),
      nl802154_(&devices_),
      factory_(nullptr, simulator_.port()) {}

SeedRecorder::~SeedRecorder() { simulator_.Stop(); }

bool SeedRecorder::Start() {
  if (!sim::EnterPrivateNamespace()) return false;
  simulator_.RegisterFamily(kMcpsFamilyName, &mcps_);
  simulator_.RegisterFamily(kNl802154FamilyName, &nl802154_);
  mkdir(directory_.c_str(), 0755);
  return simulator_.Start();
}

std::string SeedRecorder::Record(const std::function<void()>& exchanges) {
  std::mutex mutex;
  std::vector<std::vector<uint8_t>> datagrams;
  simulator_.SetSendObserver([&](uint32_t, const uint8_t* data, size_t size) {
    std::lock_guard<std::mutex> lock(mutex);
    datagrams.emplace_back(data, data + size);
  });
  exchanges();
  simulator_.SetSendObserver(nullptr);

  // Every message of an answer echoes its request's sequence number, so a
  // new number starts the next answer.
  std::string script;
  bool first = true;
  uint32_t seq = 0;
  for (std::vector<uint8_t>& datagram : datagrams) {
    auto* header = reinterpret_cast<nlmsghdr*>(datagram.data());
    if (datagram.size() < sizeof(nlmsghdr)) continue;
    if (!first && header->nlmsg_seq != seq) ScriptedDriver::AppendEndOfAnswer(&script);
    first = false;
    seq = header->nlmsg_seq;
    int remaining = static_cast<int>(datagram.size());
    for (; nlmsg_ok(header, remaining); header = nlmsg_next(header, &remaining)) {
      header->nlmsg_seq -= seq;
    }
    ScriptedDriver::AppendDatagram(&script, datagram.data(), datagram.size());
  }
  return script;
}

bool SeedRecorder::Write(const std::string& name, const std::string& script) {
  std::string path = directory_ + "/" + name;
  if (!android::base::WriteStringToFile(script, path)) {
    PLOG(ERROR) << "Write: cannot write " << path;
    return false;
  }
  return true;
}

}  // namespace fuzz
}  // namespace dalix
}  // namespace hardware
