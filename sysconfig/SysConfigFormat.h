// Calibration blobs published in the I/O registry: "alsCalibration" (a header,
// then one entry per orientation) and "alsAuxCalibration" (the same framing,
// with infrared compensation coefficients). Both are little-endian, fields may
// be unaligned, and every field is decoded through le:: from the blob's bytes.
//
// Everything here checks what it reads against the bytes it is given: an
// entry that runs past its blob, or that declares more than it can hold, is
// rejected with an error line instead of being read.
#pragma once

#include "support/CFTypes.h"

#include <CoreFoundation/CoreFoundation.h>

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

// The 8 bytes at the start of a blob.
struct ALSCalibrationHeader {
    static constexpr size_t kSize = 8;

    uint8_t revision = 0;   // 0: 28-byte spectrum preamble, otherwise 32
    uint8_t version = 0;    // must be 1 ("alsCalibration" only)
    uint8_t entryCount = 0; // entries that follow the header
    uint16_t totalSize = 0; // the blob is at least this long

    // Nothing when the blob is shorter than a header.
    static std::optional<ALSCalibrationHeader> decode(std::span<const uint8_t> blob);
};

// The 8 bytes at the start of every entry.
struct ALSCalibrationSubHeader {
    static constexpr size_t kSize = 8;

    uint8_t sensorType = 0;  // logged only
    uint8_t orientation = 0; // the device orientation the entry is for
    uint8_t chipType = 0;    // 3: the five-channel VD6286 layout; otherwise the generic one
    uint16_t entrySize = 0;  // bytes from the start of this entry to the next

    // Nothing when the subheader does not lie inside `blob`.
    static std::optional<ALSCalibrationSubHeader> decode(std::span<const uint8_t> blob, size_t offset);
};

namespace sysconfig {

// Entries start right after the blob header.
constexpr size_t kFirstEntryOffset = ALSCalibrationHeader::kSize;
constexpr uint8_t kChipTypeVD6286 = 3;
// Spectra of every calibration source have this many samples at most.
constexpr unsigned kMaxSpectrumSamples = 401;

using cf::bytesOf;

// The entry chosen for an orientation: where it starts in its blob, its
// subheader, and its bytes (exactly entrySize of them, all inside the blob).
struct CalibrationEntry {
    long offset = 0;
    ALSCalibrationSubHeader subHeader;
    std::span<const uint8_t> bytes;
};

// Walks `entryCount` entries from the first entry offset and returns the first
// one for `orientation`. Nothing when none matches, or when an entry on the way
// is malformed: its subheader or its body runs past the blob, or its size is
// smaller than its subheader (the walk could not advance). `blobName` names the
// blob in the error lines.
std::optional<CalibrationEntry> findCalibrationEntry(std::span<const uint8_t> blob, unsigned entryCount,
                                                     uint32_t orientation, const char* blobName);

// ---- Generic entry (four channels) ---------------------------------------------
//
//   8  u16 word A (fudge, 1/256 units)      10, 12, 14  u16 words B, C, D
//   17, 18  u8 gains 1 and 2   19  u8 nChannels   20  u8 nGains
//   24 + b*c  channel block c (b = 4 + 2*nGains): +0 u8 dark counts,
//             +1 u16 offset in thousandths, +3 u8, +4 u16 gains[nGains] (1/256)
//   24 + b*nChannels  spectrum block:
//        0 u8 algorithm version, 2 u16 nSamples, 4 i32[4] channel weights in
//        millionths, 20 u32[2] colour-temperature words, then (after 4 spare
//        bytes when the revision is non-zero) i16 spectra, four channels per sample.
namespace generic {
constexpr size_t kWordA = 8;
constexpr size_t kWordB = 10;
constexpr size_t kGain1 = 17;
constexpr size_t kChannelCount = 19;
constexpr size_t kGainCount = 20;
constexpr size_t kChannelBlocks = 24;
constexpr unsigned kMaxChannels = 4;
constexpr unsigned kMaxGains = 9;

constexpr size_t kSpectrumAlgo = 0;
constexpr size_t kSpectrumSampleCount = 2;
constexpr size_t kSpectrumWeights = 4;
constexpr size_t kSpectrumCctWords = 20;
constexpr unsigned kSpectrumChannels = 4;

constexpr size_t spectraOffset(uint8_t revision) { return revision == 0 ? 28 : 32; }
// The block always has room for the largest spectrum.
constexpr size_t spectrumBlockSize(uint8_t revision)
{
    return spectraOffset(revision) + size_t(kMaxSpectrumSamples) * kSpectrumChannels * 2;
}
} // namespace generic

// Where the parts of a generic entry lie, once checked against the entry.
struct GenericEntryLayout {
    unsigned nChannels = 0;
    unsigned nGains = 0;
    size_t channelBlockSize = 0;
    size_t spectrumOffset = 0; // from the start of the entry
    size_t spectrumSize = 0;
    size_t spectraOffset = 0; // from the start of the spectrum block
};

// The layout of a generic entry, or nothing (with an error line) when it
// declares more channels or gains than the driver record holds or when its
// channel blocks and spectrum block do not fit in the entry.
std::optional<GenericEntryLayout> genericEntryLayout(std::span<const uint8_t> entry, uint8_t revision);

// ---- VD6286 entry (chip type 3, five channels) -----------------------------------
//
//   8..14 words A..D as above   16, 17, 18 u8 gains   19 u8 nChannels   20 u8 nGains
//   24 + 14*c  channel block c: as the generic one with at most 5 gains
//   96 u8 algorithm version   98 u16 nSamples   100 i32[5] weights (millionths)
//   120 i32[5] colour-temperature coefficients   144 i16 spectra, sample-major
namespace vd6286 {
constexpr size_t kEntrySize = 4156;
constexpr size_t kGain0 = 16;
constexpr size_t kChannelBlocks = 24;
constexpr size_t kChannelBlockSize = 14;
constexpr unsigned kMaxChannels = 5;
constexpr unsigned kMaxGains = 5;
constexpr size_t kAlgo = 96;
constexpr size_t kSampleCount = 98;
constexpr size_t kWeights = 100;
constexpr size_t kCctCoefficients = 120;
constexpr size_t kSpectra = 144;
constexpr size_t kMaxSpectrumValues = (kEntrySize - kSpectra) / 2; // 2006

// The entry is long enough for the layout (its size check counts words).
constexpr bool entryLargeEnough(uint16_t entrySize) { return entrySize / 4 > 1038; }

// The entry's layout-sized bytes at `entryOffset` of `blob`, once its declared
// size is large enough for the layout and the layout lies inside the blob;
// nothing (with an error line) otherwise.
std::optional<std::span<const uint8_t>> entryAt(CFDataRef blob, long entryOffset, uint16_t entrySize);
} // namespace vd6286

// ---- "alsAuxCalibration" entry ----------------------------------------------------
//
//   a subheader, then 48 bytes of which the last 16 (entry offsets 40..55) are
//   four i32 infrared compensation coefficients in millionths (R, G, B, C).
namespace aux {
constexpr size_t kCoefficients = 40;
constexpr unsigned kCoefficientCount = 4;
constexpr size_t kEntrySize = 56;
} // namespace aux

} // namespace sysconfig
