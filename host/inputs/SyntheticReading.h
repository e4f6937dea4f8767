// What a unit's sensor reports under a light, computed from its stored
// channel spectra.
//
// Channel counts: c_k = s · Σ_λ E(λ)·R_k(λ), with E the light's spectrum and
// R_k the stored sensitivity of channel k (host/inputs/UnitSpectra.h). The scale s
// puts the counts where the sensor's own lux formula puts them: the
// calibration's lux coefficients w_k (lux per count) give back the light's
// illuminance, Σ w_k·c_k = lux. With the sample units' coefficients that is a
// few thousand counts on the strongest channel at 100 lux, as a sensor at its
// usual gain and integration time reports. A calibration whose coefficients
// give no positive sum for the light gets 30 counts per lux on its strongest
// channel instead.
#pragma once

#include "host/inputs/UnitSpectra.h"

#include <cstdint>
#include <iosfwd>
#include <random>
#include <vector>

namespace host {

inline constexpr double kFallbackCountsPerLux = 30.0;

struct SensorReading {
    std::vector<double> channels; // c0, c1, …
    double lux = 0.0;             // the light's illuminance (its Y scaled to the requested lux)
};

// The noise-free reading of `unit` under `light` (any scale) at `lux`.
SensorReading synthesiseReading(const UnitSpectra& unit, const spectra::Spectrum& light, double lux);

// Multiplies each channel by (1 + sigma·n), n standard normal; counts stay at or above 0.
void addRelativeNoise(SensorReading& reading, double sigma, std::mt19937_64& rng);

// Readings as `vantish run` reads them: a header c0..cN-1,lux,sampleChannelCount
// and one line per reading.
void writeReadingsCsvHeader(std::ostream& out, size_t channels);
void writeReadingCsv(std::ostream& out, const SensorReading& reading);

} // namespace host
