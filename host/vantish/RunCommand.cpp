// vantish run DEVICE: feed light samples through the plug-in on a unit, as the
// driver and the event system would, and print the colour clients receive.
#include "host/vantish/ClientColour.h"
#include "host/vantish/Commands.h"
#include "host/vantish/OpenedUnit.h"

#include "host/emulator/DriverSample.h"
#include "host/inputs/EventInput.h"
#include "spectra/Colorimetry.h"
#include "support/CFOwned.h"

#include <CLI/CLI.hpp>

#include <fstream>
#include <iomanip>
#include <iostream>
#include <sstream>

namespace vantish {

namespace {

struct RunOptions {
    std::string device;
    std::string events = "-";
    std::string format = "csv";
    std::string inputFormat = "auto";
    std::vector<std::string> sets;
};

class Printer {
public:
    Printer(std::ostream& out, bool json) : out_(out), json_(json)
    {
        if (!json_)
            out_ << "index,lux,X,Y,Z,x,y,u_prime,v_prime,cct,colorSpace,spike,duv\n";
    }
    void print(const ClientColour& r)
    {
        const spectra::Xy xy = spectra::chromaticity({r.X, r.Y, r.Z});
        const bool hasColour = r.X + r.Y + r.Z > 0;
        const spectra::Uv uv = spectra::uvPrime(xy);
        const auto cctEstimate = hasColour ? spectra::correlatedColourTemperature(xy) : std::nullopt;
        const bool hasCct = cctEstimate.has_value();
        const double cct = cctEstimate.value_or(0.0);
        const auto duvEstimate = hasColour ? spectra::distanceFromLocus(xy) : std::nullopt;
        const bool hasDuv = duvEstimate.has_value();
        const double duv = duvEstimate.value_or(0.0);
        std::ostringstream line;
        line << std::setprecision(6);
        if (json_) {
            nlohmann::json j = {{"index", r.index},           {"lux", r.lux},    {"X", r.X}, {"Y", r.Y}, {"Z", r.Z},
                                {"colorSpace", r.colorSpace}, {"spike", r.spike}};
            if (hasColour) {
                j["x"] = xy.x;
                j["y"] = xy.y;
                j["u_prime"] = uv.u;
                j["v_prime"] = uv.v;
            }
            j["cct"] = hasCct ? nlohmann::json(cct) : nlohmann::json(nullptr);
            j["duv"] = hasDuv ? nlohmann::json(duv) : nlohmann::json(nullptr);
            out_ << j.dump() << "\n";
            return;
        }
        line << r.index << ',' << r.lux << ',' << r.X << ',' << r.Y << ',' << r.Z << ',';
        if (hasColour)
            line << std::fixed << std::setprecision(4) << xy.x << ',' << xy.y << ',' << uv.u << ',' << uv.v << ',';
        else
            line << ",,,,";
        if (hasCct)
            line << std::fixed << std::setprecision(0) << cct;
        line << ',' << r.colorSpace << ',' << (r.spike ? 1 : 0) << ',';
        if (hasDuv)
            line << std::fixed << std::setprecision(4) << duv;
        out_ << line.str() << "\n";
    }

private:
    std::ostream& out_;
    bool json_;
};

int runEvents(const CommonOptions& common, const RunOptions& options)
{
    applyLogOption(common);
    std::unique_ptr<OpenedUnit> opened;
    try {
        opened = openUnit(common, options.device);
    } catch (const std::exception& e) {
        std::cerr << "vantish: " << e.what() << "\n";
        return 2;
    }

    if (!applyAssignments(*opened, options.sets))
        return 2;

    std::ifstream file;
    std::istream* in = &std::cin;
    const std::string source = options.events == "-" ? "<stdin>" : options.events;
    if (options.events != "-") {
        file.open(options.events);
        if (!file) {
            std::cerr << "vantish: cannot read " << options.events << "\n";
            return 2;
        }
        in = &file;
    }
    host::InputFormat format = host::InputFormat::Csv;
    if (options.inputFormat == "jsonl" ||
        (options.inputFormat == "auto" && (source.ends_with(".jsonl") || source.ends_with(".json"))))
        format = host::InputFormat::JsonLines;

    Printer printer(std::cout, options.format == "jsonl");
    host::EventReader reader(*in, format, opened->channelCount());
    std::vector<host::InputError> errors;
    size_t samples = 0, failed = 0, rows = 0;
    CFOwned<IOHIDEventRef> lastDriverEvent; // the service's current event, for copies
    ALSSampleRecord lastRecord;
    auto reportErrors = [&] {
        for (const auto& e : errors)
            std::cerr << "vantish: " << e.describe(source) << "\n";
        failed += errors.size();
        errors.clear();
    };

    while (auto row = reader.next(errors)) {
        reportErrors();
        ++rows;
        switch (row->kind) {
        case host::InputRow::Kind::SetProperty: {
            std::string error;
            if (!setProperty(*opened, row->key, row->value, error))
                errors.push_back({row->line, row->key, error});
            break;
        }
        case host::InputRow::Kind::CopyEvent: {
            if (!lastDriverEvent) {
                errors.push_back({row->line, "", "nothing to copy before the first sample"});
                break;
            }
            const CFOwned<IOHIDEventRef> copy(IOHIDEventCreateCopy(kCFAllocatorDefault, lastDriverEvent.get()));
            opened->session->copyEvent(copy.get());
            ClientColour r = readClientColour(copy.get(), lastRecord);
            r.index = "copy";
            printer.print(r);
            break;
        }
        case host::InputRow::Kind::Sample: {
            const uint64_t ticks = uint64_t(row->timeSeconds * 1e9);
            const CFOwned<IOHIDEventRef> event(host::createALSEvent(row->record, ticks));
            lastDriverEvent.reset(IOHIDEventCreateCopy(kCFAllocatorDefault, event.get()));
            lastRecord = row->record;
            opened->session->filter(event.get());
            ClientColour r = readClientColour(event.get(), row->record);
            r.index = std::to_string(samples++);
            printer.print(r);
            break;
        }
        }
        reportErrors();
    }
    reportErrors();
    std::cout.flush();
    if (rows == 0 && failed == 0) {
        std::cerr << "vantish: " << source << ": no samples (the input is empty or only a header)\n";
        return 1;
    }
    if (samples == 0 && failed > 0)
        return 1; // nothing could be done
    return 0;
}

} // namespace

Runner addRunCommand(CLI::App& app, const CommonOptions& common)
{
    auto options = std::make_shared<RunOptions>();
    app.add_option("device", options->device, "Device description (JSON)")->required();
    app.add_option("--events", options->events,
                   "Samples to feed: a CSV file with a header, JSON lines (.jsonl), or - for standard input")
        ->capture_default_str();
    app.add_option("--input-format", options->inputFormat, "Input format: auto (by file name), csv or jsonl")
        ->check(CLI::IsMember({"auto", "csv", "jsonl"}))
        ->capture_default_str();
    app.add_option("--format", options->format, "Output format: csv or jsonl")
        ->check(CLI::IsMember({"csv", "jsonl"}))
        ->capture_default_str();
    app.add_option("--set", options->sets,
                   "Set a client property before the first sample, KEY=VALUE with VALUE in JSON\n"
                   "(RGBCOverride=1, RGBCOverride=[100,200,300,400], ChromaticityOverride=[0.3127,0.329,100],\n"
                   "ColorAlgoLambda=0.05, ChannelRatioMitigationType=3, RebuildVelderDB=true)");
    app.footer("Sample fields: c0..c5, lux, rawLux, sampleChannelCount, sampleOrientation, status, nits,\n"
               "integrationTime, reportInterval, gain (a multiplier), cct, timestamp, subsamples, mode,\n"
               "xTalk0..xTalk4, xyzInRecord, xyzSensorX/Y/Z, filteredLux, filteredLuxValid, ts (seconds).\n"
               "Absent fields take defaults (see docs/usage.md). Lines '!set KEY=VALUE' and '!copy' (CSV) or\n"
               "{\"set\": {KEY: VALUE}} and {\"copy\": true} (JSON lines) set client properties and copy the\n"
               "current event. Output: index, lux, X, Y, Z as clients receive them, chromaticity x, y, u', v',\n"
               "correlated colour temperature, colour space, whether the sample was a light spike, and Duv\n"
               "(signed CIE 1960 uv distance from the Planckian locus, positive above it).");
    return [&common, options] { return runEvents(common, *options); };
}

} // namespace vantish
