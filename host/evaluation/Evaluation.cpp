#include "host/evaluation/Evaluation.h"

#include <algorithm>
#include <cmath>

namespace host {

namespace {

Estimate assess(const std::optional<spectra::Xyz>& xyz, const LightResult& truth)
{
    Estimate e;
    if (!xyz || !(xyz->X + xyz->Y + xyz->Z > 0))
        return e;
    e.valid = true;
    e.xy = spectra::chromaticity(*xyz);
    e.cct = spectra::correlatedColourTemperature(e.xy);
    e.duv = spectra::distanceFromLocus(e.xy);
    e.deltaUv = spectra::deltaUvPrime(spectra::uvPrime(e.xy), spectra::uvPrime(truth.trueXy));
    if (e.cct && truth.trueCct)
        e.deltaCct = *e.cct - *truth.trueCct;
    return e;
}

} // namespace

double percentile(std::vector<double> values, double p)
{
    if (values.empty())
        return 0.0;
    std::sort(values.begin(), values.end());
    const double rank = std::clamp(p, 0.0, 100.0) / 100.0 * double(values.size() - 1);
    const size_t below = size_t(std::floor(rank));
    const size_t above = std::min(below + 1, values.size() - 1);
    return values[below] + (rank - double(below)) * (values[above] - values[below]);
}

ErrorSummary summarise(const std::vector<LightResult>& results, Estimate LightResult::*which)
{
    ErrorSummary s;
    std::vector<double> errors;
    for (const LightResult& r : results) {
        if ((r.*which).valid)
            errors.push_back((r.*which).deltaUv);
        else
            ++s.missing;
    }
    s.count = errors.size();
    if (errors.empty())
        return s;
    s.median = percentile(errors, 50);
    s.p95 = percentile(errors, 95);
    s.max = *std::max_element(errors.begin(), errors.end());
    return s;
}

std::vector<LightResult> evaluateLights(const std::vector<spectra::Source>& lights, const UnitSpectra& unit, double lux,
                                        const Estimator& plugIn, const Estimator& baseline,
                                        const std::function<void(size_t)>& progress)
{
    std::vector<LightResult> results;
    for (const spectra::Source& light : lights) {
        LightResult r;
        r.name = light.name;
        r.trueXy = spectra::chromaticity(spectra::tristimulus(light.spectrum));
        r.trueCct = spectra::correlatedColourTemperature(r.trueXy);
        r.trueDuv = spectra::distanceFromLocus(r.trueXy);
        r.reading = synthesiseReading(unit, light.spectrum, lux);
        r.plugIn = assess(plugIn(r.reading), r);
        r.baseline = assess(baseline(r.reading), r);
        results.push_back(std::move(r));
        if (progress)
            progress(results.size());
    }
    return results;
}

} // namespace host
