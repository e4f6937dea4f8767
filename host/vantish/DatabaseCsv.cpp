#include "host/vantish/DatabaseCsv.h"

#include "lightdb/SqliteConnection.h"

#include <sqlite3.h>

#include <charconv>
#include <cmath>
#include <stdexcept>

namespace vantish {

namespace {

class Statement {
public:
    Statement(SqliteConnection& db, const std::string& sql)
    {
        if (const int rc = sqlite3_prepare_v2(db.handle(), sql.c_str(), -1, &statement_, nullptr); rc != SQLITE_OK)
            throw std::runtime_error(std::string("cannot read (") + sqlite3_errmsg(db.handle()) + ")");
    }
    ~Statement() { sqlite3_finalize(statement_); }
    Statement(const Statement&) = delete;
    Statement& operator=(const Statement&) = delete;

    // True for each row, false at the end; throws on an error.
    bool step()
    {
        const int rc = sqlite3_step(statement_);
        if (rc == SQLITE_ROW)
            return true;
        if (rc == SQLITE_DONE)
            return false;
        throw std::runtime_error(std::string("cannot read (") + sqlite3_errstr(rc) + ")");
    }
    int columns() const { return sqlite3_column_count(statement_); }
    std::string name(int i) const { return sqlite3_column_name(statement_, i); }
    std::string text(int i) const
    {
        const auto* t = sqlite3_column_text(statement_, i);
        return t ? reinterpret_cast<const char*>(t) : "";
    }
    double number(int i) const
    {
        return sqlite3_column_type(statement_, i) == SQLITE_NULL ? NAN : sqlite3_column_double(statement_, i);
    }
    long long integer(int i) const { return sqlite3_column_int64(statement_, i); }

private:
    sqlite3_stmt* statement_ = nullptr;
};

std::string quotedName(const std::string& name)
{
    std::string q = "\"";
    for (char c : name)
        q += c == '"' ? std::string("\"\"") : std::string(1, c);
    return q + "\"";
}

std::string columnList(const std::vector<std::string>& names)
{
    std::string list;
    for (const auto& n : names)
        list += (list.empty() ? "" : ", ") + quotedName(n);
    return list;
}

std::string numberText(double value)
{
    if (std::isnan(value))
        return "";
    char text[32];
    const auto [end, ec] = std::to_chars(text, text + sizeof text, value);
    return ec == std::errc() ? std::string(text, end) : std::string();
}

} // namespace

DatabaseTable readDatabaseTable(const std::string& path)
{
    LDBMFileSummary summary;
    if (const int rc = LDBMInspect(path, summary); rc != SQLITE_OK)
        throw std::runtime_error(std::string("cannot read (") + sqlite3_errstr(rc) + ")");
    if (summary.kind == LDBMFileSummary::Kind::Unknown)
        throw std::runtime_error("neither a reference database (no Spectra table) nor a per-chip cache (no RR table)");

    DatabaseTable table;
    table.kind = summary.kind;
    table.columns = summary.columns;
    SqliteConnection db;
    if (const int rc = db.open(path, SQLITE_OPEN_READONLY); rc != SQLITE_OK)
        throw std::runtime_error(std::string("cannot read (") + sqlite3_errstr(rc) + ")");
    if (summary.hasInfo) {
        Statement info(db, "SELECT * FROM Info");
        while (info.step()) {
            table.info.clear();
            for (int i = 0; i < info.columns(); ++i)
                table.info.emplace_back(info.name(i), info.text(i));
        }
    }

    if (table.kind == LDBMFileSummary::Kind::Reference) {
        Statement spectra(db, "SELECT ID, X, Y, Z" + std::string(table.columns.empty() ? "" : ", ") +
                                  columnList(table.columns) + " FROM Spectra ORDER BY ID");
        while (spectra.step()) {
            table.sources.push_back(spectra.integer(0));
            std::vector<double>& row = table.rows.emplace_back();
            for (int i = 1; i < spectra.columns(); ++i)
                row.push_back(spectra.number(i));
        }
        return table;
    }

    Statement responses(db, "SELECT " + columnList(table.columns) + " FROM RR ORDER BY rowid");
    Statement xyz(db, "SELECT X, Y, Z FROM XX ORDER BY rowid");
    for (;;) {
        const bool hasResponse = responses.step();
        const bool hasXyz = xyz.step();
        if (hasResponse != hasXyz)
            throw std::runtime_error("the tables RR and XX hold different numbers of sources");
        if (!hasResponse)
            break;
        table.sources.push_back(static_cast<long long>(table.rows.size()));
        std::vector<double>& row = table.rows.emplace_back();
        for (int i = 0; i < 3; ++i)
            row.push_back(xyz.number(i));
        for (int i = 0; i < responses.columns(); ++i)
            row.push_back(responses.number(i));
    }
    return table;
}

std::string databaseCsv(const DatabaseTable& table, const std::string& file, const std::vector<std::string>& notes)
{
    std::string text = table.kind == LDBMFileSummary::Kind::Reference ? "# reference light-source database "
                                                                      : "# per-chip database cache ";
    text += file + "\n# Info:";
    if (table.info.empty())
        text += " none";
    for (size_t i = 0; i < table.info.size(); ++i)
        text += (i ? ", " : " ") + table.info[i].first + "=" + table.info[i].second;
    text += "\n";
    for (const auto& note : notes)
        text += "# " + note + "\n";
    text += "source,X,Y,Z";
    for (const auto& c : table.columns)
        text += "," + c;
    text += "\n";
    for (size_t r = 0; r < table.rows.size(); ++r) {
        text += std::to_string(table.sources[r]);
        for (double v : table.rows[r])
            text += "," + numberText(v);
        text += "\n";
    }
    return text;
}

} // namespace vantish
