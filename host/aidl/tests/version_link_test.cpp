// IX::version has no definition, as on the platform: reading it builds,
// taking its address must not link (cmake/compile_fail.cmake).
#include <cstdio>

#include <aidl/aidl/hardware/dalix/uwb/IUwb.h>

using ::aidl::aidl::hardware::dalix::uwb::IUwb;

int main() {
#if DALIX_CASE == 1
  std::printf("%p\n", static_cast<const void*>(&IUwb::version));
#endif
  return IUwb::version == 1 ? 0 : 1;
}
