#include "host/recordcodec/Layouts.h"

namespace recordcodec {
namespace {

using T = FieldType;
constexpr double kQ14 = 16384.0;
constexpr double kQ16 = 65536.0;
constexpr double kQ8 = 256.0;

} // namespace

void describeChannelRecord(const Describer& d, const driver::ChannelRecordLayout& layout)
{
    namespace h = driver::header;
    d.scalar("recordVersion", h::recordVersion, T::U8);
    d.scalar("calibrationSource", h::calibrationSource, T::U32);
    d.scalar("chipType", h::chipType, T::U32);
    d.scalar("calibrationVersion", h::calibrationVersion, T::U8);
    d.scalar("recordLength", h::recordLength, T::U16);
    d.scalar("fudge", h::fudge, T::U16, kQ14);
    d.scalar("iTime", h::iTime, T::U16);
    d.scalar("aux1", h::aux1, T::U16);
    d.scalar("aux2", h::aux2, T::U16);
    if (layout.hasAux3)
        d.scalar("aux3", layout.aux3, T::U16);
    d.array("gain", layout.gain, T::U8, layout.gainSlots);
    d.scalar("nChannels", layout.nChannels, T::U8);
    d.scalar("nGains", layout.nGains, T::U8);
    if (layout.fixedLux) {
        d.array("luxCoeff", layout.luxCoeff, T::I32, layout.maxChannels, kQ16);
        d.array("cctCoeffRaw", layout.cctCoeff, T::U32, 2);
    } else {
        d.array("luxCoeff", layout.luxCoeff, T::F32, layout.maxChannels);
        d.array("cctCoeff", layout.cctCoeff, T::F32, layout.maxChannels);
    }
    using B = driver::ChannelBlockLayout;
    for (unsigned c = 0; c < layout.maxChannels; ++c) {
        const Describer ch = d.element("channels", c, layout.blockOffset(c), layout.block.size);
        ch.scalar("darkCounts", B::darkCounts, T::U8);
        ch.scalar("offsetCounts", B::offsetCounts, T::I16, kQ8);
        ch.scalar("channelParamA", B::channelParamA, T::U16);
        ch.scalar("channelParamB", B::channelParamB, layout.block.wideParamB ? T::I16 : T::U8);
        ch.array("gainScale", layout.block.gainScale, T::U16, driver::kMaxGains, kQ14);
    }
}

void describeVD6287Record(const Describer& d)
{
    namespace r = driver::vd6287;
    for (unsigned k = 0; k < 2; ++k) {
        const Describer half = d.element("halves", k, r::kHalfSize * k, r::kHalfSize);
        half.scalar("nChannels", r::nChannels, T::U8);
        half.scalar("gain", r::gain, T::U8);
        half.scalar("blobWord", r::blobWord, T::U32);
        half.scalar("valueA", r::valueA, T::F32);
        half.scalar("valueB", r::valueB, T::F32);
        for (unsigned j = 0; j < r::kChannels; ++j) {
            const Describer ch = half.element("channels", j, 0, r::kHalfSize);
            ch.array("gainTable", r::gainTable + r::gainTableStride * j, T::F32, r::kGainTableSize);
            ch.scalar("channelByte", r::channelByte + j, T::U8);
            ch.scalar("channelFactor", r::channelFactor + 4 * j, T::F32);
            ch.scalar("luxCoeff", r::luxCoeff + 4 * j, T::F32);
            ch.scalar("cctCoeff", r::cctCoeff + 4 * j, T::F32);
            ch.scalar("channelValue", r::channelValue + 4 * j, T::F32);
        }
        half.scalar("sharedValue", r::sharedValue, T::F32);
        half.scalar("entryCount", r::entryCount, T::U8);
        half.array("tableA", r::tableA, T::U16, r::kTableEntries);
        half.array("tableB", r::tableB, T::U16, r::kTableEntries);
        half.array("tableC", r::tableC, T::U16, r::kTableEntries);
        half.array("tableD", r::tableD, T::U8, r::kTableEntries);
        half.array("tableE", r::tableE, T::U16, r::kTableEntries);
        half.array("tableF", r::tableF, T::U16, r::kTableEntries);
    }
}

void describeColorCalibration(const Describer& d)
{
    namespace r = driver::colour;
    d.scalar("channelCount", r::channelCount, T::U8);
    d.scalar("sampleCount", r::sampleCount, T::U16);
    d.array("xyz", r::xyz, T::F32, r::xyzSlots);
    d.array("responses", r::responses, T::F32, r::responseSlots);
}

} // namespace recordcodec
