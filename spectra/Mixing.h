// Combining spectra: mixtures by illuminance share, and blends whose weights
// are solved so that the result has a chosen chromaticity.
#pragma once

#include "spectra/Colorimetry.h"
#include "spectra/Grid.h"

#include <array>
#include <optional>
#include <span>

namespace spectra {

struct Share {
    const Spectrum* spectrum = nullptr;
    double fraction = 0.0; // fraction of the mixture's illuminance
};

// Σ fraction·(spectrum scaled to Y = 1); the result has Y = Σ fractions.
Spectrum mixByIlluminance(std::span<const Share> shares);

// fixed + Σ wᵢ·primaryᵢ with wᵢ ≥ 0 such that the result has chromaticity
// `target` and Y = 1 (`fixed` carries its own share of that Y). Empty when the
// target lies outside what the primaries can reach from `fixed`.
std::optional<Spectrum> blendToChromaticity(const Spectrum& fixed, const std::array<Spectrum, 3>& primaries,
                                            const Xy& target);

// (1 − f)·warm + f·cool, both at unit radiant area, with f chosen so that the
// correlated colour temperature is `kelvin`. Empty when no f in [0, 1] gets there.
std::optional<Spectrum> blendToTemperature(const Spectrum& warm, const Spectrum& cool, double kelvin);

} // namespace spectra
