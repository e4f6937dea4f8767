// vantish synth DEVICE (--spectrum FILE | --source NAME): the sample records a
// unit's sensor would report under a light, computed from the unit's stored
// channel spectra, as CSV that `vantish run` reads.
#include "host/vantish/Commands.h"

#include "host/emulator/DeviceDescription.h"
#include "host/inputs/SpectrumFile.h"
#include "host/inputs/SyntheticReading.h"
#include "host/inputs/UnitSpectra.h"
#include "spectra/Colorimetry.h"
#include "spectra/TestLights.h"

#include <CLI/CLI.hpp>

#include <cstdio>
#include <iostream>

namespace vantish {

namespace {

struct SynthOptions {
    std::string device;
    std::string spectrum;
    std::string source;
    double lux = 100.0;
    double noise = 0.0;
    unsigned count = 1;
    uint64_t seed = 1;
};

spectra::Source namedLight(const std::string& name)
{
    if (const spectra::Source* s = spectra::findSource(name))
        return *s;
    if (const spectra::Source* s = spectra::findTestLight(name))
        return *s;
    throw std::runtime_error("--source " + name +
                             ": no such light (names: the reference sources listed by make_reference_db --list, "
                             "and the test lights listed by vantish synth --help)");
}

void describeLight(const spectra::Source& light, const host::UnitSpectra& unit, const SynthOptions& o)
{
    const spectra::Xy xy = spectra::chromaticity(spectra::tristimulus(light.spectrum));
    const spectra::Uv uv = spectra::uvPrime(xy);
    const auto cct = spectra::correlatedColourTemperature(xy);
    std::printf("# vantish synth: %s at %g lux, relative noise %g, seed %llu, %u sample(s)\n", light.name.c_str(),
                o.lux, o.noise, static_cast<unsigned long long>(o.seed), o.count);
    std::printf("# channel spectra: %s\n", unit.origin.c_str());
    std::printf("# true chromaticity x=%.4f y=%.4f u'=%.4f v'=%.4f CCT=%s\n", xy.x, xy.y, uv.u, uv.v,
                cct ? (std::to_string(long(*cct + 0.5)) + " K").c_str() : "none");
}

int runSynth(const SynthOptions& o)
{
    try {
        const host::DeviceDescription description = host::loadDeviceDescription(o.device);
        const host::UnitSpectra unit = host::loadUnitSpectra(description);
        const spectra::Source light = o.spectrum.empty() ? namedLight(o.source) : host::loadSpectrumFile(o.spectrum);

        describeLight(light, unit, o);
        host::writeReadingsCsvHeader(std::cout, unit.channelCount());
        const host::SensorReading exact = host::synthesiseReading(unit, light.spectrum, o.lux);
        std::mt19937_64 rng(o.seed);
        for (unsigned i = 0; i < o.count; ++i) {
            host::SensorReading reading = exact;
            host::addRelativeNoise(reading, o.noise, rng);
            host::writeReadingCsv(std::cout, reading);
        }
        std::cout.flush();
        return 0;
    } catch (const std::exception& e) {
        std::cerr << "vantish synth: " << e.what() << "\n";
        return 2;
    }
}

std::string testLightNames()
{
    std::string names;
    for (const spectra::Source& s : spectra::testLights())
        names += "  " + s.name + "\n";
    return names;
}

} // namespace

Runner addSynthCommand(CLI::App& app, const CommonOptions&)
{
    auto o = std::make_shared<SynthOptions>();
    app.add_option("device", o->device, "Device description (JSON) of a unit with stored channel spectra")->required();
    auto* spectrum = app.add_option("--spectrum", o->spectrum,
                                    "Light spectrum: CGATS (.sp) or two-column CSV (nm,value), covering 400-700 nm");
    auto* source = app.add_option("--source", o->source, "A named light: a reference source or a test light");
    spectrum->excludes(source);
    source->excludes(spectrum);
    app.add_option("--lux", o->lux, "Illuminance of the light")->check(CLI::PositiveNumber)->capture_default_str();
    app.add_option("--noise", o->noise, "Relative gaussian noise on every channel (0.01 = 1 %)")
        ->check(CLI::NonNegativeNumber)
        ->capture_default_str();
    app.add_option("--count", o->count, "Samples to write")->check(CLI::PositiveNumber)->capture_default_str();
    app.add_option("--seed", o->seed, "Seed of the noise generator")->capture_default_str();
    // Computed only when the help is shown.
    app.footer([] {
        return "Writes CSV for `vantish run`: '#' comment lines (the light, its true chromaticity and CCT), the\n"
               "header c0..cN-1,lux,sampleChannelCount, and one sample per line. Channel counts are the light\n"
               "folded with the unit's channel spectra as its calibration stores them, scaled so that the\n"
               "calibration's lux coefficients give back the light's illuminance (see docs/usage.md).\n\n"
               "Test lights (--source NAME):\n" +
               testLightNames();
    });
    return [o]() {
        if (o->spectrum.empty() == o->source.empty()) {
            std::cerr << "vantish synth: give one light, --spectrum FILE or --source NAME\n";
            return 2;
        }
        return runSynth(*o);
    };
}

} // namespace vantish
