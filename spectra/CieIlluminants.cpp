#include "spectra/CieIlluminants.h"

#include "spectra/CieData.h"
#include "spectra/Planck.h"

#include <stdexcept>
#include <string>

namespace spectra {

namespace {

Spectrum withTailFromFile(const std::string& file, double kelvin)
{
    const TabulatedIlluminant t = loadIlluminant(file);
    return withPlanckTail(t.values, sampleAtOrBelow(t.lastNm), kelvin);
}

} // namespace

Spectrum cieA() { return withTailFromFile("CIE-A.sp", kIlluminantAKelvin); }
Spectrum cieD65() { return withTailFromFile("CIE-D65.sp", kIlluminantD65Kelvin); }
Spectrum cieB() { return loadIlluminant("CIE-B.sp").values; }
Spectrum cieC() { return loadIlluminant("CIE-C.sp").values; }

Spectrum cieF(int number)
{
    if (number < 1 || number > 12)
        throw std::invalid_argument("CIE F illuminants are numbered 1 to 12");
    return loadIlluminant("CIE-F" + std::to_string(number) + ".sp").values;
}

} // namespace spectra
