#include "LightDbFiles.h"

#include "lightdb/LDBM.h"

#include <sqlite3.h>

#include <cmath>
#include <fstream>

using ldbtest::queryColumn;
using ldbtest::runSql;

namespace {

constexpr int kSources = 3;
constexpr float kGuard = -99.0f;

class SmallDBTest : public ldbtest::LightDbTest {
protected:
    void SetUp() override { writeReferenceFile("1.1", kSources); }

    void writeReferenceFile(const std::string& version, int sources)
    {
        std::filesystem::remove(bigDB());
        std::vector<ldbtest::Spectrum> rows;
        for (int id = 0; id < sources; ++id)
            rows.push_back({id, 1.0f, 1.0f, 1.0f, {1.0f}});
        ldbtest::writeReference(bigDB(), version, sources, rows);
    }

    int create(int channels = 5, unsigned chipID = 0x1234, float smallVersion = 1.3f, int orientation = 1)
    {
        const LDBMInfo reference{1.1f, kSources, -1, -1.0f, 0};
        return LDBMCode(LDBMCreateSmallDB(&reference, xyz.data(), responses.data(), orientation, 2, channels, chipID,
                                          smallVersion));
    }

    // LDBMInitialize's verdict on the cache for orientation 1.
    bool valid(float expectedSmallVersion, LDBMInfo* out = nullptr)
    {
        LDBMInfo info;
        bool cacheValid = false;
        EXPECT_EQ(LDBMInitialize(1, &info, &cacheValid, BigDBTypeDefault, expectedSmallVersion), LDBMResult::Ok);
        if (out)
            *out = info;
        return cacheValid;
    }

    // Loads the cache into arrays followed by guard values; false when the load fails.
    int load(int responseRows, std::vector<float>& loadedXYZ, std::vector<float>& loadedResponses)
    {
        loadedXYZ.assign(3 * kSources + 4, kGuard);
        loadedResponses.assign(size_t(responseRows * kSources) + 4, kGuard);
        const LDBMInfo info{1.1f, kSources, 0, 0.0f, 0};
        return LDBMCode(LDBMParseSmallDB(1, &info, loadedXYZ.data(), loadedResponses.data(), responseRows));
    }

    static bool guardsIntact(const std::vector<float>& v, size_t used)
    {
        return std::all_of(v.begin() + long(used), v.end(), [](float x) { return x == kGuard; });
    }

    std::vector<float> xyz{0.25f, 123.456789f, 3.0f, 1e-3f, 0.5f, 6.0f, 7.125f, 8.0f, 95047.0f};
    std::vector<float> responses{10.5f, 11.0f, 12.0f, 20.0f, 21.0f,     22.0f, 30.0f, 31.0f,
                                 32.0f, 40.0f, 41.0f, 42.0f, 0.000123f, 51.0f, 52.0f};
};

// Equal to the six decimals the file keeps.
void expectPrinted(const std::vector<float>& loaded, const std::vector<float>& written, size_t count)
{
    for (size_t i = 0; i < count; ++i)
        EXPECT_NEAR(loaded[i], written[i], 5e-7 + 1e-6 * std::fabs(written[i])) << i;
}

} // namespace

TEST_F(SmallDBTest, RoundTripKeepsTheFileFormatAndTheValues)
{
    ASSERT_EQ(create(5, 0x80000001u), 0);
    EXPECT_EQ(queryColumn(cacheFile(1), "SELECT sql FROM sqlite_master ORDER BY name"),
              (std::vector<std::string>{
                  "CREATE TABLE Info (version Single, smallversion Single, sources Long, orientation Long, algo "
                  "Long, chipID Unsigned Integer)",
                  "CREATE TABLE RR (CH0 Single, CH1 Single, CH2 Single, CH3 Single, CH4 Single)",
                  "CREATE TABLE XX (X Single, Y Single, Z Single)"}));
    EXPECT_EQ(queryColumn(cacheFile(1), "PRAGMA journal_mode"), std::vector<std::string>{"wal"});
    EXPECT_EQ(queryColumn(cacheFile(1), "SELECT orientation || ' ' || chipID FROM Info"),
              std::vector<std::string>{"1 -2147483647"});

    LDBMInfo info;
    ASSERT_TRUE(valid(1.3f, &info));
    EXPECT_FLOAT_EQ(info.version, 1.1f);
    EXPECT_EQ(info.sources, kSources);
    EXPECT_EQ(info.algo, 2);
    EXPECT_FLOAT_EQ(info.smallVersion, 1.3f);
    EXPECT_EQ(info.chipID, 0x80000001u);

    std::vector<float> loadedXYZ, loadedResponses;
    ASSERT_EQ(load(5, loadedXYZ, loadedResponses), 0);
    expectPrinted(loadedXYZ, xyz, xyz.size());
    expectPrinted(loadedResponses, responses, responses.size());
}

TEST_F(SmallDBTest, ChipIdZeroWritesTheFiveColumnInfo)
{
    ASSERT_EQ(create(4, 0), 0);
    EXPECT_EQ(queryColumn(cacheFile(1), "SELECT sql FROM sqlite_master WHERE name IN ('Info', 'RR') ORDER BY name"),
              (std::vector<std::string>{
                  "CREATE TABLE Info (version Single, smallversion Single, sources Long, orientation Long, algo Long)",
                  "CREATE TABLE RR (R Single, G Single, B Single, C Single)"}));
    LDBMInfo info;
    ASSERT_TRUE(valid(1.3f, &info));
    EXPECT_EQ(info.chipID, 0u);

    // A four-column RR leaves a fifth row alone.
    std::vector<float> loadedXYZ, loadedResponses;
    ASSERT_EQ(load(5, loadedXYZ, loadedResponses), 0);
    EXPECT_TRUE(guardsIntact(loadedResponses, 4 * kSources));
}

TEST_F(SmallDBTest, CacheIsInvalidWhenAnyKeyChanges)
{
    ASSERT_EQ(create(5, 0x1234, 1.1f), 0);
    EXPECT_TRUE(valid(1.1f));
    EXPECT_FALSE(valid(1.3f)) << "per-chip format version";

    writeReferenceFile("1.2", kSources);
    LDBMInfo info;
    EXPECT_FALSE(valid(1.1f, &info)) << "reference version";
    EXPECT_FLOAT_EQ(info.version, 1.2f);
    EXPECT_EQ(info.algo, -1) << "the reference Info is kept";

    writeReferenceFile("1.1", kSources + 1);
    EXPECT_FALSE(valid(1.1f)) << "source count";
    writeReferenceFile("1.1", kSources);
    EXPECT_TRUE(valid(1.1f));
}

TEST_F(SmallDBTest, ChannelCountOtherThanFourOrFiveWritesNoCache)
{
    EXPECT_EQ(create(6), 3);
    EXPECT_FALSE(std::filesystem::exists(cacheFile(1)));
    ASSERT_EQ(create(5), 0);
    EXPECT_EQ(create(6), 3);
    EXPECT_TRUE(valid(1.3f)) << "the cache written before stays";
}

// A new cache is built beside the old one and replaces it only when complete.
TEST_F(SmallDBTest, BuildStoppedPartWayKeepsThePreviousCache)
{
    ASSERT_EQ(create(), 0);
    const std::vector<float> written = responses;
    // "nan" is no SQL value: the RR insert of the second row fails.
    responses[1] = std::nanf("");
    EXPECT_EQ(create(), SQLITE_ERROR);
    EXPECT_TRUE(valid(1.3f));
    std::vector<float> loadedXYZ, loadedResponses;
    ASSERT_EQ(load(5, loadedXYZ, loadedResponses), 0);
    expectPrinted(loadedResponses, written, written.size());
    EXPECT_FALSE(std::filesystem::exists(cacheFile(1).string() + ".tmp")) << "nothing left beside it";

    responses = written;
    ASSERT_EQ(create(), 0);
    EXPECT_TRUE(valid(1.3f));
}

TEST_F(SmallDBTest, UnwritableCacheReturnsTwo)
{
    // The cache folder is a regular file: nothing can be created under it.
    std::filesystem::create_directories(roots_.cacheDir().parent_path());
    std::ofstream(roots_.cacheDir()) << "not a folder";
    EXPECT_EQ(create(), 2);
    EXPECT_TRUE(std::filesystem::is_regular_file(roots_.cacheDir()));
    std::filesystem::remove(roots_.cacheDir());

    // A folder where the cache file should be: the finished file cannot be put
    // in its place, and it does not stay behind either.
    std::filesystem::create_directories(cacheFile(1));
    EXPECT_EQ(create(), 2);
    EXPECT_TRUE(std::filesystem::is_directory(cacheFile(1)));
    EXPECT_FALSE(std::filesystem::exists(cacheFile(1).string() + ".tmp"));
}

TEST_F(SmallDBTest, LoadNeverWritesOutsideTheArrays)
{
    ASSERT_EQ(create(5), 0);
    std::vector<float> loadedXYZ, loadedResponses;

    // Columns for rows the caller does not hold are skipped.
    ASSERT_EQ(load(4, loadedXYZ, loadedResponses), 0);
    EXPECT_TRUE(guardsIntact(loadedResponses, 4 * kSources));
    runSql(cacheFile(1), "ALTER TABLE XX ADD COLUMN C Single; UPDATE XX SET C = 5;");
    ASSERT_EQ(load(5, loadedXYZ, loadedResponses), 0);
    EXPECT_TRUE(guardsIntact(loadedXYZ, 3 * kSources));

    // More rows than sources: the load fails without writing past N.
    runSql(cacheFile(1), "INSERT INTO RR VALUES (1, 2, 3, 4, 5);");
    EXPECT_EQ(load(5, loadedXYZ, loadedResponses), SQLITE_ABORT);
    EXPECT_TRUE(guardsIntact(loadedResponses, 5 * kSources));

    // Fewer rows than sources: the load fails too.
    runSql(cacheFile(1), "DELETE FROM RR WHERE rowid > 2;");
    EXPECT_EQ(load(5, loadedXYZ, loadedResponses), SQLITE_CORRUPT);
}

TEST_F(SmallDBTest, CacheWrittenByHandInTheFileFormatLoads)
{
    std::filesystem::create_directories(roots_.cacheDir());
    runSql(cacheFile(1), "PRAGMA journal_mode=WAL;"
                         "CREATE TABLE RR (R Single, G Single, B Single, C Single);"
                         "INSERT INTO RR VALUES (1.000000, 2.000000, 3.000000, 4.000000);"
                         "INSERT INTO RR VALUES (5.000000, 6.000000, 7.000000, 8.000000);"
                         "INSERT INTO RR VALUES (9.000000, 10.000000, 11.000000, 12.500000);"
                         "CREATE TABLE XX (X Single, Y Single, Z Single);"
                         "INSERT INTO XX VALUES (0.100000, 0.200000, 0.300000);"
                         "INSERT INTO XX VALUES (0.400000, 0.500000, 0.600000);"
                         "INSERT INTO XX VALUES (0.700000, 0.800000, 0.900000);"
                         "CREATE TABLE Info (version Single, smallversion Single, sources Long, orientation Long, "
                         "algo Long, chipID Unsigned Integer);"
                         "INSERT INTO Info VALUES (1.100000, 1.300000, 3, 1, 7, -2);");
    LDBMInfo info;
    ASSERT_TRUE(valid(1.3f, &info));
    EXPECT_EQ(info.algo, 7);
    EXPECT_EQ(info.chipID, 0xFFFFFFFEu);
    std::vector<float> loadedXYZ, loadedResponses;
    ASSERT_EQ(load(4, loadedXYZ, loadedResponses), 0);
    EXPECT_FLOAT_EQ(loadedResponses[2 * kSources + 2], 11.0f); // row 2, B
    EXPECT_FLOAT_EQ(loadedResponses[3 * kSources + 2], 12.5f); // row 2, C
    EXPECT_FLOAT_EQ(loadedXYZ[kSources + 1], 0.5f);            // row 1, Y
}

TEST_F(SmallDBTest, CommaDecimalLocaleReadsAndWritesTheSameFile)
{
    locale_t comma = ldbtest::commaDecimalLocale();
    if (!comma)
        GTEST_SKIP() << "no locale with a decimal comma on this machine";
    std::vector<float> loadedXYZ, loadedResponses;
    {
        ldbtest::ThreadLocale scope(comma);
        LDBMInfo info;
        ASSERT_TRUE(!valid(1.3f, &info));
        EXPECT_FLOAT_EQ(info.version, 1.1f) << "reference Info under a decimal comma";
        ASSERT_EQ(create(), 0);
        ASSERT_TRUE(valid(1.3f));
        ASSERT_EQ(load(5, loadedXYZ, loadedResponses), 0);
        expectPrinted(loadedResponses, responses, responses.size());
    }
    EXPECT_EQ(queryColumn(cacheFile(1), "SELECT typeof(version) || ' ' || version FROM Info"),
              std::vector<std::string>{"real 1.1"});
    // Written under a decimal comma, read under "C", and the other way round.
    ASSERT_TRUE(valid(1.3f));
    ASSERT_EQ(load(5, loadedXYZ, loadedResponses), 0);
    expectPrinted(loadedXYZ, xyz, xyz.size());
    ASSERT_EQ(create(), 0);
    ldbtest::ThreadLocale scope(comma);
    EXPECT_TRUE(valid(1.3f));
}
