// The per-chip database from a registry calibration entry: cache or build,
// channel spectra of both layouts, infrared compensation, the cache-writing
// task and how a newer database replaces an older one.
#include "SysConfigFixture.h"

#include <VantishPlatform/DeviceState.h>

#include <gtest/gtest.h>

#include <optional>

#include <array>
#include <atomic>
#include <thread>
#include <tuple>

using namespace sctest;

namespace {

using Database = SysConfigTest;

// Every source's responses are `expected` (flat reference spectra make them
// the same for all sources), and XYZ are the reference's.
void expectDatabase(const SpectralDatabasePtr& db, const std::vector<double>& expected)
{
    ASSERT_NE(db, nullptr);
    const uint32_t n = db->dbSampleCount;
    ASSERT_EQ(n, uint32_t(kReferenceSources));
    ASSERT_EQ(db->dbChannelResponses.size(), expected.size() * n);
    for (uint32_t i = 0; i < n; ++i) {
        EXPECT_FLOAT_EQ(db->dbXYZ[i], float(i + 1));
        EXPECT_FLOAT_EQ(db->dbXYZ[i + n], float(2 * i + 1));
        EXPECT_FLOAT_EQ(db->dbXYZ[i + 2 * n], float(3 * i + 1));
        for (size_t c = 0; c < expected.size(); ++c)
            EXPECT_NEAR(db->dbChannelResponses[c * n + i], expected[c], 1e-3 * expected[c])
                << "source " << i << " channel " << c;
    }
}

// Channel c of the default generic entry is flat at 100 (c + 1), all weights 1.
const std::vector<double> kGenericResponses = {30, 60, 90, 120};

TEST_F(Database, BuildsThenLoadsTheCache)
{
    vt::LogCapture log;
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "Algo version: 3 NSamples: 401\n"));
    EXPECT_TRUE(log.contains("Parsed big DB\n"));
    EXPECT_TRUE(log.contains("Small DB has been created\n"));
    EXPECT_TRUE(std::filesystem::exists(cacheFile()));
    EXPECT_EQ(parts(*plugin_).unit().algoVersion.load(), 3);
    EXPECT_EQ(parts(*plugin_).unit().spectrumSampleCount.load(), 401u);
    EXPECT_TRUE(parts(*plugin_).databases().isReady());
    expectDatabase(parts(*plugin_).databases().snapshot().db, kGenericResponses);

    // A valid cache is loaded, not rebuilt.
    parts(*plugin_).databases().setReady(false);
    log.clear();
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
    EXPECT_TRUE(log.contains("Found cached DB\n"));
    EXPECT_FALSE(log.contains("Parsed big DB\n"));
    EXPECT_TRUE(parts(*plugin_).databases().isReady());
    expectDatabase(parts(*plugin_).databases().snapshot().db, kGenericResponses);
}

TEST_F(Database, StaleCacheWithSixChannelsBuildsNothing)
{
    vt::LogCapture log;
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    parts(*plugin_).unit().numberOfChannels = 6;
    parts(*plugin_).unit().dbChannelCount = 5;
    EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), true, false, true));
    EXPECT_TRUE(log.contains("Cached DB not found. Recreating"));
    EXPECT_FALSE(log.contains("Parsed big DB\n"));
    EXPECT_EQ(parts(*plugin_).databases().snapshot().db, nullptr);
}

TEST_F(Database, RevisionOneMovesTheSpectraFourBytes)
{
    GenericEntry entry;
    entry.revision = 1;
    publish("alsCalibration", blob({entry.bytes()}, 1));
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
    expectDatabase(parts(*plugin_).databases().snapshot().db, kGenericResponses);
}

// Spectrum blocks the database cannot be built from; a record pushed before
// the build keeps its result.
TEST_F(Database, UnusableSpectrumBlocksBuildNothing)
{
    struct Case {
        uint8_t nGains;
        uint16_t nSamples;
        bool push;
        const char* error; // nullptr: none expected
    };
    const Case cases[] = {
        {7, 401, true, "Calibration entry has 7 gains; its spectrum block follows 8 or 9.\n"},
        {9, 402, false, "Calibration spectrum declares 402 samples; at most 401 are supported.\n"},
        {9, 400, false, nullptr}, // shorter than the reference
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::Message() << int(c.nGains) << " gains, " << c.nSamples << " samples");
        vt::LogCapture log;
        GenericEntry entry;
        entry.nGains = c.nGains;
        entry.nSamples = c.nSamples;
        publish("alsCalibration", blob({entry.bytes()}));
        EXPECT_EQ(processSysConfigCalibration(parts(*plugin_).calibration(), false, c.push, true), c.push);
        if (c.error) {
            EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, c.error));
        }
        EXPECT_FALSE(log.contains("Parsed big DB\n"));
        EXPECT_FALSE(std::filesystem::exists(cacheFile()));
        EXPECT_FALSE(parts(*plugin_).databases().isReady());
        EXPECT_EQ(parts(*plugin_).databases().snapshot().db, nullptr);
    }
}

TEST_F(Database, MissingReferenceDatabase)
{
    // The spectrum steps still read their entry (algorithm version, sample
    // count, their line); the scan then fails. The generic step keeps the
    // push's result, the VD6286 step reports its own failure.
    std::filesystem::remove(system_.path() / "Vantish.plugin" / "bzlight.sqlite");
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    vt::LogCapture log;
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, true, true));
    EXPECT_TRUE(log.contains("Database not found!\n"));
    EXPECT_TRUE(log.contains("Algo version: 3 NSamples: 401\n"));
    EXPECT_EQ(parts(*plugin_).unit().spectrumSampleCount.load(), 401u);
    EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
    EXPECT_EQ(parts(*plugin_).databases().snapshot().db, nullptr);

    log.clear();
    parts(*plugin_).unit().algoVersion = 0;
    publish("alsCalibration", blob({VD6286Entry{}.bytes()}));
    EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), false, true, true));
    EXPECT_EQ(VPServiceReceivedCount(service_, CFSTR("ALSCalibrationData")), 2u) << "the record was pushed";
    EXPECT_TRUE(log.contains("Algo version: 2 NSamples: 401\n"));
    EXPECT_EQ(parts(*plugin_).unit().algoVersion.load(), 2);
    EXPECT_EQ(parts(*plugin_).databases().snapshot().db, nullptr);
}

// Responses of flat channels v with the tail (last 196 of 401 samples) scaled
// by factor x coefficient, normalised to a weighted total of 300.
std::vector<double> compensated(const std::array<double, 4>& v, const std::array<double, 4>& k, float factor)
{
    std::array<double, 4> a{};
    double total = 0.0;
    for (size_t c = 0; c < 4; ++c) {
        const float tail = float(float(v[c]) * factor) * float(k[c]);
        a[c] = 205.0 * v[c] + 196.0 * double(tail);
        total += a[c];
    }
    std::vector<double> out;
    for (double x : a)
        out.push_back(300.0 * x / total);
    return out;
}

TEST_F(Database, AuxiliaryBlobScalesTheInfraredTail)
{
    vt::LogCapture log;
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    publish("alsAuxCalibration", blob({auxEntry(2, {9, 9, 9, 9}), auxEntry(1, {500000, 1000000, 1500000, 2000000})}));
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "ALS auxiliary calibration found \n"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "IR compensation coeffs: R=0.500000 G=1.000000 B=1.500000 C=2.000000 | "
                                               "NIR max: 400 | NIR factor: 81.917503\n "));
    expectDatabase(parts(*plugin_).databases().snapshot().db,
                   compensated({100, 200, 300, 400}, {0.5, 1.0, 1.5, 2.0}, 32767.0f / 400.0f));
}

// The factor scales the tail's largest magnitude to 32767; a silent tail
// gives 1 and the most negative sample must not overflow its magnitude.
TEST_F(Database, InfraredFactorAtTheTailExtremes)
{
    const std::pair<SpectrumFn, const char*> cases[] = {
        {[](unsigned s, unsigned c) { return int16_t(s < 205 ? 100 * (c + 1) : 0); },
         "| NIR max: 0 | NIR factor: 1.000000\n "},
        {[](unsigned s, unsigned c) { return int16_t(s == 300 && c == 2 ? -32768 : 100 * (c + 1)); },
         "| NIR max: 32768 | NIR factor: 0.999969\n "},
    };
    publish("alsAuxCalibration", blob({auxEntry(1, {1000000, 1000000, 1000000, 1000000})}));
    for (const auto& [spectrum, line] : cases) {
        SCOPED_TRACE(line);
        vt::LogCapture log;
        GenericEntry entry;
        entry.spectrum = spectrum;
        publish("alsCalibration", blob({entry.bytes()}));
        std::filesystem::remove_all(roots_.cacheDir());
        EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
        EXPECT_TRUE(anyLineContaining(log, line));
    }
}

// Without an entry for the orientation, or with a hostile one, the spectra
// stay uncompensated.
TEST_F(Database, AuxiliaryBlobsThatCompensateNothing)
{
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    const int32_t k[4] = {2000000, 2000000, 2000000, 2000000};
    Bytes pastTheEnd = blob({auxEntry(1, k)});
    pastTheEnd.resize(48);
    Bytes shortEntry = blob({auxEntry(1, k, 16)});
    shortEntry.resize(8 + 16);
    Bytes zeroSize = blob({auxEntry(1, k, 0)});
    const std::vector<std::tuple<Bytes, os_log_type_t, std::string>> cases = {
        {blob({auxEntry(2, k)}), OS_LOG_TYPE_INFO, "ALS auxiliary calibration found \n"}, // no entry for orientation 1
        {pastTheEnd, OS_LOG_TYPE_ERROR,
         "alsAuxCalibration entry 0 at offset 8: 56 bytes run past the end of the data (48 bytes).\n"},
        {shortEntry, OS_LOG_TYPE_ERROR,
         "alsAuxCalibration entry of 16 bytes is too short for its coefficients (56 bytes).\n"},
        {zeroSize, OS_LOG_TYPE_ERROR,
         "alsAuxCalibration entry 0 at offset 8: entry size 0 is smaller than its subheader.\n"},
        {Bytes(5), OS_LOG_TYPE_ERROR, "alsAuxCalibration of 5 bytes is shorter than its header.\n"},
    };
    for (const auto& [aux, type, line] : cases) {
        SCOPED_TRACE(line);
        vt::LogCapture log;
        std::filesystem::remove_all(roots_.cacheDir());
        publish("alsAuxCalibration", aux);
        EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
        EXPECT_TRUE(log.contains(type, line));
        EXPECT_FALSE(anyLineContaining(log, "IR compensation coeffs"));
        expectDatabase(parts(*plugin_).databases().snapshot().db, kGenericResponses);
    }
}

TEST_F(Database, VD6286SpectraBuildFiveChannels)
{
    vt::LogCapture log;
    publish("alsCalibration", blob({VD6286Entry{}.bytes()}));
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, true, true));
    EXPECT_EQ(log.count("ALSCalibrationDataVD6286 size: 4156, calibration data 4156."), 2u);
    EXPECT_TRUE(log.contains("Algo version: 2 NSamples: 401\n"));
    EXPECT_TRUE(log.contains("Small DB has been created\n"));
    EXPECT_EQ(parts(*plugin_).unit().algoVersion.load(), 2);
    // Channels flat at 50 (c + 1), weights (0.5, 1, 1, 1, 1): weighted total 725.
    std::vector<double> expected;
    for (int c = 0; c < 5; ++c)
        expected.push_back(300.0 * 50 * (c + 1) / 725.0);
    expectDatabase(parts(*plugin_).databases().snapshot().db, expected);
    EXPECT_TRUE(parts(*plugin_).databases().isReady());
}

TEST_F(Database, VD6286SpectrumChecks)
{
    parts(*plugin_).unit().numberOfChannels = 5;
    parts(*plugin_).unit().dbChannelCount = 5;
    vt::LogCapture log;
    VD6286Entry entry;
    entry.nSamples = 402;
    publish("alsCalibration", blob({entry.bytes()}));
    EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Calibration spectrum of 402 samples and 5 channels does not fit the "
                                                "entry (at most 401 samples, 2006 values).\n"));

    parts(*plugin_).unit().colorAlgoOverride = 5;
    publish("alsCalibration", blob({VD6286Entry{}.bytes()}));
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
    EXPECT_EQ(parts(*plugin_).unit().algoVersion.load(), 5);
    EXPECT_EQ(VPServiceReceivedCount(service_, CFSTR("ALSCalibrationData")), 0u);
}

TEST_F(Database, SynchronousWriteIntoAnUnwritableFolder)
{
    vt::LogCapture log;
    blockCacheFolder();
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Failed to create small DB 2\n"));
    EXPECT_FALSE(parts(*plugin_).databases().isReady());
    // The database itself is complete and published; only colour waits for a cache.
    expectDatabase(parts(*plugin_).databases().snapshot().db, kGenericResponses);
}

TEST_F(Database, QueuedWriteOutlivesTheHostsRelease)
{
    vt::LogCapture log;
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    const CFUUIDRef factory = parts(*plugin_).factoryID();
    {
        // Holding the calibration lock keeps the queued task waiting.
        const auto guard = parts(*plugin_).calibration().lock();
        EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, true));
        EXPECT_EQ(parts(*plugin_).refCount(), 2u); // the task holds the instance
        plugin_.release();                         // the host lets go
    }
    VPDispatchDrain();
    EXPECT_TRUE(log.contains("Small DB has been created\n"));
    EXPECT_TRUE(std::filesystem::exists(cacheFile()));
    EXPECT_EQ(VPPlugInInstanceCount(factory), 0); // and the task's release freed it
}

TEST_F(Database, QueuedWriteOfAReplacedDatabaseIsSkipped)
{
    vt::LogCapture log;
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    std::optional<Calibration::Guard> lock;
    lock.emplace(parts(*plugin_).calibration());
    EXPECT_TRUE(
        processSysConfigCalibration(parts(*plugin_).calibration(), true, false, true)); // its task waits for the lock
    const auto first = parts(*plugin_).databases().snapshot().db;

    // A rebuild publishes a newer database whose own cache write fails.
    blockCacheFolder();
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
    const auto second = parts(*plugin_).databases().snapshot().db;
    EXPECT_NE(first, second);
    unblockCacheFolder();
    lock.reset();
    VPDispatchDrain();

    // The older task neither wrote its arrays over the cache nor switched colour on.
    EXPECT_TRUE(
        log.contains(OS_LOG_TYPE_INFO, "A newer database has been published; this one's cache is not written.\n"));
    EXPECT_FALSE(std::filesystem::exists(cacheFile()));
    EXPECT_FALSE(parts(*plugin_).databases().isReady());
    EXPECT_EQ(parts(*plugin_).databases().snapshot().db, second);
}

TEST_F(Database, RebuildsNeverExposeAPartialDatabase)
{
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    blockCacheFolder(); // every call builds
    ASSERT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
    const auto kept = parts(*plugin_).databases().snapshot().db;

    std::atomic<bool> stop{false};
    std::atomic<int> bad{0}, seen{0};
    std::thread reader([&] {
        while (!stop) {
            const auto snapshot = parts(*plugin_).databases().snapshot();
            const uint32_t n = snapshot.db->dbSampleCount;
            for (uint32_t i = 0; i < n; ++i)
                if (snapshot.db->dbChannelResponses[3 * n + i] < 119.0f || snapshot.db->dbXYZ[2 * n + i] < 1.0f)
                    ++bad;
            ++seen;
        }
    });
    for (int rebuild = 0; rebuild < 5; ++rebuild)
        EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), false, false, true));
    stop = true;
    reader.join();
    EXPECT_EQ(bad.load(), 0);
    EXPECT_GT(seen.load(), 0);
    EXPECT_NE(parts(*plugin_).databases().snapshot().db, kept);
    expectDatabase(kept, kGenericResponses); // an older snapshot stays whole
}

} // namespace
