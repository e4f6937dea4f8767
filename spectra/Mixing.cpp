#include "spectra/Mixing.h"

#include <cmath>

namespace spectra {

namespace {

double det3(const std::array<Xyz, 3>& c)
{
    return c[0].X * (c[1].Y * c[2].Z - c[2].Y * c[1].Z) - c[1].X * (c[0].Y * c[2].Z - c[2].Y * c[0].Z) +
           c[2].X * (c[0].Y * c[1].Z - c[1].Y * c[0].Z);
}

} // namespace

Spectrum mixByIlluminance(std::span<const Share> shares)
{
    Spectrum sum{};
    for (const Share& share : shares)
        sum = addScaled(sum, atIlluminance(*share.spectrum, 1.0), share.fraction);
    return sum;
}

std::optional<Spectrum> blendToChromaticity(const Spectrum& fixed, const std::array<Spectrum, 3>& primaries,
                                            const Xy& target)
{
    if (!(target.y > 0.0))
        return std::nullopt;
    const Xyz base = tristimulus(fixed);
    const Xyz want{target.x / target.y - base.X, 1.0 - base.Y, (1.0 - target.x - target.y) / target.y - base.Z};
    const std::array<Xyz, 3> columns{tristimulus(primaries[0]), tristimulus(primaries[1]), tristimulus(primaries[2])};

    // Cramer's rule on the 3 × 3 system Σ wᵢ·XYZᵢ = want.
    const double d = det3(columns);
    if (std::abs(d) < 1e-300)
        return std::nullopt;
    Spectrum out = fixed;
    for (size_t i = 0; i < 3; ++i) {
        std::array<Xyz, 3> replaced = columns;
        replaced[i] = want;
        const double w = det3(replaced) / d;
        if (w < 0.0)
            return std::nullopt;
        out = addScaled(out, primaries[i], w);
    }
    return out;
}

std::optional<Spectrum> blendToTemperature(const Spectrum& warm, const Spectrum& cool, double kelvin)
{
    // XYZ is linear in f, so the search runs on tristimulus values alone: a
    // scan finds the first step across `kelvin`, bisection refines it.
    const Spectrum w = unitArea(warm);
    const Spectrum c = unitArea(cool);
    const Xyz xw = tristimulus(w);
    const Xyz xc = tristimulus(c);
    const auto cctAt = [&](double f) {
        return correlatedColourTemperature(
            chromaticity(Xyz{(1 - f) * xw.X + f * xc.X, (1 - f) * xw.Y + f * xc.Y, (1 - f) * xw.Z + f * xc.Z}));
    };

    constexpr int kSteps = 1000;
    std::optional<double> previous = cctAt(0.0);
    for (int k = 1; k <= kSteps; ++k) {
        const double f = double(k) / kSteps;
        const std::optional<double> current = cctAt(f);
        if (previous && current && *previous <= kelvin && *current >= kelvin) {
            double lo = f - 1.0 / kSteps;
            double hi = f;
            for (int i = 0; i < 50; ++i) {
                const double mid = 0.5 * (lo + hi);
                const std::optional<double> t = cctAt(mid);
                if (t && *t < kelvin)
                    lo = mid;
                else
                    hi = mid;
            }
            const double fraction = 0.5 * (lo + hi);
            return addScaled(scaled(w, 1.0 - fraction), c, fraction);
        }
        previous = current;
    }
    return std::nullopt;
}

} // namespace spectra
