// From sensor counts to the colour written back, against a database built
// here from a handful of synthetic light sources: Planckian radiators and a
// few tinted ones on a 10 nm grid, seen through five made-up Gaussian
// channels, with XYZ from an analytic approximation of the 1931 observer.
// The colorimetry is approximate; what matters is that the filter gives back
// the chromaticity of the source the counts came from, at the record's lux.
#include "PlugInState.h"

#include <gtest/gtest.h>

#include <cmath>
#include <vector>

using namespace alstest;
using namespace vt;

namespace {

constexpr int kFirstNm = 380, kLastNm = 780, kStepNm = 10;
constexpr uint32_t kChannels = 5;

std::vector<double> grid()
{
    std::vector<double> nm;
    for (int l = kFirstNm; l <= kLastNm; l += kStepNm)
        nm.push_back(l);
    return nm;
}

double planck(double nm, double kelvin)
{
    const double m = nm * 1e-9;
    return 1.0 / (std::pow(m, 5) * (std::exp(1.4388e-2 / (m * kelvin)) - 1.0));
}

double gauss(double nm, double centre, double below, double above)
{
    const double s = nm < centre ? below : above;
    return std::exp(-0.5 * (nm - centre) * (nm - centre) / (s * s));
}

// Piecewise-Gaussian fit of the colour-matching functions.
std::array<double, 3> observer(double nm)
{
    return {1.056 * gauss(nm, 599.8, 37.9, 31.0) + 0.362 * gauss(nm, 442.0, 16.0, 26.7) -
                0.065 * gauss(nm, 501.1, 20.4, 26.2),
            0.821 * gauss(nm, 568.8, 46.9, 40.5) + 0.286 * gauss(nm, 530.9, 16.3, 31.1),
            1.217 * gauss(nm, 437.0, 11.8, 36.0) + 0.681 * gauss(nm, 459.0, 26.0, 13.8)};
}

double sensitivity(uint32_t channel, double nm)
{
    static constexpr double centre[kChannels] = {445, 495, 545, 600, 650};
    static constexpr double width[kChannels] = {25, 30, 35, 35, 40};
    return gauss(nm, centre[channel], width[channel], width[channel]);
}

struct Source {
    std::array<double, 3> xyz;
    std::array<double, kChannels> response;
};

// Spectrum of source i: Planckian for the first 14, tinted Planckian after.
double spectrum(int i, double nm)
{
    static constexpr double kelvin[] = {2000, 2400, 2700, 3000, 3500, 4000,  4500,
                                        5000, 5500, 6500, 7500, 9000, 12000, 16000};
    if (i < 14)
        return planck(nm, kelvin[i]);
    static constexpr double tint[] = {450, 520, 580, 620, 480, 660};
    return planck(nm, i % 2 ? 3000 : 5000) * (1.0 + 0.8 * gauss(nm, tint[i - 14], 25, 25));
}

std::vector<Source> sources()
{
    const auto nm = grid();
    std::vector<Source> out;
    for (int i = 0; i < 20; ++i) {
        Source s{};
        for (double l : nm) {
            const double e = spectrum(i, l);
            const auto cmf = observer(l);
            for (int c = 0; c < 3; ++c)
                s.xyz[c] += e * cmf[c];
            for (uint32_t j = 0; j < kChannels; ++j)
                s.response[j] += e * sensitivity(j, l);
        }
        // Every source at Y = 100.
        const double scale = 100.0 / s.xyz[1];
        for (auto& v : s.xyz)
            v *= scale;
        for (auto& v : s.response)
            v *= scale;
        out.push_back(s);
    }
    return out;
}

SpectralDatabasePtr database(const std::vector<Source>& all)
{
    auto db = std::make_shared<SpectralDatabase>();
    const uint32_t n = uint32_t(all.size());
    db->allocate(n, kChannels);
    for (uint32_t i = 0; i < n; ++i) {
        for (uint32_t c = 0; c < 3; ++c)
            db->dbXYZ[c * n + i] = float(all[i].xyz[c]);
        for (uint32_t j = 0; j < kChannels; ++j)
            db->dbChannelResponses[j * n + i] = float(all[i].response[j]);
    }
    return db;
}

} // namespace

TEST(FilterEndToEnd, CountsOfAKnownSourceGiveItsChromaticityAtTheRecordsLux)
{
    const auto all = sources();
    PlugIn plugin;
    parts(*plugin).unit().numberOfChannels = kChannels;
    parts(*plugin).unit().dbChannelCount = kChannels;
    parts(*plugin).unit().sensorType = 5;
    parts(*plugin).databases().publish(database(all), true);

    // The source's own database entry dominates the fit, so its chromaticity
    // comes back to float precision (about 1e-7 measured); 1e-5 leaves room.
    const float lux = 321.0f;
    for (size_t k = 0; k < all.size(); ++k) {
        std::array<float, 6> counts{};
        for (uint32_t j = 0; j < kChannels; ++j)
            counts[j] = float(all[k].response[j] * 0.37); // the sensor's gain is arbitrary
        Record record = Record().sampleChannelCount(kChannels).channels(counts).lux(lux);
        Event event = createALSEvent(&record);
        plugin->filter(event.get(), false);

        const auto xyz = eventXYZ(event.get());
        const double sum = xyz[0] + xyz[1] + xyz[2];
        const double expectedSum = all[k].xyz[0] + all[k].xyz[1] + all[k].xyz[2];
        EXPECT_NEAR(xyz[0] / sum, all[k].xyz[0] / expectedSum, 1e-5) << "source " << k;
        EXPECT_NEAR(xyz[1] / sum, all[k].xyz[1] / expectedSum, 1e-5) << "source " << k;
        EXPECT_FLOAT_EQ(float(xyz[1]), lux) << "source " << k;
    }
}
