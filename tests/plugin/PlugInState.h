// What the filter tests set on an instance's parts and read back from them,
// with the shared plug-in holder and ALS events.
#pragma once

#include "common/ALSEvents.h"
#include "common/PlugInHolder.h"
#include "plugin/TestAccess.h"

#include <array>
#include <cstdint>
#include <memory>

namespace alstest {

inline void setLastXYZ(VantishPlugIn& plugin, float x, float y, float z)
{
    parts(plugin).lastXYZ()[0] = x;
    parts(plugin).lastXYZ()[1] = y;
    parts(plugin).lastXYZ()[2] = z;
}

inline void overrideChromaticity(VantishPlugIn& plugin, double x, double y, double luminance)
{
    parts(plugin).overrides().chromaticityOverrideActive = 1;
    parts(plugin).overrides().overrideX = x;
    parts(plugin).overrides().overrideY = y;
    parts(plugin).overrides().overrideLuminance = luminance;
}

// An exactly linear database (X = ch0, Y = ch1 + ch2, Z = ch3 + ch4), so the
// colour written back shows which channel values reached the calculation.
inline SpectralDatabasePtr linearDatabase(uint32_t channels)
{
    auto db = std::make_shared<SpectralDatabase>();
    const uint32_t n = 12;
    db->allocate(n, channels);
    for (uint32_t i = 0; i < n; ++i) {
        float sum[3] = {};
        for (uint32_t j = 0; j < channels; ++j) {
            const float r = float(1 + (i * (j + 2) + 3 * j) % 7);
            db->dbChannelResponses[j * n + i] = r;
            sum[j == 0 ? 0 : j <= 2 ? 1 : 2] += r;
        }
        for (uint32_t c = 0; c < 3; ++c)
            db->dbXYZ[c * n + i] = sum[c];
    }
    return db;
}

inline std::array<float, 3> lastXYZOf(VantishPlugIn& plugin)
{
    return {parts(plugin).lastXYZ()[0].load(), parts(plugin).lastXYZ()[1].load(), parts(plugin).lastXYZ()[2].load()};
}

} // namespace alstest
