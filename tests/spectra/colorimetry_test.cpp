// Colorimetry against the CIE's published values, and the CCT/Duv helpers.
#include "spectra/CieIlluminants.h"
#include "spectra/Colorimetry.h"
#include "spectra/Daylight.h"
#include "spectra/Planck.h"

#include <gtest/gtest.h>

#include <cmath>

using namespace spectra;

TEST(Colorimetry, StandardIlluminantsHaveTheirPublishedChromaticities)
{
    for (const auto& [illuminant, published] :
         {std::pair{cieA(), Xy{0.4476, 0.4074}}, {cieD65(), Xy{0.3127, 0.3290}}}) {
        const Xy xy = chromaticity(tristimulus(illuminant));
        EXPECT_NEAR(xy.x, published.x, 1e-3);
        EXPECT_NEAR(xy.y, published.y, 1e-3);
    }
}

TEST(Colorimetry, IlluminanceScalingSetsYAndKeepsChromaticity)
{
    const Spectrum s = atIlluminance(cieA(), 250.0);
    EXPECT_NEAR(tristimulus(s).Y, 250.0, 1e-9);
    EXPECT_NEAR(chromaticity(tristimulus(s)).x, chromaticity(tristimulus(cieA())).x, 1e-12);
    // A flat 1 mW·m⁻²·nm⁻¹ gives Km·Σȳ·Δλ: 683 lm/W × 106.86 nm ≈ 73 lux.
    Spectrum flat;
    flat.fill(1.0);
    EXPECT_NEAR(tristimulus(flat).Y, 0.683 * 106.86, 0.2);
}

TEST(Colorimetry, PlanckianTemperaturesComeBackThroughLcms)
{
    // lcms2's isotemperature table deviates by up to 0.8 % between 2900 K and
    // 3300 K, so those temperatures are not used as references.
    for (double kelvin : {2000.0, 2500.0, 2856.0, 4000.0, 5000.0, 6500.0, 8000.0}) {
        const std::optional<double> cct = correlatedColourTemperature(planckianChromaticity(kelvin));
        ASSERT_TRUE(cct.has_value()) << kelvin;
        EXPECT_NEAR(*cct, kelvin, 3.0);
    }
    EXPECT_FALSE(correlatedColourTemperature(Xy{0.15, 0.05}).has_value());
}

TEST(Colorimetry, DuvRoundTripsAndHasTheUsualSign)
{
    for (double duv : {-0.01, 0.0, 0.006}) {
        const Xy xy = chromaticityAt(4000.0, duv);
        EXPECT_NEAR(*correlatedColourTemperature(xy), 4000.0, 3.0);
        EXPECT_NEAR(*distanceFromLocus(xy), duv, 2e-4);
    }
    // Above the locus is towards green (larger y at the same CCT).
    EXPECT_GT(chromaticityAt(4000.0, 0.01).y, chromaticityAt(4000.0, 0.0).y);
}

TEST(Colorimetry, DeltaUvPrimeIsEuclideanInUvPrime)
{
    const Uv a = uvPrime(Xy{0.3127, 0.3290});
    EXPECT_NEAR(a.u, 0.1978, 1e-4);
    EXPECT_NEAR(a.v, 0.4683, 1e-4);
    EXPECT_NEAR(deltaUvPrime(a, Uv{a.u + 0.003, a.v - 0.004}), 0.005, 1e-12);
    const Xy back = xyFromUvPrime(a);
    EXPECT_NEAR(back.x, 0.3127, 1e-12);
    EXPECT_NEAR(back.y, 0.3290, 1e-12);
}

TEST(Daylight, ModelAt6504KMatchesTabulatedD65)
{
    const Spectrum model = atIlluminance(cieDaylight(6504.0), 100.0);
    const Spectrum table = atIlluminance(cieD65(), 100.0);
    EXPECT_LT(deltaUvPrime(uvPrime(chromaticity(tristimulus(model))), uvPrime(chromaticity(tristimulus(table)))), 5e-4);
    for (int i = sampleAtOrBelow(380); i <= sampleAtOrBelow(780); ++i)
        EXPECT_NEAR(model[size_t(i)], table[size_t(i)], 0.02 * table[size_t(i)] + 0.01) << wavelengthNm(i);
}

TEST(Daylight, InfraredTailContinuesTheTableSmoothly)
{
    const Spectrum s = cieDaylight(5500.0);
    const double last = s[size_t(kDaylightLastSample)];
    const double next = s[size_t(kDaylightLastSample + 1)];
    EXPECT_NEAR(next / last, 1.0, 0.1);
    EXPECT_GT(s[kSamples - 1], 0.0);
    EXPECT_LT(s[kSamples - 1], next);
    EXPECT_THROW(cieDaylight(3500.0), std::invalid_argument);
}
