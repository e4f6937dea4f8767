// "alsCalibration": an 8-byte header, then entries of an 8-byte subheader and
// a body in the generic (four-channel) or VD6286 (chip type 3) layout.
// "alsAuxCalibration": the same framing with infrared compensation
// coefficients. Entries are walked as the plug-in walks them; each entry's
// fields are kept inside the entry.
#include "host/recordcodec/Layouts.h"

namespace recordcodec {
namespace {

using T = FieldType;
constexpr size_t kHeaderSize = 8;
constexpr size_t kSubHeaderSize = 8;
constexpr uint8_t kChipTypeVD6286 = 3;
constexpr double kMillionths = 1000000.0;
constexpr double kThousandths = 1000.0;
constexpr double kQ8 = 256.0;

// Words A to D: A is the fudge in 1/256 units; B, C and D go to the driver as they are.
void driverWords(const Describer& e)
{
    e.scalar("wordA", 8, T::U16, kQ8);
    e.scalar("wordB", 10, T::U16);
    e.scalar("wordC", 12, T::U16);
    e.scalar("wordD", 14, T::U16);
}

// Channel block: dark counts, offset in thousandths, parameter B, gains in 1/256.
void channelBlocks(const Describer& e, size_t first, size_t blockSize, unsigned channels, unsigned gains)
{
    for (unsigned c = 0; c < channels; ++c) {
        const Describer ch = e.element("channels", c, first + blockSize * c, blockSize);
        ch.scalar("darkCounts", 0, T::U8);
        ch.scalar("offset", 1, T::U16, kThousandths);
        ch.scalar("channelParamB", 3, T::U8);
        ch.array("gains", 4, T::U16, gains, kQ8);
    }
}

void genericEntry(const Describer& e, uint8_t revision)
{
    driverWords(e);
    e.array("gains", 17, T::U8, 2);
    e.scalar("nChannels", 19, T::U8);
    e.scalar("nGains", 20, T::U8);
    const unsigned channels = e.u8(19);
    const unsigned gains = e.u8(20);
    const size_t blockSize = 4 + 2 * size_t(gains);
    channelBlocks(e, 24, blockSize, channels, gains);

    const size_t at = 24 + blockSize * channels;
    const Describer s = e.object("spectrum", at, e.windowLength());
    s.scalar("algoVersion", 0, T::U8);
    s.scalar("nSamples", 2, T::U16);
    s.array("weights", 4, T::I32, 4, kMillionths);
    s.array("cctWords", 20, T::U32, 2);
    s.array("samples", revision == 0 ? 28 : 32, T::I16, size_t(s.u16(2)) * 4);
}

void vd6286Entry(const Describer& e)
{
    constexpr unsigned kMaxChannels = 5;
    constexpr unsigned kMaxGains = 5;
    driverWords(e);
    e.array("gains", 16, T::U8, 3);
    e.scalar("nChannels", 19, T::U8);
    e.scalar("nGains", 20, T::U8);
    const unsigned channels = e.u8(19);
    channelBlocks(e, 24, 14, std::min<unsigned>(channels, kMaxChannels), std::min<unsigned>(e.u8(20), kMaxGains));
    e.scalar("algoVersion", 96, T::U8);
    e.scalar("nSamples", 98, T::U16);
    e.array("weights", 100, T::I32, 5, kMillionths);
    e.array("cctCoefficients", 120, T::I32, 5);
    e.array("samples", 144, T::I16, size_t(e.u16(98)) * channels);
}

// Walks the entries after the header; `body` describes one entry.
template <typename Body>
void entries(const Describer& d, unsigned count, Body body)
{
    size_t offset = kHeaderSize;
    for (unsigned k = 0; k < count && offset + kSubHeaderSize <= d.windowLength(); ++k) {
        const size_t size = d.u16(offset + 4);
        const Describer e = d.element("entries", k, offset, size < kSubHeaderSize ? kSubHeaderSize : size);
        body(e);
        if (size < kSubHeaderSize) // the plug-in stops at such an entry too
            break;
        offset += size;
    }
}

} // namespace

void describeAlsCalibration(const Describer& d)
{
    const Describer h = d.object("header", 0, kHeaderSize);
    h.scalar("revision", 0, T::U8);
    h.scalar("version", 1, T::U8);
    h.scalar("entryCount", 2, T::U8);
    h.scalar("totalSize", 4, T::U16);
    const uint8_t revision = d.u8(0);
    entries(d, d.u8(2), [&](const Describer& e) {
        e.scalar("sensorType", 0, T::U8);
        e.scalar("orientation", 2, T::U8);
        e.scalar("chipType", 3, T::U8);
        e.scalar("entrySize", 4, T::U16);
        if (e.u8(3) == kChipTypeVD6286)
            vd6286Entry(e);
        else
            genericEntry(e, revision);
    });
}

void describeAlsAuxCalibration(const Describer& d)
{
    d.object("header", 0, kHeaderSize).scalar("entryCount", 2, T::U8);
    entries(d, d.u8(2), [](const Describer& e) {
        e.scalar("orientation", 2, T::U8);
        e.scalar("entrySize", 4, T::U16);
        e.array("irCoefficients", 40, T::I32, 4, kMillionths);
    });
}

} // namespace recordcodec
