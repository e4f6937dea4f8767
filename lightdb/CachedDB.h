// The per-chip database of a unit from its cache file, or an empty database
// sized for a build when there is no usable cache.
#pragma once

#include "lightdb/LDBMInfo.h"
#include "lightdb/SpectralDatabase.h"

#include <cstdint>

// The most channels a per-chip database has: the driver's and the factory's
// record layouts carry at most six.
constexpr int kMaxDatabaseChannels = 6;

// What a unit's cache is kept for: its file is chosen by the orientation, its
// Info must carry the expected version and the unit's chip ID.
struct CacheKey {
    int orientation = 1;
    float smallDBVersion = 1.1f;
    uint32_t chipId = 0;
};

// Loads the cached database for the unit into `db` (private to the caller) and
// returns true; db.dbInfo then holds the cache's Info, its algorithm version
// among it. Otherwise prepares `db` (the reference Info, zero-filled arrays of
// the reference's source count by channelCount) and returns false, so the
// caller can build; when the reference cannot be read, or channelCount is
// outside 1 .. kMaxDatabaseChannels, `db` is left empty.
bool processCachedDB(const CacheKey& key, int channelCount, BigDBType type, SpectralDatabase& db);
