// A reference file whose Info claims an absurd number of sources (found by
// fuzzing: 200 million made the plug-in allocate and clear gigabytes before
// the scan could notice that the rows are not there) is refused as corrupt.
#include "LightDbFiles.h"
#include "PlugInHolder.h"

#include "lightdb/LDBM.h"

#include <sqlite3.h>

namespace {

class ReferenceSizeTest : public ldbtest::LightDbTest {
protected:
    void writeClaiming(int sources)
    {
        std::filesystem::remove(bigDB());
        ldbtest::writeReference(bigDB(), "1.5", sources, {{0, 1.0f, 1.0f, 1.0f, {1.0f, 2.0f}}});
    }

    ldbtest::PlugInHolder plugin;
};

TEST_F(ReferenceSizeTest, MoreSourcesThanADatabaseCanHoldIsCorrupt)
{
    for (int sources : {LDBMMaxSources + 1, 200000000}) {
        writeClaiming(sources);
        LDBMInfo info;
        bool valid = true;
        EXPECT_EQ(LDBMInitialize(1, &info, &valid, BigDBTypeDefault, 1.1f), SQLITE_CORRUPT) << sources;
        EXPECT_FALSE(valid);
        EXPECT_EQ(info.sources, 0) << "the caller's Info stays as it was";

        SpectralDatabase db;
        EXPECT_FALSE(plugin->processCachedDB(5, BigDBTypeDefault, db));
        EXPECT_TRUE(db.dbXYZ.empty());
        EXPECT_TRUE(db.dbChannelResponses.empty());
    }
}

TEST_F(ReferenceSizeTest, TheLargestAllowedCountIsRead)
{
    writeClaiming(LDBMMaxSources);
    LDBMInfo info;
    bool valid = true;
    EXPECT_EQ(LDBMInitialize(1, &info, &valid, BigDBTypeDefault, 1.1f), 0);
    EXPECT_EQ(info.sources, LDBMMaxSources);
}

} // namespace
