// The estimate a sensor integrator would otherwise reach for: one global 3 x M
// matrix from channel counts to CIE XYZ, fitted by ordinary least squares over
// the unit's reference sources (the sources the plug-in folds for it, read
// by the unit's own channels as synthesiseReading reads them), applied to a
// reading and scaled so that Y is the reading's lux, as the plug-in scales
// its own estimate.
#pragma once

#include "host/inputs/SyntheticReading.h"
#include "spectra/Colorimetry.h"

#include <array>
#include <optional>
#include <vector>

namespace host {

class GlobalMatrixBaseline {
public:
    // Fits over `sources` (spectra at any scale). Throws std::runtime_error
    // when the fit has no unique solution (fewer sources than channels, or
    // channels that do not tell the sources apart).
    GlobalMatrixBaseline(const UnitSpectra& unit, const std::vector<const spectra::Source*>& sources);

    // XYZ scaled to the reading's lux; nothing when the matrix gives no positive Y.
    std::optional<spectra::Xyz> estimate(const SensorReading& reading) const;

    // Row j (X, Y, Z) holds the weight of every channel.
    const std::array<std::vector<double>, 3>& matrix() const { return matrix_; }

private:
    std::array<std::vector<double>, 3> matrix_;
};

} // namespace host
