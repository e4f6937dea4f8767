// Parametric white LEDs: an InGaN pump with broad phosphor bands.
//
// Shapes (all unit radiant area, weights solved for the target colour):
//  - blue pump: peak `pumpNm`, half widths 9 nm (short side) and 12 nm (long side);
//  - phosphor: peak `phosphorPeakNm`, FWHM `phosphorFwhmNm`, split 42 % / 58 %
//    between the short and long side (phosphor bands tail off to the red);
//  - optional red component: symmetric, peak `redPeakNm`, FWHM `redFwhmNm`
//    (about 80–100 nm for a nitride phosphor, under 20 nm for a narrow-line
//    phosphor or a red chip).
// Without red, the pump/phosphor ratio is solved for the correlated colour
// temperature and the result lies where that mixing line crosses it; its
// distance from the locus is a property of the phosphor, and a combination
// farther than kMaxWhiteLedDuv is declined: no white LED is sold that far off
// white. With red, the three weights are solved to land on the locus exactly.
#pragma once

#include "spectra/Grid.h"

#include <optional>

namespace spectra {

inline constexpr double kMaxWhiteLedDuv = 0.012;

struct WhiteLed {
    double pumpNm = 450.0;
    double phosphorPeakNm = 555.0;
    double phosphorFwhmNm = 115.0;
    double redPeakNm = 0.0; // 0: no red component
    double redFwhmNm = 0.0;
    double kelvin = 5000.0;
};

// Empty when the components cannot reach the target colour.
std::optional<Spectrum> whiteLed(const WhiteLed& led);

// Violet-pumped full-spectrum LED: a violet pump (`pumpNm`, about 400–420 nm)
// carrying 10 % of the radiant power, with blue (455 nm, FWHM 50 nm), green
// (530 nm, FWHM 90 nm) and red (630 nm, FWHM 100 nm) phosphors solved to land on
// the Planckian locus at `kelvin`.
std::optional<Spectrum> violetPumpedLed(double pumpNm, double kelvin);

} // namespace spectra
