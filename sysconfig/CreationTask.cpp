// The cache-writing task that ends a configuration-supplied build.
//
// Why it checks that its database is still the published one: a queued task can
// run after a newer build (a client's rebuild, say) has published another
// database. Writing the older arrays then would overwrite the newer cache, and
// setting dbReady would switch colour on for the newer database on the strength
// of a file that is not its own. So the task writes and sets dbReady only for
// the database that is current, and it does both while holding the instance's
// calibration lock: every build publishes while holding it too, so no newer
// database can appear between the check, the write and dbReady. The lock is
// recursive, so the in-place task of a synchronous build runs under the lock
// its caller already holds.
#include "calibration/Calibration.h"
#include "lightdb/LDBM.h"
#include "support/Assert.h"
#include "support/Log.h"
#include "sysconfig/DatabaseBuild.h"

#include <mutex>

namespace sysconfig {

namespace {

// What the cache file is keyed by, taken when the build ends.
struct CacheKeys {
    int orientation = 0;
    int algo = 0;
    int channelCount = 0;
    unsigned chipId = 0;
};

void writeCache(Calibration& calibration, const SpectralDatabasePtr& db, const CacheKeys& keys)
{
    const auto guard = calibration.lock();
    if (calibration.databases().snapshot().db != db) {
        VLOG_INFO("A newer database has been published; this one's cache is not written.\n");
        return;
    }
    const LDBMResult code =
        LDBMCreateSmallDB(&db->dbInfo, db->dbXYZ.data(), db->dbChannelResponses.data(), keys.orientation, keys.algo,
                          keys.channelCount, keys.chipId, kSmallDBVersion);
    if (code != LDBMResult::Ok) {
        VLOG_ERROR("Failed to create small DB %d\n", LDBMCode(code));
        return;
    }
    VLOG_DEFAULT("Small DB has been created\n");
    calibration.databases().setReady(true);
}

} // namespace

void startCreationTask(Calibration& calibration, bool asyncCreate, SpectralDatabasePtr db)
{
    VANTISH_ASSERT(calibration.lockHeldByCaller());
    const CacheKeys keys{int(calibration.unit().orientation.load()), int(calibration.unit().algoVersion.load()),
                         int(calibration.unit().numberOfChannels.load()), calibration.unit().chipId.load()};
    if (!asyncCreate) {
        writeCache(calibration, db, keys);
        return;
    }
    calibration.host().dispatchRetained(
        dispatch_get_global_queue(DISPATCH_QUEUE_PRIORITY_DEFAULT, 0),
        [&calibration, db = std::move(db), keys] { writeCache(calibration, db, keys); });
}

} // namespace sysconfig
