#include "calibration/ColorCalibrationRecord.h"

#include "calibration/DriverRecords.h"
#include "support/Log.h"

namespace calib {

CFDataRef createColorCalibrationRecord(const SpectralDatabase& db, uint32_t channelCount)
{
    namespace layout = driver::colour;
    const size_t n = db.dbSampleCount;
    const size_t responses = n * db.dbChannelCount;
    if (channelCount != db.dbChannelCount) {
        VLOG_ERROR("ALSColorCalibration skipped: %u channels, the database has %u\n", channelCount, db.dbChannelCount);
        return nullptr;
    }
    if (n > layout::kMaxSamples || responses > layout::responseSlots || db.dbXYZ.size() < 3 * n ||
        db.dbChannelResponses.size() < responses) {
        VLOG_ERROR("ALSColorCalibration skipped: %zu sources and %zu responses do not fit (at most %zu and %zu)\n", n,
                   responses, layout::kMaxSamples, layout::responseSlots);
        return nullptr;
    }

    driver::RecordBuffer record(layout::kSize);
    record.put<uint8_t>(layout::channelCount, uint8_t(channelCount));
    record.put<uint16_t>(layout::sampleCount, uint16_t(n));
    for (size_t i = 0; i < 3 * n; ++i)
        record.put<float>(layout::xyz + 4 * i, db.dbXYZ[i]);
    for (size_t i = 0; i < responses; ++i)
        record.put<float>(layout::responses + 4 * i, db.dbChannelResponses[i]);
    return record.createData();
}

} // namespace calib
