// Driver record from a generic registry entry: the four-channel layout with
// configuration-supplied values, every field converted from the entry's units.
#include "sysconfig/GenericRecord.h"

#include "calibration/DriverRecords.h"
#include "plugin/LittleEndian.h"
#include "sysconfig/FixedPoint.h"

namespace sysconfig {

namespace {

constexpr uint8_t kFirstGain = 9;

driver::ChannelBlock channelBlock(std::span<const uint8_t> source, unsigned nGains)
{
    driver::ChannelBlock block;
    block.darkCounts = le::get<uint8_t>(source, 0);
    block.offsetCounts = int16_t(toQ8_8(float(le::get<uint16_t>(source, 1)) / 1000.0f));
    block.channelParamB = le::get<uint8_t>(source, 3);
    for (unsigned k = 0; k < nGains; ++k)
        block.gainScale[k] = toQ2_14(float(le::get<uint16_t>(source, 4 + 2 * k)) / 256.0f);
    return block;
}

} // namespace

CFDataRef createGenericRecord(std::span<const uint8_t> entry, const GenericEntryLayout& layout, uint8_t entryCount)
{
    const auto spectrum = entry.subspan(layout.spectrumOffset, layout.spectrumSize);
    driver::ChannelRecord record(driver::kFourChannelRecord);

    record.setHeader({.source = driver::CalibrationSource::Configuration,
                      .calibrationVersion = entryCount,
                      .fudge = toQ2_14(float(le::get<uint16_t>(entry, generic::kWordA)) / 256.0f),
                      .iTime = le::get<uint16_t>(entry, generic::kWordB),
                      .aux1 = le::get<uint16_t>(entry, generic::kWordB + 2),
                      .aux2 = le::get<uint16_t>(entry, generic::kWordB + 4)});
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
