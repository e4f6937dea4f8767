// Log handles are kept per subsystem and category: every plug-in instance asks
// for its log, and a host that creates and releases instances for as long as
// it runs must not grow with them (fuzzing showed one allocation kept per
// instance).
#include <os/log.h>

#include <gtest/gtest.h>

namespace {

TEST(LogHandleReuse, SameSubsystemAndCategoryGiveTheSameHandle)
{
    const os_log_t first = os_log_create("org.example.reuse", "default");
    ASSERT_NE(first, nullptr);
    for (int i = 0; i < 1000; ++i)
        ASSERT_EQ(os_log_create("org.example.reuse", "default"), first);

    EXPECT_NE(os_log_create("org.example.reuse", "calibration"), first);
    EXPECT_NE(os_log_create("org.example.other", "default"), first);
}

} // namespace
