// The grid, the spectral building blocks and the light-source models.
#include "spectra/BandShapes.h"
#include "spectra/CieData.h"
#include "spectra/CieIlluminants.h"
#include "spectra/Colorimetry.h"
#include "spectra/Daylight.h"
#include "spectra/Discharge.h"
#include "spectra/Fluorescent.h"
#include "spectra/Led.h"
#include "spectra/Mixing.h"
#include "spectra/Planck.h"
#include "spectra/SpectralTable.h"

#include <gtest/gtest.h>

#include <vector>

using namespace spectra;

namespace {

double infraredShare(const Spectrum& s) { return integralFrom(s, kNirTailStart) / integral(s); }

} // namespace

TEST(Grid, SpansThreeHundredToElevenHundredNanometres)
{
    EXPECT_EQ(wavelengthNm(0), 300.0);
    EXPECT_EQ(wavelengthNm(kSamples - 1), 1100.0);
    EXPECT_EQ(wavelengthNm(kNirTailStart), 710.0);
    EXPECT_EQ(kSamples - kNirTailStart, 196);
}

TEST(Grid, ResampleInterpolatesLinearlyAndIsZeroOutsideTheTable)
{
    const std::vector<double> nm{401.0, 406.0, 411.0};
    const std::vector<double> values{1.0, 3.0, 13.0};
    const Spectrum s = resample(nm, values);
    EXPECT_EQ(s[size_t(sampleAtOrBelow(400))], 0.0);
    EXPECT_DOUBLE_EQ(s[size_t(sampleAtOrBelow(402))], 1.4);
    EXPECT_DOUBLE_EQ(s[size_t(sampleAtOrBelow(406))], 3.0);
    EXPECT_DOUBLE_EQ(s[size_t(sampleAtOrBelow(410))], 11.0);
    EXPECT_EQ(s[size_t(sampleAtOrBelow(412))], 0.0);
    EXPECT_THROW(resample(std::vector<double>{2.0, 1.0}, std::vector<double>{0.0, 0.0}), std::invalid_argument);
    EXPECT_THROW(resample(std::vector<double>{1.0, 2.0}, std::vector<double>{0.0}), std::invalid_argument);
}

TEST(CieData, ReadsTheColordTablesAndRejectsMissingFiles)
{
    const CieData& cie = cieData();
    EXPECT_NEAR(cie.yBar[size_t(sampleAtOrBelow(556))], 0.998, 0.003); // ȳ peaks at 555 nm
    EXPECT_EQ(cie.xBar[size_t(sampleAtOrBelow(358))], 0.0);
    EXPECT_NEAR(cie.s0[size_t(sampleAtOrBelow(560))], 100.0, 1e-9);
    EXPECT_THROW(loadSpectralTable("/nonexistent/CIE-X.sp"), std::runtime_error);
}

TEST(Bands, LinesAndBandsHaveUnitAreaAndTheirPeakWhereAsked)
{
    for (const Spectrum& s : {line(546.1), line(611.0, 1.0), band(450.0, 9.0, 12.0), band(560.0, 50.0, 70.0)})
        EXPECT_NEAR(integral(s), 1.0, 1e-12);
    const Spectrum b = band(450.0, 9.0, 12.0);
    EXPECT_GT(b[size_t(sampleAtOrBelow(450))], b[size_t(sampleAtOrBelow(448))]);
    EXPECT_GT(b[size_t(sampleAtOrBelow(462))], b[size_t(sampleAtOrBelow(438))]); // longer red flank
    EXPECT_EQ(integral(line(1200.0)), 0.0);
}

TEST(Models, IncandescentAndDaylightCarryInfraredWhileLedAndFluorescentDoNot)
{
    EXPECT_GT(infraredShare(cieA()), 0.6);
    EXPECT_GT(infraredShare(planck(2000.0)), 0.8);
    EXPECT_GT(infraredShare(cieDaylight(6500.0)), 0.25);
    EXPECT_GT(infraredShare(highPressureSodium({})), 0.1);

    EXPECT_LT(infraredShare(*whiteLed({450, 565, 115, 0, 0, 5000})), 0.03);
    EXPECT_LT(infraredShare(*whiteLed({450, 545, 105, 630, 90, 3000})), 0.03);
    EXPECT_LT(infraredShare(*triPhosphorLamp({4000, 0.0, 0.05})), 0.06);
    EXPECT_LT(infraredShare(cieF(2)), 0.03);
    const Spectrum f11 = cieF(11);
    for (int i = sampleAtOrBelow(782); i < kSamples; ++i)
        EXPECT_EQ(f11[size_t(i)], 0.0);
}

TEST(Models, SolvedSourcesLandOnTheirTargetColour)
{
    const Xy led = chromaticity(tristimulus(*whiteLed({450, 565, 115, 0, 0, 5000})));
    EXPECT_NEAR(*correlatedColourTemperature(led), 5000.0, 2.0);
    EXPECT_LE(std::abs(*distanceFromLocus(led)), kMaxWhiteLedDuv);
    EXPECT_FALSE(whiteLed({450, 545, 110, 0, 0, 5000}).has_value()) << "too far above the locus";

    const Xy warm = chromaticity(tristimulus(*whiteLed({450, 545, 105, 630, 90, 2700})));
    EXPECT_NEAR(*correlatedColourTemperature(warm), 2700.0, 3.0);
    EXPECT_NEAR(*distanceFromLocus(warm), 0.0, 2e-4);

    const Xy tri = chromaticity(tristimulus(*triPhosphorLamp({5000, 0.006, 0.15})));
    EXPECT_NEAR(*distanceFromLocus(tri), 0.006, 3e-4);
    const Xy halide = chromaticity(tristimulus(*metalHalide(BurnerKind::Ceramic, 4000)));
    EXPECT_NEAR(*correlatedColourTemperature(halide), 4000.0, 3.0);
    const Xy violet = chromaticity(tristimulus(*violetPumpedLed(405, 4000)));
    EXPECT_NEAR(*correlatedColourTemperature(violet), 4000.0, 3.0);
}

TEST(Mixing, UnreachableTargetsAreDeclined)
{
    const std::array<Spectrum, 3> greens{line(520.0), line(530.0), line(540.0)};
    EXPECT_FALSE(blendToChromaticity(Spectrum{}, greens, chromaticityAt(4000.0, 0.0)).has_value());
    EXPECT_FALSE(blendToTemperature(line(600.0), line(610.0), 6500.0).has_value());
}

TEST(Mixing, SharesAreSharesOfIlluminance)
{
    const Spectrum a = cieA();
    const Spectrum d = cieDaylight(6504.0);
    const Share shares[] = {{&d, 0.7}, {&a, 0.3}};
    const Spectrum mix = mixByIlluminance(shares);
    EXPECT_NEAR(tristimulus(mix).Y, 1.0, 1e-12);
    const Xyz expect{0.7 * tristimulus(atIlluminance(d, 1)).X + 0.3 * tristimulus(atIlluminance(a, 1)).X, 1.0, 0.0};
    EXPECT_NEAR(tristimulus(mix).X, expect.X, 1e-12);
}
