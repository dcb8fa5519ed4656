#define LOG_TAG "dalix.sim.PrivateNamespace"

#include "sim/private_namespace.h"

#include <fcntl.h>
#include <sched.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>

#include <android-base/file.h>
#include <android-base/logging.h>

namespace hardware {
namespace dalix {
namespace sim {
namespace {

bool WriteProcFile(const char* path, const std::string& text) {
  if (android::base::WriteStringToFile(text, path)) return true;
  // Kernels before 3.19 have no setgroups file and need no denial.
  return errno == ENOENT && std::strcmp(path, "/proc/self/setgroups") == 0;
}

}  // namespace

bool EnterPrivateNamespace() {
  uid_t uid = geteuid();
  gid_t gid = getegid();
  if (unshare(CLONE_NEWUSER | CLONE_NEWNET) != 0) {
    int error = errno;
    LOG(ERROR) << "EnterPrivateNamespace: cannot enter a private user and network namespace ("
               << std::strerror(error)
               << (error == EINVAL ? ", the process already runs a second thread"
                                   : ", user namespaces are disabled on this machine")
               << "); the driver simulator cannot run here";
    return false;
  }
  // An unprivileged process may map only its own ids, and only once it has
  // given up setgroups().
  if (!WriteProcFile("/proc/self/setgroups", "deny") ||
      !WriteProcFile("/proc/self/uid_map", "0 " + std::to_string(uid) + " 1") ||
      !WriteProcFile("/proc/self/gid_map", "0 " + std::to_string(gid) + " 1")) {
    LOG(ERROR) << "EnterPrivateNamespace: cannot map user " << uid << " and group " << gid
               << " into the new namespace (" << std::strerror(errno) << ")";
    return false;
  }
  return true;
}

}  // namespace sim
}  // namespace dalix
}  // namespace hardware
