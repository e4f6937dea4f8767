#include "LightDbFiles.h"
#include "lightdb/CachedDB.h"

#include "lightdb/LDBM.h"

#include <cmath>
#include <functional>

using ldbtest::runSql;

namespace {

constexpr int kSources = 3;
constexpr int kSamples = 4;

// A plug-in, a reference file of three sources and the unit's channel
// spectra, and the build sequence the calibration code runs.
class CachedDBTest : public ldbtest::LightDbTest {
protected:
    void SetUp() override
    {
        std::vector<ldbtest::Spectrum> rows;
        for (int id = 0; id < kSources; ++id)
            rows.push_back({id, 10.0f + id, 20.0f + id, 30.0f + id, {1.0f, 2.0f + id, 0.5f, 1.0f + 0.25f * id}});
        ldbtest::writeReference(bigDB(), "1.1", kSources, rows);
        key.chipId = 0x5150;
        key.smallDBVersion = 1.3f;
    }

    Matrices channelSpectra(int channels) const
    {
        Matrices m;
        m.nChannels = channels;
        for (int s = 0; s < kSamples; ++s)
            for (int c = 0; c < channels; ++c)
                m.channelSpectra.push_back(100 * (c + 1) + 37 * s * c);
        m.channelWeights.assign(size_t(channels), 1.0f);
        return m;
    }

    // processCachedDB, and on false a build and a cache write as the callers do.
    bool loadOrBuild(SpectralDatabase& db, int channels = 5)
    {
        if (processCachedDB(key, channels, BigDBTypeDefault, db))
            return true;
        Matrices m = channelSpectra(channels);
        m.bindOutputs(db);
        EXPECT_EQ(LDBMParseBigDB(&db.dbInfo, ProgressCallback, &m, BigDBTypeDefault), LDBMResult::Ok);
        EXPECT_EQ(LDBMCreateSmallDB(&db.dbInfo, db.dbXYZ.data(), db.dbChannelResponses.data(), key.orientation, algo,
                                    channels, key.chipId, key.smallDBVersion),
                  LDBMResult::Ok);
        return false;
    }

    static bool allZero(const std::vector<float>& v)
    {
        return std::all_of(v.begin(), v.end(), [](float x) { return x == 0.0f; });
    }

    CacheKey key;
    int algo = 0; // the algorithm version a build writes into the cache
    vt::LogCapture log{VPLogLevel::Default};
};

void expectPrinted(const std::vector<float>& loaded, const std::vector<float>& built)
{
    ASSERT_EQ(loaded.size(), built.size());
    for (size_t i = 0; i < built.size(); ++i)
        EXPECT_NEAR(loaded[i], built[i], 5e-7 + 1e-6 * std::fabs(built[i])) << i;
}

} // namespace

TEST_F(CachedDBTest, ChannelCountsNoLayoutCarriesAreRefusedBeforeAnythingIsAllocated)
{
    for (int channels : {0, -1, 7, 300000}) {
        log.clear();
        SpectralDatabase db;
        EXPECT_FALSE(processCachedDB(key, channels, BigDBTypeDefault, db)) << channels;
        EXPECT_EQ(log.messages(), std::vector<std::string>{"A per-chip database of " + std::to_string(channels) +
                                                           " channels cannot be kept (1 to 6)\n"});
        EXPECT_EQ(db.dbSampleCount, 0u);
        EXPECT_TRUE(db.dbChannelResponses.empty());
    }
    SpectralDatabase six;
    EXPECT_FALSE(processCachedDB(key, 6, BigDBTypeDefault, six));
    EXPECT_EQ(six.dbChannelCount, 6u) << "sized for a build";
}

TEST_F(CachedDBTest, MissingReferenceLeavesTheDatabaseAlone)
{
    std::filesystem::remove(bigDB());
    SpectralDatabase db;
    EXPECT_FALSE(processCachedDB(key, 5, BigDBTypeDefault, db));
    EXPECT_EQ(log.messages(), std::vector<std::string>{"Database not found!\n"});
    EXPECT_EQ(db.dbSampleCount, 0u);
    EXPECT_TRUE(db.dbXYZ.empty());
}

TEST_F(CachedDBTest, BuildsOnceThenLoadsTheSameArrays)
{
    algo = 4;
    SpectralDatabase built;
    ASSERT_FALSE(loadOrBuild(built));
    EXPECT_EQ(log.messages(),
              (std::vector<std::string>{"nSources: 3 nChannels: 5\n", "Cached DB not found. Recreating"}));
    EXPECT_EQ(built.dbInfo.algo, -1) << "the reference Info";
    EXPECT_FALSE(allZero(built.dbChannelResponses));

    log.clear();
    algo = 0;
    SpectralDatabase loaded;
    ASSERT_TRUE(processCachedDB(key, 5, BigDBTypeDefault, loaded));
    EXPECT_EQ(log.messages(), (std::vector<std::string>{"nSources: 3 nChannels: 5\n", "Matching cached DB found"}));
    EXPECT_EQ(loaded.dbInfo.algo, 4) << "restored from the cache";
    EXPECT_EQ(loaded.dbSampleCount, 3u);
    EXPECT_EQ(loaded.dbChannelCount, 5u);
    EXPECT_EQ(loaded.dbInfo.chipID, 0x5150u);
    expectPrinted(loaded.dbXYZ, built.dbXYZ);
    expectPrinted(loaded.dbChannelResponses, built.dbChannelResponses);
}

// Nothing of a cache that is rejected stays in the database to be rebuilt.
TEST_F(CachedDBTest, CacheOfAnotherChipOrCorruptedIsRebuiltFromZero)
{
    SpectralDatabase db;
    loadOrBuild(db);
    const std::pair<std::function<void()>, const char*> rejections[] = {
        {[&] { key.chipId = 0x5151; }, "Found cached DB for different chip ID. Recreating"},
        {[&] {
             key.chipId = 0x5150;
             runSql(cacheFile(1), "INSERT INTO XX VALUES (1, 2, 3);");
         },
         "Cached DB corrupted. Recreating"},
    };
    for (const auto& [reject, line] : rejections) {
        reject();
        log.clear();
        SpectralDatabase again;
        EXPECT_FALSE(processCachedDB(key, 5, BigDBTypeDefault, again)) << line;
        EXPECT_TRUE(log.contains(line));
        EXPECT_EQ(again.dbXYZ.size(), 9u);
        EXPECT_TRUE(allZero(again.dbXYZ) && allZero(again.dbChannelResponses)) << line;
    }
}

TEST_F(CachedDBTest, ChipIdZeroCacheServesOnlyChipIdZero)
{
    key.chipId = 0;
    SpectralDatabase db;
    ASSERT_FALSE(loadOrBuild(db, 4));
    EXPECT_TRUE(processCachedDB(key, 4, BigDBTypeDefault, db));
    key.chipId = 7;
    EXPECT_FALSE(processCachedDB(key, 4, BigDBTypeDefault, db));
    EXPECT_TRUE(log.contains("Found cached DB for different chip ID. Recreating"));
}

TEST_F(CachedDBTest, FiveChannelCacheLoadsIntoFourRowsWithoutOverrun)
{
    SpectralDatabase db;
    loadOrBuild(db, 5);
    SpectralDatabase four;
    ASSERT_TRUE(processCachedDB(key, 4, BigDBTypeDefault, four));
    ASSERT_EQ(four.dbChannelResponses.size(), 12u);
    expectPrinted(four.dbChannelResponses,
                  std::vector<float>(db.dbChannelResponses.begin(), db.dbChannelResponses.begin() + 12));
}
