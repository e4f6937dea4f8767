// The calibration records the sensor driver reads: "ALSCalibrationData" in its
// 145-byte (4 channels), 193-byte (5), 220-byte (6) and 776-byte (VD6287)
// layouts, and "ALSColorCalibration" (28163 bytes), which carries the per-chip
// database. The offsets are the driver's contract: byte-packed, little-endian,
// unaligned. Calibration writes these records; the host's tools read them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>

namespace driver {

inline constexpr uint8_t kRecordVersion = 1;
inline constexpr uint8_t kCalibrationVersion = 1;
// Gain values per channel block.
inline constexpr unsigned kMaxGains = 9;

enum class CalibrationSource : uint32_t {
    Configuration = 1, // calibration blob from the device configuration
    Factory = 2,       // factory-data store
    Default = 3,       // built-in default
};

// Header shared by the 4-, 5- and 6-channel records.
namespace header {
inline constexpr size_t recordVersion = 0;      // u8
inline constexpr size_t calibrationSource = 1;  // u32
inline constexpr size_t chipType = 5;           // u32
inline constexpr size_t calibrationVersion = 9; // u8
inline constexpr size_t recordLength = 10;      // u16
inline constexpr size_t fudge = 12;             // u16, 14 fraction bits
inline constexpr size_t iTime = 14;             // u16
inline constexpr size_t aux1 = 16;              // u16
inline constexpr size_t aux2 = 18;              // u16
} // namespace header

// A channel block in its 24-byte form (4- and 6-channel records) or 25-byte
// form (5-channel record, where channelParamB is 16 bits wide).
struct ChannelBlockLayout {
    size_t size;
    bool wideParamB;
    static constexpr size_t darkCounts = 0;    // u8
    static constexpr size_t offsetCounts = 1;  // i16, 8 fraction bits
    static constexpr size_t channelParamA = 3; // u16
    static constexpr size_t channelParamB = 5; // u8 or i16
    size_t gainScale;                          // u16[9], 14 fraction bits
};

inline constexpr ChannelBlockLayout kNarrowBlock{.size = 24, .wideParamB = false, .gainScale = 6};
inline constexpr ChannelBlockLayout kWideBlock{.size = 25, .wideParamB = true, .gainScale = 7};

struct ChannelRecordLayout {
    size_t size;
    unsigned maxChannels;
    bool hasAux3;
    size_t aux3; // u16, when hasAux3
    size_t gain; // u8[gainSlots]
    unsigned gainSlots;
    size_t nChannels; // u8
    size_t nGains;    // u8
    bool fixedLux;    // luxCoeff as i32 with 16 fraction bits and cctCoeff as two raw words
    size_t luxCoeff;  // i32[maxChannels] (fixedLux) or f32[maxChannels]
    size_t cctCoeff;  // u32[2] (fixedLux) or f32[maxChannels]
    size_t blocks;    // first channel block
    ChannelBlockLayout block;

    size_t blockOffset(unsigned channel) const { return blocks + block.size * channel; }
};

// clang-format off: one record per line pair, fields in layout order
inline constexpr ChannelRecordLayout kFourChannelRecord{.size = 145,
                                                        .maxChannels = 4,
                                                        .hasAux3 = false,
                                                        .aux3 = 0,
                                                        .gain = 20,
                                                        .gainSlots = 3,
                                                        .nChannels = 23,
                                                        .nGains = 24,
                                                        .fixedLux = true,
                                                        .luxCoeff = 25,
                                                        .cctCoeff = 41,
                                                        .blocks = 49,
                                                        .block = kNarrowBlock};
inline constexpr ChannelRecordLayout kFiveChannelRecord{.size = 193,
                                                        .maxChannels = 5,
                                                        .hasAux3 = true,
                                                        .aux3 = 20,
                                                        .gain = 22,
                                                        .gainSlots = 4,
                                                        .nChannels = 26,
                                                        .nGains = 27,
                                                        .fixedLux = false,
                                                        .luxCoeff = 28,
                                                        .cctCoeff = 48,
                                                        .blocks = 68,
                                                        .block = kWideBlock};
inline constexpr ChannelRecordLayout kSixChannelRecord{.size = 220,
                                                       .maxChannels = 6,
                                                       .hasAux3 = true,
                                                       .aux3 = 20,
                                                       .gain = 22,
                                                       .gainSlots = 4,
                                                       .nChannels = 26,
                                                       .nGains = 27,
                                                       .fixedLux = false,
                                                       .luxCoeff = 28,
                                                       .cctCoeff = 52,
                                                       .blocks = 76,
                                                       .block = kNarrowBlock};
// clang-format on

// The VD6287 record: two halves, one per calibration blob of the factory record.
namespace vd6287 {
inline constexpr size_t kSize = 776;
inline constexpr size_t kHalfSize = 388;
inline constexpr unsigned kChannels = 5;
inline constexpr unsigned kGainTableSize = 10; // 1, 2, 4, then seven calibrated steps
inline constexpr unsigned kTableEntries = 7;
// Offsets within a half (j = channel, m = table entry).
inline constexpr size_t nChannels = 0;  // u8
inline constexpr size_t gain = 2;       // u8, blob gain index + 2
inline constexpr size_t blobWord = 4;   // u32
inline constexpr size_t valueA = 8;     // f32, blob value / 100
inline constexpr size_t valueB = 12;    // f32, blob value / 16384
inline constexpr size_t gainTable = 16; // f32[10] per channel, + 40 j
inline constexpr size_t gainTableStride = 40;
inline constexpr size_t channelByte = 216;   // u8, + j
inline constexpr size_t channelFactor = 224; // f32, + 4 j
inline constexpr size_t luxCoeff = 244;      // f32, + 4 j
inline constexpr size_t cctCoeff = 264;      // f32, + 4 j
inline constexpr size_t sharedValue = 284;   // f32
inline constexpr size_t channelValue = 288;  // f32, + 4 j
inline constexpr size_t entryCount = 308;    // u8
inline constexpr size_t tableA = 310;        // u16[7]
inline constexpr size_t tableB = 324;        // u16[7]
inline constexpr size_t tableC = 338;        // u16[7]
inline constexpr size_t tableD = 352;        // u8[7], blob value + 2
inline constexpr size_t tableE = 360;        // u16[7]
inline constexpr size_t tableF = 374;        // u16[7]
} // namespace vd6287

// "ALSColorCalibration": the per-chip database for the driver.
namespace colour {
inline constexpr size_t kSize = 28163;
inline constexpr size_t channelCount = 0; // u8
inline constexpr size_t sampleCount = 1;  // u16
inline constexpr size_t xyz = 3;          // f32[2640]: X block, Y block, Z block
inline constexpr size_t xyzSlots = 2640;
inline constexpr size_t responses = 10563; // f32[4400], channel-major
inline constexpr size_t responseSlots = 4400;
inline constexpr size_t kMaxSamples = xyzSlots / 3; // 880
} // namespace colour

// The 4-, 5- or 6-channel layout of a record of `size` bytes, or null.
inline const ChannelRecordLayout* channelRecordLayoutForSize(size_t size)
{
    for (const ChannelRecordLayout* layout : {&kFourChannelRecord, &kFiveChannelRecord, &kSixChannelRecord})
        if (layout->size == size)
            return layout;
    return nullptr;
}

// Fixed-point field to float: the exact quotient rounded once to single precision.
inline float fixedToFloat(int64_t raw, double divisor) { return float(double(raw) / divisor); }

} // namespace driver
