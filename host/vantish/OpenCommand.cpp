// vantish open DEVICE: match and open the plug-in on a unit, wait for its
// calibration bring-up, and report what it read, logged and handed the driver;
// with --save, write what the driver received and the per-chip database.
#include "host/vantish/Commands.h"

#include "host/emulator/Bundle.h"
#include "host/emulator/DataFolder.h"
#include "host/emulator/DriverSample.h"
#include "host/emulator/PlugInSession.h"
#include "host/emulator/Unit.h"
#include "host/inputs/UnitSpectra.h"
#include "host/recordcodec/RecordCodec.h"
#include "host/vantish/DatabaseCsv.h"
#include "host/vantish/FileOutput.h"
#include "host/vantish/OpenedUnit.h"
#include "lightdb/LDBM.h"
#include "support/CFOwned.h"

#include <CLI/CLI.hpp>

#include <VantishPlatform/LogControl.h>
#include <VantishPlatform/Paths.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <iostream>

namespace vantish {

namespace {

namespace fs = std::filesystem;

struct OpenOptions {
    std::string device;
    std::string save; // folder for what the driver received and the per-chip database; empty: none
};

const char* levelTag(os_log_type_t type)
{
    switch (type) {
    case OS_LOG_TYPE_ERROR:
    case OS_LOG_TYPE_FAULT:
        return "error";
    case OS_LOG_TYPE_INFO:
        return "info";
    case OS_LOG_TYPE_DEBUG:
        return "debug";
    default:
        return "default";
    }
}

// The lowest --log level that shows a line of `type`.
VPLogLevel levelOf(os_log_type_t type)
{
    switch (type) {
    case OS_LOG_TYPE_ERROR:
    case OS_LOG_TYPE_FAULT:
        return VPLogLevel::Error;
    case OS_LOG_TYPE_INFO:
        return VPLogLevel::Info;
    case OS_LOG_TYPE_DEBUG:
        return VPLogLevel::Debug;
    default:
        return VPLogLevel::Default;
    }
}

void printLog(const std::vector<VPLogLine>& lines, VPLogLevel shown)
{
    for (const auto& line : lines) {
        if (levelOf(line.type) > shown)
            continue;
        std::string message = line.message;
        while (!message.empty() && (message.back() == '\n' || message.back() == ' '))
            message.pop_back();
        std::cout << "    [" << levelTag(line.type) << "] " << message << "\n";
    }
}

void printDriverProperty(const host::Unit& unit, const char* key)
{
    const CFOwned<CFTypeRef> value(unit.copyDriverProperty(key));
    if (!value) {
        std::cout << "    " << key << ": not set\n";
        return;
    }
    if (CFGetTypeID(value.get()) == CFDataGetTypeID()) {
        std::cout << "    " << key << ": " << CFDataGetLength(static_cast<CFDataRef>(value.get())) << " bytes\n";
    } else {
        const CFOwned<CFStringRef> description(CFCopyDescription(value.get()));
        std::cout << "    " << key << ": " << CFStringGetCStringPtr(description.get(), kCFStringEncodingUTF8) << "\n";
    }
}

// ---- --save ----------------------------------------------------------------------

// A property key as a file name: letters, digits, '-', '_' and '.' kept, anything else '_'.
std::string fileNameFor(const std::string& key)
{
    std::string name = key;
    for (char& c : name)
        if (!std::isalnum(static_cast<unsigned char>(c)) && c != '-' && c != '_' && c != '.')
            c = '_';
    return name.empty() || name[0] == '.' ? "_" + name : name;
}

// A property value that is not bytes, as JSON; null for a type without one.
nlohmann::json jsonOf(CFTypeRef value)
{
    const CFTypeID type = CFGetTypeID(value);
    if (type == CFNumberGetTypeID()) {
        const auto number = static_cast<CFNumberRef>(value);
        if (CFNumberIsFloatType(number)) {
            double v = 0;
            CFNumberGetValue(number, kCFNumberDoubleType, &v);
            return v;
        }
        long long v = 0;
        CFNumberGetValue(number, kCFNumberLongLongType, &v);
        return v;
    }
    if (type == CFBooleanGetTypeID())
        return bool(CFBooleanGetValue(static_cast<CFBooleanRef>(value)));
    if (type == CFStringGetTypeID()) {
        const CFStringRef text = static_cast<CFStringRef>(value);
        std::vector<char> buffer(size_t(CFStringGetLength(text)) * 4 + 1);
        if (CFStringGetCString(text, buffer.data(), CFIndex(buffer.size()), kCFStringEncodingUTF8))
            return std::string(buffer.data());
    }
    return nullptr;
}

// Writes KEY.bin (the bytes as set) and KEY.json (their decode) for data,
// KEY.json for a number, flag or text; returns what was written.
std::string saveProperty(const fs::path& folder, const host::Unit& unit, const std::string& key)
{
    const CFOwned<CFTypeRef> value(unit.copyDriverProperty(key.c_str()));
    if (!value)
        return key + ": not set";
    const std::string name = fileNameFor(key);
    if (CFGetTypeID(value.get()) != CFDataGetTypeID()) {
        const nlohmann::json json = jsonOf(value.get());
        if (json.is_null())
            return key + ": not saved (neither bytes, a number, a flag nor text)";
        writeWhole(folder / (name + ".json"), json.dump() + "\n");
        return name + ".json (" + json.dump() + ")";
    }
    const auto data = static_cast<CFDataRef>(value.get());
    const uint8_t* begin = CFDataGetBytePtr(data);
    const std::vector<uint8_t> bytes(begin, begin + CFDataGetLength(data));
    writeWhole(folder / (name + ".bin"), std::string_view(reinterpret_cast<const char*>(bytes.data()), bytes.size()));
    const std::string saved = name + ".bin (" + std::to_string(bytes.size()) + " bytes)";
    const auto decoded = recordcodec::decode(bytes);
    if (!decoded)
        return saved + ", no decode: " + decoded.error;
    writeWhole(folder / (name + ".json"), decoded.value->dump(2) + "\n");
    return saved + ", " + name + ".json (" + std::string(decoded.value->value("format", "")) + ")";
}

// The population deviation of each channel over the sources after each
// source's responses were scaled to unit length: what the plug-in divides
// the channels by when it normalises the database at load.
std::vector<double> channelDeviations(const DatabaseTable& table)
{
    const size_t channels = table.columns.size();
    std::vector<std::vector<double>> unit;
    for (const auto& row : table.rows) {
        std::vector<double> r(row.begin() + 3, row.end());
        double length = 0;
        for (double v : r)
            length += v * v;
        length = std::sqrt(length);
        if (length > 0)
            for (double& v : r)
                v /= length;
        unit.push_back(std::move(r));
    }
    std::vector<double> deviations(channels, 0.0);
    if (unit.empty())
        return deviations;
    for (size_t c = 0; c < channels; ++c) {
        double mean = 0;
        for (const auto& r : unit)
            mean += r[c];
        mean /= double(unit.size());
        double squares = 0;
        for (const auto& r : unit)
            squares += (r[c] - mean) * (r[c] - mean);
        deviations[c] = std::sqrt(squares / double(unit.size()));
    }
    return deviations;
}

// Writes bzrgbc_<orientation>.csv from the cache the plug-in uses for the unit.
std::string saveDatabase(const fs::path& folder, const host::DeviceDescription& description, bool ready,
                         bool normalised)
{
    const int orientation = int(host::unitOrientation(description));
    const std::string cache = VPMapPath(LDBMSmallDBPath(orientation));
    const std::string name = "bzrgbc_" + std::to_string(orientation) + ".csv";
    if (!ready)
        return name + ": not written (no per-chip database is ready)";
    if (!fs::exists(cache))
        return name + ": not written (no cache " + cache + ")";
    DatabaseTable table;
    try {
        table = readDatabaseTable(cache);
    } catch (const std::exception& e) {
        throw std::runtime_error(cache + ": " + e.what());
    }
    std::string live;
    if (normalised) {
        const std::vector<double> deviations = channelDeviations(table);
        live = "live database: normalised at load (the device configured lambda): each source's responses scaled "
               "to unit length, then each channel divided by its deviation:";
        for (size_t c = 0; c < deviations.size(); ++c) {
            char text[64];
            std::snprintf(text, sizeof text, "%s %s=%.6g", c ? "," : "", table.columns[c].c_str(), deviations[c]);
            live += text;
        }
    } else {
        live = "live database: the responses as cached (not normalised: the device configured no lambda)";
    }
    writeWhole(folder / name, databaseCsv(table, cache, {live}));
    return name + " (" + std::to_string(table.rows.size()) + " sources, " + std::to_string(table.columns.size()) +
           " channels; " + (normalised ? "normalised live" : "not normalised live") + ")";
}

bool loggedNormalisation(const std::vector<VPLogLine>& lines)
{
    return std::any_of(lines.begin(), lines.end(),
                       [](const VPLogLine& l) { return l.message.rfind("RR normalization", 0) == 0; });
}

int runOpen(const CommonOptions& common, const OpenOptions& options)
{
    try {
        const std::string devicePath = options.device.empty() ? defaultDevice() : options.device;
        host::DeviceDescription description = host::loadDeviceDescription(devicePath);
        if (!options.save.empty()) {
            std::error_code ec;
            fs::create_directories(options.save, ec);
            if (ec || !fs::is_directory(options.save))
                throw std::runtime_error(options.save + ": cannot create the folder (" +
                                         (ec ? ec.message() : std::string("not a folder")) + ")");
        }
        host::Bundle bundle(common.bundle);
        host::mapDevicePaths(common.bundle, common.state);
        host::Unit unit(description);

        // --save reads whether the bring-up normalised the database from its
        // log (an info line), so it captures at least that much.
        const VPLogLevel shown = logLevelOption(common, VPLogLevel::Info);
        VPLogSetEcho(false);
        VPLogSetLevel(options.save.empty() ? shown : std::max(shown, VPLogLevel::Info));
        VPLogStartCapture();

        std::cout << "Bundle  " << bundle.folder() << " (factory " << bundle.factoryName() << ")\n";
        std::cout << "Unit    " << description.name;
        if (!description.summary.empty())
            std::cout << " - " << description.summary;
        std::cout << "\n\n";

        host::PlugInSession session(bundle, unit);
        const SInt32 score = session.match();
        std::cout << "match   score " << score << (score > 0 ? " (attached)" : " (declined)") << "\n";
        printLog(VPLogTakeCaptured(), shown);
        if (score <= 0)
            return 1;

        // The bring-up open queues waits until waitForQueuedWork, so every
        // line taken here was logged by open itself.
        session.open();
        std::cout << "open    configuration read from the service, device tree and device information\n";
        printLog(VPLogTakeCaptured(), shown);

        session.waitForQueuedWork();
        std::cout << "bring-up\n";
        const std::vector<VPLogLine> bringUp = VPLogTakeCaptured();
        printLog(bringUp, shown);

        std::cout << "driver received\n";
        printDriverProperty(unit, "ALSCalibrationData");
        printDriverProperty(unit, "ALSColorCalibration");
        printDriverProperty(unit, "crgb");

        // A client sees colour only once the per-chip database is ready: the
        // filter then marks every ALS event with a colour space.
        ALSSampleRecord probe;
        probe.sampleChannelCount = 6;
        probe.sampleOrientation = 1;
        probe.lux = probe.rawLux = 100.0f;
        probe.channelValues.fill(1000.0f);
        const CFOwned<IOHIDEventRef> event(host::createALSEvent(probe, 0));
        session.filter(event.get());
        const bool colour = IOHIDEventGetIntegerValue(event.get(), kIOHIDEventFieldAmbientLightColorSpace) != 0;
        VPLogTakeCaptured();
        std::cout << "colour  "
                  << (colour ? "on: the per-chip database is ready (dbReady)"
                             : "off: no per-chip database (dbReady is 0)")
                  << "\n";
        VPLogStopCapture();

        if (!options.save.empty()) {
            const fs::path folder = options.save;
            std::vector<std::string> saved;
            for (const std::string& key : unit.driverPropertyKeys())
                saved.push_back(saveProperty(folder, unit, key));
            saved.push_back(saveDatabase(folder, description, colour, loggedNormalisation(bringUp)));
            std::cout << "saved   " << options.save << "\n";
            for (const auto& line : saved)
                std::cout << "    " << line << "\n";
        }
        return 0;
    } catch (const std::exception& e) {
        std::cout.flush();
        std::cerr << "vantish: " << e.what() << "\n";
        return 2;
    }
}

} // namespace

std::string defaultDevice() { return (host::dataFolder() / "devices" / "xwca-t2" / "device.json").string(); }

Runner addOpenCommand(CLI::App& app, const CommonOptions& common)
{
    auto options = std::make_shared<OpenOptions>();
    app.add_option("device", options->device, "Device description (JSON); the built-in sample unit when omitted");
    app.add_option("--save", options->save,
                   "Also write, into this folder (created when missing), every property the plug-in handed\n"
                   "the driver and the per-chip database it cached for the unit");
    app.footer("Prints the match, then the plug-in's log under the step that logged it: open (on the host's\n"
               "thread; the bring-up it queues starts only after open returns) and bring-up. --log chooses the\n"
               "lowest level shown (default: info). --save writes, each file whole or not at all:\n"
               "  KEY.bin    the bytes of a data property exactly as set (ALSCalibrationData, ALSColorCalibration)\n"
               "  KEY.json   its decode by the record codec (as vantish calib decode), or a number property's\n"
               "             value (crgb)\n"
               "  bzrgbc_<orientation>.csv  the per-chip database from the unit's cache, as vantish lightdb export\n"
               "             writes it, with a '# live database' line: whether the plug-in normalised it at load\n"
               "             and by which channel deviations.");
    return [&common, options] { return runOpen(common, *options); };
}

} // namespace vantish
