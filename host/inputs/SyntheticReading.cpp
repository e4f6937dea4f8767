#include "host/inputs/SyntheticReading.h"

#include <algorithm>
#include <cstdio>
#include <ostream>

namespace host {

SensorReading synthesiseReading(const UnitSpectra& unit, const spectra::Spectrum& light, double lux)
{
    SensorReading reading;
    reading.lux = lux;
    std::vector<double> raw(unit.channelCount(), 0.0);
    double luxSum = 0.0;
    double strongest = 0.0;
    for (size_t k = 0; k < unit.channelCount(); ++k) {
        for (size_t i = 0; i < light.size(); ++i)
            raw[k] += light[i] * unit.channels[k][i];
        luxSum += unit.luxCoefficients[k] * raw[k];
        strongest = std::max(strongest, raw[k]);
    }
    double scale = 0.0;
    if (luxSum > 0)
        scale = lux / luxSum;
    else if (strongest > 0)
        scale = kFallbackCountsPerLux * lux / strongest;
    for (double r : raw)
        reading.channels.push_back(std::max(0.0, r * scale));
    return reading;
}

void addRelativeNoise(SensorReading& reading, double sigma, std::mt19937_64& rng)
{
    if (sigma <= 0)
        return;
    std::normal_distribution<double> normal(0.0, 1.0);
    for (double& c : reading.channels)
        c = std::max(0.0, c * (1.0 + sigma * normal(rng)));
}

void writeReadingsCsvHeader(std::ostream& out, size_t channels)
{
    for (size_t k = 0; k < channels; ++k)
        out << 'c' << k << ',';
    out << "lux,sampleChannelCount\n";
}

void writeReadingCsv(std::ostream& out, const SensorReading& reading)
{
    char text[32];
    for (double c : reading.channels) {
        std::snprintf(text, sizeof text, "%.9g,", c);
        out << text;
    }
    std::snprintf(text, sizeof text, "%.9g,", reading.lux);
    out << text << reading.channels.size() << '\n';
}

} // namespace host
