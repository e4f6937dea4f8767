// The per-chip database of a unit calibrated from the factory store: the
// cached database or one built from the factory record's channel spectra,
// normalised for the colour solver and then published whole.
#pragma once

#include "calibration/Calibration.h"
#include "lightdb/LDBMInfo.h"

#include <CoreFoundation/CoreFoundation.h>

#include <cstddef>

namespace calib {

// The factory layouts, recognised by their length.
enum class FactoryLayout {
    None,
    VD6287, // version 3 (version 1 is converted first)
    XwCAT2,
    XwCl,
};

FactoryLayout factoryLayoutOf(size_t length);

// The factory record the driver record was built from.
struct FactorySource {
    FactoryLayout layout = FactoryLayout::None;
    CFDataRef data = nullptr;   // borrowed
    size_t xwclEntryOffset = 0; // XwCl: the entry that was parsed
    BigDBType bigDBType = BigDBTypeDefault;
};

// Loads or builds the database for the calibration just parsed, publishes it
// when it is complete and usable, and hands it to the driver where the sensor
// takes it. Runs under the caller's calibration lock.
void finishFactoryDatabase(Calibration& calibration, const FactorySource& source, bool forceRebuild);

} // namespace calib
