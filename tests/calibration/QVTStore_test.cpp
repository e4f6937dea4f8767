#include "CalibrationFixture.h"

#include <algorithm>

namespace {

class QVTStoreTest : public ct::CalibrationTest {
protected:
    std::string retryLine(int attempt)
    {
        return "Retrieving QVT calibration data failed in attempt number " + std::to_string(attempt) +
               "/20. Try again in 5 sec.\n";
    }
    size_t countStartingWith(const std::string& prefix)
    {
        const auto all = log.messages();
        return size_t(
            std::count_if(all.begin(), all.end(), [&](const std::string& m) { return m.starts_with(prefix); }));
    }
};

TEST_F(QVTStoreTest, EmptyStoreOnDravikOSIsRetried20TimesThenGivenUp)
{
    VPDispatchSetDelayMode(VPDelayMode::Manual);
    parts(*plugin).unit().isDravikOS = 1;
    EXPECT_FALSE(parts(*plugin).calibration().loadQVTCalibration(false));
    for (int attempt = 1; attempt <= 20; ++attempt) {
        ASSERT_TRUE(log.contains(OS_LOG_TYPE_INFO, retryLine(attempt))) << attempt;
        ASSERT_EQ(VPDispatchPendingDelayed(), 1u);
        VPDispatchFireDelayed();
        VPDispatchDrain();
    }
    EXPECT_EQ(VPDispatchPendingDelayed(), 0u);
    EXPECT_EQ(countStartingWith("Retrieving QVT calibration data failed"), 20u);
    // The first attempt and 20 retries, each reading "XwCM" and then "XwCA".
    EXPECT_EQ(log.count("loadQVTCalibration"), 21u);
    EXPECT_EQ(VPQVTReadCount(), 2u * 21);

    // A later request fails silently and schedules nothing.
    EXPECT_FALSE(parts(*plugin).calibration().loadQVTCalibration(true));
    EXPECT_EQ(countStartingWith("Retrieving QVT calibration data failed"), 20u);
    EXPECT_EQ(VPDispatchPendingDelayed(), 0u);
}

TEST_F(QVTStoreTest, RetryKeepsTheInstanceAliveAndLoadsOnceTheStoreIsReady)
{
    VPDispatchSetDelayMode(VPDelayMode::Manual);
    parts(*plugin).unit().isDravikOS = 1;
    parts(*plugin).unit().chipId = 0x1A2B3C4D;
    EXPECT_FALSE(parts(*plugin).calibration().loadQVTCalibration(false));
    ASSERT_EQ(VPDispatchPendingDelayed(), 1u);

    // The host lets go of the instance while the retry is pending.
    CFUUIDRef factory = parts(*plugin).factoryID();
    const long instances = VPPlugInInstanceCount(factory);
    plugin.release();
    EXPECT_EQ(VPPlugInInstanceCount(factory), instances);

    writeStore("XwCA", ct::makeXwCA({}).vec());
    VPDispatchFireDelayed();
    VPDispatchDrain();
    EXPECT_EQ(received("ALSCalibrationData").size(), 193u);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "QVTDataCopy for key XwCA succeeded."));
    EXPECT_EQ(VPDispatchPendingDelayed(), 0u);
    EXPECT_EQ(VPPlugInInstanceCount(factory), instances - 1);
}

TEST_F(QVTStoreTest, WithoutDravikOSAMissingRecordIsNotRetried)
{
    VPDispatchSetDelayMode(VPDelayMode::Manual);
    EXPECT_FALSE(parts(*plugin).calibration().loadQVTCalibration(false));
    EXPECT_EQ(VPDispatchPendingDelayed(), 0u);
    EXPECT_EQ(countStartingWith("Retrieving QVT calibration data failed"), 0u);
    EXPECT_EQ(VPQVTReadCount(), 2u); // "XwCA", then "XwCl"
    EXPECT_EQ(parts(*plugin).calibration().storeRetries(), 0u);
}

TEST_F(QVTStoreTest, StoreErrorCountsAsNoRecord)
{
    VPQVTSetFailure("XwCA", 5);
    writeStore("XwCl", ct::makeXwCl({}).vec());
    EXPECT_TRUE(parts(*plugin).calibration().loadQVTCalibration(false));
    VPQVTSetFailure("XwCA", 0);
    EXPECT_EQ(countStartingWith("QVTDataCopy for key XwCA failed with error "), 1u);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "QVTDataCopy for key XwCl succeeded."));
    EXPECT_EQ(received("ALSCalibrationData").size(), 193u);
}

TEST_F(QVTStoreTest, UnrecognisedLengthIsNotParsed)
{
    std::vector<uint8_t> record = ct::makeXwCl({}).vec();
    record.push_back(0);
    writeStore("XwCA", record);
    EXPECT_FALSE(parts(*plugin).calibration().loadQVTCalibration(false));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "QVT calibration data length = 5157\n"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Failed to parse ALS calibration data."));
    EXPECT_TRUE(received("ALSCalibrationData").empty());
}

TEST_F(QVTStoreTest, RefusedRecordFailsTheLoadAndMissingServiceDoesNot)
{
    writeStore("XwCl", ct::makeXwCl({}).vec());
    VPServiceRefuseProperty(service, CFSTR("ALSCalibrationData"), true);
    EXPECT_FALSE(parts(*plugin).calibration().loadQVTCalibration(false));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Failed to set ALS calibration data."));

    parts(*plugin).service() = nullptr;
    EXPECT_TRUE(parts(*plugin).calibration().loadQVTCalibration(false));
}

} // namespace
