#include "spectra/Daylight.h"

#include "spectra/CieData.h"
#include "spectra/Planck.h"

#include <cmath>
#include <stdexcept>

namespace spectra {

Xy daylightChromaticity(double kelvin)
{
    if (!(kelvin >= kDaylightMinKelvin && kelvin <= kDaylightMaxKelvin))
        throw std::invalid_argument("daylight: temperature outside 4000 K to 25000 K");
    const double t = kelvin;
    const double x = t <= 7000.0 ? -4.6070e9 / (t * t * t) + 2.9678e6 / (t * t) + 0.09911e3 / t + 0.244063
                                 : -2.0064e9 / (t * t * t) + 1.9018e6 / (t * t) + 0.24748e3 / t + 0.237040;
    return Xy{x, -3.000 * x * x + 2.870 * x - 0.275};
}

Spectrum cieDaylight(double kelvin)
{
    const Xy c = daylightChromaticity(kelvin);
    const double m = 0.0241 + 0.2562 * c.x - 0.7341 * c.y;
    const double m1 = std::round((-1.3515 - 1.7703 * c.x + 5.9114 * c.y) / m * 1000.0) / 1000.0;
    const double m2 = std::round((0.0300 - 31.4424 * c.x + 30.0717 * c.y) / m * 1000.0) / 1000.0;

    const CieData& cie = cieData();
    Spectrum s = addScaled(addScaled(cie.s0, cie.s1, m1), cie.s2, m2);
    return withPlanckTail(s, kDaylightLastSample, kelvin);
}

} // namespace spectra
