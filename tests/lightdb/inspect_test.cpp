#include "LightDbFiles.h"

#include "lightdb/Inspect.h"
#include "lightdb/LDBM.h"

#include <sqlite3.h>

#include <fstream>

using ldbtest::runSql;

namespace {
class InspectTest : public ldbtest::LightDbTest {};
} // namespace

TEST_F(InspectTest, ReferenceFileWithNames)
{
    runSql(bigDB(), "CREATE TABLE Info (version REAL, sources INTEGER, columns INTEGER, samples INTEGER);"
                    "INSERT INTO Info VALUES (2.0, 3, 7, 3);"
                    "CREATE TABLE Spectra (ID INTEGER, X REAL, Y REAL, Z REAL, S10 REAL, S2 REAL, S0 REAL);"
                    "INSERT INTO Spectra VALUES (0, 1, 1, 1, 1, 1, 1), (1, 1, 1, 1, 1, 1, 1), (2, 1, 1, 1, 1, 1, 1);"
                    "CREATE TABLE Names (ID INTEGER, name TEXT);"
                    "INSERT INTO Names VALUES (0, 'planck-2856K'), (1, 'led-450-555-115-5000K'), (2, 'planck-6500K');");
    LDBMFileSummary s;
    ASSERT_EQ(LDBMInspect(bigDB().string(), s), 0);
    EXPECT_EQ(s.kind, LDBMFileSummary::Kind::Reference);
    EXPECT_TRUE(s.hasInfo);
    EXPECT_FLOAT_EQ(s.info.version, 2.0f);
    EXPECT_EQ(s.info.sources, 3);
    EXPECT_EQ(s.rows, 3);
    EXPECT_EQ(s.columns, (std::vector<std::string>{"S0", "S2", "S10"}));
    EXPECT_TRUE(s.hasNames);
    EXPECT_EQ(s.namePrefixes, (std::vector<std::string>{"led", "planck"}));
}

TEST_F(InspectTest, CacheFileWithoutNamesAndFailures)
{
    ldbtest::writeReference(bigDB(), "1.1", 2, {{0, 1, 1, 1, {1.0f}}, {1, 1, 1, 1, {1.0f}}});
    LDBMFileSummary s;
    ASSERT_EQ(LDBMInspect(bigDB().string(), s), 0);
    EXPECT_FALSE(s.hasNames);
    EXPECT_EQ(s.columns, std::vector<std::string>{"L0"});

    const LDBMInfo info{1.1f, 2, -1, -1.0f, 0};
    const std::vector<float> xyz(6, 1.0f), responses(8, 2.0f);
    ASSERT_EQ(LDBMCreateSmallDB(&info, xyz.data(), responses.data(), 2, 3, 4, 0, 1.1f), LDBMResult::Ok);
    const auto cache = cacheFile(2);
    const auto before = std::filesystem::last_write_time(cache);
    ASSERT_EQ(LDBMInspect(cache.string(), s), 0);
    EXPECT_EQ(s.kind, LDBMFileSummary::Kind::Cache);
    EXPECT_EQ(s.info.algo, 3);
    EXPECT_EQ(s.info.chipID, 0u);
    EXPECT_EQ(s.rows, 2);
    EXPECT_EQ(s.columns, (std::vector<std::string>{"R", "G", "B", "C"}));
    EXPECT_EQ(std::filesystem::last_write_time(cache), before);

    EXPECT_EQ(LDBMInspect((system_.path() / "none.sqlite").string(), s), SQLITE_CANTOPEN);
    std::ofstream(system_.path() / "text.sqlite") << "this is not a database, only some text that is long enough";
    EXPECT_NE(LDBMInspect((system_.path() / "text.sqlite").string(), s), 0);
    EXPECT_EQ(LDBMNamePrefix("cie-a"), "cie");
    EXPECT_EQ(LDBMNamePrefix("lps"), "lps");
}
