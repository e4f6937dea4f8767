// The descriptive row ("Info" table) of a reference or per-chip database, and
// the choice of reference database file.
#pragma once

#include <cstdint>

struct LDBMInfo {
    float version = 0.0f;       // "version": version of the reference data
    int32_t sources = 0;        // "sources": number of light sources N
    int32_t algo = -1;          // "algo": colour-algorithm version
    float smallVersion = -1.0f; // "smallversion": per-chip database format version
    uint32_t chipID = 0;        // "chipID": sensor chip identifier
};

// Selects the reference database file; any non-zero value selects the second.
enum BigDBType : int {
    BigDBTypeDefault = 0,
    BigDBType02 = 1,
};
