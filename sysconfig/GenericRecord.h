// The 145-byte four-channel driver record built from a generic registry
// calibration entry.
#pragma once

#include "sysconfig/SysConfigFormat.h"

#include <cstdint>
#include <span>
#include <vector>

namespace sysconfig {

constexpr size_t kGenericRecordSize = 145;

// The record for `entry`, whose layout has been checked; `entryCount` is the
// blob header's entry count, which the driver takes as the calibration version.
std::vector<uint8_t> buildGenericRecord(std::span<const uint8_t> entry, const GenericEntryLayout& layout,
                                        uint8_t entryCount);

} // namespace sysconfig
