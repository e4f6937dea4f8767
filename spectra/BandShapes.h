// Building blocks of the parametric light sources: emission lines and broad
// bands, each of unit radiant area on the grid (Σ s·Δλ = 1), so that weights
// are radiant powers.
#pragma once

#include "spectra/Grid.h"

#include <span>

namespace spectra {

// Emission lines are drawn as Gaussians no narrower than this, so that a line
// keeps its power and shape when sampled every 2 nm (as a 2 nm spectrometer
// would record it).
inline constexpr double kMinLineFwhmNm = 4.0;

struct Line {
    double nm = 0.0;
    double power = 0.0; // relative radiant power
};

// A Gaussian line of FWHM max(fwhm, kMinLineFwhmNm); zero when it lies off the grid.
Spectrum line(double centreNm, double fwhmNm = kMinLineFwhmNm);
// Σ power·line(nm) over `lines`, all drawn with the same width.
Spectrum lines(std::span<const Line> lines, double fwhmNm = kMinLineFwhmNm);
// A band with Gaussian flanks of different half widths at half maximum on the
// short- and long-wavelength side of the peak.
Spectrum band(double peakNm, double shortHalfWidthNm, double longHalfWidthNm);

} // namespace spectra
