// The wavelength grid every spectrum of the tools lives on: 401 samples from
// 300 nm to 1100 nm in 2 nm steps, the grid of the units' channel spectra.
#pragma once

#include <array>
#include <cstddef>
#include <span>

namespace spectra {

inline constexpr int kSamples = 401;
inline constexpr double kFirstNm = 300.0;
inline constexpr double kStepNm = 2.0;
inline constexpr double kLastNm = kFirstNm + kStepNm * (kSamples - 1);
// Sample 205 (710 nm) starts the 196-sample near-infrared tail that the
// per-chip fold can rescale.
inline constexpr int kNirTailStart = 205;

// Spectral irradiance in mW·m⁻²·nm⁻¹, one value per grid sample.
using Spectrum = std::array<double, kSamples>;

constexpr double wavelengthNm(int sample) { return kFirstNm + kStepNm * sample; }

// Index of the grid sample at or below `nm`, clamped to the grid.
int sampleAtOrBelow(double nm);

// Linear interpolation of a tabulated spectrum (ascending wavelengths) onto the
// grid. Grid samples outside [first, last] tabulated wavelength are zero.
Spectrum resample(std::span<const double> wavelengthsNm, std::span<const double> values);

// Evaluates f(nm) at every grid wavelength.
template <typename F>
Spectrum sampled(F f)
{
    Spectrum s{};
    for (int i = 0; i < kSamples; ++i)
        s[size_t(i)] = f(wavelengthNm(i));
    return s;
}

Spectrum scaled(const Spectrum& s, double factor);
// `s` scaled to unit radiant area (Σ s·Δλ = 1); a black spectrum stays black.
Spectrum unitArea(const Spectrum& s);
// a + factor · b
Spectrum addScaled(const Spectrum& a, const Spectrum& b, double factor);
// Radiant sum over the grid, Σ s·Δλ (mW·m⁻² for irradiance).
double integral(const Spectrum& s);
// Radiant sum of the samples from `first` on.
double integralFrom(const Spectrum& s, int first);

} // namespace spectra
