// The reference database files: read back through the plug-in's own reader,
// reproducible, bounded, and naming their sources for the tools.
#include "spectra/Colorimetry.h"
#include "spectra/ReferenceDatabase.h"

#include "common/TestSupport.h"
#include "lightdb/LDBM.h"

#include <VantishPlatform/Paths.h>
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
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
    const Xyz expected = tristimulus(s);
    if (sampleCount != kSamples || xyz[0] != float(expected.X) || xyz[1] != float(kReferenceLux) ||
        xyz[2] != float(expected.Z))
        ++c.mismatches;
    for (int i = 0; i < sampleCount; ++i)
        if (spectrum[i] != float(s[size_t(i)]))
            ++c.mismatches;
    return 0;
}

std::string bytesOf(const std::filesystem::path& p)
{
    std::ifstream in(p, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), {});
}

} // namespace

TEST(ReferenceDatabase, ThePlugInReadsBothShippedFilesCompletely)
{
    vt::TempDir root;
    std::filesystem::create_directories(root.path() / "Vantish.plugin");
    VPSetPathRoot("/System/Library/HIDPlugins", root.str());

    for (const ReferenceFile& file : kReferenceFiles) {
        SCOPED_TRACE(file.fileName);
        const BigDBType type = file.set == ReferenceSet::Default ? BigDBTypeDefault : BigDBType02;
        Consumed consumed{referenceSources(file.set)};
        ASSERT_LE(consumed.expected.size(), kMaxReferenceSources);
        writeReferenceDatabase(VPMapPath(LDBMBigDBPath(type)), file.version, consumed.expected);

        LDBMInfo info;
        sqlite3* db = nullptr;
        ASSERT_EQ(sqlite3_open_v2(VPMapPath(LDBMBigDBPath(type)).c_str(), &db, SQLITE_OPEN_READONLY, nullptr),
                  SQLITE_OK);
        EXPECT_EQ(sqlite3_exec(db, "SELECT * FROM Info", LDBMReadInfoRow, &info, nullptr), SQLITE_OK);
        sqlite3_close(db);
        EXPECT_EQ(info.version, file.version);
        EXPECT_EQ(size_t(info.sources), consumed.expected.size());

        EXPECT_EQ(LDBMParseBigDB(&info, check, &consumed, type), LDBMResult::Ok);
        EXPECT_EQ(consumed.rows, consumed.expected.size());
        EXPECT_EQ(consumed.mismatches, 0u);
    }
    VPClearPathRoots();
}

TEST(ReferenceDatabase, IsReproducibleAndLeavesNoSideFiles)
{
    vt::TempDir dir;
    const std::vector<const Source*> sources = referenceSources(ReferenceSet::Dense02);
    writeReferenceDatabase((dir.path() / "a.sqlite").string(), 2.0f, sources);
    writeReferenceDatabase((dir.path() / "b.sqlite").string(), 2.0f, sources);
    writeReferenceDatabase((dir.path() / "b.sqlite").string(), 2.0f, sources); // replaces
    EXPECT_EQ(bytesOf(dir.path() / "a.sqlite"), bytesOf(dir.path() / "b.sqlite"));

    std::vector<std::string> files;
    for (const auto& entry : std::filesystem::directory_iterator(dir.path()))
        files.push_back(entry.path().filename());
    std::sort(files.begin(), files.end());
    EXPECT_EQ(files, (std::vector<std::string>{"a.sqlite", "b.sqlite"}));
}

TEST(ReferenceDatabase, RefusesMoreSourcesThanAPerChipDatabaseHolds)
{
    vt::TempDir dir;
    const std::vector<const Source*> tooMany(kMaxReferenceSources + 1, &catalogue().front());
    EXPECT_THROW(writeReferenceDatabase((dir.path() / "x.sqlite").string(), 1.0f, tooMany), std::invalid_argument);
    EXPECT_FALSE(std::filesystem::exists(dir.path() / "x.sqlite"));
}

TEST(ReferenceDatabase, EverySourceIsNamedInIdOrder)
{
    vt::TempDir dir;
    const std::string path = (dir.path() / "small.sqlite").string();
    writeReferenceDatabase(path, 1.0f, {findSource("planck-2856K"), findSource("cie-f11"), findSource("lps")});

    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open_v2(path.c_str(), &db, SQLITE_OPEN_READONLY, nullptr), SQLITE_OK);
    std::vector<std::string> rows;
    const auto collect = [](void* out, int, char** values, char**) {
        static_cast<std::vector<std::string>*>(out)->push_back(std::string(values[0]) + ":" + values[1]);
        return 0;
    };
    EXPECT_EQ(sqlite3_exec(db, "SELECT ID, name FROM Names ORDER BY ID", collect, &rows, nullptr), SQLITE_OK);
    sqlite3_close(db);
    EXPECT_EQ(rows, (std::vector<std::string>{"0:planck-2856K", "1:cie-f11", "2:lps"}));
}
