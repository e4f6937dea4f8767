// Fields that generic and VD6286 entries carry alike, converted into the
// driver record's units.
#pragma once

#include "calibration/DriverRecords.h"

#include <cstdint>
#include <span>

namespace sysconfig {

// The record header of a configuration-supplied record: the entry's fudge
// factor (Q2.14 from 256ths) and driver words; `entryCount` is the blob
// header's entry count, which the driver takes as the calibration version.
driver::RecordHeader recordHeader(std::span<const uint8_t> entry, uint8_t entryCount);

// A channel block from the entry's block `source`: dark counts, offset counts
// (Q8.8 from thousandths), parameter B, and `nGains` gain scales (Q2.14 from
// 256ths) placed from slot `firstGainSlot` on.
driver::ChannelBlock channelBlock(std::span<const uint8_t> source, unsigned nGains, unsigned firstGainSlot = 0);

} // namespace sysconfig
