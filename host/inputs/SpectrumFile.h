// Light spectra read from files, put onto the 300–1100 nm grid.
//
//   *.csv   two columns, wavelength in nm and spectral value, one pair a line,
//           wavelengths ascending; an optional header line, '#' comments and
//           blank lines are skipped.
//   other   a spectral CGATS file (as colord-data's illuminant/*.sp), read with
//           lcms2's IT8 parser; its first data set is the spectrum.
//
// Any wavelength spacing is accepted (linear interpolation onto the grid);
// grid samples beyond the file's range are zero. The file must cover the
// visible range 400–700 nm and carry light in it. Only the spectrum's shape
// matters: the tools scale it to the illuminance they are asked for.
#pragma once

#include "spectra/Catalogue.h"

#include <filesystem>
#include <stdexcept>
#include <string>
#include <vector>

namespace host {

// A file that gives no usable spectrum; the message names the file (and the
// line, for CSV).
class SpectrumFileError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

inline constexpr double kVisibleFirstNm = 400.0;
inline constexpr double kVisibleLastNm = 700.0;

// The spectrum of a file, named after the file (its stem), family "file".
spectra::Source loadSpectrumFile(const std::filesystem::path& file);

// Every spectrum named: files as they are, folders by their *.csv and *.sp
// files in name order. A file that cannot be used is skipped with its message
// in `errors`; a path that does not exist is an error too.
std::vector<spectra::Source> loadSpectrumFiles(const std::vector<std::filesystem::path>& paths,
                                               std::vector<std::string>& errors);

} // namespace host
