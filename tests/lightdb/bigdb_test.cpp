#include "LightDbFiles.h"
#include "lightdb/CachedDB.h"

#include "lightdb/LDBM.h"

#include <sqlite3.h>

#include <array>

using ldbtest::LightDbTest;
using ldbtest::runSql;

namespace {

struct Recorder {
    std::vector<int> ids;
    std::vector<std::array<float, 3>> xyz;
    std::vector<std::vector<float>> spectra;
};

int record(void* context, int id, float* xyz, float* spectrum, int sampleCount)
{
    auto& r = *static_cast<Recorder*>(context);
    r.ids.push_back(id);
    r.xyz.push_back({xyz[0], xyz[1], xyz[2]});
    r.spectra.emplace_back(spectrum, spectrum + sampleCount);
    return 0;
}

LDBMInfo withSources(int n)
{
    LDBMInfo info;
    info.sources = n;
    return info;
}

std::vector<ldbtest::Spectrum> rowsWithIds(const std::vector<int>& ids)
{
    std::vector<ldbtest::Spectrum> rows;
    for (int id : ids)
        rows.push_back({id, 1.0f, 2.0f, 3.0f, {0.5f, 0.25f}});
    return rows;
}

class BigDBTest : public LightDbTest {};

} // namespace

TEST_F(BigDBTest, InfoRowIgnoresUnknownColumnsNullsAndLastRowWins)
{
    runSql(bigDB(), "CREATE TABLE Info (version REAL, sources INTEGER, columns INTEGER, samples INTEGER, note TEXT);"
                    "INSERT INTO Info VALUES (1.5, 7, 405, 401, 'first');"
                    "INSERT INTO Info VALUES (2.25, NULL, 9, 9, 'second');");
    LDBMInfo info;
    info.sources = 99;
    bool valid = true;
    ASSERT_EQ(LDBMInitialize(1, &info, &valid, BigDBTypeDefault, 1.1f), LDBMResult::Ok);
    EXPECT_FALSE(valid);
    EXPECT_FLOAT_EQ(info.version, 2.25f);
    EXPECT_EQ(info.sources, 7); // the second row's NULL keeps the first row's value
    EXPECT_EQ(info.algo, -1);
    EXPECT_FLOAT_EQ(info.smallVersion, -1.0f);
    EXPECT_EQ(info.chipID, 0u);
}

TEST_F(BigDBTest, EveryIdMustAppearExactlyOnce)
{
    struct Case {
        std::vector<int> ids;
        int sources;
        int result;
        std::vector<int> consumed;
    };
    const Case cases[] = {
        {{0, 1, 2}, 3, 0, {0, 1, 2}},
        {{2, 0, 1}, 3, 0, {2, 0, 1}},
        {{0, 1}, 3, -1, {0, 1}},
        {{1, 1, 1}, 3, -1, {1}},       // same sum as 0, 1, 2: stopped at the repeat
        {{0, 2, 2, 1}, 3, -1, {0, 2}}, // duplicate even though every ID occurs
        {{0, 5, 1, 2}, 3, -1, {0}},    // out of range stops the scan at that row
        {{}, 0, 0, {}},
        {{0}, 0, SQLITE_ABORT, {}},
    };
    for (const auto& c : cases) {
        std::filesystem::remove(bigDB());
        ldbtest::writeReference(bigDB(), "1.0", c.sources, rowsWithIds(c.ids));
        Recorder r;
        const LDBMInfo info = withSources(c.sources);
        EXPECT_EQ(LDBMCode(LDBMParseBigDB(&info, record, &r, BigDBTypeDefault)), c.result)
            << ::testing::PrintToString(c.ids);
        EXPECT_EQ(r.ids, c.consumed) << ::testing::PrintToString(c.ids);
    }
}

TEST_F(BigDBTest, RowsOutsideTheFormatStopTheScan)
{
    const char* tables[] = {
        // the second row has no ID
        "CREATE TABLE Spectra (ID INTEGER, X REAL, Y REAL, Z REAL, L0 REAL);"
        "INSERT INTO Spectra VALUES (0, 1, 1, 1, 1), (NULL, 1, 1, 1, 1), (1, 1, 1, 1, 1);",
        // no Y column
        "CREATE TABLE Spectra (ID INTEGER, X REAL, Z REAL, L0 REAL, L1 REAL);"
        "INSERT INTO Spectra VALUES (0, 1, 1, 1, 1), (1, 1, 1, 1, 1);",
        // a NULL tristimulus value
        "CREATE TABLE Spectra (ID INTEGER, X REAL, Y REAL, Z REAL, L0 REAL);"
        "INSERT INTO Spectra VALUES (0, 1, 1, 1, 1), (1, 1, NULL, 1, 1);",
        // sample index 5 in a two-sample row
        "CREATE TABLE Spectra (ID INTEGER, X REAL, Y REAL, Z REAL, L0 REAL, L5 REAL);"
        "INSERT INTO Spectra VALUES (0, 1, 1, 1, 1, 1), (1, 1, 1, 1, 1, 1);",
        // two columns for sample 0, none for sample 1
        "CREATE TABLE Spectra (ID INTEGER, X REAL, Y REAL, Z REAL, L0 REAL, M0 REAL);"
        "INSERT INTO Spectra VALUES (0, 1, 1, 1, 1, 1), (1, 1, 1, 1, 1, 1);",
        // a NULL sample leaves its slot unset
        "CREATE TABLE Spectra (ID INTEGER, X REAL, Y REAL, Z REAL, L0 REAL, L1 REAL);"
        "INSERT INTO Spectra VALUES (0, 1, 1, 1, 1, 1), (1, 1, 1, 1, NULL, 1);",
    };
    for (const char* table : tables) {
        std::filesystem::remove(bigDB());
        runSql(bigDB(), table);
        Recorder r;
        const LDBMInfo info = withSources(2);
        EXPECT_EQ(LDBMParseBigDB(&info, record, &r, BigDBTypeDefault), LDBMResult::BadSourceIDs) << table;
        EXPECT_LE(r.ids.size(), 1u) << table;
    }
}

TEST_F(BigDBTest, SampleColumnsLandInTheSlotTheirNameGives)
{
    runSql(bigDB(), "CREATE TABLE Spectra (L2 REAL, ID INTEGER, Z REAL, L0 REAL, X REAL, L1 REAL, Y REAL);"
                    "INSERT INTO Spectra VALUES (0.3, 0, 30, 0.1, 10, 0.2, 20);");
    Recorder r;
    const LDBMInfo info = withSources(1);
    ASSERT_EQ(LDBMParseBigDB(&info, record, &r, BigDBTypeDefault), LDBMResult::Ok);
    ASSERT_EQ(r.ids.size(), 1u);
    EXPECT_EQ(r.xyz[0], (std::array<float, 3>{10.0f, 20.0f, 30.0f}));
    EXPECT_EQ(r.spectra[0], (std::vector<float>{0.1f, 0.2f, 0.3f}));
}

TEST_F(BigDBTest, TypeSelectsTheReferenceFile)
{
    EXPECT_STREQ(LDBMBigDBPath(BigDBTypeDefault), "/System/Library/HIDPlugins/Vantish.plugin/bzlight.sqlite");
    EXPECT_STREQ(LDBMBigDBPath(BigDBType02), "/System/Library/HIDPlugins/Vantish.plugin/bzlight-02.sqlite");
    EXPECT_EQ(LDBMSmallDBPath(3), "/var/mobile/Library/Brenzel/bzrgbc_3.sqlite");

    ldbtest::writeReference(bigDB("bzlight.sqlite"), "1.0", 1, {{0, 1.0f, 0.0f, 0.0f, {1.0f}}});
    ldbtest::writeReference(bigDB("bzlight-02.sqlite"), "2.0", 1, {{0, 2.0f, 0.0f, 0.0f, {1.0f}}});
    for (int type : {0, 1, 2}) {
        LDBMInfo info;
        bool valid = false;
        ASSERT_EQ(LDBMInitialize(1, &info, &valid, BigDBType(type), 1.1f), LDBMResult::Ok);
        Recorder r;
        ASSERT_EQ(LDBMParseBigDB(&info, record, &r, BigDBType(type)), LDBMResult::Ok);
        const float expected = type == 0 ? 1.0f : 2.0f;
        EXPECT_FLOAT_EQ(info.version, expected) << type;
        EXPECT_FLOAT_EQ(r.xyz.at(0)[0], expected) << type;
    }
}

TEST_F(BigDBTest, MissingReferenceFileCallsNothing)
{
    Recorder r;
    const LDBMInfo info = withSources(1);
    EXPECT_EQ(LDBMParseBigDB(&info, record, &r, BigDBTypeDefault), LDBMResult(SQLITE_CANTOPEN));
    EXPECT_TRUE(r.ids.empty());
    LDBMInfo out;
    bool valid = true;
    EXPECT_EQ(LDBMInitialize(1, &out, &valid, BigDBTypeDefault, 1.1f), LDBMResult(SQLITE_CANTOPEN));
    EXPECT_FALSE(valid);
}

// An Info claiming an absurd number of sources (found by fuzzing: 200 million
// made the plug-in allocate and clear gigabytes before the scan could notice
// that the rows are not there) is refused as corrupt.
TEST_F(BigDBTest, MoreSourcesThanADatabaseCanHoldIsCorrupt)
{
    const CacheKey key;
    for (int sources : {LDBMMaxSources, LDBMMaxSources + 1, 200000000}) {
        SCOPED_TRACE(sources);
        std::filesystem::remove(bigDB());
        ldbtest::writeReference(bigDB(), "1.5", sources, {{0, 1.0f, 1.0f, 1.0f, {1.0f, 2.0f}}});
        LDBMInfo info;
        bool valid = true;
        const bool tooMany = sources > LDBMMaxSources;
        EXPECT_EQ(LDBMCode(LDBMInitialize(1, &info, &valid, BigDBTypeDefault, 1.1f)), tooMany ? SQLITE_CORRUPT : 0);
        // A refused Info leaves the caller's as it was.
        EXPECT_EQ(info.sources, tooMany ? 0 : LDBMMaxSources);
        if (!tooMany)
            continue;
        EXPECT_FALSE(valid);

        SpectralDatabase db;
        EXPECT_FALSE(processCachedDB(key, 5, BigDBTypeDefault, db));
        EXPECT_TRUE(db.dbXYZ.empty() && db.dbChannelResponses.empty());
    }
}
