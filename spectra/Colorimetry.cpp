#include "spectra/Colorimetry.h"

#include "spectra/CieData.h"
#include "spectra/Planck.h"

#include <lcms2.h>

#include <cmath>

namespace spectra {

namespace {

Uv uv1960(const Xy& xy)
{
    const Uv p = uvPrime(xy);
    return Uv{p.u, p.v * 2.0 / 3.0};
}

// Unit normal of the Planckian locus at `kelvin` in CIE 1960 uv, pointing above it.
Uv locusNormal(double kelvin)
{
    const double step = kelvin * 1e-3;
    const Uv hi = uv1960(planckianChromaticity(kelvin + step));
    const Uv lo = uv1960(planckianChromaticity(kelvin - step));
    const double du = hi.u - lo.u;
    const double dv = hi.v - lo.v;
    const double length = std::hypot(du, dv);
    Uv n{-dv / length, du / length};
    if (n.v < 0)
        n = Uv{-n.u, -n.v};
    return n;
}

} // namespace

Xyz tristimulus(const Spectrum& s)
{
    const CieData& cie = cieData();
    Xyz sum;
    for (size_t i = 0; i < s.size(); ++i) {
        sum.X += s[i] * cie.xBar[i];
        sum.Y += s[i] * cie.yBar[i];
        sum.Z += s[i] * cie.zBar[i];
    }
    const double k = kKmLumenPerMilliwatt * kStepNm;
    return Xyz{sum.X * k, sum.Y * k, sum.Z * k};
}

Xy chromaticity(const Xyz& xyz)
{
    const double total = xyz.X + xyz.Y + xyz.Z;
    if (total == 0.0)
        return Xy{};
    return Xy{xyz.X / total, xyz.Y / total};
}

Uv uvPrime(const Xy& xy)
{
    const double d = -2.0 * xy.x + 12.0 * xy.y + 3.0;
    return Uv{4.0 * xy.x / d, 9.0 * xy.y / d};
}

Xy xyFromUvPrime(const Uv& uv)
{
    const double d = 6.0 * uv.u - 16.0 * uv.v + 12.0;
    return Xy{9.0 * uv.u / d, 4.0 * uv.v / d};
}

double deltaUvPrime(const Uv& a, const Uv& b) { return std::hypot(a.u - b.u, a.v - b.v); }

std::optional<double> correlatedColourTemperature(const Xy& xy)
{
    const cmsCIExyY white{xy.x, xy.y, 1.0};
    double kelvin = 0.0;
    if (!cmsTempFromWhitePoint(&kelvin, &white))
        return std::nullopt;
    return kelvin;
}

Xy planckianChromaticity(double kelvin) { return chromaticity(tristimulus(planck(kelvin))); }

Xy chromaticityAt(double kelvin, double duv)
{
    const Uv p = uv1960(planckianChromaticity(kelvin));
    const Uv n = locusNormal(kelvin);
    const Uv shifted{p.u + duv * n.u, p.v + duv * n.v};
    return xyFromUvPrime(Uv{shifted.u, shifted.v * 1.5});
}

std::optional<double> distanceFromLocus(const Xy& xy)
{
    const std::optional<double> kelvin = correlatedColourTemperature(xy);
    if (!kelvin)
        return std::nullopt;
    const Uv p = uv1960(planckianChromaticity(*kelvin));
    const Uv q = uv1960(xy);
    const Uv n = locusNormal(*kelvin);
    const double distance = std::hypot(q.u - p.u, q.v - p.v);
    return (q.u - p.u) * n.u + (q.v - p.v) * n.v >= 0 ? distance : -distance;
}

Spectrum atIlluminance(const Spectrum& s, double lux)
{
    const double y = tristimulus(s).Y;
    return y > 0.0 ? scaled(s, lux / y) : s;
}

} // namespace spectra
