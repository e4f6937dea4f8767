// The XwCA T2 factory record (9962 bytes): one 5-channel calibration with its
// chip ID in text, fixed-point coefficients and six stored channel spectra of
// 32-bit samples.
#pragma once

#include <cstddef>
#include <cstdint>

namespace stored::xwca {

inline constexpr size_t kSize = 9962;
inline constexpr unsigned kMaxChannels = 5; // channels of the driver record
inline constexpr unsigned kMaxGains = 5;    // calibrated gains after the four fixed ones
inline constexpr unsigned kStoredSpectra = 6;
inline constexpr unsigned kSpectrumSamples = 401;
inline constexpr size_t kChipIdDigits = 8;

// Offsets (c = channel, g = gain, s = sample).
inline constexpr size_t versionMajor = 4; // u8
inline constexpr size_t versionMinor = 5; // u8
inline constexpr size_t chipID = 16;      // char[8], hexadecimal, not terminated
inline constexpr size_t deviceID = 28;    // u8
inline constexpr size_t nChannels = 80;   // u8
inline constexpr size_t nGains = 81;      // u8
inline constexpr size_t fudge = 82;       // u16, 14 fraction bits
inline constexpr size_t gainScale = 84;   // u16, + 18 c + 2 g
inline constexpr size_t gainScaleStride = 18;
inline constexpr size_t channelParamA = 192; // u16, + 2 c
inline constexpr size_t offsetCounts = 204;  // i16, + 2 c
inline constexpr size_t darkCounts = 216;    // u8, + c
inline constexpr size_t channelParamB = 222; // i16, + 2 c
inline constexpr size_t luxCoeff = 234;      // i32, 31 fraction bits, + 4 c
inline constexpr size_t cctCoeff = 258;      // i32, 14 fraction bits, + 4 c
inline constexpr size_t gainIndex = 282;     // u8, versions above 1.6
inline constexpr size_t iTime = 284;         // i16, versions above 1.6
inline constexpr size_t spectrum = 338;      // i32[401], + 1604 c + 4 s
inline constexpr size_t spectrumStride = 1604;

// Versions up to this one (major * 10 + minor) carry no gain index and iTime.
inline constexpr int kLastVersionWithoutTiming = 16;
// Version whose records from one device model carry a wrong iTime and fudge.
inline constexpr int kVersionWithTimingFault = 17;
// Device-model code (QyGetProductType) of that model. Its version-1.7 records
// were written with the integration time and fudge of another model; its
// units use iTime 250 and fudge 1.2 instead.
inline constexpr int kProductTypeWithTimingFault = 0x2F;

} // namespace stored::xwca
