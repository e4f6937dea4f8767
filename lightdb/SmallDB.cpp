#include "lightdb/CNumbers.h"
#include "lightdb/LDBM.h"
#include "lightdb/SqliteConnection.h"

#include <VantishPlatform/Paths.h>

#include <os/log.h>

#include <cstdio>
#include <cstring>
#include <mutex>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr const char* kWriteAheadLog = "PRAGMA journal_mode=WAL";
constexpr const char* kCacheFolder = "/var/mobile/Library/Brenzel";

std::string cacheFile(int orientation) { return VPMapPath(LDBMSmallDBPath(orientation)); }

// Creates `folder` with mode 0755, and its parents where they are missing (a
// host folder standing in for the device's may lack them); results ignored,
// as an existing folder is the usual case.
void makeFolder(const std::string& folder)
{
    for (size_t slash = folder.find('/', 1); slash != std::string::npos; slash = folder.find('/', slash + 1))
        mkdir(folder.substr(0, slash).c_str(), 0755);
    mkdir(folder.c_str(), 0755);
}

// ---- Reading -------------------------------------------------------------------

bool cacheMatches(const LDBMInfo& cache, const LDBMInfo& reference, float expectedSmallVersion)
{
    return cache.version == reference.version && cache.sources == reference.sources &&
           cache.smallVersion == expectedSmallVersion;
}

// Component that an RR or XX column fills, by the column's name.
int componentOf(const char* name)
{
    static const char* const names[4][3] = {{"R", "X", "CH0"}, {"G", "Y", "CH1"}, {"B", "Z", "CH2"}, {"C", "CH3", ""}};
    for (int k = 0; k < 4; ++k)
        for (const char* known : names[k])
            if (*known && strcmp(name, known) == 0)
                return k;
    return 4;
}

// Reads RR or XX rows into `destination`, row r component k at r + N * k.
struct TableReader {
    float* destination;
    int32_t sources; // N
    int components;  // rows the destination holds; other components are skipped
    int32_t rowCount = 0;
};

int onTableRow(void* context, int columns, char** values, char** names)
{
    auto& reader = *static_cast<TableReader*>(context);
    if (reader.rowCount >= reader.sources)
        return 1; // more rows than sources: the file does not belong to this Info
    for (int i = 0; i < columns; ++i) {
        if (!names[i] || !values[i])
            continue;
        const int k = componentOf(names[i]);
        if (k < reader.components)
            reader.destination[size_t(reader.rowCount) + size_t(reader.sources) * size_t(k)] =
                float(ldbm::parseDecimal(values[i]));
    }
    ++reader.rowCount;
    return 0;
}

// Loads a whole table; a table with more or fewer rows than N is corrupt.
int readTable(SqliteConnection& db, const char* sql, float* destination, int32_t sources, int components)
{
    TableReader reader{destination, sources, components};
    int rc = db.exec(sql, onTableRow, &reader);
    if (rc == SQLITE_OK && reader.rowCount != sources)
        rc = SQLITE_CORRUPT;
    return rc;
}

// ---- Writing -------------------------------------------------------------------

// Numbers are written as "%f" and "%d" in the "C" locale (ldbm::formatC), so
// the file reads back the same under any process locale. Every statement is
// formatted into a buffer of its own and run by itself.

int writeResponses(SqliteConnection& db, int32_t n, const float* responses, int channelCount)
{
    const char* create;
    if (channelCount == 4)
        create = "CREATE TABLE RR (R Single, G Single, B Single, C Single)";
    else if (channelCount == 5)
        create = "CREATE TABLE RR (CH0 Single, CH1 Single, CH2 Single, CH3 Single, CH4 Single)";
    else
        return 3;
    if (db.exec(create) != SQLITE_OK)
        return 3;

    for (int32_t i = 0; i < n; ++i) {
        auto at = [&](int k) { return double(responses[size_t(i) + size_t(n) * size_t(k)]); };
        char row[1024];
        if (channelCount == 4)
            ldbm::formatC(row, sizeof row, "INSERT INTO RR VALUES (%f, %f, %f, %f)", at(0), at(1), at(2), at(3));
        else
            ldbm::formatC(row, sizeof row, "INSERT INTO RR VALUES (%f, %f, %f, %f, %f)", at(0), at(1), at(2), at(3),
                          at(4));
        if (int rc = db.exec(row); rc != SQLITE_OK)
            return rc;
    }
    return SQLITE_OK;
}

int writeTristimulus(SqliteConnection& db, int32_t n, const float* xyz)
{
    db.exec("DROP TABLE XX");
    if (int rc = db.exec("CREATE TABLE XX (X Single, Y Single, Z Single)"); rc != SQLITE_OK)
        return rc;
    for (int32_t i = 0; i < n; ++i) {
        auto at = [&](int k) { return double(xyz[size_t(i) + size_t(n) * size_t(k)]); };
        char row[1024];
        ldbm::formatC(row, sizeof row, "INSERT INTO XX VALUES (%f, %f, %f)", at(0), at(1), at(2));
        if (int rc = db.exec(row); rc != SQLITE_OK)
            return rc;
    }
    return SQLITE_OK;
}

// The chip ID column exists only for a non-zero chip ID.
int writeInfo(SqliteConnection& db, const LDBMInfo& info, float smallVersion, int orientation, int algo,
              unsigned chipID)
{
    const double version = double(info.version);
    char row[1024];
    const char* create;
    if (chipID != 0) {
        create = "CREATE TABLE Info (version Single, smallversion Single, sources Long, orientation Long, algo Long, "
                 "chipID Unsigned Integer)";
        ldbm::formatC(row, sizeof row, "INSERT INTO Info VALUES (%f, %f, %d, %d, %d, %d)", version,
                      double(smallVersion), info.sources, orientation, algo, int(chipID));
    } else {
        create = "CREATE TABLE Info (version Single, smallversion Single, sources Long, orientation Long, algo Long)";
        ldbm::formatC(row, sizeof row, "INSERT INTO Info VALUES (%f, %f, %d, %d, %d)", version, double(smallVersion),
                      info.sources, orientation, algo);
    }
    if (int rc = db.exec(create); rc != SQLITE_OK)
        return rc;
    return db.exec(row);
}

// ---- Replacing the cache ----------------------------------------------------------
//
// A new cache is built whole in a file of its own next to the cache and then
// renamed over it. The old cache stays valid and readable until the new one is
// complete, so a build that fails part-way (a full disk, a folder that went
// away, an error in any statement) never costs the last good cache.

std::string buildingFile(const std::string& cache) { return cache + ".tmp"; }

// A database file and the companions SQLite keeps beside it.
void removeDatabaseFiles(const std::string& file)
{
    for (const char* suffix : {"", "-wal", "-shm", "-journal"})
        unlink((file + suffix).c_str());
}

// Cache writes of this process run one at a time: they share the building file.
std::mutex& writerMutex()
{
    static std::mutex mutex;
    return mutex;
}

// Writes the tables into `file`, then moves everything the write-ahead log
// holds into the file itself, so that the file alone is the cache.
int buildCache(const std::string& file, const LDBMInfo& info, const float* xyz, const float* responses, int orientation,
               int algo, int channelCount, unsigned chipID, float smallVersion)
{
    // On the device the open also carries a platform-only flag (0x00400000)
    // that picks the file's data-protection class; SQLite here has no such
    // flag, so it is left out.
    SqliteConnection db;
    if (db.open(file, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE) != SQLITE_OK)
        return 2;
    if (db.exec(kWriteAheadLog) != SQLITE_OK)
        return 4;
    // The statements commit one by one; none needs to reach the disk before the
    // last. The checkpoint below syncs the finished file before it is renamed
    // over the cache, so a crash part-way leaves only a building file behind.
    db.exec("PRAGMA synchronous=NORMAL");

    // The file is new; the drops only matter when a leftover could not be removed.
    db.exec("DROP TABLE Info");
    db.exec("DROP TABLE RR");
    const int32_t n = info.sources;
    if (int rc = writeResponses(db, n, responses, channelCount); rc != SQLITE_OK)
        return rc;
    if (int rc = writeTristimulus(db, n, xyz); rc != SQLITE_OK)
        return rc;
    if (int rc = writeInfo(db, info, smallVersion, orientation, algo, chipID); rc != SQLITE_OK)
        return rc;
    return sqlite3_wal_checkpoint_v2(db.handle(), nullptr, SQLITE_CHECKPOINT_TRUNCATE, nullptr, nullptr);
}

// Renames the finished file over the cache. A log left beside the old cache
// (by a writer that died) would be replayed into the new file; it goes first.
int putInPlace(const std::string& building, const std::string& cache)
{
    unlink((cache + "-wal").c_str());
    unlink((cache + "-shm").c_str());
    return rename(building.c_str(), cache.c_str()) == 0 ? SQLITE_OK : 2;
}

} // namespace

LDBMResult LDBMInitialize(int orientation, LDBMInfo* info, bool* cacheValid, BigDBType type, float expectedSmallVersion)
{
    *cacheValid = false;
    const std::string cache = cacheFile(orientation);

    LDBMInfo reference; // absent columns keep version 0, sources 0, algo -1, smallversion -1, chipID 0
    {
        SqliteConnection db;
        int rc = db.open(VPMapPath(LDBMBigDBPath(type)), SQLITE_OPEN_READONLY);
        if (rc != SQLITE_OK)
            return LDBMResult(rc);
        rc = db.exec("SELECT * FROM Info", LDBMReadInfoRow, &reference);
        os_log_debug(OS_LOG_DEFAULT, "BIG: DB version %f - %d samples", double(reference.version), reference.sources);
        if (rc != SQLITE_OK)
            return LDBMResult(rc);
    }
    // A negative source count cannot size a database, and a huge one would
    // have the event system's process allocate gigabytes for a broken file.
    if (reference.sources < 0 || reference.sources > LDBMMaxSources)
        return LDBMResult(SQLITE_CORRUPT);
    *info = reference;

    SqliteConnection db;
    if (db.open(cache, SQLITE_OPEN_READONLY) != SQLITE_OK)
        return LDBMResult::Ok;
    db.exec(kWriteAheadLog);
    LDBMInfo stored{0.0f, 0, 0, 0.0f, 0};
    if (db.exec("SELECT * FROM Info", LDBMReadInfoRow, &stored) != SQLITE_OK)
        return LDBMResult::Ok; // no Info: a missing or unfinished cache
    os_log_debug(OS_LOG_DEFAULT, "SMALL: DB version %f - %d samples", double(stored.version), stored.sources);
    if (cacheMatches(stored, reference, expectedSmallVersion)) {
        *cacheValid = true;
        *info = stored;
    }
    return LDBMResult::Ok;
}

LDBMResult LDBMParseSmallDB(int orientation, const LDBMInfo* info, float* xyz, float* responses, int responseRows)
{
    SqliteConnection db;
    int rc = db.open(cacheFile(orientation), SQLITE_OPEN_READONLY);
    if (rc != SQLITE_OK)
        return LDBMResult(rc);
    db.exec(kWriteAheadLog);
    rc = readTable(db, "SELECT * FROM RR", responses, info->sources, responseRows);
    if (rc != SQLITE_OK)
        return LDBMResult(rc);
    return LDBMResult(readTable(db, "SELECT * FROM XX", xyz, info->sources, 3));
}

LDBMResult LDBMCreateSmallDB(const LDBMInfo* info, const float* xyz, const float* responses, int orientation, int algo,
                             int channelCount, unsigned chipID, float smallVersion)
{
    const std::string path = cacheFile(orientation);
    const std::string building = buildingFile(path);
    std::lock_guard lock(writerMutex());
    makeFolder(VPMapPath(kCacheFolder));
    removeDatabaseFiles(building); // left by a write that never finished

    int rc = buildCache(building, *info, xyz, responses, orientation, algo, channelCount, chipID, smallVersion);
    if (rc == SQLITE_OK)
        rc = putInPlace(building, path);
    if (rc != SQLITE_OK)
        removeDatabaseFiles(building);
    return LDBMResult(rc);
}
