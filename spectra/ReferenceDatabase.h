// Writing the reference database files the plug-in ships and reads.
//
// Layout: table Info (version REAL, sources INTEGER, columns INTEGER, samples
// INTEGER), one row; table Spectra (ID INTEGER PRIMARY KEY, X, Y, Z, S0 .. S400
// all REAL), one row per source with IDs 0 .. N−1 in set order; table Names
// (ID INTEGER PRIMARY KEY, name TEXT), the source names for tools, which the
// plug-in does not read. The plug-in reads
// every value as text through sqlite3_exec and converts it with atof to float,
// so every REAL is stored as a value already rounded to float: SQLite's
// 15-significant-digit text of such a value converts back to that same float.
#pragma once

#include "spectra/Catalogue.h"

#include <string>
#include <vector>

namespace spectra {

// The most sources a per-chip database can hand to the driver.
inline constexpr size_t kMaxReferenceSources = 880;

// Writes the file at `path` (replacing it) through a temporary file beside it,
// so an interrupted run never leaves a half-written database under the final
// name. The bytes depend only on the inputs and the SQLite library. Throws
// std::runtime_error on a SQLite or file error, std::invalid_argument for more
// than kMaxReferenceSources sources.
void writeReferenceDatabase(const std::string& path, float version, const std::vector<const Source*>& sources);

} // namespace spectra
