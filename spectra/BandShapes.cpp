#include "spectra/BandShapes.h"

#include <algorithm>
#include <cmath>

namespace spectra {

namespace {

// exp(−ln2·(d/h)²): 1 at the peak, 1/2 at d = h.
double flank(double distanceNm, double halfWidthNm)
{
    const double r = distanceNm / halfWidthNm;
    return std::exp(-std::log(2.0) * r * r);
}

} // namespace

Spectrum band(double peakNm, double shortHalfWidthNm, double longHalfWidthNm)
{
    return unitArea(sampled([=](double nm) {
        return nm < peakNm ? flank(peakNm - nm, shortHalfWidthNm) : flank(nm - peakNm, longHalfWidthNm);
    }));
}

Spectrum line(double centreNm, double fwhmNm)
{
    const double half = std::max(fwhmNm, kMinLineFwhmNm) / 2.0;
    if (centreNm < kFirstNm - 4 * half || centreNm > kLastNm + 4 * half)
        return Spectrum{};
    return band(centreNm, half, half);
}

Spectrum lines(std::span<const Line> list, double fwhmNm)
{
    Spectrum sum{};
    for (const Line& l : list)
        sum = addScaled(sum, line(l.nm, fwhmNm), l.power);
    return sum;
}

} // namespace spectra
