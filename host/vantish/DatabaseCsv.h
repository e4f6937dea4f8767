// A light database file (a reference file or a per-chip cache) as CSV, for
// plotting and diffing: `#` lines with the file's kind and its Info row, a
// header "source,X,Y,Z,<columns>", one line per source. Reference files give
// their sample columns (S0 … S400), caches their channel responses (RR: CH0 …
// or R, G, B, C) beside the tristimulus values of XX.
//
// Numbers are the values the file stores (SQLite doubles), each written in the
// shortest form that reads back to the same double, so nothing is lost on the
// way. The cache itself holds "%f" text: six decimals of the plug-in's floats.
#pragma once

#include "lightdb/Inspect.h"

#include <string>
#include <utility>
#include <vector>

namespace vantish {

struct DatabaseTable {
    LDBMFileSummary::Kind kind = LDBMFileSummary::Kind::Unknown;
    std::vector<std::pair<std::string, std::string>> info; // the Info row's columns as stored (its last row)
    std::vector<std::string> columns;                      // after source, X, Y, Z
    std::vector<long long> sources;                        // the ID (reference) or row number (cache)
    std::vector<std::vector<double>> rows;                 // X, Y, Z, then one value per column
};

// Reads the file without changing it. Throws std::runtime_error with the
// reason (not naming the file) when it is not a database, is neither kind, or
// its tables do not agree.
DatabaseTable readDatabaseTable(const std::string& path);

// The CSV text; `notes` become further `#` lines after the Info line.
std::string databaseCsv(const DatabaseTable& table, const std::string& file, const std::vector<std::string>& notes);

} // namespace vantish
