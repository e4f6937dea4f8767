// Driver record from a generic registry entry: the four-channel layout with
// configuration-supplied values, every field converted from the entry's units.
#include "sysconfig/GenericRecord.h"

#include "calibration/DriverRecords.h"
#include "support/LittleEndian.h"
#include "sysconfig/FixedPoint.h"
#include "sysconfig/RecordFields.h"

namespace sysconfig {

namespace {

constexpr uint8_t kFirstGain = 9;

} // namespace

CFDataRef createGenericRecord(std::span<const uint8_t> entry, const GenericEntryLayout& layout, uint8_t entryCount)
{
    const auto spectrum = entry.subspan(layout.spectrumOffset, layout.spectrumSize);
    driver::ChannelRecord record(driver::kFourChannelRecord);

    record.setHeader(recordHeader(entry, entryCount));
    record.setGain(0, kFirstGain);
    record.setGain(1, le::get<uint8_t>(entry, generic::kGain1));
    record.setGain(2, le::get<uint8_t>(entry, generic::kGain1 + 1));
    record.setCounts(uint8_t(layout.nChannels), uint8_t(layout.nGains));

    for (unsigned k = 0; k < generic::kSpectrumChannels; ++k) {
        const float weight = float(le::get<int32_t>(spectrum, generic::kSpectrumWeights + 4 * k)) / 1000000.0f;
        record.setLuxCoeffFixed(k, toQ16_16(weight));
    }
    for (unsigned k = 0; k < 2; ++k)
        record.setCctCoeffRaw(k, le::get<uint32_t>(spectrum, generic::kSpectrumCctWords + 4 * k) << 16);

    for (unsigned c = 0; c < layout.nChannels; ++c)
        record.setChannelBlock(c, channelBlock(entry.subspan(generic::kChannelBlocks + layout.channelBlockSize * c,
                                                             layout.channelBlockSize),
                                               layout.nGains));
    return record.createData();
}

} // namespace sysconfig
