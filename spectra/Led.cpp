#include "spectra/Led.h"

#include "spectra/BandShapes.h"
#include "spectra/Colorimetry.h"
#include "spectra/Mixing.h"

#include <cmath>

namespace spectra {

namespace {

Spectrum pump(double peakNm) { return band(peakNm, 9.0, 12.0); }

Spectrum phosphor(double peakNm, double fwhmNm) { return band(peakNm, 0.42 * fwhmNm, 0.58 * fwhmNm); }

} // namespace

std::optional<Spectrum> whiteLed(const WhiteLed& led)
{
    const Spectrum blue = pump(led.pumpNm);
    const Spectrum yellow = phosphor(led.phosphorPeakNm, led.phosphorFwhmNm);
    if (led.redPeakNm <= 0.0) {
        std::optional<Spectrum> white = blendToTemperature(yellow, blue, led.kelvin);
        const std::optional<double> duv = white ? distanceFromLocus(chromaticity(tristimulus(*white))) : std::nullopt;
        if (!duv || std::abs(*duv) > kMaxWhiteLedDuv)
            return std::nullopt;
        return white;
    }
    const Spectrum red = band(led.redPeakNm, led.redFwhmNm / 2, led.redFwhmNm / 2);
    return blendToChromaticity(Spectrum{}, {blue, yellow, red}, chromaticityAt(led.kelvin, 0.0));
}

std::optional<Spectrum> violetPumpedLed(double pumpNm, double kelvin)
{
    constexpr double kPumpShare = 0.10;
    const Spectrum violet = band(pumpNm, 8.0, 10.0);
    const std::array<Spectrum, 3> phosphors{band(455, 21, 29), band(530, 38, 52), band(630, 50, 50)};
    const Xy target = chromaticityAt(kelvin, 0.0);

    // The pump's share is of the final radiant power, which the solve decides:
    // start from a typical white (3 mW/m² per lux) and settle in a few rounds.
    double radiantPerLux = 3.0;
    std::optional<Spectrum> result;
    for (int round = 0; round < 4; ++round) {
        result = blendToChromaticity(scaled(violet, kPumpShare * radiantPerLux), phosphors, target);
        if (!result)
            return std::nullopt;
        radiantPerLux = integral(*result);
    }
    return result;
}

} // namespace spectra
