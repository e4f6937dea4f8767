#include "formats/VD6287Layout.h"

#include "calibration/Calibration.h"
#include "calibration/DriverRecords.h"
#include "support/CFOwned.h"
#include "support/Log.h"

#include <optional>

namespace {

using namespace stored::vd6287;
namespace half = driver::vd6287;

std::optional<std::span<const uint8_t>> slice(std::span<const uint8_t> bytes, size_t offset, size_t length)
{
    if (!le::fits(bytes.size(), offset, length))
        return std::nullopt;
    return bytes.subspan(offset, length);
}

// ---- Version 1 to version 3 --------------------------------------------------------

// Byte ranges that keep their content and move: {version-3 offset, version-1 offset, length}.
struct Move {
    size_t to;
    size_t from;
    size_t length;
};
constexpr Move kMoves[] = {
    {0, 0, 7},        // type, channels, gains, gain index
    {11, 9, 6},       // unnamed settings
    {17, 19, 4},      // values A and B
    {21, 23, 108},    // gain ratios
    {141, 143, 95},   // channel factors, lux and colour-temperature coefficients, values
    {238, 239, 4812}, // spectra
    {5050, 5051, 4},  // tail word
};

constexpr unsigned kV1TableEntries = 4; // tables A and B hold four values in version 1

// The version-3 entry count of a version-1 count, or nothing when the tables
// cannot hold it.
std::optional<uint8_t> v3EntryCount(uint8_t v1Count)
{
    if (v1Count == kNoV1Entries)
        return 0;
    if (v1Count > kMaxV1Entries)
        return std::nullopt;
    return uint8_t(v1Count + 1);
}

void convertBlob(driver::RecordBuffer& out, size_t to, std::span<const uint8_t> in, uint8_t entries)
{
    for (const Move& move : kMoves)
        out.putBytes(to + move.to, in.subspan(move.from, move.length));
    out.put<uint32_t>(to + blob::blobWord, 0xFFFFFFFFu);
    for (unsigned m = 0; m < 6; ++m)
        out.put<int16_t>(to + blob::channelByte + 2 * m, le::get<int8_t>(in, v1blob::channelByte + m));

    out.put<uint8_t>(to + blob::entryCount, entries);
    // Version 1 keeps tables A and B from the second entry on (entry 0 of A
    // is zero, of B a copy of its first value) and one value for each of C to F.
    out.put<uint16_t>(to + blob::tableB, le::get<uint16_t>(in, v1blob::tableB));
    for (unsigned m = 0; m < kV1TableEntries; ++m) {
        out.put<uint16_t>(to + blob::tableA + 2 * (m + 1), le::get<uint16_t>(in, v1blob::tableA + 2 * m));
        out.put<uint16_t>(to + blob::tableB + 2 * (m + 1), le::get<uint16_t>(in, v1blob::tableB + 2 * m));
    }
    for (unsigned m = 0; m < entries; ++m) {
        out.put<uint16_t>(to + blob::tableC + 2 * m, le::get<uint16_t>(in, v1blob::tableC));
        out.put<uint8_t>(to + blob::tableD + m, le::get<uint8_t>(in, v1blob::tableD));
        out.put<uint16_t>(to + blob::tableE + 2 * m, le::get<uint16_t>(in, v1blob::tableE));
        out.put<uint16_t>(to + blob::tableF + 2 * m, le::get<uint16_t>(in, v1blob::tableF));
    }
    out.put<uint8_t>(to + blob::tailByte, le::get<uint8_t>(in, v1blob::tailByte));
}

// ---- Version 3 to the driver record ------------------------------------------------------

bool blobsAre(std::span<const uint8_t> data, size_t field, uint8_t first, uint8_t second)
{
    return le::get<uint8_t>(data, v3BlobOffset(0) + field) == first &&
           le::get<uint8_t>(data, v3BlobOffset(1) + field) == second;
}

void putGainTable(driver::RecordBuffer& out, size_t at, std::span<const uint8_t> b, unsigned j)
{
    out.put<float>(at, 1.0f);
    out.put<float>(at + 4, 2.0f);
    float step = 4.0f;
    out.put<float>(at + 8, step);
    for (unsigned g = 0; g < kGains; ++g) {
        const double ratio =
            double(le::get<uint16_t>(b, blob::gainRatio + blob::gainRatioStride * j + 2 * g)) / 16384.0;
        step = float(double(step) * ratio);
        out.put<float>(at + 12 + 4 * g, step);
    }
}

void putTables(driver::RecordBuffer& out, size_t at, std::span<const uint8_t> b, unsigned entries)
{
    out.put<uint8_t>(at + half::entryCount, uint8_t(entries));
    for (unsigned m = 0; m < entries; ++m) {
        out.put<uint16_t>(at + half::tableA + 2 * m, le::get<uint16_t>(b, blob::tableA + 2 * m));
        out.put<uint16_t>(at + half::tableB + 2 * m, le::get<uint16_t>(b, blob::tableB + 2 * m));
        out.put<uint16_t>(at + half::tableC + 2 * m, le::get<uint16_t>(b, blob::tableC + 2 * m));
        out.put<uint8_t>(at + half::tableD + m, uint8_t(le::get<uint8_t>(b, blob::tableD + m) + 2));
        out.put<uint16_t>(at + half::tableE + 2 * m, le::get<uint16_t>(b, blob::tableE + 2 * m));
        out.put<uint16_t>(at + half::tableF + 2 * m, le::get<uint16_t>(b, blob::tableF + 2 * m));
    }
}

void putHalf(driver::RecordBuffer& out, size_t at, std::span<const uint8_t> b)
{
    out.put<uint8_t>(at + half::nChannels, le::get<uint8_t>(b, blob::numChannels));
    out.put<uint8_t>(at + half::gain, uint8_t(le::get<uint8_t>(b, blob::gainIndex) + 2));
    out.put<uint32_t>(at + half::blobWord, le::get<uint32_t>(b, blob::blobWord));
    out.put<float>(at + half::valueA, driver::fixedToFloat(le::get<uint16_t>(b, blob::valueA), 100.0));
    out.put<float>(at + half::valueB, driver::fixedToFloat(le::get<uint16_t>(b, blob::valueB), 16384.0));
    for (unsigned j = 0; j < kChannels; ++j) {
        putGainTable(out, at + half::gainTable + half::gainTableStride * j, b, j);
        out.put<uint8_t>(at + half::channelByte + j, le::get<uint8_t>(b, blob::channelByte + 2 * j));
        out.put<float>(at + half::channelFactor + 4 * j,
                       driver::fixedToFloat(le::get<int16_t>(b, blob::channelFactor + 2 * j), 16384.0));
        out.put<float>(at + half::luxCoeff + 4 * j,
                       driver::fixedToFloat(le::get<int32_t>(b, blob::luxCoeff + 4 * j), 65536.0));
        out.put<float>(at + half::cctCoeff + 4 * j,
                       driver::fixedToFloat(le::get<int32_t>(b, blob::cctCoeff + 4 * j), 256.0));
        out.put<float>(at + half::channelValue + 4 * j,
                       driver::fixedToFloat(le::get<uint32_t>(b, blob::channelValue + 4 * j), 65536.0));
    }
    out.put<float>(at + half::sharedValue, driver::fixedToFloat(le::get<uint32_t>(b, blob::sharedValue), 65536.0));
    putTables(out, at, b, le::get<uint8_t>(b, blob::entryCount));
}

} // namespace

CFDataRef Calibration::convertSorvelXwClv1Tov3(CFDataRef versionOne)
{
    const CFIndex length = versionOne ? CFDataGetLength(versionOne) : 0;
    if (length != CFIndex(kV1Size)) {
        VLOG_ERROR("VD6287 v1 calibration size - %ld != %lu\n", long(length), static_cast<unsigned long>(kV1Size));
        return nullptr;
    }
    const std::span<const uint8_t> in(CFDataGetBytePtr(versionOne), kV1Size);

    driver::RecordBuffer out(kV3Size);
    out.putBytes(0, in.first(kHeaderSize));
    for (unsigned k = 0; k < kBlobs; ++k) {
        const auto b = slice(in, v1BlobOffset(k), kV1BlobSize);
        const uint8_t count = b ? le::get<uint8_t>(*b, v1blob::count) : 0;
        const std::optional<uint8_t> entries = v3EntryCount(count);
        if (!b || !entries) {
            VLOG_ERROR("VD6287 v1 calibration blob %u holds %u table entries, at most %u fit -> calibration will be "
                       "skipped.\n",
                       k, unsigned(count) + 1, kMaxEntries);
            return nullptr;
        }
        convertBlob(out, v3BlobOffset(k), *b, *entries);
    }
    return out.createData();
}

CFOwned<CFDataRef> Calibration::processQVTCalibrationVD6287_XwClv3(CFDataRef data)
{
    const CFIndex length = data ? CFDataGetLength(data) : 0;
    if (length != CFIndex(kV3Size)) {
        VLOG_ERROR("QVT calibration size - %ld != %lu\n", long(length), static_cast<unsigned long>(kV3Size));
        return {};
    }
    const std::span<const uint8_t> bytes(CFDataGetBytePtr(data), kV3Size);
    const unsigned blobs = le::get<uint8_t>(bytes, header::numBlobs);
    if (blobs != kBlobs) {
        VLOG_ERROR("Calibration num_blobs=%u, expected=2\n", blobs);
        return {};
    }
    if (!blobsAre(bytes, blob::type, 0, 1)) {
        VLOG_ERROR("Unexpected calibration blob types!\n");
        return {};
    }
    if (!blobsAre(bytes, blob::numChannels, kChannels, kChannels) || !blobsAre(bytes, blob::numGains, kGains, kGains)) {
        VLOG_ERROR("Unexpected num_channels/num_gains!\n");
        return {};
    }
    for (unsigned k = 0; k < kBlobs; ++k) {
        const unsigned entries = le::get<uint8_t>(bytes, v3BlobOffset(k) + blob::entryCount);
        if (entries > kMaxEntries) {
            VLOG_ERROR("Calibration blob %u holds %u table entries, expected at most %u\n", k, entries, kMaxEntries);
            return {};
        }
    }
    VLOG_DEFAULT("XwCl calibration version = v%d.%d\n", int(le::get<uint8_t>(bytes, header::versionMajor)),
                 int(le::get<uint8_t>(bytes, header::versionMinor)));

    driver::RecordBuffer out(half::kSize);
    for (unsigned k = 0; k < kBlobs; ++k)
        putHalf(out, half::kHalfSize * k, bytes.subspan(v3BlobOffset(k), kV3BlobSize));
    CFOwned<CFDataRef> built(out.createData());
    if (!built)
        return {};

    unit_.numberOfChannels = kChannels;
    unit_.dbChannelCount = kChannels;
    unit_.smallDBVersion = 1.3f;
    unit_.sensorType = eALSSensorTypeVD6287;
    return built;
}
