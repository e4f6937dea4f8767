#include "host/inputs/UnitSpectra.h"

#include "host/recordcodec/RecordCodec.h"
#include "support/CFOwned.h"

#include <CoreFoundation/CoreFoundation.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <optional>
#include <variant>

namespace fs = std::filesystem;

namespace host {

namespace {

using recordcodec::Json;

constexpr unsigned kMaxReportedChannels = 6;
// The plug-in scales the last 196 samples (710–1100 nm) for infrared compensation.
constexpr int kNirTailStart = spectra::kNirTailStart;

[[noreturn]] void fail(const DeviceDescription& unit, const std::string& message)
{
    throw UnitSpectraError(unit.file.string() + ": " + message);
}

// ---- Reading the decoded records ---------------------------------------------------

// The member at `path` (object keys, array indices) of a decoded record, or null.
const Json* at(const Json& root, std::initializer_list<std::variant<const char*, size_t>> path)
{
    const Json* node = &root;
    for (const auto& step : path) {
        if (std::holds_alternative<const char*>(step)) {
            const char* key = std::get<const char*>(step);
            if (!node->is_object() || !node->contains(key))
                return nullptr;
            node = &(*node)[key];
        } else {
            const size_t index = std::get<size_t>(step);
            if (!node->is_array() || index >= node->size())
                return nullptr;
            node = &(*node)[index];
        }
    }
    return node;
}

// A plain number, or the converted value of a fixed-point field.
double number(const Json* node)
{
    if (!node)
        return 0.0;
    if (node->is_object() && node->contains("value"))
        node = &(*node)["value"];
    return node->is_number() ? node->get<double>() : 0.0;
}

// The converted values of a fixed-point array (or a plain array).
std::vector<double> numbers(const Json* node)
{
    std::vector<double> out;
    if (!node)
        return out;
    if (node->is_object() && node->contains("value"))
        node = &(*node)["value"];
    if (node->is_array())
        for (const Json& v : *node)
            out.push_back(v.is_number() ? v.get<double>() : 0.0);
    return out;
}

spectra::Spectrum spectrumOf(const std::vector<double>& samples)
{
    spectra::Spectrum s{};
    for (size_t i = 0; i < samples.size() && i < s.size(); ++i)
        s[i] = samples[i];
    return s;
}

// Channel c of sample-major samples (`channels` values per sample).
spectra::Spectrum sampleMajorChannel(const std::vector<double>& samples, size_t channels, size_t c)
{
    spectra::Spectrum s{};
    for (size_t i = 0; i < s.size() && i * channels + c < samples.size(); ++i)
        s[i] = samples[i * channels + c];
    return s;
}

Json decodeRecord(const DeviceDescription& unit, const std::vector<uint8_t>& bytes,
                  std::optional<recordcodec::Kind> kind, const std::string& what)
{
    auto decoded = recordcodec::decode(bytes, kind);
    if (!decoded)
        fail(unit, what + ": " + decoded.error);
    return std::move(*decoded.value);
}

// ---- Factory store -----------------------------------------------------------------

std::optional<std::vector<uint8_t>> readFile(const fs::path& path)
{
    std::ifstream in(path, std::ios::binary);
    if (!in)
        return std::nullopt;
    return std::vector<uint8_t>(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

bool onDravikOS(const DeviceDescription& unit)
{
    const auto& answers = unit.answers;
    return answers.contains("ProductName") && answers["ProductName"] == "Dravik OS";
}

// XwCl: the entry the plug-in parses and its column mapping.
UnitSpectra fromXwCl(const DeviceDescription& unit, const Json& fields, const std::string& what)
{
    const unsigned deviceID = unsigned(number(at(fields, {"header", "deviceID"})));
    const unsigned chipType = unsigned(number(at(fields, {"header", "chipType"})));
    const bool fiveChannel = deviceID == 14 || deviceID == 19;
    const bool fourChannel = deviceID == 35 || deviceID == 58;
    const bool sixChannel = deviceID == 62;
    if (!fiveChannel && !fourChannel && !sixChannel)
        fail(unit, what + ": device id " + std::to_string(deviceID) + " has no calibration layout");

    size_t entry = 0;
    if (!fiveChannel) {
        const size_t selector = size_t(number(at(fields, {"header", "entrySelector"})));
        const Json* entries = at(fields, {"entries"});
        if (selector < 1 || !entries || selector > entries->size())
            fail(unit, what + ": the entry selector " + std::to_string(selector) + " names no entry");
        entry = selector - 1;
    }
    const unsigned numberOfChannels = unsigned(number(at(fields, {"entries", entry, "nChannels"})));
    if (numberOfChannels < 4 || numberOfChannels > kMaxReportedChannels)
        fail(unit, what + ": " + std::to_string(numberOfChannels) + " channels");
    auto stored = [&](size_t c) {
        return spectrumOf(numbers(at(fields, {"entries", entry, "channels", c, "spectrum"})));
    };
    auto weight = [&](size_t c) { return number(at(fields, {"entries", entry, "channels", c, "luxCoeff"})); };

    UnitSpectra out;
    out.referenceSet = fourChannel ? spectra::ReferenceSet::Default : spectra::ReferenceSet::Dense02;
    if ((fiveChannel || sixChannel) && (chipType == 1 || chipType == 2)) {
        // The plug-in folds stored channels 1.. into the database columns,
        // the last column doubled (type 1) or with stored channel 0 added
        // (type 2); the driver reports the columns after the channels the
        // colour fit skips.
        const unsigned columns = sixChannel ? numberOfChannels - 1 : numberOfChannels;
        const unsigned skip = numberOfChannels - columns;
        for (unsigned c = 0; c < skip; ++c) {
            out.channels.push_back(stored(c));
            out.luxCoefficients.push_back(0.0);
        }
        for (unsigned c = 0; c < columns; ++c) {
            spectra::Spectrum s = stored(c + 1);
            if (c == columns - 1)
                s = chipType == 1 ? spectra::scaled(s, 2.0) : spectra::addScaled(s, stored(0), 1.0);
            out.channels.push_back(s);
            out.luxCoefficients.push_back(weight(c));
        }
        return out;
    }
    for (unsigned c = 0; c < numberOfChannels; ++c) {
        out.channels.push_back(stored(c));
        out.luxCoefficients.push_back(weight(c));
    }
    return out;
}

UnitSpectra fromXwCAT2(const DeviceDescription& unit, const Json& fields, const std::string& what)
{
    const unsigned n = unsigned(number(at(fields, {"nChannels"})));
    if (n < 4 || n > 5)
        fail(unit, what + ": " + std::to_string(n) + " channels");
    UnitSpectra out;
    for (size_t c = 0; c < n; ++c) {
        out.channels.push_back(spectrumOf(numbers(at(fields, {"spectra", c, "samples"}))));
        out.luxCoefficients.push_back(number(at(fields, {"channels", c, "luxCoeff"})));
    }
    return out;
}

// VD6287: five channels, spectra and weights from the first blob.
UnitSpectra fromVD6287(const Json& fields)
{
    constexpr size_t kChannels = 5;
    UnitSpectra out;
    for (size_t c = 0; c < kChannels; ++c) {
        out.channels.push_back(spectrumOf(numbers(at(fields, {"blobs", size_t(0), "spectra", c, "samples"}))));
        out.luxCoefficients.push_back(number(at(fields, {"blobs", size_t(0), "channels", c, "luxCoeff"})));
    }
    return out;
}

UnitSpectra fromFactoryStore(const DeviceDescription& unit)
{
    const std::vector<std::string> classes =
        onDravikOS(unit) ? std::vector<std::string>{"XwCM", "XwCA"} : std::vector<std::string>{"XwCA", "XwCl"};
    for (const std::string& cls : classes) {
        const fs::path path = *unit.factoryStore / cls;
        const auto bytes = readFile(path);
        if (!bytes)
            continue;
        const auto kind = recordcodec::kindForSize(bytes->size());
        const std::string what = path.string();
        const Json record = decodeRecord(unit, *bytes, std::nullopt, what);
        const Json& fields = record["fields"];
        UnitSpectra out;
        switch (*kind) {
        case recordcodec::Kind::XwCl:
            out = fromXwCl(unit, fields, what);
            break;
        case recordcodec::Kind::XwCAT2:
            out = fromXwCAT2(unit, fields, what);
            break;
        case recordcodec::Kind::VD6287v1:
        case recordcodec::Kind::VD6287v3:
            out = fromVD6287(fields);
            break;
        default:
            fail(unit, what + ": a " + std::string(recordcodec::kindName(*kind)) +
                           " record is not a factory calibration the plug-in reads");
        }
        out.origin =
            "factory store class " + cls + " (" + what + ", " + std::string(recordcodec::kindName(*kind)) + ")";
        return out;
    }
    fail(unit, "the factory store " + unit.factoryStore->string() + " holds no record of class " + classes[0] + " or " +
                   classes[1] +
                   ", so the unit runs on the built-in default calibration and has no "
                   "stored channel spectra");
}

// ---- Registry ----------------------------------------------------------------------

// The value of `key` on the service's registry entry or the nearest ancestor
// that has it, as the plug-in's recursive parent search finds it.
const nlohmann::json* registryProperty(const DeviceDescription& unit, const std::string& key, std::string& where)
{
    uint64_t id = unit.registryID;
    for (size_t hops = 0; id != 0 && hops <= unit.registry.size(); ++hops) {
        const RegistryEntryDescription* entry = nullptr;
        for (size_t i = 0; i < unit.registry.size(); ++i)
            if (unit.registry[i].id == id) {
                entry = &unit.registry[i];
                where = "registry[" + std::to_string(i) + "].properties." + key;
            }
        if (!entry)
            return nullptr;
        if (entry->properties.contains(key))
            return &entry->properties[key];
        id = entry->parent;
    }
    return nullptr;
}

// The bytes of a data-valued registry property, or nothing when it is absent or not data.
std::optional<std::vector<uint8_t>> registryData(const DeviceDescription& unit, const std::string& key)
{
    std::string where;
    const nlohmann::json* value = registryProperty(unit, key, where);
    if (!value)
        return std::nullopt;
    const CFOwned<CFTypeRef> cf(createPropertyValue(*value, unit.folder(), unit.file.string() + ": " + where));
    if (CFGetTypeID(cf.get()) != CFDataGetTypeID())
        return std::nullopt;
    const CFDataRef data = static_cast<CFDataRef>(cf.get());
    const uint8_t* begin = CFDataGetBytePtr(data);
    return std::vector<uint8_t>(begin, begin + CFDataGetLength(data));
}

// The first entry of a decoded blob for `orientation`, or null.
const Json* entryFor(const Json& fields, uint32_t orientation)
{
    const Json* entries = at(fields, {"entries"});
    if (!entries || !entries->is_array())
        return nullptr;
    for (const Json& e : *entries)
        if (uint32_t(number(at(e, {"orientation"}))) == orientation)
            return &e;
    return nullptr;
}

// The plug-in's infrared compensation: the tail of every channel scaled so
// that the tail's largest magnitude becomes 32767, then by the channel's
// coefficient, in single precision.
void compensateInfrared(UnitSpectra& out, const std::vector<double>& coefficients)
{
    double nirMax = 0;
    for (const auto& s : out.channels)
        for (int i = kNirTailStart; i < spectra::kSamples; ++i)
            nirMax = std::max(nirMax, std::abs(s[size_t(i)]));
    const float nirFactor = nirMax != 0 ? 32767.0f / float(nirMax) : 1.0f;
    for (size_t c = 0; c < out.channels.size(); ++c) {
        const float k = c < coefficients.size() ? float(coefficients[c]) : 0.0f;
        for (int i = kNirTailStart; i < spectra::kSamples; ++i) {
            double& v = out.channels[c][size_t(i)];
            v = double((float(v) * nirFactor) * k);
        }
    }
}

UnitSpectra fromRegistry(const DeviceDescription& unit)
{
    const auto blob = registryData(unit, "alsCalibration");
    if (!blob)
        fail(unit, "the service asks for registry calibration but no registry entry above it holds "
                   "\"alsCalibration\" data");
    const uint32_t orientation = unitOrientation(unit);
    const std::string what = "\"alsCalibration\"";
    const Json record = decodeRecord(unit, *blob, recordcodec::Kind::AlsCalibration, what);
    const Json& fields = record["fields"];
    if (number(at(fields, {"header", "version"})) != 1)
        fail(unit, what + ": calibration version " + std::to_string(int(number(at(fields, {"header", "version"})))) +
                       " is not supported");
    const Json* entry = entryFor(fields, orientation);
    if (!entry)
        fail(unit, what + " has no entry for orientation " + std::to_string(orientation));

    UnitSpectra out;
    out.origin = "registry " + what + ", entry for orientation " + std::to_string(orientation);
    const unsigned n = unsigned(number(at(*entry, {"nChannels"})));
    if (number(at(*entry, {"chipType"})) == 3) {
        if (n != 5)
            fail(unit, what + ": a VD6286 entry with " + std::to_string(n) + " channels");
        const auto samples = numbers(at(*entry, {"samples"}));
        const auto weights = numbers(at(*entry, {"weights"}));
        for (size_t c = 0; c < n; ++c) {
            out.channels.push_back(sampleMajorChannel(samples, n, c));
            out.luxCoefficients.push_back(c < weights.size() ? weights[c] : 0.0);
        }
        return out;
    }
    if (n != 4)
        fail(unit, what + ": a generic entry with " + std::to_string(n) + " channels (the plug-in folds 4)");
    const auto samples = numbers(at(*entry, {"spectrum", "samples"}));
    const auto weights = numbers(at(*entry, {"spectrum", "weights"}));
    for (size_t c = 0; c < n; ++c) {
        out.channels.push_back(sampleMajorChannel(samples, n, c));
        out.luxCoefficients.push_back(c < weights.size() ? weights[c] : 0.0);
    }
    if (const auto aux = registryData(unit, "alsAuxCalibration")) {
        const Json auxRecord = decodeRecord(unit, *aux, recordcodec::Kind::AlsAuxCalibration, "\"alsAuxCalibration\"");
        if (const Json* auxEntry = entryFor(auxRecord["fields"], orientation)) {
            compensateInfrared(out, numbers(at(*auxEntry, {"irCoefficients"})));
            out.origin += ", infrared compensation from \"alsAuxCalibration\"";
        }
    }
    return out;
}

bool serviceFlag(const DeviceDescription& unit, const char* key)
{
    const auto& p = unit.serviceProperties;
    return p.contains(key) && p[key].is_boolean() && p[key].get<bool>();
}

} // namespace

uint32_t unitOrientation(const DeviceDescription& unit)
{
    const auto bytes = registryData(unit, "IOHIDOrientationType");
    if (!bytes || bytes->size() < 4)
        return 1;
    return uint32_t((*bytes)[0]) | uint32_t((*bytes)[1]) << 8 | uint32_t((*bytes)[2]) << 16 |
           uint32_t((*bytes)[3]) << 24;
}

UnitSpectra loadUnitSpectra(const DeviceDescription& unit)
{
    if (serviceFlag(unit, "SysConfigCalibration") || serviceFlag(unit, "ALSCalibrationSpectrumToProcess"))
        return fromRegistry(unit);
    if (unit.bootArgs.find("als_default_calibration=") != std::string::npos)
        fail(unit, "the boot arguments force the built-in default calibration, which has no channel spectra");
    if (!unit.factoryStore)
        fail(unit, "the unit has no factory store and no registry calibration, so it runs on the built-in default "
                   "calibration and has no stored channel spectra");
    return fromFactoryStore(unit);
}

} // namespace host
