// "ALSColorCalibration": the per-chip database handed to the driver of the
// VD6287 sensor.
#pragma once

#include "lightdb/SpectralDatabase.h"

#include <CoreFoundation/CoreFoundation.h>

#include <cstdint>

namespace calib {

// The 28163-byte record of `db` with `channelCount` in its channel-count
// field, or null (with an error line) when the database does not fit the
// record (more than 880 sources or 4400 responses) or `channelCount` is not
// the number of response rows the database holds.
CFDataRef createColorCalibrationRecord(const SpectralDatabase& db, uint32_t channelCount);

} // namespace calib
