// Tri-phosphor fluorescent lamps beyond the CIE F series.
//
// A lamp is the mercury discharge (fixed: 6 % of the illuminance, lines at
// 404.7, 435.8, 546.1, 577.0 and 579.1 nm), a weak broad continuum (band at
// 560 nm, half widths 120/140 nm) with `continuumShare` of the illuminance, and
// three rare-earth phosphors whose weights are solved for the target colour:
//  - blue: a band at 450 nm (half widths 22/28 nm);
//  - green: terbium lines, 543 nm with satellites at 488, 585 and 621 nm;
//  - red: europium lines, 611 nm with satellites at 593, 627, 650 and 707 nm.
// The argon fill and mercury add weak near-infrared lines (763.5, 811.5,
// 912.3, 1014.0 nm), together 2 % of the radiant power.
#pragma once

#include "spectra/Grid.h"

#include <optional>

namespace spectra {

struct TriPhosphorLamp {
    double kelvin = 4000.0;
    double duv = 0.0;             // distance above (+) or below (−) the Planckian locus, CIE 1960 uv
    double continuumShare = 0.05; // fraction of the illuminance from the broad continuum
};

// Empty when the phosphors cannot reach the target colour.
std::optional<Spectrum> triPhosphorLamp(const TriPhosphorLamp& lamp);

} // namespace spectra
