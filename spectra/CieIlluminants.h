// CIE standard illuminants from the colord-data tables, on the grid.
//
// Beyond the tables: A and D65 continue as Planckian radiators (A is one, at
// 2856 K; D65 follows the daylight tail at 6504 K). B and C stop where their
// tables stop (770 nm, 780 nm): they are realised by filtering A through
// copper-sulphate solutions, which absorb the near infrared. The F series is
// zero outside 380–780 nm: fluorescent lamps emit almost nothing there.
#pragma once

#include "spectra/Grid.h"

namespace spectra {

inline constexpr double kIlluminantAKelvin = 2856.0;
inline constexpr double kIlluminantD65Kelvin = 6504.0;

Spectrum cieA();
Spectrum cieB();
Spectrum cieC();
Spectrum cieD65();
// F1 .. F12; throws std::invalid_argument for other numbers.
Spectrum cieF(int number);

} // namespace spectra
