// CIE tables on the grid, read from the colord-data files installed at
// VANTISH_COLORD_DIR (default /usr/share/colord).
#pragma once

#include "spectra/Grid.h"

#include <string>

namespace spectra {

struct CieData {
    // CIE 1931 2° colour-matching functions (cmf/CIE1931-2deg-XYZ.cmf, 360–830 nm
    // at 5 nm); zero outside the table, where they are below 2e-6.
    Spectrum xBar, yBar, zBar;
    // CIE daylight components S0, S1, S2 (ref/CIE-1986-daylight-SPD.cmf,
    // 300–830 nm at 5 nm); zero beyond 830 nm, see Daylight.h for the tail.
    Spectrum s0, s1, s2;
};

// Loaded on first use; throws std::runtime_error when a file is missing.
const CieData& cieData();

// A tabulated illuminant and the wavelength range its table covers.
struct TabulatedIlluminant {
    Spectrum values; // zero outside [firstNm, lastNm]
    double firstNm = 0.0;
    double lastNm = 0.0;
};

// Reads illuminant/<fileName> (for instance "CIE-A.sp") of the colord data.
TabulatedIlluminant loadIlluminant(const std::string& fileName);

// Absolute path of a file of the colord data, e.g. "cmf/CIE1931-2deg-XYZ.cmf".
std::string colordPath(const std::string& relative);

} // namespace spectra
