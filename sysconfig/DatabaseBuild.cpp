// The common end of a configuration-supplied build, and the Matrices record
// that carries a calibration entry's spectra into the reference scan.
#include "sysconfig/DatabaseBuild.h"

#include "calibration/Calibration.h"
#include "lightdb/LDBM.h"
#include "support/Assert.h"
#include "support/Log.h"

namespace sysconfig {

bool finishDatabaseBuild(Calibration& calibration, bool asyncCreate, Matrices& matrices,
                         const std::shared_ptr<SpectralDatabase>& db)
{
    VANTISH_ASSERT(calibration.lockHeldByCaller());
    const LDBMResult code = LDBMParseBigDB(&db->dbInfo, ProgressCallback, &matrices, BigDBTypeDefault);
    if (code != LDBMResult::Ok) {
        VLOG_ERROR("Failed to parse big DB %d\n", LDBMCode(code));
        return false;
    }
    VLOG_DEFAULT("Parsed big DB\n");
    // The arrays are complete. Colour stays as it was (on with the old database,
    // it goes on with this one) until the cache write decides. The caller holds
    // the calibration lock, so no creation task changes dbReady between the read and
    // the publication.
    SpectralDatabasePtr complete = db;
    calibration.databases().publish(complete, calibration.databases().isReady());
    startCreationTask(calibration, asyncCreate, std::move(complete));
    return true;
}

bool prepareMatrices(SpectralDatabase& db, unsigned channels, Matrices& matrices)
{
    const size_t n = db.dbSampleCount;
    if (n == 0 || channels == 0 || db.dbChannelCount != channels || db.dbXYZ.size() != 3 * n ||
        db.dbChannelResponses.size() != size_t(channels) * n)
        return false;
    matrices = Matrices{};
    matrices.bindOutputs(db);
    matrices.nChannels = int32_t(channels);
    return true;
}

} // namespace sysconfig
