// The per-chip spectral database the colour fit runs against: for every
// reference light source, the sensor's expected channel responses and the
// source's CIE XYZ.
//
// A database is built privately by calibration and then published whole to the
// plug-in object; once published it is never changed. Readers hold a shared
// reference for as long as they use it, so a newer database can replace it at
// any time without pulling arrays from under them.
#pragma once

#include "lightdb/LDBMInfo.h"

#include <cstdint>
#include <memory>
#include <vector>

struct SpectralDatabase {
    uint32_t dbSampleCount = 0;            // N
    uint32_t dbChannelCount = 0;           // M, rows of dbChannelResponses
    std::vector<float> dbXYZ;              // 3 x N: X block, Y block, Z block
    std::vector<float> dbChannelResponses; // M x N, channel-major: channel j of sample i at j*N + i
    std::vector<float> channelStdDev;      // M per-channel deviations, or empty when not normalised
    LDBMInfo dbInfo;                       // Info row of the reference or cached database

    // The arrays hold exactly what the counts promise.
    bool consistent() const
    {
        const size_t n = dbSampleCount, m = dbChannelCount;
        return dbXYZ.size() == 3 * n && dbChannelResponses.size() == m * n &&
               (channelStdDev.empty() || channelStdDev.size() == m);
    }
    const float* stdDevOrNull() const { return channelStdDev.empty() ? nullptr : channelStdDev.data(); }
    // Sizes the arrays for n sources and m channels, zero-filled.
    void allocate(uint32_t n, uint32_t m)
    {
        dbSampleCount = n;
        dbChannelCount = m;
        dbXYZ.assign(size_t(3) * n, 0.0f);
        dbChannelResponses.assign(size_t(m) * n, 0.0f);
        channelStdDev.clear();
    }
};

using SpectralDatabasePtr = std::shared_ptr<const SpectralDatabase>;
