#include "spectra/Grid.h"

#include <algorithm>
#include <cmath>
#include <stdexcept>

namespace spectra {

int sampleAtOrBelow(double nm)
{
    const int i = int(std::floor((nm - kFirstNm) / kStepNm + 1e-9));
    return std::clamp(i, 0, kSamples - 1);
}

Spectrum resample(std::span<const double> wavelengthsNm, std::span<const double> values)
{
    if (wavelengthsNm.size() != values.size() || wavelengthsNm.size() < 2)
        throw std::invalid_argument("resample: need at least two wavelength/value pairs of equal count");
    if (!std::is_sorted(wavelengthsNm.begin(), wavelengthsNm.end()))
        throw std::invalid_argument("resample: wavelengths must ascend");

    Spectrum out{};
    const double first = wavelengthsNm.front();
    const double last = wavelengthsNm.back();
    size_t k = 0; // table interval [k, k+1] holding the current wavelength
    for (int i = 0; i < kSamples; ++i) {
        const double nm = wavelengthNm(i);
        if (nm < first - 1e-9 || nm > last + 1e-9)
            continue;
        while (k + 2 < wavelengthsNm.size() && wavelengthsNm[k + 1] < nm)
            ++k;
        const double span = wavelengthsNm[k + 1] - wavelengthsNm[k];
        const double t = span > 0 ? std::clamp((nm - wavelengthsNm[k]) / span, 0.0, 1.0) : 0.0;
        out[size_t(i)] = values[k] + t * (values[k + 1] - values[k]);
    }
    return out;
}

Spectrum scaled(const Spectrum& s, double factor)
{
    Spectrum out;
    for (size_t i = 0; i < s.size(); ++i)
        out[i] = s[i] * factor;
    return out;
}

Spectrum addScaled(const Spectrum& a, const Spectrum& b, double factor)
{
    Spectrum out;
    for (size_t i = 0; i < a.size(); ++i)
        out[i] = a[i] + factor * b[i];
    return out;
}

double integralFrom(const Spectrum& s, int first)
{
    double sum = 0.0;
    for (int i = std::max(first, 0); i < kSamples; ++i)
        sum += s[size_t(i)];
    return sum * kStepNm;
}

double integral(const Spectrum& s) { return integralFrom(s, 0); }

Spectrum unitArea(const Spectrum& s)
{
    const double area = integral(s);
    return area > 0.0 ? scaled(s, 1.0 / area) : s;
}

} // namespace spectra
