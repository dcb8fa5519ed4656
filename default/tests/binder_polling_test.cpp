#include "binder_polling.h"

#include <gtest/gtest.h>

// Built with the binder library and without any (where the weak
// declarations stay null, as on a device whose library lacks the calls).
TEST(BinderPollingTest, AvailableExactlyWhenBothCallsResolved) {
  EXPECT_EQ(DALIX_BINDER_LINKED != 0, hardware::dalix::BinderPollingAvailable());
}
