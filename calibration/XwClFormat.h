// Parsing an XwCl factory record in place: the header picks the entry and the
// driver-record layout, the entry gives the record's fields and, later, the
// channel spectra.
#pragma once

#include "calibration/Calibration.h"
#include "formats/XwClLayout.h"
#include "lightdb/LDBMInfo.h"
#include "support/CFOwned.h"

#include <cstddef>
#include <cstdint>
#include <span>

namespace calib {

struct XwClParse {
    enum class Outcome {
        Record,       // `record` holds the driver record
        ChipMismatch, // the record belongs to another chip; dbReady was cleared
        Unusable,     // no driver record can be built from it
    };
    Outcome outcome = Outcome::Unusable;
    CFOwned<CFDataRef> record;
    size_t entryOffset = 0; // entry the record was built from
    BigDBType bigDBType = BigDBTypeDefault;
};

// Parses an XwCl record (the caller has recognised its length) into the
// driver record and sets the plug-in's calibration fields.
XwClParse parseXwClRecord(Calibration& calibration, std::span<const uint8_t> data);

} // namespace calib
