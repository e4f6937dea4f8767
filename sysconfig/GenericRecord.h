// The 145-byte four-channel driver record built from a generic registry
// calibration entry.
#pragma once

#include "sysconfig/SysConfigFormat.h"

#include <CoreFoundation/CoreFoundation.h>

#include <cstdint>
#include <span>

namespace sysconfig {

// The record for `entry`, whose layout has been checked, as new data (the
// caller releases it), or null; `entryCount` is the blob header's entry
// count, which the driver takes as the calibration version.
CFDataRef createGenericRecord(std::span<const uint8_t> entry, const GenericEntryLayout& layout, uint8_t entryCount);

} // namespace sysconfig
