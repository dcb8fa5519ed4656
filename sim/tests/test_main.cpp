#include <cstring>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "sim/private_namespace.h"

// Listing the tests starts no simulator, so it must work where namespaces do
// not: test discovery runs the program this way at build time.
static bool ListsTestsOnly(int argc, char** argv) {
  for (int i = 1; i < argc; ++i) {
    if (std::strncmp(argv[i], "--gtest_list_tests", 18) == 0) return true;
  }
  return false;
}

int main(int argc, char** argv) {
  if (!ListsTestsOnly(argc, argv) && !hardware::dalix::sim::EnterPrivateNamespace()) return 1;
  testing::InitGoogleMock(&argc, argv);
  return RUN_ALL_TESTS();
}
