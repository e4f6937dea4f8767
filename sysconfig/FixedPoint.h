// Fixed-point fields of the driver records built from registry calibration.
// Each value is scaled in single precision, converted towards zero to a 32-bit
// signed integer that saturates at its limits (NaN gives 0), and stored: all
// 32 bits for Q16.16, the low 16 bits for Q2.14 and Q8.8 (so a value outside
// their 16-bit range wraps, as the driver expects from its 32-bit conversion).
#pragma once

#include <cmath>
#include <cstdint>
#include <limits>

namespace sysconfig {

// Truncates towards zero, saturating at the limits of int32_t.
inline int32_t saturatingTruncate(float scaled)
{
    constexpr float two31 = 2147483648.0f;
    if (std::isnan(scaled))
        return 0;
    if (scaled >= two31)
        return std::numeric_limits<int32_t>::max();
    if (scaled <= -two31)
        return std::numeric_limits<int32_t>::min();
    return int32_t(scaled);
}

inline uint16_t lowHalf(int32_t value) { return uint16_t(uint32_t(value) & 0xFFFFu); }

// 2 integer and 14 fraction bits (gains and fudge factors; 0x4000 = 1.0).
inline uint16_t toQ2_14(float value) { return lowHalf(saturatingTruncate(value * 16384.0f)); }
// 8 integer and 8 fraction bits (offsets).
inline uint16_t toQ8_8(float value) { return lowHalf(saturatingTruncate(value * 256.0f)); }
// 16 integer and 16 fraction bits (lux coefficients).
inline int32_t toQ16_16(float value) { return saturatingTruncate(value * 65536.0f); }

} // namespace sysconfig
