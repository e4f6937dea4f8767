// A read-only look into a reference or per-chip database file, for tools
// (`vantish lightdb info FILE`). The plug-in itself never needs it.
#pragma once

#include "lightdb/LDBMInfo.h"

#include <cstdint>
#include <string>
#include <vector>

struct LDBMFileSummary {
    enum class Kind { Unknown, Reference, Cache };
    Kind kind = Kind::Unknown; // Reference: has Spectra; Cache: has RR
    bool hasInfo = false;      // an Info table was read
    LDBMInfo info;             // its last row; absent columns keep LDBMInfo's defaults
    int64_t rows = 0;          // rows of Spectra (reference) or RR (cache)
    // Reference: the sample columns ordered by sample index; cache: the RR
    // (channel) columns in table order.
    std::vector<std::string> columns;
    // Reference files may carry an optional "Names" table (ID, name) naming
    // each source; these are the distinct prefixes of those names, sorted.
    bool hasNames = false;
    std::vector<std::string> namePrefixes;
};

// Summarises the file at `path` (a host path, used as it stands) without
// changing it. 0, or the SQLite code of the failed open or first query.
int LDBMInspect(const std::string& path, LDBMFileSummary& summary);

// The family part of a source name: everything before the first ' ', '_', '-',
// ':' or '/' ("LED_3000K" -> "LED", "CIE A" -> "CIE"), or the whole name.
std::string LDBMNamePrefix(const std::string& name);
