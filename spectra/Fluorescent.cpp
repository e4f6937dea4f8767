#include "spectra/Fluorescent.h"

#include "spectra/BandShapes.h"
#include "spectra/Colorimetry.h"
#include "spectra/Mixing.h"

namespace spectra {

namespace {

constexpr Line kMercury[] = {{404.7, 0.35}, {435.8, 0.6}, {546.1, 1.0}, {577.0, 0.12}, {579.1, 0.12}};
constexpr Line kTerbium[] = {{543.0, 1.0}, {488.0, 0.25}, {585.0, 0.12}, {621.0, 0.06}};
constexpr Line kEuropium[] = {{611.0, 1.0}, {593.0, 0.12}, {627.0, 0.15}, {650.0, 0.05}, {707.0, 0.06}};
constexpr Line kInfrared[] = {{763.5, 0.3}, {811.5, 0.3}, {912.3, 0.2}, {1014.0, 0.2}};
constexpr double kMercuryShare = 0.06;
constexpr double kInfraredFraction = 0.02;

} // namespace

std::optional<Spectrum> triPhosphorLamp(const TriPhosphorLamp& lamp)
{
    const Spectrum mercury = atIlluminance(lines(kMercury), kMercuryShare);
    const Spectrum continuum = atIlluminance(band(560.0, 120.0, 140.0), lamp.continuumShare);
    const std::array<Spectrum, 3> phosphors{band(450.0, 22.0, 28.0), lines(kTerbium, 8.0), lines(kEuropium)};

    const std::optional<Spectrum> visible =
        blendToChromaticity(addScaled(mercury, continuum, 1.0), phosphors, chromaticityAt(lamp.kelvin, lamp.duv));
    if (!visible)
        return std::nullopt;
    // The infrared lines as a fraction of the whole: p / (V + p) = fraction.
    const double power = integral(*visible) * kInfraredFraction / (1.0 - kInfraredFraction);
    return addScaled(*visible, unitArea(lines(kInfrared)), power);
}

} // namespace spectra
