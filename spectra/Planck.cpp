#include "spectra/Planck.h"

#include <algorithm>
#include <cmath>

namespace spectra {

double planckRelative(double nm, double kelvin)
{
    const double um = nm / 1000.0;
    return 1.0 / (std::pow(um, 5) * std::expm1(kC2MicrometreKelvin / (um * kelvin)));
}

Spectrum planck(double kelvin)
{
    return sampled([kelvin](double nm) { return planckRelative(nm, kelvin); });
}

Spectrum withPlanckTail(const Spectrum& s, int lastSample, double kelvin)
{
    constexpr int kWindow = 26;
    const int first = std::max(0, lastSample - kWindow + 1);
    double tabulated = 0.0;
    double radiator = 0.0;
    for (int i = first; i <= lastSample; ++i) {
        tabulated += s[size_t(i)];
        radiator += planckRelative(wavelengthNm(i), kelvin);
    }
    const double factor = radiator > 0.0 ? tabulated / radiator : 0.0;
    Spectrum out = s;
    for (int i = lastSample + 1; i < kSamples; ++i)
        out[size_t(i)] = factor * planckRelative(wavelengthNm(i), kelvin);
    return out;
}

} // namespace spectra
