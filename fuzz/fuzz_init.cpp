// libFuzzer's start-up hook, shared by every target: a fuzzer runs millions
// of exchanges, so log lines go nowhere (they are still formatted, so their
// code runs), while a CHECK still reports why it aborts.
#include <cstddef>
#include <cstdio>
#include <cstdlib>

#include <android-base/logging.h>

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
  android::base::SetLogger([](android::base::LogId, android::base::LogSeverity, const char*,
                              const char*, unsigned int, const char*) {});
  android::base::SetAborter([](const char* message) {
    fprintf(stderr, "%s\n", message);
    abort();
  });
  return 0;
}
