#include "spectra/Discharge.h"

#include "spectra/BandShapes.h"
#include "spectra/Colorimetry.h"
#include "spectra/Mixing.h"

namespace spectra {

namespace {

constexpr double kSodiumD = 589.3;

constexpr Line kSodiumVisible[] = {{466.5, 0.03}, {498.3, 0.06}, {515.4, 0.03}, {568.8, 0.10}, {616.0, 0.08}};
constexpr Line kMercuryTrace[] = {{435.8, 0.01}, {546.1, 0.02}, {577.0, 0.01}};
constexpr Line kMercury[] = {{404.7, 0.4}, {435.8, 0.8}, {546.1, 1.0}, {577.0, 0.3}, {579.1, 0.3}};

constexpr Line kHalideBlue[] = {{451.1, 1.0}, {410.2, 0.3}, {424.7, 0.2}, {435.8, 0.5}, {474.3, 0.2}};
constexpr Line kHalideGreen[] = {{535.0, 1.0}, {546.1, 0.6}, {567.2, 0.15}, {570.0, 0.15}};
constexpr Line kHalideRed[] = {{604.3, 0.2}, {608.0, 0.2}, {670.8, 0.3}};
constexpr Line kHalideInfrared[] = {{818.9, 1.0}, {766.5, 0.3}, {769.9, 0.3}, {852.1, 0.5},
                                    {894.3, 0.4}, {811.5, 0.2}, {912.3, 0.2}, {1014.0, 0.6}};

Spectrum sodiumWings(double b)
{
    return addScaled(band(kSodiumD - b, 1.2 * b, 0.45 * b), band(kSodiumD + 1.2 * b, 0.45 * b, 2.0 * b), 1.3);
}

} // namespace

Spectrum highPressureSodium(const SodiumLamp& lamp)
{
    Spectrum s = sodiumWings(lamp.broadeningNm);
    s = addScaled(s, lines(kSodiumVisible), 1.0);
    s = addScaled(s, lines(kMercuryTrace), 1.0);
    s = addScaled(s, line(818.9, 6.0), 0.25 * lamp.infraredScale);
    return addScaled(s, band(900.0, 200.0, 400.0), 0.15 * lamp.infraredScale);
}

Spectrum lowPressureSodium() { return addScaled(line(kSodiumD), line(818.9), 0.15); }

std::optional<Spectrum> metalHalide(BurnerKind kind, double kelvin)
{
    const bool ceramic = kind == BurnerKind::Ceramic;
    const double continuumShare = ceramic ? 0.40 : 0.25;
    const double sodiumWidth = ceramic ? 16.0 : 10.0;
    const double infraredFraction = ceramic ? 0.12 : 0.08;

    const Spectrum fixed =
        addScaled(atIlluminance(band(560.0, 140.0, 200.0), continuumShare), atIlluminance(lines(kMercury), 0.08), 1.0);
    const Spectrum red = addScaled(band(kSodiumD, sodiumWidth / 2, sodiumWidth * 0.8), lines(kHalideRed), 1.0);
    const std::optional<Spectrum> visible =
        blendToChromaticity(fixed, {lines(kHalideBlue), lines(kHalideGreen), red}, chromaticityAt(kelvin, 0.0));
    if (!visible)
        return std::nullopt;
    const double power = integral(*visible) * infraredFraction / (1.0 - infraredFraction);
    return addScaled(*visible, unitArea(lines(kHalideInfrared)), power);
}

} // namespace spectra
