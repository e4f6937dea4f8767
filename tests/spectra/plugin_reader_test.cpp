// The generated files read through the plug-in's own reference-database reader.
#include "spectra/Colorimetry.h"
#include "spectra/ReferenceDatabase.h"

#include "lightdb/LDBM.h"
#include "support/TestSupport.h"

#include <VantishPlatform/Paths.h>
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <filesystem>
#include <vector>

using namespace spectra;

namespace {

struct Consumed {
    std::vector<const Source*> expected;
    size_t rows = 0;
    size_t mismatches = 0;
};

int check(void* context, int id, float* xyz, float* spectrum, int sampleCount)
{
    auto& c = *static_cast<Consumed*>(context);
    ++c.rows;
    const Spectrum& s = c.expected.at(size_t(id))->spectrum;
    if (sampleCount != kSamples || xyz[1] != float(kReferenceLux) || xyz[0] != float(tristimulus(s).X)) ++c.mismatches;
    for (int i = 0; i < sampleCount; ++i)
        if (spectrum[i] != float(s[size_t(i)])) ++c.mismatches;
    return 0;
}

} // namespace

TEST(PlugInReader, ParsesBothShippedFilesCompletely)
{
    vt::TempDir root;
    std::filesystem::create_directories(root.path() / "Vantish.plugin");
    VPSetPathRoot("/System/Library/HIDPlugins", root.str());

    for (const ReferenceFile& file : kReferenceFiles) {
        const BigDBType type = file.set == ReferenceSet::Default ? BigDBTypeDefault : BigDBType02;
        Consumed consumed{referenceSources(file.set)};
        writeReferenceDatabase(VPMapPath(LDBMBigDBPath(type)), file.version, consumed.expected);

        LDBMInfo info;
        sqlite3* db = nullptr;
        ASSERT_EQ(sqlite3_open_v2(VPMapPath(LDBMBigDBPath(type)).c_str(), &db, SQLITE_OPEN_READONLY, nullptr), SQLITE_OK);
        EXPECT_EQ(sqlite3_exec(db, "SELECT * FROM Info", LDBMReadInfoRow, &info, nullptr), SQLITE_OK);
        sqlite3_close(db);
        EXPECT_EQ(info.version, file.version) << file.fileName;
        EXPECT_EQ(size_t(info.sources), consumed.expected.size());

        EXPECT_EQ(LDBMParseBigDB(&info, check, &consumed, type), 0) << file.fileName;
        EXPECT_EQ(consumed.rows, consumed.expected.size());
        EXPECT_EQ(consumed.mismatches, 0u);
    }
    VPClearPathRoots();
}
