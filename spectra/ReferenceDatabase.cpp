#include "spectra/ReferenceDatabase.h"

#include "spectra/Colorimetry.h"

#include <sqlite3.h>

#include <filesystem>
#include <memory>
#include <stdexcept>

namespace spectra {

namespace {

constexpr int kLeadingColumns = 4; // ID, X, Y, Z

struct Closer {
    void operator()(sqlite3* db) const { sqlite3_close(db); }
    void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Connection = std::unique_ptr<sqlite3, Closer>;
using Statement = std::unique_ptr<sqlite3_stmt, Closer>;

void check(sqlite3* db, int code, const char* what)
{
    if (code != SQLITE_OK && code != SQLITE_DONE && code != SQLITE_ROW)
        throw std::runtime_error(std::string(what) + ": " + sqlite3_errmsg(db));
}

void exec(sqlite3* db, const std::string& sql)
{
    check(db, sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr), sql.c_str());
}

double asFloat(double value) { return double(float(value)); }

std::string spectraTableSql()
{
    std::string sql = "CREATE TABLE Spectra (ID INTEGER PRIMARY KEY, X REAL, Y REAL, Z REAL";
    for (int s = 0; s < kSamples; ++s)
        sql += ", S" + std::to_string(s) + " REAL";
    return sql + ")";
}

std::string insertSql()
{
    std::string sql = "INSERT INTO Spectra VALUES (?";
    for (int c = 1; c < kLeadingColumns + kSamples; ++c)
        sql += ", ?";
    return sql + ")";
}

Statement prepare(sqlite3* db, const std::string& sql)
{
    sqlite3_stmt* raw = nullptr;
    check(db, sqlite3_prepare_v2(db, sql.c_str(), -1, &raw, nullptr), sql.c_str());
    return Statement(raw);
}

void insertInfo(sqlite3* db, float version, int sources)
{
    const Statement insert = prepare(db, "INSERT INTO Info VALUES (?, ?, ?, ?)");
    sqlite3_bind_double(insert.get(), 1, double(version));
    sqlite3_bind_int(insert.get(), 2, sources);
    sqlite3_bind_int(insert.get(), 3, kLeadingColumns + kSamples);
    sqlite3_bind_int(insert.get(), 4, kSamples);
    check(db, sqlite3_step(insert.get()), "insert Info");
}

void insertSources(sqlite3* db, const std::vector<const Source*>& sources)
{
    const Statement insert = prepare(db, insertSql());
    sqlite3_stmt* raw = insert.get();
    for (size_t id = 0; id < sources.size(); ++id) {
        const Spectrum& s = sources[id]->spectrum;
        const Xyz xyz = tristimulus(s);
        sqlite3_bind_int(raw, 1, int(id));
        sqlite3_bind_double(raw, 2, asFloat(xyz.X));
        sqlite3_bind_double(raw, 3, asFloat(xyz.Y));
        sqlite3_bind_double(raw, 4, asFloat(xyz.Z));
        for (int i = 0; i < kSamples; ++i)
            sqlite3_bind_double(raw, kLeadingColumns + 1 + i, asFloat(s[size_t(i)]));
        check(db, sqlite3_step(raw), "insert spectrum");
        check(db, sqlite3_reset(raw), "reset insert");
    }
}

// The name of every source, so that tools can tell the sources and their
// families apart; the plug-in reads only Info and Spectra.
void insertNames(sqlite3* db, const std::vector<const Source*>& sources)
{
    const Statement insert = prepare(db, "INSERT INTO Names VALUES (?, ?)");
    sqlite3_stmt* raw = insert.get();
    for (size_t id = 0; id < sources.size(); ++id) {
        sqlite3_bind_int(raw, 1, int(id));
        sqlite3_bind_text(raw, 2, sources[id]->name.c_str(), -1, SQLITE_TRANSIENT);
        check(db, sqlite3_step(raw), "insert name");
        check(db, sqlite3_reset(raw), "reset insert");
    }
}

void removeIfPresent(const std::filesystem::path& p)
{
    std::error_code ignored;
    std::filesystem::remove(p, ignored);
}

} // namespace

void writeReferenceDatabase(const std::string& path, float version, const std::vector<const Source*>& sources)
{
    if (sources.size() > kMaxReferenceSources)
        throw std::invalid_argument("a reference database holds at most 880 sources");

    const std::filesystem::path temporary = path + ".tmp";
    removeIfPresent(temporary);
    removeIfPresent(temporary.string() + "-journal");
    {
        sqlite3* raw = nullptr;
        const int opened =
            sqlite3_open_v2(temporary.c_str(), &raw, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr);
        Connection db(raw);
        if (opened != SQLITE_OK)
            throw std::runtime_error(temporary.string() + ": cannot create");

        exec(raw, "PRAGMA journal_mode=DELETE");
        exec(raw, "BEGIN");
        exec(raw, "CREATE TABLE Info (version REAL, sources INTEGER, columns INTEGER, samples INTEGER)");
        insertInfo(raw, version, int(sources.size()));
        exec(raw, spectraTableSql());
        insertSources(raw, sources);
        exec(raw, "CREATE TABLE Names (ID INTEGER PRIMARY KEY, name TEXT)");
        insertNames(raw, sources);
        exec(raw, "COMMIT");
        exec(raw, "VACUUM");
        if (sqlite3_close(db.release()) != SQLITE_OK)
            throw std::runtime_error(temporary.string() + ": close failed");
    }
    std::filesystem::rename(temporary, path);
}

} // namespace spectra
