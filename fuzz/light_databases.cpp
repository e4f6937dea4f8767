// The reference and cache databases with hostile contents: corrupted SQLite
// files and well-formed files with hostile tables and rows, through
// LDBMInitialize, processCachedDB (which reads the cache with
// LDBMParseSmallDB), LDBMParseBigDB with ProgressCallback folding the rows
// into a per-chip database, and LDBMCreateSmallDB writing its cache, which is
// then read back.
//
// Input: byte 0 = bits 0-2 channel count, bit 3 the second reference file,
// bits 4-5 the per-chip version expected (1.1, 1.2, 1.3, 0), bit 6 the plug-in
// has a chip ID, bit 7 orientation 3 instead of 1. Then lines of text:
//   @ref | @ref2 | @cache        the tables that follow make up that file
//   T name column...             a table (identifiers as given, any text)
//   R value...                   a row of the table before ("N" is NULL)
//   @rawref | @rawref2 | @rawcache
//                                the rest of the input is that file's bytes
// Files not named keep the workspace's reference databases (6 sources of 16
// samples) and no cache.
// Values are bound as text, so every statement stays a plain insert.
#include "common/FuzzSupport.h"

#include "lightdb/CachedDB.h"
#include "lightdb/LDBM.h"

#include <VantishPlatform/Paths.h>

#include <sqlite3.h>

#include <filesystem>
#include <memory>
#include <set>
#include <sstream>
#include <string>
#include <vector>

namespace fs = std::filesystem;

namespace {

constexpr float kSmallVersions[] = {1.1f, 1.2f, 1.3f, 0.0f};
// Reference files of few sample columns: SQLite parses a file's schema on
// every open, and a 405-column table would cost more than the rest of an input.
constexpr int kDefaultSamples = 16;

struct Options {
    int channels;
    BigDBType type;
    float smallVersion;
    uint32_t chipId;
    int orientation;
};

std::string sqlIdentifier(const std::string& identifier)
{
    std::string out = "\"";
    for (char c : identifier)
        out += c == '"' ? std::string("\"\"") : std::string(1, c);
    return out + "\"";
}

std::vector<std::string> words(const std::string& line)
{
    std::vector<std::string> out;
    std::istringstream in(line);
    for (std::string word; in >> word;)
        out.push_back(word);
    return out;
}

// Builds a database file from T and R lines. Statements that SQLite refuses
// (a duplicate column, a row for a table that failed) are skipped.
class TableWriter {
public:
    explicit TableWriter(const fs::path& file)
    {
        sqlite3_open(file.c_str(), &db_);
        // A fuzzed statement never reaches other files.
        sqlite3_limit(db_, SQLITE_LIMIT_ATTACHED, 0);
        sqlite3_exec(db_, "PRAGMA journal_mode=OFF; PRAGMA synchronous=OFF", nullptr, nullptr, nullptr);
    }
    ~TableWriter() { sqlite3_close(db_); }
    TableWriter(const TableWriter&) = delete;
    TableWriter& operator=(const TableWriter&) = delete;

    void line(const std::vector<std::string>& w)
    {
        if (w[0] == "T" && w.size() >= 2) {
            table_ = w[1];
            columns_ = w.size() - 2;
            std::string sql = "CREATE TABLE " + sqlIdentifier(table_) + " (";
            for (size_t i = 2; i < w.size(); ++i)
                sql += (i > 2 ? ", " : "") + sqlIdentifier(w[i]);
            sqlite3_exec(db_, (sql + ")").c_str(), nullptr, nullptr, nullptr);
        } else if (w[0] == "R" && !table_.empty() && columns_ > 0) {
            insert(std::vector<std::string>(w.begin() + 1, w.end()));
        }
    }

private:
    void insert(const std::vector<std::string>& values)
    {
        std::string sql = "INSERT INTO " + sqlIdentifier(table_) + " VALUES (";
        for (size_t i = 0; i < columns_; ++i)
            sql += i ? ", ?" : "?";
        sqlite3_stmt* statement = nullptr;
        if (sqlite3_prepare_v2(db_, (sql + ")").c_str(), -1, &statement, nullptr) != SQLITE_OK)
            return;
        for (size_t i = 0; i < columns_ && i < values.size(); ++i)
            if (values[i] != "N")
                sqlite3_bind_text(statement, int(i + 1), values[i].c_str(), -1, SQLITE_TRANSIENT);
        sqlite3_step(statement);
        sqlite3_finalize(statement);
    }

    sqlite3* db_ = nullptr;
    std::string table_;
    size_t columns_ = 0;
};

fs::path fileNamed(const std::string& name, const Options& o)
{
    const fz::Workspace& w = fz::Workspace::get();
    if (name == "ref")
        return w.referenceFile(BigDBTypeDefault);
    if (name == "ref2")
        return w.referenceFile(BigDBType02);
    if (name == "cache")
        return VPMapPath(LDBMSmallDBPath(o.orientation));
    return {};
}

void removeDatabase(const fs::path& file)
{
    std::error_code ec;
    for (const char* suffix : {"", "-wal", "-shm", "-journal"})
        fs::remove(file.string() + suffix, ec);
}

// Writes the files the input describes; returns the reference files it replaced.
std::set<fs::path> writeFiles(std::span<const uint8_t> text, const Options& o)
{
    const fs::path cache = fileNamed("cache", o);
    std::set<fs::path> replaced;
    std::unique_ptr<TableWriter> writer;
    size_t at = 0;
    while (at < text.size()) {
        size_t end = at;
        while (end < text.size() && text[end] != '\n')
            ++end;
        const std::string line(text.begin() + long(at), text.begin() + long(end));
        at = end + 1;
        if (line.rfind('@', 0) == 0) {
            const bool raw = line.rfind("@raw", 0) == 0;
            const fs::path file = fileNamed(line.substr(raw ? 4 : 1), o);
            writer.reset();
            if (file.empty())
                continue;
            if (file != cache)
                replaced.insert(file);
            removeDatabase(file);
            fs::create_directories(file.parent_path());
            if (raw) {
                fz::writeFile(file, text.subspan(std::min(at, text.size())));
                break;
            }
            writer = std::make_unique<TableWriter>(file);
        } else if (writer) {
            if (const auto w = words(line); !w.empty())
                writer->line(w);
        }
    }
    return replaced;
}

// Channel spectra as the calibration code hands them over: 401 samples.
Matrices spectraFor(SpectralDatabase& db, int channels)
{
    Matrices m;
    m.bindOutputs(db);
    m.nChannels = channels;
    m.firstChannel = 0;
    m.channelSpectra.resize(size_t(401) * size_t(channels));
    for (size_t i = 0; i < m.channelSpectra.size(); ++i)
        m.channelSpectra[i] = int32_t(100 + (i * 37) % 900);
    m.channelWeights.assign(size_t(channels), 1.0f);
    return m;
}

void run(const Options& o)
{
    LDBMInfo info;
    bool valid = false;
    LDBMInitialize(o.orientation, &info, &valid, o.type, o.smallVersion);

    const CacheKey key{o.orientation, o.smallVersion, o.chipId};
    SpectralDatabase db;
    if (processCachedDB(key, o.channels, o.type, db))
        return;
    if (db.dbSampleCount == 0 || db.dbChannelCount != uint32_t(o.channels))
        return;
    Matrices m = spectraFor(db, o.channels);
    if (LDBMParseBigDB(&db.dbInfo, ProgressCallback, &m, o.type) != LDBMResult::Ok)
        return;
    if (LDBMCreateSmallDB(&db.dbInfo, db.dbXYZ.data(), db.dbChannelResponses.data(), o.orientation, 3, o.channels,
                          o.chipId, o.smallVersion) != LDBMResult::Ok)
        return;
    SpectralDatabase cached;
    processCachedDB(key, o.channels, o.type, cached);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    const fz::Workspace& workspace = fz::Workspace::get();
    workspace.clear();
    fz::Input input(data, size);
    const uint8_t flags = input.take<uint8_t>();
    const Options options{.channels = 1 + (flags & 7) % 6,
                          .type = (flags & 8) ? BigDBType02 : BigDBTypeDefault,
                          .smallVersion = kSmallVersions[(flags >> 4) & 3],
                          .chipId = (flags & 0x40) ? fz::kChipId : 0u,
                          .orientation = (flags & 0x80) ? 3 : 1};

    const std::set<fs::path> replaced = writeFiles(input.rest(), options);
    run(options);
    for (const fs::path& file : replaced)
        fz::writeReferenceDatabase(file, fz::kReferenceSources, kDefaultSamples);
    return 0;
}

extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    const fz::Workspace& workspace = fz::Workspace::get();
    for (BigDBType type : {BigDBTypeDefault, BigDBType02})
        fz::writeReferenceDatabase(workspace.referenceFile(type), fz::kReferenceSources, kDefaultSamples);
    return 0;
}
