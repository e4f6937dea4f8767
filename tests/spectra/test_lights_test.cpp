// The built-in test lights are distinct lights that no reference set holds.
#include "spectra/Catalogue.h"
#include "spectra/Colorimetry.h"
#include "spectra/TestLights.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <set>

using namespace spectra;

namespace {

// Largest difference between two spectra at 100 lux, relative to the larger peak.
double relativeDistance(const Spectrum& a, const Spectrum& b)
{
    double peak = 0, worst = 0;
    for (size_t i = 0; i < a.size(); ++i) {
        peak = std::max({peak, std::abs(a[i]), std::abs(b[i])});
        worst = std::max(worst, std::abs(a[i] - b[i]));
    }
    return peak > 0 ? worst / peak : 0.0;
}

TEST(TestLights, AreNoReferenceSourceAndDistinct)
{
    const std::vector<Source>& lights = testLights();
    ASSERT_GE(lights.size(), 20u);
    std::set<std::string> names, families;
    for (const Source& light : lights) {
        SCOPED_TRACE(light.name);
        EXPECT_TRUE(names.insert(light.name).second) << "duplicate name";
        families.insert(light.family);
        EXPECT_EQ(light.name.rfind("test-", 0), 0u);
        EXPECT_EQ(findSource(light.name), nullptr);
        EXPECT_EQ(findTestLight(light.name), &light);
        EXPECT_NEAR(tristimulus(light.spectrum).Y, kReferenceLux, 1e-9);
        EXPECT_TRUE(std::all_of(light.spectrum.begin(), light.spectrum.end(),
                                [](double v) { return std::isfinite(v) && v >= 0; }));
        // Not any source of either reference set (the catalogue is their union), not
        // even up to a rounding: every one differs by at least 0.5 % of its peak.
        for (const Source& reference : catalogue())
            EXPECT_GT(relativeDistance(light.spectrum, reference.spectrum), 5e-3) << reference.name;
    }
    for (const char* family : {"led", "led-red", "led-violet", "daylight", "cie", "planck", "fluorescent", "sodium",
                               "metal-halide", "mix-led", "mix-incandescent"})
        EXPECT_TRUE(families.count(family)) << family;
    // The CIE illuminants B and C are reference sources, so they are not test lights.
    EXPECT_NE(findSource("cie-b"), nullptr);
    EXPECT_NE(findSource("cie-c"), nullptr);
    EXPECT_EQ(findTestLight("cie-b"), nullptr);
}

} // namespace
