// Planckian (black-body) radiators, and the Planckian continuation used to
// carry tabulated spectra into the near infrared.
#pragma once

#include "spectra/Grid.h"

namespace spectra {

// Second radiation constant, µm·K (CODATA 2018: 1.438776877e-2 m·K).
inline constexpr double kC2MicrometreKelvin = 14387.76877;

// Relative spectral exitance c1·λ⁻⁵ / (exp(c2/λT) − 1) with λ in µm and c1 = 1.
double planckRelative(double nm, double kelvin);

// A Planckian radiator at `kelvin` on the grid (relative scale).
Spectrum planck(double kelvin);

// Replaces every sample after `lastSample` by a Planckian radiator at `kelvin`,
// scaled so that its mean over the 26 samples (50 nm) ending at `lastSample`
// equals the mean of `s` over the same samples. A window rather than the last
// value alone keeps an absorption band in the table's last samples from
// setting the level of the whole tail.
Spectrum withPlanckTail(const Spectrum& s, int lastSample, double kelvin);

} // namespace spectra
