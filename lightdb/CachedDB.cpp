#include "lightdb/CachedDB.h"

#include "lightdb/LDBM.h"
#include "support/Log.h"

#include <new>

// Works on the caller's private `db` only; the caller publishes it once it is
// complete, so nothing here is ever seen half-written.
bool processCachedDB(const CacheKey& key, int channelCount, BigDBType type, SpectralDatabase& db)
{
    // The arrays are sized from the channel count: one no record layout can
    // carry is refused before anything is read or allocated.
    if (channelCount < 1 || channelCount > kMaxDatabaseChannels) {
        VLOG_ERROR("A per-chip database of %d channels cannot be kept (1 to %d)\n", channelCount, kMaxDatabaseChannels);
        return false;
    }
    const int cacheOrientation = key.orientation;
    bool valid = false;
    if (LDBMInitialize(cacheOrientation, &db.dbInfo, &valid, type, key.smallDBVersion) != LDBMResult::Ok) {
        VLOG_DEFAULT("Database not found!\n");
        return false;
    }

    const uint32_t sources = uint32_t(db.dbInfo.sources); // never negative once LDBMInitialize succeeded
    VLOG_DEFAULT("nSources: %u nChannels: %d\n", sources, channelCount);
    const uint32_t rows = channelCount > 0 ? uint32_t(channelCount) : 0;
    try {
        db.allocate(sources, rows);
    } catch (const std::bad_alloc&) {
        db = SpectralDatabase{};
        VLOG_ERROR("Cannot allocate a database of %u sources\n", sources);
        return false;
    }

    // A build fills the arrays from zero, so a rejected cache leaves nothing behind.
    auto rebuild = [&] {
        db.allocate(sources, rows);
        return false;
    };
    if (!valid) {
        VLOG_DEFAULT("Cached DB not found. Recreating");
        return false;
    }
    if (LDBMParseSmallDB(cacheOrientation, &db.dbInfo, db.dbXYZ.data(), db.dbChannelResponses.data(), int(rows)) !=
        LDBMResult::Ok) {
        VLOG_DEFAULT("Cached DB corrupted. Recreating");
        return rebuild();
    }
    if (db.dbInfo.chipID != key.chipId) {
        VLOG_DEFAULT("Found cached DB for different chip ID. Recreating");
        return rebuild();
    }
    VLOG_DEFAULT("Matching cached DB found");
    return true;
}
