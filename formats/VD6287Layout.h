// The VD6287 factory record (XwClData_VD6287): an 80-byte header and two
// calibration blobs, in version 3 (10348 bytes, blobs of 5134 bytes) or the
// older version 1 (10440 bytes, blobs of 5180 bytes), which is converted to
// version 3 before use.
#pragma once

#include <cstddef>
#include <cstdint>

namespace stored::vd6287 {

inline constexpr size_t kHeaderSize = 80;
inline constexpr size_t kV3Size = 10348;
inline constexpr size_t kV3BlobSize = 5134;
inline constexpr size_t kV1Size = 10440;
inline constexpr size_t kV1BlobSize = 5180;
inline constexpr unsigned kBlobs = 2;
inline constexpr unsigned kChannels = 5;
inline constexpr unsigned kGains = 7;
inline constexpr unsigned kStoredSpectra = 6;
inline constexpr unsigned kSpectrumSamples = 401;
inline constexpr unsigned kMaxEntries = 7;   // slots of tables A to F
inline constexpr unsigned kMaxV1Entries = 6; // a version-1 count, one less than the entries it yields
inline constexpr uint8_t kNoV1Entries = 255; // version-1 count meaning "no entries"

constexpr size_t v3BlobOffset(unsigned blob) { return kHeaderSize + kV3BlobSize * blob; }
constexpr size_t v1BlobOffset(unsigned blob) { return kHeaderSize + kV1BlobSize * blob; }

namespace header {
inline constexpr size_t versionMajor = 4; // u8
inline constexpr size_t versionMinor = 5; // u8
inline constexpr size_t numBlobs = 10;    // u8
} // namespace header

// Version-3 blob (j = channel 0..4, g = gain 0..6, m = entry 0..6, c = spectrum 0..5).
namespace blob {
inline constexpr size_t type = 0;        // u8: 0 in the first blob, 1 in the second
inline constexpr size_t numChannels = 4; // u8
inline constexpr size_t numGains = 5;    // u8
inline constexpr size_t gainIndex = 6;   // u8
inline constexpr size_t blobWord = 7;    // u32
inline constexpr size_t valueA = 17;     // u16, hundredths
inline constexpr size_t valueB = 19;     // u16, 14 fraction bits
inline constexpr size_t gainRatio = 21;  // u16, 14 fraction bits, + 18 j + 2 g
inline constexpr size_t gainRatioStride = 18;
inline constexpr size_t channelByte = 129;   // u8 (low byte of a 16-bit slot), + 2 j
inline constexpr size_t channelFactor = 141; // i16, 14 fraction bits, + 2 j
inline constexpr size_t luxCoeff = 153;      // i32, 16 fraction bits, + 4 j
inline constexpr size_t cctCoeff = 177;      // i32, 8 fraction bits, + 4 j
inline constexpr size_t sharedValue = 201;   // u32, 16 fraction bits
inline constexpr size_t channelValue = 205;  // u32, 16 fraction bits, + 4 j
inline constexpr size_t reserved = 236;      // 2 bytes, zero
inline constexpr size_t spectrum = 238;      // i16[401], + 802 c + 2 s
inline constexpr size_t spectrumStride = 802;
inline constexpr size_t tailWord = 5050;   // u32
inline constexpr size_t entryCount = 5054; // u8, at most 7
inline constexpr size_t tableA = 5055;     // u16[7]
inline constexpr size_t tableB = 5069;     // u16[7]
inline constexpr size_t tableC = 5083;     // u16[7]
inline constexpr size_t tableD = 5097;     // u8[7]
inline constexpr size_t tableE = 5104;     // u16[7]
inline constexpr size_t tableF = 5118;     // u16[7]
inline constexpr size_t tailByte = 5132;   // u8
} // namespace blob

// Version-1 blob: the fields that move or change form on conversion.
namespace v1blob {
inline constexpr size_t channelByte = 137; // i8[6]
inline constexpr size_t count = 5055;      // u8, entries minus one (255: none)
inline constexpr size_t tableA = 5056;     // u16[4]
inline constexpr size_t tableB = 5064;     // u16[4]
inline constexpr size_t tableD = 5072;     // u8
inline constexpr size_t tableC = 5073;     // u16
inline constexpr size_t tableF = 5075;     // u16
inline constexpr size_t tableE = 5077;     // u16
inline constexpr size_t tailByte = 5079;   // u8
} // namespace v1blob

} // namespace stored::vd6287
