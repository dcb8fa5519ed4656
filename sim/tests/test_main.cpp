#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "sim/private_namespace.h"

int main(int argc, char** argv) {
  // Parsing the flags starts no thread, so the namespace is still entered
  // before any. Listing the tests starts no simulator, so it must work where
  // namespaces do not: test discovery runs the program this way at build time.
  testing::InitGoogleMock(&argc, argv);
  if (!GTEST_FLAG_GET(list_tests) && !hardware::dalix::sim::EnterPrivateNamespace()) return 1;
  return RUN_ALL_TESTS();
}
