// CIE daylight: S0 + M1·S1 + M2·S2 for correlated colour temperatures of
// 4000 K to 25000 K.
//
// The CIE components end at 830 nm. Silicon sensors respond up to 1100 nm, so
// the spectrum continues beyond 830 nm as a Planckian radiator at the same
// temperature, matched to the mean of the 780–830 nm samples (withPlanckTail).
#pragma once

#include "spectra/Colorimetry.h"
#include "spectra/Grid.h"

namespace spectra {

inline constexpr double kDaylightMinKelvin = 4000.0;
inline constexpr double kDaylightMaxKelvin = 25000.0;
// Last grid sample of the CIE daylight table (830 nm).
inline constexpr int kDaylightLastSample = 265;

// Chromaticity of the CIE daylight locus. Throws std::invalid_argument outside
// 4000–25000 K.
Xy daylightChromaticity(double kelvin);

// Relative spectrum, 100 at 560 nm for the tabulated part. M1 and M2 are
// rounded to three decimals as CIE 15:2004 recommends.
Spectrum cieDaylight(double kelvin);

} // namespace spectra
