// The reference database files as the plug-in reads them: every value as text
// from sqlite3_exec, converted with atof.
#include "spectra/Colorimetry.h"
#include "spectra/ReferenceDatabase.h"

#include "support/TestSupport.h"

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <string>
#include <vector>

using namespace spectra;

namespace {

using Row = std::map<std::string, std::string>;

std::vector<Row> selectAll(const std::string& path, const std::string& sql)
{
    sqlite3* db = nullptr;
    EXPECT_EQ(sqlite3_open_v2(path.c_str(), &db, SQLITE_OPEN_READONLY, nullptr), SQLITE_OK);
    std::vector<Row> rows;
    const auto collect = [](void* out, int n, char** values, char** names) {
        Row row;
        for (int i = 0; i < n; ++i) row[names[i]] = values[i] ? values[i] : "NULL";
        static_cast<std::vector<Row>*>(out)->push_back(std::move(row));
        return 0;
    };
    EXPECT_EQ(sqlite3_exec(db, sql.c_str(), collect, &rows, nullptr), SQLITE_OK);
    sqlite3_close(db);
    return rows;
}

std::string bytesOf(const std::filesystem::path& p)
{
    std::ifstream in(p, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), {});
}

float asRead(const std::string& text) { return float(std::atof(text.c_str())); }

} // namespace

TEST(ReferenceDatabase, HoldsEverySourceInTheFormatThePlugInReads)
{
    vt::TempDir dir;
    const std::string path = (dir.path() / "bzlight.sqlite").string();
    const std::vector<const Source*> sources = referenceSources(ReferenceSet::Default);
    writeReferenceDatabase(path, 1.0f, sources);

    const std::vector<Row> info = selectAll(path, "SELECT * FROM Info");
    ASSERT_EQ(info.size(), 1u);
    EXPECT_EQ(asRead(info[0].at("version")), 1.0f);
    EXPECT_EQ(std::atoi(info[0].at("sources").c_str()), int(sources.size()));

    const std::vector<Row> rows = selectAll(path, "SELECT * FROM Spectra");
    ASSERT_EQ(rows.size(), sources.size());
    ASSERT_LE(rows.size(), kMaxReferenceSources);
    for (size_t r = 0; r < rows.size(); ++r) {
        const Row& row = rows[r];
        ASSERT_EQ(row.size(), 405u);
        const int id = std::atoi(row.at("ID").c_str());
        ASSERT_EQ(id, int(r)) << "IDs run 0..N-1 in set order";
        const Spectrum& s = sources[size_t(id)]->spectrum;
        const Xyz xyz = tristimulus(s);
        EXPECT_EQ(asRead(row.at("X")), float(xyz.X));
        EXPECT_EQ(asRead(row.at("Y")), float(kReferenceLux));
        EXPECT_EQ(asRead(row.at("Z")), float(xyz.Z));
        for (int i = 0; i < kSamples; ++i)
            ASSERT_EQ(asRead(row.at("S" + std::to_string(i))), float(s[size_t(i)])) << sources[size_t(id)]->name << " " << i;
    }
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
    for (const auto& entry : std::filesystem::directory_iterator(dir.path())) files.push_back(entry.path().filename());
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
