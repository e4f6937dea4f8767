// vantish lightdb info|export FILE: what a reference light-source database or
// a per-chip cache holds, read without changing it; its values as CSV.
#include "host/vantish/Commands.h"

#include "host/vantish/DatabaseCsv.h"
#include "host/vantish/FileOutput.h"
#include "lightdb/Inspect.h"

#include <CLI/CLI.hpp>

#include <sqlite3.h>

#include <cstdio>
#include <iostream>
#include <memory>

namespace vantish {

namespace {

struct LightdbOptions {
    std::string file;
    std::string output; // export: the CSV file; empty or "-": standard output
};

// "S0 … S400" for a run of sample columns, else the names as they are.
std::string columnRange(const std::vector<std::string>& columns)
{
    if (columns.empty())
        return "none";
    if (columns.size() <= 6) {
        std::string names;
        for (const auto& c : columns)
            names += (names.empty() ? "" : ", ") + c;
        return names;
    }
    return columns.front() + " … " + columns.back();
}

void printInfo(const LDBMFileSummary& s)
{
    if (!s.hasInfo) {
        std::printf("Info      no Info table\n");
        return;
    }
    std::printf("Info      version %.6g, sources %d", double(s.info.version), int(s.info.sources));
    if (s.kind == LDBMFileSummary::Kind::Cache)
        std::printf(", smallversion %.6g, algo %d, chip ID 0x%08X", double(s.info.smallVersion), int(s.info.algo),
                    unsigned(s.info.chipID));
    std::printf("\n");
}

int runInfo(const LightdbOptions& o)
{
    LDBMFileSummary s;
    if (const int rc = LDBMInspect(o.file, s); rc != SQLITE_OK) {
        std::cerr << "vantish lightdb info: " << o.file << ": cannot read (" << sqlite3_errstr(rc) << ")\n";
        return 2;
    }
    std::printf("File      %s\n", o.file.c_str());
    switch (s.kind) {
    case LDBMFileSummary::Kind::Reference:
        std::printf("Kind      reference light-source database\n");
        printInfo(s);
        std::printf("Sources   %lld (rows of Spectra)\n", static_cast<long long>(s.rows));
        std::printf("Grid      %zu sample columns, %s", s.columns.size(), columnRange(s.columns).c_str());
        if (s.columns.size() == 401)
            std::printf(" (300–1100 nm in 2 nm steps)");
        std::printf("\n");
        if (!s.hasNames) {
            std::printf("Families  not recorded (no Names table)\n");
            break;
        }
        std::printf("Families ");
        for (const auto& f : s.namePrefixes)
            std::printf(" %s", f.c_str());
        std::printf("\n");
        break;
    case LDBMFileSummary::Kind::Cache:
        std::printf("Kind      per-chip database cache\n");
        printInfo(s);
        std::printf("Sources   %lld (rows of RR)\n", static_cast<long long>(s.rows));
        std::printf("Channels  %zu: %s\n", s.columns.size(), columnRange(s.columns).c_str());
        break;
    case LDBMFileSummary::Kind::Unknown:
        std::cerr << "vantish lightdb info: " << o.file
                  << ": neither a reference database (no Spectra table) nor a per-chip cache (no RR table)\n";
        return 1;
    }
    if (s.hasInfo && s.info.sources != s.rows)
        std::printf("Warning   Info counts %d sources, the table holds %lld rows\n", int(s.info.sources),
                    static_cast<long long>(s.rows));
    return 0;
}

int runExport(const LightdbOptions& o)
{
    std::string csv;
    try {
        csv = databaseCsv(readDatabaseTable(o.file), o.file, {});
    } catch (const std::exception& e) {
        std::cerr << "vantish lightdb export: " << o.file << ": " << e.what() << "\n";
        return 2;
    }
    if (o.output.empty() || o.output == "-") {
        std::cout << csv;
        return 0;
    }
    try {
        writeWhole(o.output, csv);
    } catch (const std::exception& e) {
        std::cerr << "vantish lightdb export: " << e.what() << "\n";
        return 2;
    }
    return 0;
}

} // namespace

Runner addLightdbCommand(CLI::App& app, const CommonOptions&)
{
    auto o = std::make_shared<LightdbOptions>();
    app.require_subcommand(1);
    CLI::App* info = app.add_subcommand("info", "Show a light database file: Info, source count, grid, families");
    info->add_option("file", o->file,
                     "A reference database (bzlight.sqlite, bzlight-02.sqlite) or a per-chip cache "
                     "(bzrgbc_<orientation>.sqlite)")
        ->required();
    info->footer("Families are the name prefixes of the sources (led, ledr, daylight, …) from the file's Names\n"
                 "table; the reference databases built by make_reference_db carry one.");

    auto e = std::make_shared<LightdbOptions>();
    CLI::App* exportCommand =
        app.add_subcommand("export", "Write a light database file as CSV: source, X, Y, Z, then its columns");
    exportCommand
        ->add_option("file", e->file,
                     "A reference database (bzlight.sqlite, bzlight-02.sqlite) or a per-chip cache "
                     "(bzrgbc_<orientation>.sqlite)")
        ->required();
    exportCommand->add_option("-o,--output", e->output,
                              "Write the CSV here (whole, or not at all) instead of standard output");
    exportCommand->footer(
        "'#' lines name the kind and give the Info row as stored; then the header and one line per source.\n"
        "Reference files: source is the ID, then X, Y, Z and the sample columns S0 … S400 (300–1100 nm in\n"
        "2 nm steps). Per-chip caches: source is the row, X, Y, Z from XX and the channel responses of RR\n"
        "(CH0 …, or R, G, B, C), un-normalised as cached. Values are written exactly as the file stores them\n"
        "(the shortest text that reads back to the same double).");
    return [o, e, exportCommand] { return exportCommand->parsed() ? runExport(*e) : runInfo(*o); };
}

} // namespace vantish
