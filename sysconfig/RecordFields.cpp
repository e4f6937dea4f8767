#include "sysconfig/RecordFields.h"

#include "support/LittleEndian.h"
#include "sysconfig/FixedPoint.h"
#include "sysconfig/SysConfigFormat.h"

namespace sysconfig {

driver::RecordHeader recordHeader(std::span<const uint8_t> entry, uint8_t entryCount)
{
    return {.source = driver::CalibrationSource::Configuration,
            .calibrationVersion = entryCount,
            .fudge = toQ2_14(float(le::get<uint16_t>(entry, generic::kWordA)) / 256.0f),
            .iTime = le::get<uint16_t>(entry, generic::kWordB),
            .aux1 = le::get<uint16_t>(entry, generic::kWordB + 2),
            .aux2 = le::get<uint16_t>(entry, generic::kWordB + 4)};
}

driver::ChannelBlock channelBlock(std::span<const uint8_t> source, unsigned nGains, unsigned firstGainSlot)
{
    driver::ChannelBlock block;
    block.darkCounts = le::get<uint8_t>(source, 0);
    block.offsetCounts = int16_t(toQ8_8(float(le::get<uint16_t>(source, 1)) / 1000.0f));
    block.channelParamB = int16_t(le::get<uint8_t>(source, 3));
    for (unsigned k = 0; k < nGains && firstGainSlot + k < driver::kMaxGains; ++k)
        block.gainScale[firstGainSlot + k] = toQ2_14(float(le::get<uint16_t>(source, 4 + 2 * k)) / 256.0f);
    return block;
}

} // namespace sysconfig
