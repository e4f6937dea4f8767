// Synthetic readings, the global-matrix baseline and the accuracy statistics.
#include "host/evaluation/Evaluation.h"
#include "host/evaluation/GlobalMatrixBaseline.h"
#include "spectra/Catalogue.h"
#include "spectra/CieData.h"
#include "spectra/TestLights.h"

#include <gtest/gtest.h>

#include <cmath>

namespace {

// A unit whose first three channels are the colour-matching functions: a
// linear map from its counts to XYZ exists, and the fit must find it.
host::UnitSpectra colorimetricUnit()
{
    const spectra::CieData& cie = spectra::cieData();
    host::UnitSpectra u;
    u.channels = {cie.xBar, cie.yBar, cie.zBar, spectra::sampled([](double nm) { return nm > 700 ? 1.0 : 0.0; })};
    u.luxCoefficients = {0.0, 0.02, 0.0, 0.0};
    return u;
}

TEST(SyntheticReading, CountsFollowTheLuxFormulaAndNoiseIsSeeded)
{
    const host::UnitSpectra u = colorimetricUnit();
    const spectra::Spectrum& light = spectra::testLights().front().spectrum;
    const host::SensorReading r = host::synthesiseReading(u, spectra::scaled(light, 7.0), 250.0);
    EXPECT_EQ(r.lux, 250.0);
    ASSERT_EQ(r.channels.size(), 4u);
    EXPECT_NEAR(0.02 * r.channels[1], 250.0, 1e-9); // Σ w·c = lux, whatever the light's scale
    const spectra::Xyz xyz = spectra::tristimulus(light);
    EXPECT_NEAR(r.channels[0] / r.channels[1], xyz.X / xyz.Y, 1e-12);

    // Coefficients that give no lux: 30 counts per lux on the strongest channel.
    host::UnitSpectra dark = u;
    dark.luxCoefficients = {0, 0, 0, 0};
    const host::SensorReading f = host::synthesiseReading(dark, light, 10.0);
    EXPECT_NEAR(*std::max_element(f.channels.begin(), f.channels.end()), 300.0, 1e-9);

    std::mt19937_64 a(42), b(42);
    host::SensorReading n1 = r, n2 = r;
    host::addRelativeNoise(n1, 0.05, a);
    host::addRelativeNoise(n2, 0.05, b);
    EXPECT_EQ(n1.channels, n2.channels);
    EXPECT_NE(n1.channels, r.channels);
    for (size_t k = 0; k < 4; ++k)
        EXPECT_GE(n1.channels[k], 0.0);
}

TEST(GlobalMatrixBaseline, RecoversAnExactLinearMapAndScalesToLux)
{
    const host::UnitSpectra u = colorimetricUnit();
    const host::GlobalMatrixBaseline baseline(u, spectra::referenceSources(spectra::ReferenceSet::Default));
    // X from channel 0 only, Y from 1, Z from 2: catches a transposed or misread solution.
    const auto& m = baseline.matrix();
    EXPECT_GT(m[0][0], 0);
    EXPECT_NEAR(m[0][1], 0, 1e-9);
    EXPECT_NEAR(m[2][0], 0, 1e-9);
    EXPECT_NEAR(m[1][3], 0, 1e-9);

    for (const spectra::Source& light : spectra::testLights()) {
        const auto xyz = baseline.estimate(host::synthesiseReading(u, light.spectrum, 40.0));
        ASSERT_TRUE(xyz);
        const spectra::Xyz truth = spectra::tristimulus(spectra::atIlluminance(light.spectrum, 40.0));
        EXPECT_NEAR(xyz->X, truth.X, 1e-6) << light.name;
        EXPECT_NEAR(xyz->Y, 40.0, 1e-9) << light.name;
        EXPECT_NEAR(xyz->Z, truth.Z, 1e-6) << light.name;
    }
    EXPECT_FALSE(baseline.estimate(host::SensorReading{{0, 0, 0, 0}, 40.0}));
}

TEST(GlobalMatrixBaseline, NeedsMoreSourcesThanChannels)
{
    const auto sources = spectra::referenceSources(spectra::ReferenceSet::Default);
    EXPECT_THROW(host::GlobalMatrixBaseline(colorimetricUnit(), {sources.begin(), sources.begin() + 3}),
                 std::runtime_error);
}

TEST(Evaluation, PercentilesInterpolateBetweenRanks)
{
    EXPECT_EQ(host::percentile({}, 50), 0.0);
    EXPECT_EQ(host::percentile({4, 1, 3, 2}, 50), 2.5);
    EXPECT_DOUBLE_EQ(host::percentile({4, 1, 3, 2}, 95), 3.85);
    EXPECT_EQ(host::percentile({4, 1, 3, 2}, 100), 4.0);
    EXPECT_EQ(host::percentile({7}, 95), 7.0);
}

TEST(Evaluation, ErrorsAreMeasuredFromTheSpectrumAndMissingColourCounted)
{
    const host::UnitSpectra u = colorimetricUnit();
    const std::vector<spectra::Source> lights(spectra::testLights().begin(), spectra::testLights().begin() + 4);
    // "Plug-in": exact for all but the second light, which it does not colour.
    size_t calls = 0;
    const host::Estimator exact = [&](const host::SensorReading& r) -> std::optional<spectra::Xyz> {
        if (calls++ == 1)
            return std::nullopt;
        return spectra::Xyz{r.channels[0], r.channels[1], r.channels[2]};
    };
    // "Baseline": always the equal-energy white.
    const host::Estimator white = [](const host::SensorReading& r) {
        return std::optional<spectra::Xyz>(spectra::Xyz{r.lux, r.lux, r.lux});
    };
    std::vector<size_t> progress;
    const auto results = host::evaluateLights(lights, u, 100.0, exact, white, [&](size_t n) { progress.push_back(n); });
    ASSERT_EQ(results.size(), 4u);
    EXPECT_EQ(progress, (std::vector<size_t>{1, 2, 3, 4}));
    EXPECT_FALSE(results[1].plugIn.valid);
    for (const auto& r : results) {
        if (r.plugIn.valid) {
            EXPECT_NEAR(r.plugIn.deltaUv, 0.0, 1e-12);
        }
        EXPECT_NEAR(r.baseline.xy.x, 1.0 / 3, 1e-12);
        const double expected = spectra::deltaUvPrime(spectra::uvPrime({1.0 / 3, 1.0 / 3}), spectra::uvPrime(r.trueXy));
        EXPECT_NEAR(r.baseline.deltaUv, expected, 1e-12);
        ASSERT_TRUE(r.trueCct && r.baseline.deltaCct);
        EXPECT_NEAR(*r.baseline.deltaCct, *r.baseline.cct - *r.trueCct, 1e-9);
    }
    const host::ErrorSummary plugIn = host::summarise(results, &host::LightResult::plugIn);
    EXPECT_EQ(plugIn.count, 3u);
    EXPECT_EQ(plugIn.missing, 1u);
    EXPECT_NEAR(plugIn.max, 0.0, 1e-12);
    const host::ErrorSummary baseline = host::summarise(results, &host::LightResult::baseline);
    EXPECT_EQ(baseline.count, 4u);
    EXPECT_GT(baseline.median, 0.0);
    EXPECT_LE(baseline.median, baseline.p95);
    EXPECT_LE(baseline.p95, baseline.max);
}

} // namespace
