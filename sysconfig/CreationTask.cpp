// The cache-writing task that ends a configuration-supplied build.
//
// Why it checks that its database is still the published one: a queued task can
// run after a newer build (a client's rebuild, say) has published another
// database. Writing the older arrays then would overwrite the newer cache, and
// setting dbReady would switch colour on for the newer database on the strength
// of a file that is not its own. So the task writes and sets dbReady only for
// the database that is current, and it does both while holding the instance's
// calibrationMutex: every build publishes while holding it too, so no newer
// database can appear between the check, the write and dbReady. The mutex is
// recursive, so the in-place task of a synchronous build runs under the lock
// its caller already holds.
#include "lightdb/LDBM.h"
#include "support/Log.h"
#include "plugin/VantishPlugIn.h"
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

void writeCache(VantishPlugIn& plugin, const SpectralDatabasePtr& db, const CacheKeys& keys)
{
    std::lock_guard lock(plugin.calibrationMutex);
    if (plugin.snapshotDatabase().db != db) {
        VLOG_INFO("A newer database has been published; this one's cache is not written.\n");
        return;
    }
    const int code = LDBMCreateSmallDB(&db->dbInfo, db->dbXYZ.data(), db->dbChannelResponses.data(), keys.orientation,
                                       keys.algo, keys.channelCount, keys.chipId, kSmallDBVersion);
    if (code != 0) {
        VLOG_ERROR("Failed to create small DB %d\n", code);
        return;
    }
    VLOG_DEFAULT("Small DB has been created\n");
    plugin.setDbReady(true);
}

} // namespace

void startCreationTask(VantishPlugIn& plugin, bool asyncCreate, SpectralDatabasePtr db)
{
    const CacheKeys keys{int(plugin.orientation.load()), int(plugin.algoVersion.load()),
                         int(plugin.numberOfChannels.load()), plugin.chipId.load()};
    if (!asyncCreate) {
        writeCache(plugin, db, keys);
        return;
    }
    plugin.dispatchRetained(dispatch_get_global_queue(DISPATCH_QUEUE_PRIORITY_DEFAULT, 0),
                            [&plugin, db = std::move(db), keys] { writeCache(plugin, db, keys); });
}

} // namespace sysconfig
