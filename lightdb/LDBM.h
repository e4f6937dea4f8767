// The light database module: the shipped reference spectra, the per-chip
// database computed from them, and its cache file.
//
// The functions below report an LDBMResult: success, one of the module's own
// failures, or the SQLite result code of the step that failed, carried with
// its number (so a log line of the code reads as the SQLite code).
#pragma once

#include "lightdb/LDBMInfo.h"
#include "lightdb/Matrices.h"

#include <string>

enum class LDBMResult : int {
    Ok = 0,
    BadSourceIDs = -1,   // LDBMParseBigDB: the Spectra IDs are not exactly 0 .. N-1
    CacheNotPlaced = 2,  // LDBMCreateSmallDB: the file cannot be opened or put in place
    CacheNotWritten = 3, // LDBMCreateSmallDB: a channel count other than 4 or 5, or a failed RR table
    NoWriteAheadLog = 4, // LDBMCreateSmallDB: write-ahead logging cannot be switched on
};

// The number a result is logged with.
constexpr int LDBMCode(LDBMResult result) { return int(result); }

// Consumer of the reference scan: one call per Spectra row. Returns 0 to go on.
typedef int (*LDBMSpectrumConsumer)(void* userData, int id, float* xyz, float* spectrum, int sampleCount);

// Device path of the reference file that `type` selects.
const char* LDBMBigDBPath(BigDBType type);
// Device path of the cache file for an orientation ("…/bzrgbc_<o>.sqlite").
std::string LDBMSmallDBPath(int orientation);

// SQLite row callback that reads an Info row into the LDBMInfo `context`.
int LDBMReadInfoRow(void* context, int columns, char** values, char** names);

// Streams every Spectra row of the reference file to `consumer`.
// Ok; the open's code; BadSourceIDs when the IDs are not exactly 0..N-1 once
// each; otherwise the statement's code. A row without "ID", "X", "Y" or "Z",
// or whose sample columns do not name every slot 0 .. C-5 once, stops the scan.
LDBMResult LDBMParseBigDB(const LDBMInfo* info, LDBMSpectrumConsumer consumer, void* userData, BigDBType type);

// Folds one reference spectrum with the channel spectra of `matrices`. Returns
// non-zero (stopping the scan) when the row does not fit the record's arrays
// or the source's weighted response total is 0 or not finite.
int ProgressCallback(void* matrices, int id, float* xyz, float* spectrum, int sampleCount);

// The most light sources a reference file may give: far more than any
// shipped file holds, and a per-chip database of a few megabytes at most.
constexpr int32_t LDBMMaxSources = 65536;

// Reads the reference Info into `info`, then checks the cache for `orientation`;
// when it is valid, sets *cacheValid and overwrites `info` with the cache's Info.
// Ok, the reference's open or statement code, or SQLITE_CORRUPT when the
// reference gives a negative source count or more than LDBMMaxSources.
LDBMResult LDBMInitialize(int orientation, LDBMInfo* info, bool* cacheValid, BigDBType type,
                          float expectedSmallVersion);

// Loads the cache's RR and XX tables into `responses` (responseRows x N) and
// `xyz` (3 x N), N = info->sources. Columns for rows at or beyond `responseRows`
// are skipped. A table with more rows than N stops with SQLITE_ABORT, one
// with fewer gives SQLITE_CORRUPT.
LDBMResult LDBMParseSmallDB(int orientation, const LDBMInfo* info, float* xyz, float* responses, int responseRows);

// Writes the cache file: built whole beside it ("<cache>.tmp") and renamed
// over it on success, so a failed write leaves the previous cache as it was.
// Ok; CacheNotPlaced, NoWriteAheadLog or CacheNotWritten as above; otherwise
// the code of the failing statement or of the final checkpoint.
LDBMResult LDBMCreateSmallDB(const LDBMInfo* info, const float* xyz, const float* responses, int orientation, int algo,
                             int channelCount, unsigned chipID, float smallVersion);
