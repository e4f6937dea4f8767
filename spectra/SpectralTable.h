// Spectral tables stored as CGATS files (the colour-matching functions and CIE
// illuminants installed by Debian's colord-data), read with lcms2's parser.
#pragma once

#include <string>
#include <vector>

namespace spectra {

// One or more spectra tabulated on a common, evenly spaced wavelength range.
struct SpectralTable {
    std::vector<double> wavelengthsNm;     // SPECTRAL_START_NM .. SPECTRAL_END_NM, SPECTRAL_BANDS values
    std::vector<std::vector<double>> sets; // one row of the data block per set
};

// Reads a spectral CGATS file. Throws std::runtime_error when the file cannot
// be read or lacks the spectral range keywords.
SpectralTable loadSpectralTable(const std::string& path);

} // namespace spectra
