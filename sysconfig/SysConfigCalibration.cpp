// Calibration from the I/O registry: the "alsCalibration" blob's entry for this
// orientation becomes the driver's calibration record and the source of the
// per-chip database, which is loaded from its cache or built from the entry's
// channel spectra.
#include "sysconfig/SysConfigCalibration.h"

#include "lightdb/CachedDB.h"
#include "lightdb/LDBM.h"
#include "support/CFOwned.h"
#include "support/Log.h"

#include "calibration/Calibration.h"
#include "sysconfig/DatabaseBuild.h"
#include "sysconfig/GenericRecord.h"
#include "sysconfig/SysConfigFormat.h"

#include <IOKit/IOKitLib.h>

#include <mutex>

using namespace sysconfig;

namespace {

enum class PushOutcome { Failed, Set, NoService };

// A blob found on the service's registry entry or one of its ancestors.
CFOwned<CFTypeRef> copyRegistryBlob(io_registry_entry_t entry, CFStringRef key)
{
    return CFOwned<CFTypeRef>(IORegistryEntrySearchCFProperty(
        entry, kIOServicePlane, key, kCFAllocatorDefault, kIORegistryIterateRecursively | kIORegistryIterateParents));
}

// The generic entry's record; also takes the entry's channel count and the
// algorithm override, as the driver will work with them.
CFDataRef createGenericRecord(Calibration& calibration, const CalibrationEntry& entry,
                              const ALSCalibrationHeader& header)
{
    const auto layout = genericEntryLayout(entry.bytes, header.revision);
    if (!layout)
        return nullptr;
    CFDataRef data = sysconfig::createGenericRecord(entry.bytes, *layout, header.entryCount);
    if (!data)
        return nullptr;
    calibration.unit().numberOfChannels = layout->nChannels;
    calibration.unit().dbChannelCount = layout->nChannels;
    if (const uint8_t algoOverride = calibration.unit().colorAlgoOverride; algoOverride != 0)
        calibration.unit().algoVersion = algoOverride;
    return data;
}

PushOutcome pushCalibrationRecord(Calibration& calibration, CFDataRef blob, const ALSCalibrationHeader& header,
                                  const CalibrationEntry& entry)
{
    CFOwned<CFDataRef> record =
        entry.subHeader.chipType == kChipTypeVD6286
            ? processSysConfigSensorCalibrationVD6286(calibration, blob, entry.offset, header, entry.subHeader)
            : CFOwned<CFDataRef>(createGenericRecord(calibration, entry, header));
    if (!record)
        return PushOutcome::Failed;
    if (!calibration.host().service())
        return PushOutcome::NoService;
    if (!IOHIDServiceSetProperty(calibration.host().service(), CFSTR("ALSCalibrationData"), record.get())) {
        VLOG_ERROR("Failed to set ALS calibration data.");
        return PushOutcome::Failed;
    }
    return PushOutcome::Set;
}

// Loads the cached database or builds it from the entry; the result as the
// caller reports it, given the push's result so far.
bool loadOrBuildDatabase(Calibration& calibration, bool asyncCreate, CFDataRef blob, const ALSCalibrationHeader& header,
                         CalibrationEntry entry, CFTypeRef auxBlob, bool resultSoFar)
{
    const unsigned channels = calibration.unit().numberOfChannels;
    auto db = std::make_shared<SpectralDatabase>();
    const CacheKey key{int(calibration.unit().orientation.load()), calibration.unit().smallDBVersion.load(),
                       calibration.unit().chipId.load()};
    if (processCachedDB(key, int(channels), BigDBTypeDefault, *db)) {
        calibration.unit().algoVersion = uint8_t(db->dbInfo.algo);
        VLOG_DEFAULT("Found cached DB\n");
        calibration.databases().publish(std::move(db), true);
        return true;
    }

    const bool generic = channels == 4;
    const bool vd6286 = channels == 5 && entry.subHeader.chipType == kChipTypeVD6286;
    if (!generic && !vd6286)
        return resultSoFar;
    // Without a database sized for the build (no reference to build from),
    // the spectrum step still reads the entry (algorithm version, sample
    // count and their log line) and then fails at the reference scan, which
    // writes nothing: the generic step keeps the push's result, the VD6286
    // step reports false.
    Matrices matrices;
    if (!prepareMatrices(*db, channels, matrices)) {
        matrices = Matrices{};
        matrices.nChannels = int32_t(channels);
    }
    if (generic)
        return buildGenericSpectrum(calibration, asyncCreate, entry.bytes, header.revision, auxBlob, matrices, db) ||
               resultSoFar;
    return processSysConfigSpectrumVD6286(calibration, asyncCreate, blob, entry.offset, entry.subHeader, matrices, db);
}

} // namespace

bool processSysConfigCalibration(Calibration& calibration, bool asyncCreate, bool pushCalibration, bool processDatabase)
{
    const auto guard = calibration.lock();
    const io_registry_entry_t registryEntry = calibration.host().registryEntry();
    if (!registryEntry)
        return false;
    const auto calibrationBlob = copyRegistryBlob(registryEntry, CFSTR("alsCalibration"));
    const auto auxCalibration = copyRegistryBlob(registryEntry, CFSTR("alsAuxCalibration"));
    if (!cf::isData(calibrationBlob.get()))
        return false;
    CFDataRef blob = static_cast<CFDataRef>(calibrationBlob.get());
    const auto bytes = bytesOf(blob);

    const auto header = ALSCalibrationHeader::decode(bytes);
    if (!header) {
        VLOG_ERROR("Need at least header size bytes. Actual: %ld, Expected: %ld\n", long(bytes.size()),
                   long(ALSCalibrationHeader::kSize));
        return false;
    }
    if (header->version != 1) {
        VLOG_ERROR("unsupported calibration version: %d\n", int(header->version));
        return false;
    }
    if (bytes.size() < header->totalSize) {
        VLOG_ERROR("Insufficient calibration data size. Actual: %ld, Expected: %hu\n", long(bytes.size()),
                   header->totalSize);
        return false;
    }
    VLOG_INFO("supported calibration version %d,%d with size %d\n", int(header->version), int(header->revision),
              int(header->totalSize));

    const auto entry =
        findCalibrationEntry(bytes, header->entryCount, calibration.unit().orientation, "alsCalibration");
    if (!entry)
        return false;
    VLOG_INFO("Found calibration for orientation = %d, senzorType = %d, chipType = %d \n",
              int(calibration.unit().orientation.load()), int(entry->subHeader.sensorType),
              int(entry->subHeader.chipType));

    bool result = false;
    if (pushCalibration) {
        const PushOutcome pushed = pushCalibrationRecord(calibration, blob, *header, *entry);
        if (pushed == PushOutcome::Failed)
            return false;
        result = pushed == PushOutcome::Set;
    }
    if (!processDatabase)
        return result;
    return loadOrBuildDatabase(calibration, asyncCreate, blob, *header, *entry, auxCalibration.get(), result);
}
