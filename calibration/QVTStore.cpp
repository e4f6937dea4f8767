// Calibration from the factory-data store: reading the record (with retries
// while the store is not ready on Dravik OS), recognising and parsing it into
// the driver record, and then the per-chip database.
#include "calibration/Calibration.h"
#include "calibration/FactoryDatabase.h"
#include "calibration/XwClFormat.h"
#include "formats/VD6287Layout.h"
#include "support/CFOwned.h"
#include "support/Log.h"

#include <QVT/QVT.h>

#include <mutex>

namespace {

// Store reads retried after the first one failed; the store may come up late after boot.
constexpr uint32_t kStoreRetries = 20;
constexpr int64_t kStoreRetryDelay = 5 * int64_t(NSEC_PER_SEC);

// The store's own diagnostics, on the framework log at debug level.
void qvtLogHandler(int, const char* message)
{
    os_log_t log = _BRENZEL_LOG_DEFAULT.load();
    if (!log)
        log = init_default_brenzel_log();
    os_log_debug(log, "%s", message);
}

struct ParsedRecord {
    CFOwned<CFDataRef> record;
    calib::FactorySource source;
    bool chipMismatch = false;
};

ParsedRecord parseFactoryData(Calibration& p, CFDataRef data)
{
    ParsedRecord parsed;
    parsed.source.data = data;
    parsed.source.layout = calib::factoryLayoutOf(size_t(CFDataGetLength(data)));
    switch (parsed.source.layout) {
    case calib::FactoryLayout::VD6287:
        parsed.record = p.processQVTCalibrationVD6287_XwClv3(data);
        break;
    case calib::FactoryLayout::XwCAT2:
        parsed.record = p.processQVTCalibrationXwCAT2(data);
        break;
    case calib::FactoryLayout::XwCl: {
        calib::XwClParse xwcl = calib::parseXwClRecord(p, {CFDataGetBytePtr(data), size_t(CFDataGetLength(data))});
        parsed.chipMismatch = xwcl.outcome == calib::XwClParse::Outcome::ChipMismatch;
        parsed.record = std::move(xwcl.record);
        parsed.source.xwclEntryOffset = xwcl.entryOffset;
        parsed.source.bigDBType = xwcl.bigDBType;
        break;
    }
    case calib::FactoryLayout::None:
        break;
    }
    return parsed;
}

} // namespace

void Calibration::scheduleStoreRetry()
{
    const uint32_t failed = qvtRetryCount_.fetch_add(1);
    if (failed >= kStoreRetries)
        return;
    VLOG_INFO("Retrieving QVT calibration data failed in attempt number %d/20. Try again in 5 sec.\n", int(failed + 1));
    host_.dispatchAfterRetained(dispatch_time(DISPATCH_TIME_NOW, kStoreRetryDelay),
                                dispatch_get_global_queue(DISPATCH_QUEUE_PRIORITY_HIGH, 0),
                                [this] { loadQVTCalibration(false); });
}

CFDataRef Calibration::readFactoryData()
{
    if (!unit_.isDravikOS.load()) {
        if (CFDataRef data = copyQVTCalibrationData(CFSTR("XwCA")))
            return data;
        return copyQVTCalibrationData(CFSTR("XwCl"));
    }
    if (CFDataRef data = copyQVTCalibrationData(CFSTR("XwCM")))
        return data;
    if (CFDataRef data = copyQVTCalibrationData(CFSTR("XwCA")))
        return data;
    scheduleStoreRetry();
    return nullptr;
}

CFDataRef Calibration::copyQVTCalibrationData(CFStringRef key)
{
    QVTLogSetHandler(qvtLogHandler);
    CFErrorRef error = nullptr;
    CFDataRef data = QVTSealingMapCopyLocalDataForClass(key, nullptr, &error);
    if (error && CFErrorGetCode(error) != 0)
        VLOG_DEFAULT("QVTDataCopy for key %@ failed with error %@", key, error);
    else
        VLOG_DEFAULT("QVTDataCopy for key %@ succeeded.", key);
    if (error)
        CFRelease(error);
    return data;
}

bool Calibration::loadQVTCalibration(bool forceRebuild)
{
    const auto guard = lock();
    VLOG_DEBUG("loadQVTCalibration");

    CFOwned<CFDataRef> data(readFactoryData());
    if (!data)
        return false;
    VLOG_INFO("QVT calibration data length = %ld\n", long(CFDataGetLength(data.get())));
    if (CFDataGetLength(data.get()) == CFIndex(stored::vd6287::kV1Size)) {
        // A failed conversion keeps the version-1 data, which no layout matches.
        if (CFDataRef converted = convertSorvelXwClv1Tov3(data.get())) {
            data.reset(converted);
            VLOG_INFO("QVT calibration data converted from v1 to v3. New size = %ld\n",
                      long(CFDataGetLength(data.get())));
        }
    }

    ParsedRecord parsed = parseFactoryData(*this, data.get());
    if (parsed.chipMismatch)
        return false;
    if (!parsed.record) {
        VLOG_ERROR("Failed to parse ALS calibration data.");
        return false;
    }
    if (host_.service() &&
        !IOHIDServiceSetProperty(host_.service(), CFSTR("ALSCalibrationData"), parsed.record.get())) {
        VLOG_ERROR("Failed to set ALS calibration data.");
        return false;
    }
    parsed.record.reset();

    calib::finishFactoryDatabase(*this, parsed.source, forceRebuild);
    return true;
}
