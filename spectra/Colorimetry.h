// CIE 1931 2° colorimetry of grid spectra.
//
// Normalisation: absolute photometric. A spectrum is spectral irradiance in
// mW·m⁻²·nm⁻¹ and X = Km·Σ S(λ)·x̄(λ)·Δλ (likewise Y, Z) with Km = 683 lm/W =
// 0.683 lm/mW and Δλ = 2 nm, so Y is the illuminance in lux. The reference
// sources are all scaled to 100 lux: every database row then has Y = 100 while
// its channel responses are normalised to a fixed lux-weighted sum, so the fit
// sees one consistent scale between responses and XYZ across all sources.
#pragma once

#include "spectra/Grid.h"

#include <optional>

namespace spectra {

inline constexpr double kKmLumenPerMilliwatt = 0.683;

struct Xyz {
    double X = 0.0;
    double Y = 0.0;
    double Z = 0.0;
};
struct Xy {
    double x = 0.0;
    double y = 0.0;
};
// CIE 1976 UCS u′, v′ (or CIE 1960 u, v where stated: u = u′, v = 2/3·v′).
struct Uv {
    double u = 0.0;
    double v = 0.0;
};

Xyz tristimulus(const Spectrum& s);
// Chromaticity of a stimulus; (0, 0) for a black one.
Xy chromaticity(const Xyz& xyz);
Uv uvPrime(const Xy& xy);
Xy xyFromUvPrime(const Uv& uv);
double deltaUvPrime(const Uv& a, const Uv& b);

// Correlated colour temperature through lcms2; empty where lcms2 has no
// isotemperature line for the point (below about 1667 K or far off the locus).
std::optional<double> correlatedColourTemperature(const Xy& xy);

// Chromaticity of the Planckian radiator at `kelvin` through our own colour-matching sums.
Xy planckianChromaticity(double kelvin);
// Point at distance `duv` (CIE 1960 uv) from the Planckian locus along the
// isotemperature line of `kelvin`; positive duv lies above the locus (greener).
Xy chromaticityAt(double kelvin, double duv);
// Signed distance (CIE 1960 uv) from the Planckian point at the correlated
// colour temperature, positive above the locus; empty where there is no CCT.
std::optional<double> distanceFromLocus(const Xy& xy);

// `s` scaled so that its Y is `lux` (a black spectrum stays black).
Spectrum atIlluminance(const Spectrum& s, double lux);

} // namespace spectra
