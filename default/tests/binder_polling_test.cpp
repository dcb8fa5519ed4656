#include "binder_polling.h"

#include <gtest/gtest.h>

namespace hardware {
namespace dalix {
namespace {

// Built twice: linked with the binder library, where both calls resolve, and
// without it, where the weak declarations stay null as they do against the
// vendor link stub on a device whose library lacks them.
TEST(BinderPollingTest, AvailableExactlyWhenBothCallsResolved) {
  EXPECT_EQ(DALIX_BINDER_LINKED != 0, BinderPollingAvailable());
}

}  // namespace
}  // namespace dalix
}  // namespace hardware
