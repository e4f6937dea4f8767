// The XwCl factory record: a 76-byte header and one or two calibration
// entries of 5080 bytes (5156 or 10236 bytes in all).
#pragma once

#include <cstddef>
#include <cstdint>

namespace stored::xwcl {

inline constexpr size_t kOneEntrySize = 5156;
inline constexpr size_t kTwoEntrySize = 10236;
inline constexpr size_t kHeaderSize = 76;
inline constexpr size_t kEntrySize = 5080;
inline constexpr unsigned kStoredChannels = 6;
inline constexpr unsigned kStoredGains = 9;
inline constexpr unsigned kSpectrumSamples = 401;

constexpr size_t entryOffset(unsigned index) { return kHeaderSize + kEntrySize * index; }

namespace header {
inline constexpr size_t versionMajor = 4;   // u8
inline constexpr size_t versionMinor = 5;   // u8
inline constexpr size_t entrySelector = 10; // u8, 1-based
inline constexpr size_t chipID = 12;        // u32
inline constexpr size_t deviceID = 16;      // u8
inline constexpr size_t chipType = 74;      // u8
} // namespace header

// Offsets within an entry (c = stored channel 0..5, g = gain 0..8, s = sample).
namespace entry {
inline constexpr size_t nChannels = 4;  // u8
inline constexpr size_t nGains = 5;     // u8
inline constexpr size_t iTime = 6;      // u16
inline constexpr size_t aux1 = 8;       // u16
inline constexpr size_t aux2 = 10;      // u16
inline constexpr size_t aux3 = 12;      // u16
inline constexpr size_t gain = 14;      // u8[4]
inline constexpr size_t fudge = 18;     // u16
inline constexpr size_t gainScale = 20; // u16, + 18 c + 2 g
inline constexpr size_t gainScaleStride = 18;
inline constexpr size_t channelParamA = 128; // u16, + 2 c
inline constexpr size_t offsetCounts = 140;  // i16, + 2 c
inline constexpr size_t darkCounts = 152;    // u8, + c
inline constexpr size_t channelParamB = 158; // i8, + c
inline constexpr size_t luxCoeff = 164;      // i32, 16 fraction bits, + 4 c
inline constexpr size_t cctCoeff = 188;      // i32, + 4 c
inline constexpr size_t spectrum = 268;      // i16[401], + 802 c + 2 s
inline constexpr size_t spectrumStride = 802;
} // namespace entry

// Device ids, which choose the driver-record layout.
inline constexpr uint8_t kDeviceKestrow = 14;      // 5 channels, first entry
inline constexpr uint8_t kDeviceMarlit = 19;       // 5 channels, first entry
inline constexpr uint8_t kDeviceFourChannelA = 35; // 4 channels, selected entry
inline constexpr uint8_t kDeviceFourChannelB = 58; // 4 channels, selected entry
inline constexpr uint8_t kDeviceSixChannel = 62;   // 6 channels, selected entry

} // namespace stored::xwcl
