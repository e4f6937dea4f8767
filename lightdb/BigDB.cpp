#include "lightdb/CNumbers.h"
#include "lightdb/LDBM.h"
#include "lightdb/SqliteConnection.h"

#include <VantishPlatform/Paths.h>

#include <algorithm>
#include <cstring>
#include <vector>

namespace {

// State of one pass over the Spectra table.
struct SpectraScan {
    LDBMSpectrumConsumer consumer;
    void* userData;
    int32_t sources;
    std::vector<char> seen;     // per ID: already consumed
    std::vector<float> samples; // the current row's spectrum, reused row after row
    std::vector<char> filled;   // per sample slot of the current row
};

struct SpectraRow {
    int id = -1;
    float xyz[3] = {0.0f, 0.0f, 0.0f};
};

// Sample columns are named by one character and the sample's index ("L0",
// "L1", ...); -1 for a name that carries none.
int sampleSlot(const char* name) { return name[0] ? ldbm::parseInteger(name + 1) : -1; }

// Reads one row of `columns` columns: "ID", "X", "Y", "Z" and columns - 4
// samples, each landing in the slot its name gives. False when the row is not
// of that shape: a tristimulus value missing, a slot outside 0 .. columns - 5,
// or a slot given twice or not at all.
bool readSpectraRow(SpectraScan& scan, int columns, char** values, char** names, SpectraRow& row)
{
    if (columns < 4)
        return false;
    const size_t count = size_t(columns - 4);
    scan.samples.assign(count, 0.0f);
    scan.filled.assign(count, 0);
    size_t filledCount = 0;
    unsigned tristimulus = 0;
    for (int i = 0; i < columns; ++i) {
        const char* name = names[i];
        const char* value = values[i];
        if (!name || !value)
            continue;
        if (strcmp(name, "ID") == 0) {
            row.id = ldbm::parseInteger(value);
        } else if (strcmp(name, "X") == 0 || strcmp(name, "Y") == 0 || strcmp(name, "Z") == 0) {
            const int k = name[0] - 'X';
            row.xyz[k] = float(ldbm::parseDecimal(value));
            tristimulus |= 1u << k;
        } else {
            const int slot = sampleSlot(name);
            if (slot < 0 || size_t(slot) >= count || scan.filled[size_t(slot)])
                return false;
            scan.samples[size_t(slot)] = float(ldbm::parseDecimal(value));
            scan.filled[size_t(slot)] = 1;
            ++filledCount;
        }
    }
    return tristimulus == 7u && filledCount == count;
}

// Row handler of the scan: a non-zero result stops it.
int onSpectraRow(void* context, int columns, char** values, char** names)
{
    auto& scan = *static_cast<SpectraScan*>(context);
    SpectraRow row;
    if (!readSpectraRow(scan, columns, values, names, row))
        return 1;
    if (row.id < 0 || row.id >= scan.sources || scan.seen[size_t(row.id)])
        return 1;
    scan.seen[size_t(row.id)] = 1;
    return scan.consumer(scan.userData, row.id, row.xyz, scan.samples.data(), int(scan.samples.size()));
}

} // namespace

LDBMResult LDBMParseBigDB(const LDBMInfo* info, LDBMSpectrumConsumer consumer, void* userData, BigDBType type)
{
    SqliteConnection db;
    int rc = db.open(VPMapPath(LDBMBigDBPath(type)), SQLITE_OPEN_READONLY);
    if (rc != SQLITE_OK)
        return LDBMResult(rc);

    SpectraScan scan{consumer, userData, info->sources, {}, {}, {}};
    scan.seen.assign(size_t(std::max(info->sources, 0)), 0);
    rc = db.exec("SELECT * FROM Spectra", onSpectraRow, &scan);

    // Every ID 0 .. N-1 must have been consumed exactly once (duplicates and
    // strangers already stopped the scan).
    const bool complete = std::all_of(scan.seen.begin(), scan.seen.end(), [](char s) { return s != 0; });
    return complete ? LDBMResult(rc) : LDBMResult::BadSourceIDs;
}
