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

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

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

std::string duvText(const std::optional<double>& duv)
{
    if (!duv)
        return "-";
    char text[32];
    std::snprintf(text, sizeof text, "%+.4f", *duv);
    return text;
}

void printEstimate(const host::Estimate& e)
{
    if (!e.valid) {
        std::printf("  %-36s", "no colour");
        return;
    }
    std::printf("  %.4f %.4f %7s %.4f %7s", e.xy.x, e.xy.y, duvText(e.duv).c_str(), e.deltaUv,
                cctText(e.deltaCct, true).c_str());
}

void printTable(const std::vector<host::LightResult>& results)
{
    std::printf("%-38s  %-28s  %-36s  %s\n", "", "true", "plug-in", "global matrix");
    std::printf("%-38s  x      y         CCT     Duv  x      y          Duv  Δu′v′    ΔCCT"
                "  x      y          Duv  Δu′v′    ΔCCT\n",
                "light");
    for (const host::LightResult& r : results) {
        std::printf("%-38s  %.4f %.4f %6s %7s", r.name.c_str(), r.trueXy.x, r.trueXy.y, cctText(r.trueCct).c_str(),
                    duvText(r.trueDuv).c_str());
        printEstimate(r.plugIn);
        printEstimate(r.baseline);
        std::printf("\n");
    }
}

nlohmann::json optionalJson(const std::optional<double>& value)
{
    return value ? nlohmann::json(*value) : nlohmann::json(nullptr);
}

nlohmann::json chromaticityJson(const spectra::Xy& xy, const std::optional<double>& cct,
                                const std::optional<double>& duv)
{
    const spectra::Uv uv = spectra::uvPrime(xy);
    return {{"x", xy.x},
            {"y", xy.y},
            {"u_prime", uv.u},
            {"v_prime", uv.v},
            {"cct", optionalJson(cct)},
            {"duv", optionalJson(duv)}};
}

nlohmann::json estimateJson(const host::Estimate& e)
{
    if (!e.valid)
        return nullptr;
    nlohmann::json j = chromaticityJson(e.xy, e.cct, e.duv);
    j["delta_uv"] = e.deltaUv;
    j["delta_cct"] = optionalJson(e.deltaCct);
    return j;
}

nlohmann::json summaryJson(const host::ErrorSummary& s)
{
    return {{"count", s.count}, {"missing", s.missing}, {"median", s.median}, {"p95", s.p95}, {"max", s.max}};
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

        const bool json = options.format == "json";
        const size_t referenceCount = spectra::referenceSources(unit.referenceSet).size();
        if (!json) {
            std::printf("Unit       %s%s%s\n", description.name.c_str(), description.summary.empty() ? "" : " - ",
                        description.summary.c_str());
            std::printf("Spectra    %s\n", unit.origin.c_str());
            std::printf("Reference  %s (%zu sources) for the plug-in and the global matrix\n",
                        referenceFileName(unit.referenceSet), referenceCount);
            std::printf("Lights     %zu: %s, at %g lux\n\n", lights.size(), lightsName.c_str(), options.lux);
            std::fflush(stdout);
        }

        std::vector<host::LightResult> results;
        {
            host::ProgressBar progress("evaluating", lights.size());
            results = host::evaluateLights(
                lights, unit, options.lux, [&](const host::SensorReading& r) { return plugInColour(*opened, r); },
                [&](const host::SensorReading& r) { return baseline.estimate(r); },
                [&](size_t done) { progress.update(done); });
        }
        const host::ErrorSummary plugInSummary = host::summarise(results, &host::LightResult::plugIn);
        nlohmann::json out;
        if (json) {
            out = {{"unit", {{"name", description.name}, {"summary", description.summary}, {"file", options.device}}},
                   {"spectra", unit.origin},
                   {"reference", {{"file", referenceFileName(unit.referenceSet)}, {"sources", referenceCount}}},
                   {"lights", {{"description", lightsName}, {"count", lights.size()}, {"lux", options.lux}}}};
            nlohmann::json& rows = out["results"] = nlohmann::json::array();
            for (const host::LightResult& r : results)
                rows.push_back({{"light", r.name},
                                {"true", chromaticityJson(r.trueXy, r.trueCct, r.trueDuv)},
                                {"plug_in", estimateJson(r.plugIn)},
                                {"global_matrix", estimateJson(r.baseline)}});
            out["summary"] = {{"plug_in", summaryJson(plugInSummary)},
                              {"global_matrix", summaryJson(host::summarise(results, &host::LightResult::baseline))}};
        } else {
            printTable(results);
            printSummary(results);
        }

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
            if (json)
                out["report"] = std::filesystem::absolute(options.report).string();
            else
                std::printf("\nReport     %s\n", std::filesystem::absolute(options.report).c_str());
        }
        if (json)
            std::printf("%s\n", out.dump(2).c_str());
        if (plugInSummary.count == 0) {
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
    app.add_option("--format", options->format,
                   "Output: text (a table and a summary) or json (one object with every value; see docs/usage.md)")
        ->check(CLI::IsMember({"text", "json"}))
        ->capture_default_str();
    app.add_option("--set", options->sets,
                   "Set a client property before the first reading, KEY=VALUE with VALUE in JSON, as for\n"
                   "vantish run (ColorAlgoLambda=0.01 evaluates the fit with a client's lambda)");
    app.footer("For each light: the true chromaticity and CCT (CIE 1931 2°), the plug-in's estimate through its\n"
               "filter, and the estimate of one global least-squares channel-to-XYZ matrix fitted over the unit's\n"
               "reference sources, both from the same noise-free reading; Duv (signed CIE 1960 uv distance from\n"
               "the Planckian locus); errors as Δu′v′ and ΔCCT; summary:\n"
               "median, 95th percentile and maximum Δu′v′. Exit status 1 when the plug-in gave no colour at\n"
               "all, 2 when nothing could be evaluated.");
    return [&common, options] { return runEvaluation(common, *options); };
}

} // namespace vantish
