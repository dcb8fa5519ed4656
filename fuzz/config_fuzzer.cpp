// ConfigUtils::Load of an arbitrary file, then every way the service reads
// the store back.
#include <sys/mman.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <string>

#include <android-base/logging.h>

#include "net/config_utils.h"

using hardware::dalix::ConfigUtils;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static int fd = memfd_create("config", MFD_CLOEXEC);
  static const std::string path = "/proc/self/fd/" + std::to_string(fd);
  CHECK(fd >= 0);
  CHECK_EQ(0, ftruncate(fd, 0));
  CHECK_EQ(static_cast<ssize_t>(size), pwrite(fd, data, size, 0));
  ConfigUtils store;
  CHECK(store.Load(path.c_str()));
  // A key holding a NUL is found by its C string only up to the NUL, so a
  // lookup may miss; it must not fail any other way.
  for (const char* key = store.GetNext(true); key != nullptr; key = store.GetNext(false)) {
    store.GetValue(key);
  }
  store.Dump();
  return 0;
}
