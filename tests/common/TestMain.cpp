// The main of every test program: logs stay quiet unless VANTISH_TEST_LOG is
// set, and no queued work is left running between tests.
#include <VantishPlatform/DispatchControl.h>
#include <VantishPlatform/LogControl.h>

#include <gtest/gtest.h>

#include <cstdlib>

namespace {
class QuietEnvironment : public ::testing::Environment {
public:
    void SetUp() override
    {
        if (!std::getenv("VANTISH_TEST_LOG"))
            VPLogSetEcho(false);
    }
    void TearDown() override { VPDispatchDrain(); }
};
} // namespace

int main(int argc, char** argv)
{
    ::testing::InitGoogleTest(&argc, argv);
    ::testing::AddGlobalTestEnvironment(new QuietEnvironment);
    return RUN_ALL_TESTS();
}
