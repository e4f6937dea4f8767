// What the vantish command writes for integrators and other programs: the
// driver's records and the per-chip database saved by `open --save`, light
// databases as CSV, `eval --format json`, and an `open` log that reads the
// same on every run.
#include "VantishCommand.h"
#include "common/TestSupport.h"
#include "host/emulator/Bundle.h"
#include "host/emulator/PlugInSession.h"
#include "host/emulator/Unit.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <sqlite3.h>

#include <cmath>
#include <iterator>
#include <map>
#include <regex>

namespace {

using namespace vt::command;

std::string bytesOf(const fs::path& file)
{
    std::ifstream in(file, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

struct Table {
    std::vector<std::string> comments; // '#' lines without the '#'
    std::vector<std::string> header;
    std::vector<std::vector<double>> rows;
};

std::vector<std::string> split(const std::string& line)
{
    std::vector<std::string> cells;
    std::istringstream in(line);
    for (std::string cell; std::getline(in, cell, ',');)
        cells.push_back(cell);
    return cells;
}

Table readCsv(const fs::path& file)
{
    Table t;
    std::istringstream in(slurp(file));
    for (std::string line; std::getline(in, line);) {
        if (line.rfind("#", 0) == 0) {
            t.comments.push_back(line.substr(1));
        } else if (t.header.empty()) {
            t.header = split(line);
        } else {
            std::vector<double>& row = t.rows.emplace_back();
            for (const std::string& cell : split(line))
                row.push_back(std::strtod(cell.c_str(), nullptr));
        }
    }
    return t;
}

// Every row of `sql` on the database file, with the result's column names.
Table readSqlite(const fs::path& file, const std::string& sql)
{
    Table t;
    sqlite3* db = nullptr;
    EXPECT_EQ(sqlite3_open_v2(file.c_str(), &db, SQLITE_OPEN_READONLY, nullptr), SQLITE_OK) << file;
    sqlite3_stmt* statement = nullptr;
    EXPECT_EQ(sqlite3_prepare_v2(db, sql.c_str(), -1, &statement, nullptr), SQLITE_OK) << sql;
    for (int i = 0; statement && i < sqlite3_column_count(statement); ++i)
        t.header.push_back(sqlite3_column_name(statement, i));
    while (statement && sqlite3_step(statement) == SQLITE_ROW) {
        std::vector<double>& row = t.rows.emplace_back();
        for (int i = 0; i < sqlite3_column_count(statement); ++i)
            row.push_back(sqlite3_column_double(statement, i));
    }
    sqlite3_finalize(statement);
    sqlite3_close(db);
    return t;
}

// The CSV's columns named in `table` hold exactly the table's values, row by
// row: the export writes each stored double in a form that reads back to it.
void expectSameColumns(const Table& csv, const Table& table, size_t firstRow = 0)
{
    ASSERT_EQ(csv.rows.size(), table.rows.size());
    for (size_t c = 0; c < table.header.size(); ++c) {
        const auto at = std::find(csv.header.begin(), csv.header.end(), table.header[c]);
        ASSERT_NE(at, csv.header.end()) << table.header[c];
        const size_t column = size_t(at - csv.header.begin());
        for (size_t r = firstRow; r < table.rows.size(); ++r)
            ASSERT_EQ(csv.rows[r][column], table.rows[r][c]) << table.header[c] << " row " << r;
    }
}

class VantishOutputs : public VantishCommand {};

TEST_F(VantishOutputs, OpenSavesTheDriversBytesTheirDecodeAndTheCachedDatabase)
{
    const Outcome o = run("open " + device("vd6287-v3") + " --save saved");
    ASSERT_EQ(o.status, 0) << o.err;

    // What the driver stand-in receives from the same unit opened here.
    vt::DeviceRoots roots;
    const host::Bundle bundle(vt::bundleDir());
    host::Unit unit(host::loadDeviceDescription(fs::path(vt::sourceDir()) / "data/devices/vd6287-v3/device.json"));
    host::PlugInSession session(bundle, unit);
    ASSERT_GT(session.match(), 0);
    session.open();
    session.waitForQueuedWork();
    const std::vector<std::string> keys = unit.driverPropertyKeys();
    ASSERT_EQ(keys, (std::vector<std::string>{"ALSCalibrationData", "ALSColorCalibration"}));
    for (const std::string& key : keys) {
        SCOPED_TRACE(key);
        const CFOwned<CFTypeRef> value(unit.copyDriverProperty(key.c_str()));
        const auto data = static_cast<CFDataRef>(value.get());
        const std::string received(reinterpret_cast<const char*>(CFDataGetBytePtr(data)),
                                   size_t(CFDataGetLength(data)));
        EXPECT_EQ(bytesOf(path("saved/" + key + ".bin")), received);
        const Outcome decoded = run("calib decode saved/" + key + ".bin");
        ASSERT_EQ(decoded.status, 0) << decoded.err;
        EXPECT_EQ(decoded.out, slurp(path("saved/" + key + ".json")));
    }

    // The per-chip CSV reads back to the cache's values exactly, sources in order.
    const fs::path cache = path("state/Library/Brenzel/bzrgbc_1.sqlite");
    const Table csv = readCsv(path("saved/bzrgbc_1.csv"));
    EXPECT_EQ(csv.header, (std::vector<std::string>{"source", "X", "Y", "Z", "CH0", "CH1", "CH2", "CH3", "CH4"}));
    expectSameColumns(csv, readSqlite(cache, "SELECT X, Y, Z FROM XX ORDER BY rowid"));
    expectSameColumns(csv, readSqlite(cache, "SELECT * FROM RR ORDER BY rowid"));
    ASSERT_EQ(csv.comments.size(), 3u);
    EXPECT_NE(csv.comments[1].find("sources=425"), std::string::npos) << csv.comments[1];
    EXPECT_NE(csv.comments[2].find("not normalised"), std::string::npos) << csv.comments[2];
    // Nothing else is left in the folder (no temporary files).
    EXPECT_EQ(std::distance(fs::directory_iterator(path("saved")), fs::directory_iterator()), 5);
}

TEST_F(VantishOutputs, SavedDeviationsAreTheOnesThePlugInNormalisedBy)
{
    // xwcl-35's record configures lambda: the plug-in normalises at load and logs its deviations.
    const Outcome o = run("--log debug open " + device("xwcl-35") + " --save saved");
    ASSERT_EQ(o.status, 0) << o.err;
    std::vector<double> logged;
    const std::regex loggedLine(R"(Standard deviation\[\d\]: ([0-9.]+))");
    for (auto m = std::sregex_iterator(o.out.begin(), o.out.end(), loggedLine); m != std::sregex_iterator(); ++m)
        logged.push_back(std::stod((*m)[1]));
    ASSERT_EQ(logged.size(), 4u) << o.out;

    const Table csv = readCsv(path("saved/bzrgbc_1.csv"));
    ASSERT_EQ(csv.comments.size(), 3u);
    const std::string& live = csv.comments[2];
    EXPECT_NE(live.find("normalised at load"), std::string::npos) << live;
    const std::regex savedValue(R"(([RGBC])=([0-9.]+))");
    std::vector<double> saved;
    for (auto m = std::sregex_iterator(live.begin(), live.end(), savedValue); m != std::sregex_iterator(); ++m)
        saved.push_back(std::stod((*m)[2]));
    ASSERT_EQ(saved.size(), 4u) << live;
    for (size_t c = 0; c < 4; ++c)
        EXPECT_NEAR(saved[c], logged[c], 1e-6); // the log prints "%f", the file six significant digits
}

TEST_F(VantishOutputs, ReferenceExportReadsBackToTheFilesValues)
{
    const fs::path reference = fs::path(vt::bundleDir()) / "bzlight.sqlite";
    const Outcome o = run("lightdb export " + quoted(reference.string()) + " -o ref.csv");
    ASSERT_EQ(o.status, 0) << o.err;
    EXPECT_EQ(o.out, "");
    const Table csv = readCsv(path("ref.csv"));
    ASSERT_EQ(csv.header.size(), 4u + 401u);
    EXPECT_EQ(csv.header[4], "S0");
    EXPECT_EQ(csv.header.back(), "S400");
    Table stored = readSqlite(reference, "SELECT * FROM Spectra ORDER BY ID");
    std::replace(stored.header.begin(), stored.header.end(), std::string("ID"), std::string("source"));
    expectSameColumns(csv, stored);

    // An output that cannot be put in place leaves nothing behind.
    fs::create_directory(path("taken"));
    const Outcome blocked = run("lightdb export " + quoted(reference.string()) + " -o taken");
    EXPECT_EQ(blocked.status, 2);
    EXPECT_EQ(blocked.err, "vantish lightdb export: taken: cannot write (Is a directory)\n");
    for (const auto& entry : fs::directory_iterator(path(".")))
        EXPECT_NE(entry.path().filename().string().rfind(".taken", 0), 0u) << entry.path();
}

TEST_F(VantishOutputs, EvalJsonHoldsTheTextsNumbers)
{
    const Outcome text = run("eval " + device("xwca-t2"));
    const Outcome json = run("eval " + device("xwca-t2") + " --format json");
    ASSERT_EQ(text.status, 0) << text.err;
    ASSERT_EQ(json.status, 0) << json.err;
    const nlohmann::json j = nlohmann::json::parse(json.out);
    auto rounded = [](double v) { return std::round(v * 1e4) / 1e4; };

    for (const auto& [label, key] : {std::pair{"plug-in", "plug_in"}, std::pair{"global matrix", "global_matrix"}}) {
        SCOPED_TRACE(label);
        const auto numbers = rowNumbers(text.out, label);
        ASSERT_EQ(numbers.size(), 3u) << text.out;
        const nlohmann::json& s = j.at("summary").at(key);
        EXPECT_EQ(rounded(s.at("median")), numbers[0]);
        EXPECT_EQ(rounded(s.at("p95")), numbers[1]);
        EXPECT_EQ(rounded(s.at("max")), numbers[2]);
        EXPECT_EQ(s.at("missing"), 0);
    }
    ASSERT_EQ(j.at("results").size(), j.at("lights").at("count").get<size_t>());
    // Each light's row: true x, y, CCT, Duv; plug-in x, y, Duv, Δu′v′, ΔCCT; the same for the matrix.
    for (const nlohmann::json& r : j.at("results")) {
        SCOPED_TRACE(r.at("light").get<std::string>());
        const auto row = rowNumbers(text.out, r.at("light"));
        ASSERT_EQ(row.size(), 14u);
        EXPECT_EQ(rounded(r.at("true").at("x")), row[0]);
        EXPECT_EQ(std::round(r.at("true").at("cct").get<double>()), row[2]);
        EXPECT_EQ(rounded(r.at("true").at("duv")), row[3]);
        EXPECT_EQ(rounded(r.at("plug_in").at("duv")), row[6]);
        EXPECT_EQ(rounded(r.at("plug_in").at("delta_uv")), row[7]);
        EXPECT_EQ(rounded(r.at("global_matrix").at("delta_uv")), row[12]);
    }
}

// The lines of `out` between the line `from` and the next line that starts a step.
std::string section(const std::string& out, const std::string& from)
{
    const size_t start = out.find("\n" + from);
    if (start == std::string::npos)
        return "";
    const size_t end = out.find("\n" + std::string(from == "open" ? "bring-up" : "driver received"), start + 1);
    return out.substr(start, end - start);
}

TEST_F(VantishOutputs, OpenPrintsTheSameLogUnderTheStepThatLoggedIt)
{
    for (const char* unit : {"xwca-t2", "sysconfig-aux"}) {
        SCOPED_TRACE(unit);
        fs::remove_all(path("state"));
        const Outcome first = run("--log debug open " + device(unit));
        const Outcome again = run("--log debug open " + device(unit));
        fs::remove_all(path("state"));
        const Outcome firstAgain = run("--log debug open " + device(unit));
        const Outcome againAgain = run("--log debug open " + device(unit));
        ASSERT_EQ(first.status, 0) << first.err;
        EXPECT_EQ(first.out, firstAgain.out);
        EXPECT_EQ(again.out, againAgain.out);
        // open reads the service; the calibration and the database come in the bring-up.
        EXPECT_NE(section(first.out, "open").find("IONameMatched="), std::string::npos) << first.out;
        EXPECT_NE(section(first.out, "bring-up").find("Small DB has been created"), std::string::npos) << first.out;
        EXPECT_NE(section(first.out, "bring-up").find("[debug] BIG: DB version"), std::string::npos) << first.out;
    }
    // --log chooses the lowest level shown.
    const Outcome quiet = run("--log default open " + device("xwca-t2"));
    EXPECT_EQ(quiet.out.find("[info]"), std::string::npos) << quiet.out;
    EXPECT_NE(quiet.out.find("[default] Matched on"), std::string::npos) << quiet.out;
    EXPECT_EQ(run("--log off open " + device("xwca-t2")).out.find("    ["), std::string::npos);
}

} // namespace
