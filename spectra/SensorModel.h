// A colour sensor described by the spectral sensitivity of each of its
// channels on the grid, as stored in the CSV files of data/sensors:
//
//   # comment lines start with '#'
//   nm,B,G,R,C
//   300,0.000123,...
//
// one row per grid wavelength (300, 302, ... 1100 nm, all 401 of them, in
// order), one column per channel, relative sensitivities (counts per unit of
// spectral irradiance, on a common scale for all channels of a sensor).
#pragma once

#include "spectra/Grid.h"

#include <filesystem>
#include <string>
#include <vector>

namespace spectra {

struct SensorModel {
    std::vector<std::string> channelNames;
    std::vector<Spectrum> channels; // one sensitivity per channel, same order as the names

    size_t channelCount() const { return channels.size(); }
    // Largest sensitivity over every channel and sample.
    double peak() const;
};

// Reads a sensor CSV. Throws std::runtime_error naming the file and line when
// it cannot be read or does not follow the form above.
SensorModel loadSensorModel(const std::filesystem::path& file);

// The CSV text of a sensor: `comments` (one '#' line each), the header and the
// 401 rows, values with six decimals.
std::string sensorModelCsv(const SensorModel& sensor, const std::vector<std::string>& comments = {});

// The channel counts a sensor gives under an irradiance: Σ E(λ)·S_c(λ)·Δλ.
std::vector<double> channelResponses(const SensorModel& sensor, const Spectrum& irradiance);

} // namespace spectra
