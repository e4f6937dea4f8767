#include "calibration/FactoryDatabase.h"

#include "calibration/Calibration.h"
#include "calibration/ColorCalibrationRecord.h"
#include "calibration/SpectrumExtraction.h"
#include "colour/MatrixUtilities.h"
#include "formats/VD6287Layout.h"
#include "formats/XwCAT2Layout.h"
#include "formats/XwClLayout.h"
#include "lightdb/CachedDB.h"
#include "lightdb/LDBM.h"
#include "support/Assert.h"
#include "support/CFOwned.h"
#include "support/Log.h"

#include <memory>
#include <utility>

namespace calib {
namespace {

// The colour solver works with 4, 5 or 6 sensor channels.
bool colourChannelsUsable(uint32_t channels) { return channels >= 4 && channels <= 6; }

// Whether `db` holds arrays for all the sources its Info names, so the
// reference scan cannot write past them.
bool sizedForBuild(const SpectralDatabase& db, uint32_t rows)
{
    const size_t n = db.dbSampleCount;
    return db.dbInfo.sources >= 0 && uint32_t(db.dbInfo.sources) == db.dbSampleCount && db.dbChannelCount == rows &&
           db.dbXYZ.size() == 3 * n && db.dbChannelResponses.size() == size_t(rows) * n;
}

bool extractSpectrum(Calibration& p, const FactorySource& source, Matrices& m)
{
    CFDataRef data = source.data;
    switch (source.layout) {
    case FactoryLayout::VD6287:
        return p.processQVTSpectrumVD6287_XwClv3(data, m);
    case FactoryLayout::XwCAT2:
        return p.processQVTSpectrumXwCAT2(data, m);
    case FactoryLayout::XwCl:
        return extractXwClSpectrum(p, {CFDataGetBytePtr(data), size_t(CFDataGetLength(data))}, source.xwclEntryOffset,
                                   m);
    case FactoryLayout::None:
        break;
    }
    return false;
}

// Builds `db` (sized by processCachedDB) from the reference spectra and the
// unit's channel spectra and writes the cache. False when nothing was built.
bool buildFromSpectra(Calibration& p, const FactorySource& source, SpectralDatabase& db)
{
    const uint32_t channels = p.unit().numberOfChannels.load();
    const uint32_t rows = p.unit().dbChannelCount.load();
    const uint32_t chipType = p.unit().chipType.load();
    if (!sizedForBuild(db, rows) || channels < rows)
        return false;

    Matrices m;
    m.bindOutputs(db);
    if (chipType == 1 || chipType == 2) {
        m.nChannels = int32_t(rows);
        m.firstChannel = 0;
    } else {
        m.nChannels = int32_t(channels);
        m.firstChannel = int32_t(channels - rows);
    }
    if (!extractSpectrum(p, source, m))
        return false;
    // A reference file that cannot be read to its end builds nothing; say so,
    // as the configuration-supplied path does.
    if (const LDBMResult code = LDBMParseBigDB(&db.dbInfo, ProgressCallback, &m, source.bigDBType);
        code != LDBMResult::Ok) {
        VLOG_ERROR("Failed to parse big DB %d\n", LDBMCode(code));
        return false;
    }
    VLOG_DEFAULT("Parsed big DB\n");

    const LDBMResult code = LDBMCreateSmallDB(&db.dbInfo, db.dbXYZ.data(), db.dbChannelResponses.data(),
                                              int(p.unit().orientation.load()), int(p.unit().algoVersion.load()),
                                              int(rows), p.unit().chipId.load(), p.unit().smallDBVersion.load());
    if (code != LDBMResult::Ok)
        VLOG_ERROR("Failed to create small DB %d\n", LDBMCode(code));
    else
        VLOG_DEFAULT("Small DB has been created\n");
    return true;
}

// Scales every sample's responses to unit length, then every channel by its
// standard deviation over the samples (channels that do not vary stay as
// they are). Done on the private database, before anyone can read it.
void normaliseResponses(Calibration& p, SpectralDatabase& db)
{
    VLOG_INFO("RR normalization");
    const int n = int(db.dbSampleCount);
    const int m = int(db.dbChannelCount);
    float* responses = db.dbChannelResponses.data();
    normalizedByEuklidNorm(responses, n, m);
    db.channelStdDev.assign(size_t(m), 0.0f);
    calculateSTD(responses, db.channelStdDev.data(), n, m);
    for (int c = 0; c < m; ++c) {
        const float deviation = db.channelStdDev[size_t(c)];
        if (deviation == 0.0f)
            continue;
        for (int i = 0; i < n; ++i)
            responses[size_t(c) * size_t(n) + size_t(i)] /= deviation;
    }
}

void sendColorCalibration(Calibration& p)
{
    if (!p.host().service() || p.unit().sensorType.load() != eALSSensorTypeVD6287)
        return;
    const DatabaseSlot::Snapshot snapshot = p.databases().snapshot();
    if (!snapshot.ready)
        return;
    CFOwned<CFDataRef> record(createColorCalibrationRecord(*snapshot.db, p.unit().numberOfChannels.load()));
    if (record)
        IOHIDServiceSetProperty(p.host().service(), CFSTR("ALSColorCalibration"), record.get());
}

} // namespace

FactoryLayout factoryLayoutOf(size_t length)
{
    switch (length) {
    case stored::vd6287::kV3Size:
        return FactoryLayout::VD6287;
    case stored::xwca::kSize:
        return FactoryLayout::XwCAT2;
    case stored::xwcl::kOneEntrySize:
    case stored::xwcl::kTwoEntrySize:
        return FactoryLayout::XwCl;
    default:
        return FactoryLayout::None;
    }
}

void finishFactoryDatabase(Calibration& p, const FactorySource& source, bool forceRebuild)
{
    VANTISH_ASSERT(p.lockHeldByCaller());
    SpectralDatabase db;
    const bool usable = colourChannelsUsable(p.unit().numberOfChannels.load());
    const CacheKey key{int(p.unit().orientation.load()), p.unit().smallDBVersion.load(), p.unit().chipId.load()};
    const bool cached = processCachedDB(key, int(p.unit().dbChannelCount.load()), source.bigDBType, db);
    if (cached)
        p.unit().algoVersion = uint8_t(db.dbInfo.algo);
    // A database that is not usable for colour is not published: the one
    // already in place (if any) and dbReady stay as they were.
    bool ready = cached && usable && !forceRebuild;
    if (!ready)
        ready = buildFromSpectra(p, source, db) && usable;
    if (ready) {
        if (p.fit().lambdaConfigured.load())
            normaliseResponses(p, db);
        p.databases().publish(std::make_shared<const SpectralDatabase>(std::move(db)), true);
    }
    sendColorCalibration(p);
}

} // namespace calib
