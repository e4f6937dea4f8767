#include "formats/VD6287Layout.h"
#include "formats/XwCAT2Layout.h"
#include "formats/XwClLayout.h"
#include "host/recordcodec/Layouts.h"

namespace recordcodec {
namespace {

using T = FieldType;
constexpr double kQ14 = 16384.0;
constexpr double kQ16 = 65536.0;
constexpr double kQ8 = 256.0;

void xwclEntry(const Describer& e, bool sixChannelChipType0)
{
    using namespace stored::xwcl::entry;
    e.scalar("nChannels", nChannels, T::U8);
    e.scalar("nGains", nGains, T::U8);
    e.scalar("iTime", iTime, T::U16);
    e.scalar("aux1", aux1, T::U16);
    e.scalar("aux2", aux2, T::U16);
    e.scalar("aux3", aux3, T::U16);
    e.array("gain", gain, T::U8, 4);
    e.scalar("fudge", fudge, T::U16, kQ14);
    // The 6-channel record of chip type 0 reads the colour-temperature
    // coefficients with 16 fraction bits, every other layout with 8.
    const double cctDivisor = sixChannelChipType0 ? kQ16 : kQ8;
    for (unsigned c = 0; c < stored::xwcl::kStoredChannels; ++c) {
        const Describer ch = e.element("channels", c, 0, stored::xwcl::kEntrySize);
        ch.array("gainScale", gainScale + gainScaleStride * c, T::U16, stored::xwcl::kStoredGains, kQ14);
        ch.scalar("channelParamA", channelParamA + 2 * c, T::U16);
        ch.scalar("offsetCounts", offsetCounts + 2 * c, T::I16, kQ8);
        ch.scalar("darkCounts", darkCounts + c, T::U8);
        ch.scalar("channelParamB", channelParamB + c, T::I8);
        ch.scalar("luxCoeff", luxCoeff + 4 * c, T::I32, kQ16);
        ch.scalar("cctCoeff", cctCoeff + 4 * c, T::I32, cctDivisor);
        ch.array("spectrum", spectrum + spectrumStride * c, T::I16, stored::xwcl::kSpectrumSamples);
    }
}

void vd6287Header(const Describer& d)
{
    using namespace stored::vd6287::header;
    const Describer h = d.object("header", 0, stored::vd6287::kHeaderSize);
    h.scalar("versionMajor", versionMajor, T::U8);
    h.scalar("versionMinor", versionMinor, T::U8);
    h.scalar("numBlobs", numBlobs, T::U8);
}

void vd6287Channels(const Describer& b, size_t ratio, size_t byte, size_t byteStride, FieldType byteType, size_t factor,
                    size_t lux, size_t cct, size_t value)
{
    for (unsigned j = 0; j < stored::vd6287::kChannels; ++j) {
        const Describer ch = b.element("channels", j, 0, b.windowLength());
        ch.array("gainRatio", ratio + stored::vd6287::blob::gainRatioStride * j, T::U16, stored::vd6287::kGains, kQ14);
        ch.scalar("channelByte", byte + byteStride * j, byteType);
        ch.scalar("channelFactor", factor + 2 * j, T::I16, kQ14);
        ch.scalar("luxCoeff", lux + 4 * j, T::I32, kQ16);
        ch.scalar("cctCoeff", cct + 4 * j, T::I32, kQ8);
        ch.scalar("channelValue", value + 4 * j, T::U32, kQ16);
    }
}

void vd6287Spectra(const Describer& b, size_t first)
{
    for (unsigned c = 0; c < stored::vd6287::kStoredSpectra; ++c)
        b.element("spectra", c, 0, b.windowLength())
            .array("samples", first + stored::vd6287::blob::spectrumStride * c, T::I16,
                   stored::vd6287::kSpectrumSamples);
}

} // namespace

void describeXwCl(const Describer& d)
{
    using namespace stored::xwcl;
    const Describer h = d.object("header", 0, kHeaderSize);
    h.scalar("versionMajor", header::versionMajor, T::U8);
    h.scalar("versionMinor", header::versionMinor, T::U8);
    h.scalar("entrySelector", header::entrySelector, T::U8);
    h.scalar("chipID", header::chipID, T::U32);
    h.scalar("deviceID", header::deviceID, T::U8);
    h.scalar("chipType", header::chipType, T::U8);
    const bool sixChannelChipType0 = d.u8(header::deviceID) == kDeviceSixChannel && d.u8(header::chipType) == 0;
    const size_t entries = d.windowLength() > kHeaderSize ? (d.windowLength() - kHeaderSize) / kEntrySize : 0;
    for (unsigned k = 0; k < entries; ++k)
        xwclEntry(d.element("entries", k, entryOffset(k), kEntrySize), sixChannelChipType0);
}

void describeXwCAT2(const Describer& d)
{
    using namespace stored::xwca;
    d.scalar("versionMajor", versionMajor, T::U8);
    d.scalar("versionMinor", versionMinor, T::U8);
    d.array("chipID", chipID, T::Text, kChipIdDigits);
    d.scalar("deviceID", deviceID, T::U8);
    d.scalar("nChannels", nChannels, T::U8);
    d.scalar("nGains", nGains, T::U8);
    d.scalar("fudge", fudge, T::U16, kQ14);
    for (unsigned c = 0; c < kMaxChannels; ++c) {
        const Describer ch = d.element("channels", c, 0, kSize);
        ch.array("gainScale", gainScale + gainScaleStride * c, T::U16, 9, kQ14);
        ch.scalar("channelParamA", channelParamA + 2 * c, T::U16);
        ch.scalar("offsetCounts", offsetCounts + 2 * c, T::I16, kQ8);
        ch.scalar("darkCounts", darkCounts + c, T::U8);
        ch.scalar("channelParamB", channelParamB + 2 * c, T::I16);
        ch.scalar("luxCoeff", luxCoeff + 4 * c, T::I32, 2147483648.0);
        ch.scalar("cctCoeff", cctCoeff + 4 * c, T::I32, kQ14);
    }
    d.scalar("gainIndex", gainIndex, T::U8);
    d.scalar("iTime", iTime, T::I16);
    for (unsigned c = 0; c < kStoredSpectra; ++c)
        d.element("spectra", c, 0, kSize).array("samples", spectrum + spectrumStride * c, T::I32, kSpectrumSamples);
}

void describeVD6287v3(const Describer& d)
{
    using namespace stored::vd6287;
    vd6287Header(d);
    for (unsigned k = 0; k < kBlobs; ++k) {
        const Describer b = d.element("blobs", k, v3BlobOffset(k), kV3BlobSize);
        b.scalar("type", blob::type, T::U8);
        b.scalar("numChannels", blob::numChannels, T::U8);
        b.scalar("numGains", blob::numGains, T::U8);
        b.scalar("gainIndex", blob::gainIndex, T::U8);
        b.scalar("blobWord", blob::blobWord, T::U32);
        b.scalar("valueA", blob::valueA, T::U16, 100.0);
        b.scalar("valueB", blob::valueB, T::U16, kQ14);
        vd6287Channels(b, blob::gainRatio, blob::channelByte, 2, T::U8, blob::channelFactor, blob::luxCoeff,
                       blob::cctCoeff, blob::channelValue);
        b.scalar("sharedValue", blob::sharedValue, T::U32, kQ16);
        vd6287Spectra(b, blob::spectrum);
        b.scalar("tailWord", blob::tailWord, T::U32);
        b.scalar("entryCount", blob::entryCount, T::U8);
        b.array("tableA", blob::tableA, T::U16, kMaxEntries);
        b.array("tableB", blob::tableB, T::U16, kMaxEntries);
        b.array("tableC", blob::tableC, T::U16, kMaxEntries);
        b.array("tableD", blob::tableD, T::U8, kMaxEntries);
        b.array("tableE", blob::tableE, T::U16, kMaxEntries);
        b.array("tableF", blob::tableF, T::U16, kMaxEntries);
        b.scalar("tailByte", blob::tailByte, T::U8);
    }
}

void describeVD6287v1(const Describer& d)
{
    using namespace stored::vd6287;
    // Version 1 keeps the version-3 fields two bytes further on (one byte
    // further from the spectra on), with one-byte channel values.
    constexpr size_t kShift = 2;
    vd6287Header(d);
    for (unsigned k = 0; k < kBlobs; ++k) {
        const Describer b = d.element("blobs", k, v1BlobOffset(k), kV1BlobSize);
        b.scalar("type", blob::type, T::U8);
        b.scalar("numChannels", blob::numChannels, T::U8);
        b.scalar("numGains", blob::numGains, T::U8);
        b.scalar("gainIndex", blob::gainIndex, T::U8);
        b.scalar("valueA", blob::valueA + kShift, T::U16, 100.0);
        b.scalar("valueB", blob::valueB + kShift, T::U16, kQ14);
        vd6287Channels(b, blob::gainRatio + kShift, v1blob::channelByte, 1, T::I8, blob::channelFactor + kShift,
                       blob::luxCoeff + kShift, blob::cctCoeff + kShift, blob::channelValue + kShift);
        b.scalar("sharedValue", blob::sharedValue + kShift, T::U32, kQ16);
        vd6287Spectra(b, blob::spectrum + 1);
        b.scalar("tailWord", blob::tailWord + 1, T::U32);
        b.scalar("count", v1blob::count, T::U8);
        b.array("tableA", v1blob::tableA, T::U16, 4);
        b.array("tableB", v1blob::tableB, T::U16, 4);
        b.scalar("tableD", v1blob::tableD, T::U8);
        b.scalar("tableC", v1blob::tableC, T::U16);
        b.scalar("tableF", v1blob::tableF, T::U16);
        b.scalar("tableE", v1blob::tableE, T::U16);
        b.scalar("tailByte", v1blob::tailByte, T::U8);
    }
}

} // namespace recordcodec
