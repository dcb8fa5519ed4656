// IX::version is declared in the generated header only, as the platform's
// generator leaves it: reading its value is fine, taking its address (an ODR
// use) must fail to link. Built by cmake/compile_fail.cmake.
#include <cstdio>

#include <aidl/aidl/hardware/dalix/uwb/IUwb.h>

using ::aidl::aidl::hardware::dalix::uwb::IUwb;

int main() {
#if DALIX_CASE == 1
  std::printf("%p\n", static_cast<const void*>(&IUwb::version));
#endif
  return IUwb::version == 1 ? 0 : 1;
}
