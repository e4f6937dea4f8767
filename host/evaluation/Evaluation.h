// Accuracy of a colour estimate over a set of lights: for each light its true
// chromaticity and correlated colour temperature (CIE 1931 2°, from the
// spectrum), and for each estimator (the plug-in, the global-matrix baseline)
// the estimate from the same reading and its error Δu′v′ and ΔCCT.
#pragma once

#include "host/inputs/SyntheticReading.h"
#include "spectra/Colorimetry.h"

#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace host {

// The XYZ an estimator gives for a reading, or nothing when it gives no colour.
using Estimator = std::function<std::optional<spectra::Xyz>(const SensorReading&)>;

struct Estimate {
    bool valid = false; // the estimator gave a colour
    spectra::Xy xy;
    std::optional<double> cct;
    std::optional<double> duv;      // signed CIE 1960 uv distance from the Planckian locus, where there is a CCT
    double deltaUv = 0.0;           // Δu′v′ from the true chromaticity
    std::optional<double> deltaCct; // estimated − true CCT, where both exist
};

struct LightResult {
    std::string name;
    spectra::Xy trueXy;
    std::optional<double> trueCct;
    std::optional<double> trueDuv;
    SensorReading reading;
    Estimate plugIn;
    Estimate baseline;
};

// Δu′v′ statistics over the lights an estimator gave a colour for.
// Percentiles interpolate linearly between the ranked errors.
struct ErrorSummary {
    size_t count = 0;   // lights with an estimate
    size_t missing = 0; // lights without one
    double median = 0.0;
    double p95 = 0.0;
    double max = 0.0;
};

// The p-th percentile (0–100) of `values` (any order); 0 for none.
double percentile(std::vector<double> values, double p);
ErrorSummary summarise(const std::vector<LightResult>& results, Estimate LightResult::*which);

// Evaluates every light: one noise-free reading at `lux`, both estimators on
// it. `progress` (may be empty) is called after each light with the number done.
std::vector<LightResult> evaluateLights(const std::vector<spectra::Source>& lights, const UnitSpectra& unit, double lux,
                                        const Estimator& plugIn, const Estimator& baseline,
                                        const std::function<void(size_t)>& progress = {});

} // namespace host
