#include "CalibrationFixture.h"

#include <cerrno>
#include <memory>

namespace {

class BringUpTest : public ct::CalibrationTest {
protected:
    void SetUp() override
    {
        CalibrationTest::SetUp();
        VPSetBootArgs("debug=0x14e");
        parts(*plugin).unit().sensorType = eALSSensorType5ChannelA;
        parts(*plugin).unit().chipId = 0x1A2B3C4D;
        parts(*plugin).databases().publish(std::make_shared<const SpectralDatabase>(), true);
    }
    // The "crgb" value the driver received, or -1 when none.
    int crgb()
    {
        CFTypeRef value = VPServiceCopyReceivedProperty(service, CFSTR("crgb"));
        if (!value)
            return -1;
        int out = -2;
        if (CFGetTypeID(value) == CFNumberGetTypeID())
            CFNumberGetValue(CFNumberRef(value), kCFNumberIntType, &out);
        CFRelease(value);
        return out;
    }
    void expectDefaultPath()
    {
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "Switching off color adaptation support.\n"));
        EXPECT_EQ(crgb(), 0);
        EXPECT_FALSE(parts(*plugin).databases().isReady());
        const std::vector<uint8_t> record = received("ALSCalibrationData");
        ASSERT_EQ(record.size(), 193u);
        EXPECT_EQ(ct::rd32(record, 1), 3u); // built-in default
    }
};

TEST_F(BringUpTest, BootArgumentForcesTheDefaultWhateverItsValue)
{
    for (const char* args : {"als_default_calibration=0", "debug=1 als_default_calibration=1 -v"}) {
        SCOPED_TRACE(args);
        VPSetBootArgs(std::string(args));
        writeStore("XwCA", ct::makeXwCA({}).vec());
        parts(*plugin).calibration().runCalibrationBringUp();
        EXPECT_EQ(VPQVTReadCount(), 0u);
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "boot-args are set to use default calibration"));
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "Getting QVT calibration...\n"));
        expectDefaultPath();
    }
}

// Also when the boot arguments ask for the default but cannot be read.
TEST_F(BringUpTest, FactoryCalibrationLeavesCrgbAlone)
{
    for (int sysctlError : {0, EPERM}) {
        SCOPED_TRACE(sysctlError);
        VPSetBootArgs(sysctlError ? "als_default_calibration=1" : "debug=0x14e");
        VPSetSysctlFailure(sysctlError);
        writeStore("XwCA", ct::makeXwCA({}).vec());
        parts(*plugin).calibration().runCalibrationBringUp();
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "QVT Calibration has been loaded successfully"));
        EXPECT_FALSE(log.contains("boot-args are set to use default calibration"));
        EXPECT_EQ(crgb(), -1);
        EXPECT_EQ(ct::rd32(received("ALSCalibrationData"), 1), 2u); // factory store
    }
}

TEST_F(BringUpTest, FailedOrRejectedCalibrationFallsBackToTheDefault)
{
    parts(*plugin).calibration().runCalibrationBringUp(); // empty store
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "Failed to load QVT calibration.\n"));
    expectDefaultPath();

    // A record whose counts exceed its layout ends the same way.
    writeStore("XwCA", ct::makeXwCA({.nChannels = 9}).vec());
    parts(*plugin).calibration().runCalibrationBringUp();
    expectDefaultPath();
}

} // namespace
