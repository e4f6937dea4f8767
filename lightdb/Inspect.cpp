#include "lightdb/Inspect.h"

#include "lightdb/CNumbers.h"
#include "lightdb/LDBM.h"
#include "lightdb/SqliteConnection.h"

#include <algorithm>
#include <set>
#include <strings.h>

namespace {

// Collects the first column of every row as text.
int collectFirstColumn(void* context, int columns, char** values, char**)
{
    if (columns > 0 && values[0])
        static_cast<std::vector<std::string>*>(context)->push_back(values[0]);
    return 0;
}

std::vector<std::string> firstColumn(SqliteConnection& db, const std::string& sql, int* rc = nullptr)
{
    std::vector<std::string> out;
    int code = db.exec(sql.c_str(), collectFirstColumn, &out);
    if (rc)
        *rc = code;
    return out;
}

// Column names of a table, in table order ("PRAGMA table_info" gives cid, name, ...).
std::vector<std::string> tableColumns(SqliteConnection& db, const char* table)
{
    std::vector<std::string> names;
    auto collect = [](void* context, int columns, char** values, char**) {
        if (columns > 1 && values[1])
            static_cast<std::vector<std::string>*>(context)->push_back(values[1]);
        return 0;
    };
    db.exec((std::string("PRAGMA table_info(") + table + ")").c_str(), collect, &names);
    return names;
}

int64_t rowCount(SqliteConnection& db, const char* table)
{
    auto counts = firstColumn(db, std::string("SELECT count(*) FROM ") + table);
    return counts.empty() ? 0 : int64_t(strtoll(counts[0].c_str(), nullptr, 10));
}

// Spectra's sample columns, ordered by the index their names carry.
std::vector<std::string> sampleColumns(SqliteConnection& db)
{
    std::vector<std::string> samples;
    for (auto& name : tableColumns(db, "Spectra"))
        if (name != "ID" && name != "X" && name != "Y" && name != "Z")
            samples.push_back(name);
    auto index = [](const std::string& name) { return name.size() > 1 ? ldbm::parseInteger(name.c_str() + 1) : 0; };
    std::stable_sort(samples.begin(), samples.end(),
                     [&](const std::string& a, const std::string& b) { return index(a) < index(b); });
    return samples;
}

} // namespace

std::string LDBMNamePrefix(const std::string& name) { return name.substr(0, name.find_first_of(" _-:/")); }

int LDBMInspect(const std::string& path, LDBMFileSummary& summary)
{
    summary = LDBMFileSummary{};
    SqliteConnection db;
    if (int rc = db.open(path, SQLITE_OPEN_READONLY); rc != SQLITE_OK)
        return rc;
    int rc = SQLITE_OK;
    const auto tables = firstColumn(db, "SELECT name FROM sqlite_master WHERE type='table'", &rc);
    if (rc != SQLITE_OK)
        return rc;
    // Table names match without regard to case, as in SQL.
    auto has = [&](const char* table) {
        return std::any_of(tables.begin(), tables.end(),
                           [&](const std::string& t) { return strcasecmp(t.c_str(), table) == 0; });
    };

    if (has("Info"))
        summary.hasInfo = db.exec("SELECT * FROM Info", LDBMReadInfoRow, &summary.info) == SQLITE_OK;
    if (has("Spectra")) {
        summary.kind = LDBMFileSummary::Kind::Reference;
        summary.rows = rowCount(db, "Spectra");
        summary.columns = sampleColumns(db);
    } else if (has("RR")) {
        summary.kind = LDBMFileSummary::Kind::Cache;
        summary.rows = rowCount(db, "RR");
        summary.columns = tableColumns(db, "RR");
    }
    if (summary.kind == LDBMFileSummary::Kind::Reference && has("Names")) {
        int namesRc = SQLITE_OK;
        std::set<std::string> prefixes;
        for (auto& name : firstColumn(db, "SELECT name FROM Names", &namesRc))
            prefixes.insert(LDBMNamePrefix(name));
        summary.hasNames = namesRc == SQLITE_OK;
        summary.namePrefixes.assign(prefixes.begin(), prefixes.end());
    }
    return SQLITE_OK;
}
