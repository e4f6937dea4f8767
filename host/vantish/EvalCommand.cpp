// vantish eval DEVICE: the plug-in's colour accuracy on a unit over a set of
// lights, beside a global least-squares matrix on the same readings.
#include "host/vantish/EvalCommand.h"

#include "host/evaluation/AccuracyReport.h"
#include "host/evaluation/Evaluation.h"
#include "host/evaluation/GlobalMatrixBaseline.h"
#include "host/evaluation/ProgressBar.h"
#include "host/inputs/SpectrumFile.h"
#include "host/inputs/UnitSpectra.h"
#include "host/vantish/OpenedUnit.h"
#include "host/vantish/ReadingFilter.h"
#include "spectra/TestLights.h"

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iostream>

namespace vantish {

namespace {

const char* referenceFileName(spectra::ReferenceSet set)
{
    for (const spectra::ReferenceFile& f : spectra::kReferenceFiles)
        if (f.set == set)
            return f.fileName;
    return "?";
}

std::string cctText(const std::optional<double>& k, bool sign = false)
{
    if (!k)
        return "-";
    char text[32];
    std::snprintf(text, sizeof text, sign ? "%+.0f" : "%.0f", *k);
    return text;
}

void printEstimate(const host::Estimate& e)
{
    if (!e.valid) {
        std::printf("  %-34s", "no colour");
        return;
    }
    std::printf("  %.4f %.4f %.4f %7s", e.xy.x, e.xy.y, e.deltaUv, cctText(e.deltaCct, true).c_str());
}

void printTable(const std::vector<host::LightResult>& results)
{
    std::printf("%-38s  %-20s  %-34s  %s\n", "", "true", "plug-in", "global matrix");
    std::printf("%-38s  x      y        CCT  x      y      Δu′v′     ΔCCT  x      y      Δu′v′     ΔCCT\n", "light");
    for (const host::LightResult& r : results) {
        std::printf("%-38s  %.4f %.4f %6s", r.name.c_str(), r.trueXy.x, r.trueXy.y, cctText(r.trueCct).c_str());
        printEstimate(r.plugIn);
        printEstimate(r.baseline);
        std::printf("\n");
    }
}

void printSummary(const std::vector<host::LightResult>& results)
{
    std::printf("\nSummary, Δu′v′ over %zu lights   median   p95      max\n", results.size());
    const std::pair<const char*, host::Estimate host::LightResult::*> rows[] = {
        {"plug-in", &host::LightResult::plugIn}, {"global matrix", &host::LightResult::baseline}};
    for (const auto& [label, which] : rows) {
        const host::ErrorSummary s = host::summarise(results, which);
        std::printf("  %-30s %.4f   %.4f   %.4f", label, s.median, s.p95, s.max);
        if (s.missing)
            std::printf("   (%zu without colour)", s.missing);
        std::printf("\n");
    }
}

std::vector<spectra::Source> chooseLights(const EvalOptions& options, std::string& name)
{
    if (options.spectra.empty()) {
        name = "the built-in test lights (none of them a reference source)";
        return spectra::testLights();
    }
    std::vector<std::filesystem::path> paths(options.spectra.begin(), options.spectra.end());
    std::vector<std::string> errors;
    std::vector<spectra::Source> lights = host::loadSpectrumFiles(paths, errors);
    for (const std::string& e : errors)
        std::cerr << "vantish eval: " << e << "\n";
    name = "spectrum files";
    for (const std::string& p : options.spectra)
        name += " " + p;
    return lights;
}

std::optional<spectra::Xyz> plugInColour(OpenedUnit& opened, const host::SensorReading& reading)
{
    const ClientColour colour = filterReading(opened, reading);
    if (colour.spike || !(colour.X + colour.Y + colour.Z > 0))
        return std::nullopt;
    return spectra::Xyz{colour.X, colour.Y, colour.Z};
}

} // namespace

int runEvaluation(const CommonOptions& common, const EvalOptions& options)
{
    applyLogOption(common);
    try {
        const host::DeviceDescription description = host::loadDeviceDescription(options.device);
        const host::UnitSpectra unit = host::loadUnitSpectra(description);
        std::string lightsName;
        const std::vector<spectra::Source> lights = chooseLights(options, lightsName);
        if (lights.empty()) {
            std::cerr << "vantish eval: no light to evaluate\n";
            return 2;
        }
        // Open the report first: a report that cannot be written fails before the work.
        std::ofstream report;
        if (!options.report.empty()) {
            report.open(options.report);
            if (!report)
                throw std::runtime_error(options.report + ": cannot write the report");
        }

        const host::GlobalMatrixBaseline baseline(unit, spectra::referenceSources(unit.referenceSet));
        std::unique_ptr<OpenedUnit> opened = openUnit(common, options.device);
        if (!applyAssignments(*opened, options.sets))
            return 2;

        std::printf("Unit       %s%s%s\n", description.name.c_str(), description.summary.empty() ? "" : " - ",
                    description.summary.c_str());
        std::printf("Spectra    %s\n", unit.origin.c_str());
        std::printf("Reference  %s (%zu sources) for the plug-in and the global matrix\n",
                    referenceFileName(unit.referenceSet), spectra::referenceSources(unit.referenceSet).size());
        std::printf("Lights     %zu: %s, at %g lux\n\n", lights.size(), lightsName.c_str(), options.lux);
        std::fflush(stdout);

        std::vector<host::LightResult> results;
        {
            host::ProgressBar progress("evaluating", lights.size());
            results = host::evaluateLights(
                lights, unit, options.lux, [&](const host::SensorReading& r) { return plugInColour(*opened, r); },
                [&](const host::SensorReading& r) { return baseline.estimate(r); },
                [&](size_t done) { progress.update(done); });
        }
        printTable(results);
        printSummary(results);

        if (report.is_open()) {
            const host::ReportContext context{description.name,
                                              description.summary,
                                              description.file.string(),
                                              unit.origin,
                                              referenceFileName(unit.referenceSet),
                                              lightsName,
                                              options.lux};
            host::writeAccuracyReport(report, context, results);
            report.close();
            if (!report)
                throw std::runtime_error(options.report + ": writing the report failed");
            std::printf("\nReport     %s\n", std::filesystem::absolute(options.report).c_str());
        }
        if (host::summarise(results, &host::LightResult::plugIn).count == 0) {
            std::cerr << "vantish eval: the plug-in gave no colour for any light; its calibration did not come up "
                         "on this unit (see vantish open "
                      << options.device << ")\n";
            return 1;
        }
        return 0;
    } catch (const std::exception& e) {
        std::cerr << "vantish eval: " << e.what() << "\n";
        return 2;
    }
}

Runner addEvalCommand(CLI::App& app, const CommonOptions& common)
{
    auto options = std::make_shared<EvalOptions>();
    app.add_option("device", options->device, "Device description (JSON) of a unit with stored channel spectra")
        ->required();
    app.add_option("--spectra", options->spectra,
                   "Lights to evaluate: spectrum files (CGATS .sp or nm,value .csv) or folders of them;\n"
                   "default: the built-in test lights");
    app.add_option("--report", options->report, "Also write the evaluation as one HTML file");
    app.add_option("--lux", options->lux, "Illuminance of every reading")
        ->check(CLI::PositiveNumber)
        ->capture_default_str();
    app.add_option("--set", options->sets,
                   "Set a client property before the first reading, KEY=VALUE with VALUE in JSON, as for\n"
                   "vantish run (ColorAlgoLambda=0.01 evaluates the fit with a client's lambda)");
    app.footer("For each light: the true chromaticity and CCT (CIE 1931 2°), the plug-in's estimate through its\n"
               "filter, and the estimate of one global least-squares channel-to-XYZ matrix fitted over the unit's\n"
               "reference sources, both from the same noise-free reading; errors as Δu′v′ and ΔCCT; summary:\n"
               "median, 95th percentile and maximum Δu′v′. Exit status 1 when the plug-in gave no colour at\n"
               "all, 2 when nothing could be evaluated.");
    return [&common, options] { return runEvaluation(common, *options); };
}

} // namespace vantish
