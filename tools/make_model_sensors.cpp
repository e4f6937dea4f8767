// Writes the model colour sensors of data/sensors as CSV files, or checks that
// the files there are what this program writes.
//
//   make_model_sensors OUTDIR          write colour5.csv, colour6.csv, rgbc4.csv
//   make_model_sensors --check DIR     exit 1 when a file in DIR differs
//
// The sensors are models, not measurements of any part. Each channel is
//   S(λ) = QE(λ) · min(1, Σ passbands(λ) + leak(λ) + floor)
// with a silicon photodiode response QE shared by the sensor's channels:
//   QE(λ) = λ/1000 nm · σ((λ − uvEdge)/uvWidth) · σ((siEdge − λ)/siWidth),  σ(x) = 1/(1+e^−x)
// (counts per photon rise with λ; the surface loses blue and UV, absorption
// in silicon fades towards its band gap near 1100 nm), passbands with
// Gaussian flanks of different half widths on either side of the peak, and a
// near-infrared leak: filter stacks that turn transparent again beyond their
// design range, leak · σ((λ − leakOnset)/leakWidth). Each sensor is scaled so
// that its most sensitive channel peaks at 1.

#include "spectra/Grid.h"
#include "spectra/SensorModel.h"
#include "tools/ToolArguments.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

namespace {

using namespace spectra;

struct Passband {
    double peakNm;
    double shortHalfWidthNm; // half width at half maximum below the peak
    double longHalfWidthNm;  // and above it
    double transmission;     // at the peak
};

struct Leak {
    double level;   // transmission reached deep in the infrared
    double onsetNm; // where half of it is reached
    double widthNm; // logistic scale of the rise
};

struct ChannelShape {
    const char* name;
    std::vector<Passband> passbands;
    Leak leak;
    double floor; // out-of-band transmission everywhere
};

struct Silicon {
    double uvEdgeNm, uvWidthNm; // loss of blue and ultraviolet response
    double siEdgeNm, siWidthNm; // fading absorption towards the band gap
};

struct SensorShape {
    const char* file;
    const char* description;
    Silicon silicon;
    std::vector<ChannelShape> channels;
};

double logistic(double x) { return 1.0 / (1.0 + std::exp(-x)); }

double quantumResponse(const Silicon& si, double nm)
{
    return nm / 1000.0 * logistic((nm - si.uvEdgeNm) / si.uvWidthNm) * logistic((si.siEdgeNm - nm) / si.siWidthNm);
}

double passband(const Passband& p, double nm)
{
    const double halfWidth = nm < p.peakNm ? p.shortHalfWidthNm : p.longHalfWidthNm;
    const double r = (nm - p.peakNm) / halfWidth;
    return p.transmission * std::exp(-std::log(2.0) * r * r);
}

double transmission(const ChannelShape& c, double nm)
{
    double t = c.floor;
    for (const Passband& p : c.passbands)
        t += passband(p, nm);
    if (c.leak.level > 0.0)
        t += c.leak.level * logistic((nm - c.leak.onsetNm) / c.leak.widthNm);
    return std::min(t, 1.0);
}

SensorModel build(const SensorShape& shape)
{
    SensorModel sensor;
    for (const ChannelShape& c : shape.channels) {
        sensor.channelNames.emplace_back(c.name);
        sensor.channels.push_back(
            sampled([&](double nm) { return quantumResponse(shape.silicon, nm) * transmission(c, nm); }));
    }
    const double peak = sensor.peak();
    for (Spectrum& s : sensor.channels)
        s = scaled(s, 1.0 / peak);
    return sensor;
}

const std::vector<SensorShape>& shapes()
{
    static const std::vector<SensorShape> all = {
        {"colour5.csv",
         "Model C5: five-channel colour sensor with interference filters (X-, Y-, Z-like, clear, near-infrared)",
         {365.0, 18.0, 1010.0, 32.0},
         {
             // The Z-like filter follows the short-wave lobe of the colour-matching functions.
             {"Z", {{448.0, 24.0, 30.0, 0.92}}, {0.05, 790.0, 25.0}, 0.004},
             {"Y", {{552.0, 42.0, 48.0, 0.90}}, {0.04, 800.0, 25.0}, 0.004},
             // X-like: the long-wave lobe and the small blue lobe of x̄.
             {"X", {{598.0, 32.0, 38.0, 0.90}, {445.0, 18.0, 22.0, 0.17}}, {0.06, 770.0, 22.0}, 0.004},
             // Clear: an IR-attenuating coating over the visible, leaking beyond it.
             {"C", {{560.0, 150.0, 120.0, 0.85}}, {0.12, 760.0, 30.0}, 0.01},
             // Near-infrared: a visible-blocking long-pass filter.
             {"IR", {}, {0.92, 770.0, 14.0}, 0.002},
         }},
        {"colour6.csv",
         "Model C6: six-channel colour sensor; channel 0 a broad clear channel that sees far into the infrared, "
         "five interference passbands from violet to red",
         {360.0, 18.0, 1015.0, 30.0},
         {
             {"C", {}, {}, 0.95},
             {"V", {{420.0, 15.0, 18.0, 0.85}}, {0.03, 810.0, 25.0}, 0.005},
             {"B", {{475.0, 18.0, 22.0, 0.88}}, {0.035, 800.0, 25.0}, 0.005},
             {"G", {{530.0, 22.0, 25.0, 0.90}}, {0.04, 795.0, 25.0}, 0.005},
             {"O", {{590.0, 22.0, 26.0, 0.90}}, {0.06, 780.0, 22.0}, 0.005},
             {"R", {{650.0, 22.0, 30.0, 0.92}}, {0.10, 750.0, 20.0}, 0.005},
         }},
        {"rgbc4.csv",
         "Model RGBC4: four-channel RGBC sensor with dye filters under a window that passes about half of the "
         "near infrared, where the dyes turn transparent; the clear channel has no dye",
         {370.0, 20.0, 1005.0, 35.0},
         {
             {"R", {{615.0, 25.0, 60.0, 0.88}}, {0.55, 700.0, 18.0}, 0.01},
             {"G", {{535.0, 38.0, 42.0, 0.80}}, {0.45, 790.0, 22.0}, 0.02},
             {"B", {{462.0, 30.0, 40.0, 0.82}}, {0.40, 810.0, 25.0}, 0.02},
             // No dye: everything the window passes, its near-infrared loss included.
             {"C", {{560.0, 300.0, 150.0, 0.96}}, {0.48, 780.0, 30.0}, 0.0},
         }},
    };
    return all;
}

std::string csvOf(const SensorShape& shape)
{
    return sensorModelCsv(build(shape),
                          {shape.description, "A model, not a measured part; written by make_model_sensors.",
                           "Relative sensitivity per channel on the 300-1100 nm grid, peak 1."});
}

std::string readFile(const std::filesystem::path& path)
{
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

} // namespace

int main(int argc, char** argv)
{
    std::string folder;
    bool check = false;
    if (const auto stop = parseToolArguments(argc, argv,
                                             {"Writes the model colour sensors as CSV files",
                                              "Folder receiving (or, with --check, holding) the sensor files", true,
                                              "--check", "Compare the files in the folder with what would be written"},
                                             folder, check))
        return *stop;

    const std::filesystem::path dir(folder);
    int differing = 0;
    for (const SensorShape& shape : shapes()) {
        const std::string text = csvOf(shape);
        const std::filesystem::path path = dir / shape.file;
        if (check) {
            if (readFile(path) != text) {
                std::fprintf(stderr, "make_model_sensors: %s differs from its model\n", path.c_str());
                ++differing;
            }
            continue;
        }
        std::filesystem::create_directories(dir);
        std::ofstream out(path, std::ios::binary);
        out << text;
        if (!out) {
            std::fprintf(stderr, "make_model_sensors: cannot write %s\n", path.c_str());
            return 1;
        }
    }
    return differing == 0 ? 0 : 1;
}
