// What the sensor driver hands the event system for one light sample: an
// ambient-light event carrying the illuminance, the first four raw channels
// and, as its vendor-defined child, the 137-byte sample record.
#pragma once

#include "formats/ALSSampleRecord.h"

#include <IOKit/hid/IOHIDEvent.h>

#include <array>
#include <cstdint>
#include <optional>

namespace host {

// The record's bytes in the driver's layout.
std::array<uint8_t, ALSSampleRecord::kSize> encodeSampleRecord(const ALSSampleRecord& record);

// A new ALS event (caller releases) for the record, stamped `timeStamp` ticks.
IOHIDEventRef createALSEvent(const ALSSampleRecord& record, uint64_t timeStamp);

// The X, Y, Z the plug-in wrote into the event's record (xyzResult), or
// nothing when the event carries no full record.
std::optional<std::array<float, 3>> readXYZResult(IOHIDEventRef event);

} // namespace host
