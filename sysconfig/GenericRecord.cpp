// Driver record from a generic registry entry: the four-channel layout with
// configuration-supplied values, every field converted from the entry's units.
#include "sysconfig/GenericRecord.h"

#include "plugin/LittleEndian.h"
#include "sysconfig/FixedPoint.h"

namespace sysconfig {

namespace {

// Offsets of the four-channel record.
constexpr size_t kRecordVersion = 0;
constexpr size_t kCalibrationSource = 1;
constexpr size_t kCalibrationVersion = 9;
constexpr size_t kRecordLength = 10;
constexpr size_t kFudge = 12;
constexpr size_t kDriverWords = 14; // iTime, aux1, aux2
constexpr size_t kGains = 20;
constexpr size_t kChannelCount = 23;
constexpr size_t kGainCount = 24;
constexpr size_t kLuxCoefficients = 25;
constexpr size_t kCctWords = 41;
constexpr size_t kChannelBlocks = 49;
constexpr size_t kChannelBlockSize = 24;

constexpr uint32_t kSourceConfiguration = 1;
constexpr uint8_t kFirstGain = 9;

void putChannelBlock(std::span<uint8_t> block, std::span<const uint8_t> source, unsigned nGains)
{
    le::put<uint8_t>(block, 0, le::get<uint8_t>(source, 0));                                   // dark counts
    le::put<uint16_t>(block, 1, toQ8_8(float(le::get<uint16_t>(source, 1)) / 1000.0f));       // offset counts
    le::put<uint8_t>(block, 5, le::get<uint8_t>(source, 3));                                   // channel parameter B
    for (unsigned k = 0; k < nGains; ++k)
        le::put<uint16_t>(block, 6 + 2 * k, toQ2_14(float(le::get<uint16_t>(source, 4 + 2 * k)) / 256.0f));
}

} // namespace

std::vector<uint8_t> buildGenericRecord(std::span<const uint8_t> entry, const GenericEntryLayout& layout,
                                        uint8_t entryCount)
{
    std::vector<uint8_t> record(kGenericRecordSize, 0);
    std::span<uint8_t> out(record);
    const auto spectrum = entry.subspan(layout.spectrumOffset, layout.spectrumSize);

    le::put<uint8_t>(out, kRecordVersion, 1);
    le::put<uint32_t>(out, kCalibrationSource, kSourceConfiguration);
    le::put<uint8_t>(out, kCalibrationVersion, entryCount);
    le::put<uint16_t>(out, kRecordLength, uint16_t(kGenericRecordSize));
    le::put<uint16_t>(out, kFudge, toQ2_14(float(le::get<uint16_t>(entry, generic::kWordA)) / 256.0f));
    for (size_t w = 0; w < 3; ++w)
        le::put<uint16_t>(out, kDriverWords + 2 * w, le::get<uint16_t>(entry, generic::kWordB + 2 * w));

    le::put<uint8_t>(out, kGains, kFirstGain);
    le::put<uint8_t>(out, kGains + 1, le::get<uint8_t>(entry, generic::kGain1));
    le::put<uint8_t>(out, kGains + 2, le::get<uint8_t>(entry, generic::kGain1 + 1));
    le::put<uint8_t>(out, kChannelCount, uint8_t(layout.nChannels));
    le::put<uint8_t>(out, kGainCount, uint8_t(layout.nGains));

    for (size_t k = 0; k < generic::kSpectrumChannels; ++k) {
        const float weight = float(le::get<int32_t>(spectrum, generic::kSpectrumWeights + 4 * k)) / 1000000.0f;
        le::put<int32_t>(out, kLuxCoefficients + 4 * k, toQ16_16(weight));
    }
    for (size_t k = 0; k < 2; ++k)
        le::put<uint32_t>(out, kCctWords + 4 * k, le::get<uint32_t>(spectrum, generic::kSpectrumCctWords + 4 * k) << 16);

    for (unsigned c = 0; c < layout.nChannels; ++c)
        putChannelBlock(out.subspan(kChannelBlocks + kChannelBlockSize * c, kChannelBlockSize),
                        entry.subspan(generic::kChannelBlocks + layout.channelBlockSize * c, layout.channelBlockSize),
                        layout.nGains);
    return record;
}

} // namespace sysconfig
