#include "CalibrationFixture.h"

#include "calibration/ColorCalibrationRecord.h"

#include <atomic>
#include <cmath>
#include <thread>

namespace {

constexpr int kSources = 6;

class FactoryDatabaseTest : public ct::CalibrationTest {
protected:
    void SetUp() override
    {
        CalibrationTest::SetUp();
        ct::writeReferenceDatabases(system.path(), kSources);
        parts(*plugin).unit().chipId = 0x1A2B3C4D;
    }
};

TEST_F(FactoryDatabaseTest, BuildsCachesPublishesAndReloads)
{
    writeStore("XwCA", ct::makeXwCA({}).vec());
    ASSERT_TRUE(parts(*plugin).calibration().loadQVTCalibration(false));
    EXPECT_EQ(log.count("Parsed big DB\n"), 1u);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "Small DB has been created\n"));
    EXPECT_TRUE(std::filesystem::exists(roots.cacheDir() / "bzrgbc_1.sqlite"));
    const auto built = parts(*plugin).databases().snapshot();
    ASSERT_TRUE(built.ready);
    EXPECT_EQ(built.db->dbSampleCount, uint32_t(kSources));
    EXPECT_EQ(built.db->dbChannelCount, 5u);
    EXPECT_TRUE(built.db->channelStdDev.empty()); // no lambda configured: not normalised

    // The cache serves the next load; a forced rebuild scans the reference again.
    ASSERT_TRUE(parts(*plugin).calibration().loadQVTCalibration(false));
    EXPECT_EQ(log.count("Parsed big DB\n"), 1u);
    const auto cached = parts(*plugin).databases().snapshot();
    ASSERT_TRUE(cached.ready);
    EXPECT_NE(cached.db, built.db);
    for (size_t i = 0; i < built.db->dbChannelResponses.size(); ++i)
        EXPECT_NEAR(cached.db->dbChannelResponses[i], built.db->dbChannelResponses[i], 1e-5);

    ASSERT_TRUE(parts(*plugin).calibration().loadQVTCalibration(true));
    EXPECT_EQ(log.count("Parsed big DB\n"), 2u);
}

TEST_F(FactoryDatabaseTest, ResponsesAreNormalisedBeforeAnyoneSeesThem)
{
    writeStore("XwCA", ct::makeXwCA({}).vec());
    parts(*plugin).fit().lambdaConfigured = 1;

    std::atomic<bool> done{false};
    std::atomic<int> unnormalisedSeen{0};
    std::thread reader([&] {
        while (!done.load()) {
            const auto snapshot = parts(*plugin).databases().snapshot();
            if (snapshot.ready && snapshot.db->channelStdDev.empty())
                ++unnormalisedSeen;
        }
    });
    const bool loaded = parts(*plugin).calibration().loadQVTCalibration(false);
    done = true;
    reader.join();
    ASSERT_TRUE(loaded);
    EXPECT_EQ(unnormalisedSeen.load(), 0);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "RR normalization"));

    const auto snapshot = parts(*plugin).databases().snapshot();
    ASSERT_TRUE(snapshot.ready);
    const SpectralDatabase& db = *snapshot.db;
    const size_t n = db.dbSampleCount;
    ASSERT_EQ(db.channelStdDev.size(), 5u);
    // Each sample had unit length before every channel was divided by its deviation.
    for (size_t i = 0; i < n; ++i) {
        double length = 0;
        for (size_t c = 0; c < 5; ++c) {
            const double unscaled = double(db.dbChannelResponses[c * n + i]) * db.channelStdDev[c];
            length += unscaled * unscaled;
        }
        EXPECT_NEAR(std::sqrt(length), 1.0, 1e-5) << i;
    }
    for (size_t c = 0; c < 5; ++c) {
        if (db.channelStdDev[c] == 0.0f)
            continue;
        double mean = 0, var = 0;
        for (size_t i = 0; i < n; ++i)
            mean += db.dbChannelResponses[c * n + i] / double(n);
        for (size_t i = 0; i < n; ++i)
            var += std::pow(db.dbChannelResponses[c * n + i] - mean, 2) / double(n);
        EXPECT_NEAR(std::sqrt(var), 1.0, 1e-4) << c;
    }
}

TEST_F(FactoryDatabaseTest, DatabaseUnusableForColourIsNotPublished)
{
    // A 4-channel layout that only calibrates three channels.
    writeStore("XwCl", ct::makeXwCl({.deviceID = 35, .nChannels = 3, .nGains = 8}).vec());
    parts(*plugin).unit().chipId = 0;
    ASSERT_TRUE(parts(*plugin).calibration().loadQVTCalibration(false));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Failed to create small DB 3\n"));
    const auto snapshot = parts(*plugin).databases().snapshot();
    EXPECT_FALSE(snapshot.ready);
    EXPECT_EQ(snapshot.db, nullptr);
}

TEST_F(FactoryDatabaseTest, MissingReferenceLeavesTheDatabaseAsItWas)
{
    std::filesystem::remove_all(system.path() / "Vantish.plugin");
    writeStore("XwCA", ct::makeXwCA({}).vec());
    ASSERT_TRUE(parts(*plugin).calibration().loadQVTCalibration(false));
    EXPECT_FALSE(parts(*plugin).databases().isReady());
    EXPECT_EQ(log.count("Parsed big DB\n"), 0u);
}

TEST_F(FactoryDatabaseTest, VD6287DatabaseGoesToTheDriver)
{
    writeStore("XwCA", ct::makeVD6287v3().vec());
    ASSERT_TRUE(parts(*plugin).calibration().loadQVTCalibration(false));
    const auto snapshot = parts(*plugin).databases().snapshot();
    ASSERT_TRUE(snapshot.ready);
    const SpectralDatabase& db = *snapshot.db;
    const std::vector<uint8_t> record = received("ALSColorCalibration");
    ASSERT_EQ(record.size(), 28163u);
    EXPECT_EQ(record[0], 5);
    EXPECT_EQ(ct::rd16(record, 1), kSources);
    for (size_t i = 0; i < 3 * kSources; ++i)
        EXPECT_EQ(ct::rdf(record, 3 + 4 * i), db.dbXYZ[i]) << i;
    EXPECT_EQ(ct::rd32(record, 3 + 4 * 3 * kSources), 0u);
    for (size_t i = 0; i < 5 * kSources; ++i)
        EXPECT_EQ(ct::rdf(record, 10563 + 4 * i), db.dbChannelResponses[i]) << i;
    EXPECT_EQ(ct::rd32(record, 10563 + 4 * 5 * kSources), 0u);
}

class ColorCalibrationRecordTest : public ct::CalibrationTest {
protected:
    std::vector<uint8_t> build(uint32_t sources, uint32_t rows, uint32_t channelCount)
    {
        SpectralDatabase db;
        db.allocate(sources, rows);
        for (size_t i = 0; i < db.dbChannelResponses.size(); ++i)
            db.dbChannelResponses[i] = float(i + 1);
        return ct::takeBytes(calib::createColorCalibrationRecord(db, channelCount));
    }
};

TEST_F(ColorCalibrationRecordTest, DatabasesBeyondTheRecordAreSkipped)
{
    const std::vector<uint8_t> full = build(880, 5, 5);
    ASSERT_EQ(full.size(), 28163u);
    EXPECT_EQ(ct::rd16(full, 1), 880);
    EXPECT_EQ(ct::rdf(full, 28163 - 4), 4400.0f); // the last response fills the last slot

    EXPECT_TRUE(build(881, 5, 5).empty());
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "ALSColorCalibration skipped: 881 sources and 4405 responses do not "
                                                "fit (at most 880 and 4400)\n"));
    EXPECT_TRUE(build(800, 6, 6).empty()); // 4800 responses
    EXPECT_TRUE(build(10, 5, 6).empty());  // more channels than the database has rows
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "ALSColorCalibration skipped: 6 channels, the database has 5\n"));
}

} // namespace
