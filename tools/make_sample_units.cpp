// Writes the calibration records of the sample units in data/devices: for
// each record its JSON form (as the record codec decodes it) and its
// bytes (as the codec encodes that JSON), or checks the stored files.
//
//   make_sample_units DATADIR          write DATADIR/devices/<unit>/...
//   make_sample_units --check DATADIR  exit 1 when a stored file differs
//
// The channel spectra come from the model sensors in DATADIR/sensors, scaled
// by one factor per sensor so that its most sensitive channel uses 90 % of
// the record's sample type (the plug-in normalises each light source's
// responses, so only the shapes and the channels' relative sizes matter).
// Every other value is a plausible, made-up calibration; data/devices/README.md
// lists them. The device descriptions (device.json) are written by hand.

#include "host/recordcodec/RecordCodec.h"
#include "spectra/SensorModel.h"
#include "tools/ToolArguments.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <limits>
#include <stdexcept>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;
using recordcodec::Json;
using spectra::SensorModel;

constexpr double kFullScaleShare = 0.9;
constexpr double kI16FullScale = kFullScaleShare * std::numeric_limits<int16_t>::max();
constexpr double kI32FullScale = kFullScaleShare * std::numeric_limits<int32_t>::max();

// ---- Values shared by the units -------------------------------------------------------------

// Lux per count of each channel for the sensors' nominal gain and integration
// time (channel order of the sensor files). Units of one sensor differ a little.
const std::vector<double> kLuxColour5 = {0.0040, 0.0310, 0.0065, 0.0012, 0.0};
const std::vector<double> kLuxColour6 = {0.0008, 0.0010, 0.0035, 0.0240, 0.0110, 0.0030};
const std::vector<double> kLuxRgbc4 = {0.0120, 0.0450, 0.0020, 0.0040};
// Colour-temperature coefficients: only handed on to the driver.
const std::vector<double> kCctColour5 = {0.62, -1.35, 0.88, 0.11, -0.27};
const std::vector<double> kCctColour6 = {0.05, -0.41, 0.93, -1.12, 0.37, 0.58};
const std::vector<double> kCctRgbc4 = {0.81, -0.44, -0.96, 0.12};

// Small per-channel trims (a few per cent) that make each channel's values its own.
double trim(size_t channel, double spread) { return 1.0 + spread * (double(channel % 5) - 2.0) / 2.0; }

std::vector<double> scaledBy(const std::vector<double>& values, double factor)
{
    std::vector<double> out;
    for (double v : values)
        out.push_back(v * factor);
    return out;
}

Json samples(const spectra::Spectrum& sensitivity, double fullScale)
{
    Json out = Json::array();
    for (double v : sensitivity)
        out.push_back(std::llround(v * fullScale));
    return out;
}

// The sensor's channels one after the other, as `slots` spectra (zero beyond its channels).
Json spectrumSlots(const SensorModel& sensor, size_t slots, double fullScale)
{
    Json out = Json::array();
    for (size_t c = 0; c < slots; ++c)
        out.push_back(c < sensor.channelCount() ? samples(sensor.channels[c], fullScale)
                                                : samples(spectra::Spectrum{}, fullScale));
    return out;
}

// Sample-major spectra (sample s of channel c at s · channels + c), as the
// registry blobs keep them; with `tailLoss`, channel c's near-infrared tail
// is stored divided by tailLoss[c].
Json interleaved(const SensorModel& sensor, double fullScale, const std::vector<double>& tailLoss = {})
{
    Json out = Json::array();
    for (int s = 0; s < spectra::kSamples; ++s)
        for (size_t c = 0; c < sensor.channelCount(); ++c) {
            const double loss = s >= spectra::kNirTailStart && !tailLoss.empty() ? tailLoss[c] : 1.0;
            out.push_back(std::llround(sensor.channels[c][size_t(s)] * fullScale / loss));
        }
    return out;
}

Json value(double v) { return Json{{"value", v}}; }

Json values(const std::vector<double>& vs)
{
    Json list = Json::array();
    for (double v : vs)
        list.push_back(v);
    return Json{{"value", list}};
}

// Per-gain scale factors around `nominal`, slightly different per channel.
std::vector<double> gainScales(size_t channel, size_t gains, double nominal)
{
    std::vector<double> out;
    for (size_t g = 0; g < gains; ++g)
        out.push_back(nominal * (1.0 + 0.004 * double((channel + g) % 4) - 0.006));
    return out;
}

Json record(const char* format, size_t size, Json fields)
{
    return Json{{"format", format}, {"size", size}, {"fields", std::move(fields)}};
}

// ---- Factory records --------------------------------------------------------------------------

Json xwcaT2(const SensorModel& sensor)
{
    Json f;
    f["versionMajor"] = 1;
    f["versionMinor"] = 8;
    f["chipID"] = Json{{"text", "5C0A3E71"}};
    f["deviceID"] = 0x31;
    f["nChannels"] = 5;
    f["nGains"] = 5;
    f["fudge"] = value(1.0);
    for (size_t c = 0; c < 5; ++c) {
        Json ch;
        ch["gainScale"] = values(gainScales(c, 5, 2.0));
        ch["channelParamA"] = 480 + 16 * c;
        ch["offsetCounts"] = value(0.25 + 0.125 * double(c));
        ch["darkCounts"] = 3 + c % 3;
        ch["channelParamB"] = int(c % 3) - 1;
        ch["luxCoeff"] = value(kLuxColour5[c] * trim(c, 0.02));
        ch["cctCoeff"] = value(kCctColour5[c]);
        f["channels"].push_back(ch);
    }
    f["gainIndex"] = 4; // with 5 calibrated gains: gain index 8
    f["iTime"] = 100;
    f["spectra"] = Json::array();
    for (const Json& s : spectrumSlots(sensor, 6, kI32FullScale))
        f["spectra"].push_back(Json{{"samples", s}});
    return record("factory-xwca-t2", 9962, f);
}

struct XwClEntry {
    unsigned iTime;
    std::vector<unsigned> gain;
    unsigned nGains;
    double fudge;
    double luxFactor; // scales the sensor's lux coefficients
};

Json xwclEntry(const SensorModel& sensor, const XwClEntry& e, const std::vector<double>& lux,
               const std::vector<double>& cct)
{
    Json f;
    f["nChannels"] = sensor.channelCount();
    f["nGains"] = e.nGains;
    f["iTime"] = e.iTime;
    f["aux1"] = 100;
    f["aux2"] = 99;
    f["aux3"] = 62;
    f["gain"] = e.gain;
    f["fudge"] = value(e.fudge);
    for (size_t c = 0; c < 6; ++c) {
        Json ch;
        if (c < sensor.channelCount()) {
            ch["gainScale"] = values(gainScales(c, e.nGains, 2.0));
            ch["channelParamA"] = 512 - 8 * c;
            ch["offsetCounts"] = value(0.5 - 0.125 * double(c % 3));
            ch["darkCounts"] = 2 + c % 4;
            ch["channelParamB"] = int(c % 5) - 2;
            ch["luxCoeff"] = value(lux[c] * e.luxFactor * trim(c, 0.03));
            ch["cctCoeff"] = value(cct[c]);
        }
        ch["spectrum"] = c < sensor.channelCount() ? samples(sensor.channels[c], kI16FullScale)
                                                   : samples(spectra::Spectrum{}, kI16FullScale);
        f["channels"].push_back(ch);
    }
    return f;
}

struct XwClHeader {
    unsigned versionMajor, versionMinor, entrySelector;
    uint32_t chipID;
    unsigned deviceID, chipType;
};

Json xwcl(const XwClHeader& h, std::vector<Json> entries)
{
    Json f;
    f["header"] = Json{{"versionMajor", h.versionMajor},   {"versionMinor", h.versionMinor},
                       {"entrySelector", h.entrySelector}, {"chipID", h.chipID},
                       {"deviceID", h.deviceID},           {"chipType", h.chipType}};
    f["entries"] = std::move(entries);
    return record("factory-xwcl", f["entries"].size() == 1 ? 5156 : 10236, f);
}

Json xwcl14(const SensorModel& sensor)
{
    return xwcl({3, 2, 1, 0x1E6B40C2, 14, 0},
                {xwclEntry(sensor, {100, {8, 9, 9, 8}, 9, 1.0, 1.0}, kLuxColour5, kCctColour5)});
}

// Two entries (two cover-glass variants); the header selects the second. The
// chip ID is stored with its bytes reversed (the service publishes 0x2D9A4C13).
Json xwcl35(const SensorModel& sensor)
{
    return xwcl({2, 4, 2, 0x134C9A2D, 35, 0},
                {xwclEntry(sensor, {50, {8, 8, 8, 0}, 8, 1.10, 1.12}, kLuxRgbc4, kCctRgbc4),
                 xwclEntry(sensor, {100, {8, 8, 8, 0}, 8, 1.0, 1.0}, kLuxRgbc4, kCctRgbc4)});
}

Json xwcl62(const SensorModel& sensor)
{
    return xwcl({4, 0, 1, 0x47E21B08, 62, 0},
                {xwclEntry(sensor, {100, {8, 9, 9, 8}, 9, 1.0, 1.0}, kLuxColour6, kCctColour6)});
}

// ---- VD6287 -------------------------------------------------------------------------------------

// The per-channel fields of a blob; the lux coefficients of the second blob
// (the sensor's second operating range) are a little lower.
Json vd6287Channels(size_t blob)
{
    Json list = Json::array();
    for (size_t j = 0; j < 5; ++j) {
        std::vector<double> ratios;
        for (size_t g = 0; g < 7; ++g)
            ratios.push_back(2.0 * (1.0 + 0.003 * double((j + g) % 5) - 0.006));
        Json ch;
        ch["gainRatio"] = values(ratios);
        ch["channelByte"] = 10 + 2 * j;
        ch["channelFactor"] = value(1.0 + 0.015 * (double(j) - 2.0));
        ch["luxCoeff"] = value(kLuxColour5[j] * (blob == 0 ? 1.0 : 0.96) * trim(j, 0.02));
        ch["cctCoeff"] = value(kCctColour5[j]);
        ch["channelValue"] = value(0.5 + 0.0625 * double(j));
        list.push_back(ch);
    }
    return list;
}

Json vd6287Spectra(const SensorModel& sensor)
{
    Json out = Json::array();
    for (const Json& s : spectrumSlots(sensor, 6, kI16FullScale))
        out.push_back(Json{{"samples", s}});
    return out;
}

Json vd6287Header(unsigned major, unsigned minor)
{
    return Json{{"versionMajor", major}, {"versionMinor", minor}, {"numBlobs", 2}};
}

Json vd6287v3(const SensorModel& sensor)
{
    Json f;
    f["header"] = vd6287Header(3, 1);
    for (unsigned k = 0; k < 2; ++k) {
        Json b;
        b["type"] = k;
        b["numChannels"] = 5;
        b["numGains"] = 7;
        b["gainIndex"] = 3;
        b["blobWord"] = k == 0 ? 0x00640190 : 0x003200C8;
        b["valueA"] = value(k == 0 ? 2.5 : 1.25);
        b["valueB"] = value(1.0);
        b["channels"] = vd6287Channels(k);
        b["sharedValue"] = value(1.0);
        b["spectra"] = vd6287Spectra(sensor);
        b["tailWord"] = 0x5AA5;
        b["entryCount"] = 5;
        b["tableA"] = {0, 100, 400, 1600, 6400};
        b["tableB"] = {120, 480, 1920, 7680, 30720};
        b["tableC"] = {250, 250, 200, 150, 100};
        b["tableD"] = {6, 5, 4, 3, 2};
        b["tableE"] = {1000, 1000, 800, 600, 400};
        b["tableF"] = {50, 60, 70, 80, 90};
        b["tailByte"] = 1;
        f["blobs"].push_back(b);
    }
    return record("factory-vd6287-v3", 10348, f);
}

// Version 1 keeps one value of tables C to F and a count one below the
// entries it stands for (3: four entries).
Json vd6287v1(const SensorModel& sensor)
{
    Json f;
    f["header"] = vd6287Header(1, 2);
    for (unsigned k = 0; k < 2; ++k) {
        Json b;
        b["type"] = k;
        b["numChannels"] = 5;
        b["numGains"] = 7;
        b["gainIndex"] = 2;
        b["valueA"] = value(k == 0 ? 2.5 : 1.25);
        b["valueB"] = value(1.0);
        b["channels"] = vd6287Channels(k);
        b["sharedValue"] = value(1.0);
        b["spectra"] = vd6287Spectra(sensor);
        b["tailWord"] = 0x5AA5;
        b["count"] = 3;
        b["tableA"] = {100, 400, 1600, 6400};
        b["tableB"] = {120, 480, 1920, 7680};
        b["tableD"] = 4;
        b["tableC"] = 200;
        b["tableF"] = 70;
        b["tableE"] = 800;
        b["tailByte"] = 1;
        f["blobs"].push_back(b);
    }
    return record("factory-vd6287-v1", 10440, f);
}

// ---- Registry blobs ---------------------------------------------------------------------------

constexpr size_t kHeaderSize = 8;

// The unit with infrared compensation had its spectra measured through a
// window that passes less near infrared than its own cover: its stored tails
// (710 nm on) are too low by these factors (R, G, B, C), which the auxiliary
// blob restores.
const std::vector<double> kMeasuredTailLoss = {1.25, 1.30, 1.35, 1.20};

// A generic (four-channel) entry; its size follows from the gains and the revision.
Json genericEntry(const SensorModel& sensor, unsigned orientation, unsigned revision, unsigned gains, double luxFactor,
                  const std::vector<double>& tailLoss = {})
{
    Json e;
    const size_t channels = sensor.channelCount();
    e["sensorType"] = 2;
    e["orientation"] = orientation;
    e["chipType"] = 0;
    e["entrySize"] = 24 + (4 + 2 * gains) * channels + (revision == 0 ? 3236 : 3240);
    e["wordA"] = value(1.0);
    e["wordB"] = 100;
    e["wordC"] = 100;
    e["wordD"] = 99;
    e["gains"] = {9, 9};
    e["nChannels"] = channels;
    e["nGains"] = gains;
    for (size_t c = 0; c < channels; ++c) {
        Json ch;
        ch["darkCounts"] = 2 + c;
        ch["offset"] = value(0.35 + 0.05 * double(c));
        ch["channelParamB"] = c;
        ch["gains"] = values(gainScales(c, gains, 2.0));
        e["channels"].push_back(ch);
    }
    Json s;
    s["algoVersion"] = 3;
    s["nSamples"] = spectra::kSamples;
    s["weights"] = values(scaledBy(kLuxRgbc4, luxFactor));
    s["cctWords"] = {812, 2750};
    s["samples"] = interleaved(sensor, kI16FullScale, tailLoss);
    e["spectrum"] = s;
    return e;
}

Json vd6286Entry(const SensorModel& sensor)
{
    Json e;
    e["sensorType"] = 7;
    e["orientation"] = 1;
    e["chipType"] = 3;
    e["entrySize"] = 4156;
    e["wordA"] = value(1.0);
    e["wordB"] = 100;
    e["wordC"] = 100;
    e["wordD"] = 99;
    e["gains"] = {8, 9, 9};
    e["nChannels"] = 5;
    e["nGains"] = 5;
    for (size_t c = 0; c < 5; ++c) {
        Json ch;
        ch["darkCounts"] = 3 + c % 2;
        ch["offset"] = value(0.4 + 0.025 * double(c));
        ch["channelParamB"] = 1;
        ch["gains"] = values(gainScales(c, 5, 2.0));
        e["channels"].push_back(ch);
    }
    e["algoVersion"] = 3;
    e["nSamples"] = spectra::kSamples;
    e["weights"] = values(kLuxColour5);
    e["cctCoefficients"] = {620, -1350, 880, 110, -270};
    e["samples"] = interleaved(sensor, kI16FullScale);
    return e;
}

Json alsCalibration(unsigned revision, std::vector<Json> entries)
{
    size_t total = kHeaderSize;
    for (const Json& e : entries)
        total += e["entrySize"].get<size_t>();
    Json f;
    f["header"] = Json{{"revision", revision}, {"version", 1}, {"entryCount", entries.size()}, {"totalSize", total}};
    f["entries"] = std::move(entries);
    return record("registry-alsCalibration", total, f);
}

// Infrared compensation for orientation 1 of `generic`: the plug-in scales the
// tails so that their largest sample becomes 32767 and then multiplies
// channel c by coefficient c; the coefficients make the product the channel's
// tail loss.
Json alsAuxCalibration(const Json& generic)
{
    const Json& stored = generic["spectrum"]["samples"];
    const size_t channels = generic["nChannels"].get<size_t>();
    long long nirMax = 0;
    for (size_t i = size_t(spectra::kNirTailStart) * channels; i < stored.size(); ++i)
        nirMax = std::max(nirMax, std::llabs(stored[i].get<long long>()));
    const float nirFactor = 32767.0f / float(nirMax);
    std::vector<double> coefficients;
    for (double loss : kMeasuredTailLoss)
        coefficients.push_back(loss / double(nirFactor));
    Json entry{{"orientation", 1}, {"entrySize", 56}, {"irCoefficients", values(coefficients)}};
    Json f;
    f["header"] = Json{{"entryCount", 1}};
    f["entries"] = Json::array({entry});
    return record("registry-alsAuxCalibration", 64, f);
}

// ---- Units ------------------------------------------------------------------------------------

struct StoredRecord {
    std::string binary; // relative to the unit folder
    std::string json;
    Json source;
};

struct SampleUnit {
    std::string folder;
    std::vector<StoredRecord> records;
};

std::vector<SampleUnit> sampleUnits(const fs::path& sensors)
{
    const SensorModel colour5 = spectra::loadSensorModel(sensors / "colour5.csv");
    const SensorModel colour6 = spectra::loadSensorModel(sensors / "colour6.csv");
    const SensorModel rgbc4 = spectra::loadSensorModel(sensors / "rgbc4.csv");
    const Json auxGeneric = genericEntry(rgbc4, 1, 1, 9, 1.0, kMeasuredTailLoss);
    auto store = [](const char* cls, Json source) {
        return StoredRecord{std::string("store/") + cls, std::string("store/") + cls + ".json", std::move(source)};
    };
    auto blob = [](const char* key, Json source) {
        return StoredRecord{std::string("registry/") + key + ".bin", std::string("registry/") + key + ".json",
                            std::move(source)};
    };
    return {
        {"xwca-t2", {store("XwCA", xwcaT2(colour5))}},
        {"xwcl-14", {store("XwCl", xwcl14(colour5))}},
        {"xwcl-35", {store("XwCl", xwcl35(rgbc4))}},
        {"xwcl-62", {store("XwCA", xwcl62(colour6))}},
        {"vd6287-v1", {store("XwCl", vd6287v1(colour5))}},
        {"vd6287-v3", {store("XwCM", vd6287v3(colour5))}},
        // Entries for orientations 3 and 1: the unit (orientation 1) uses the second.
        {"sysconfig-r0",
         {blob("alsCalibration",
               alsCalibration(0, {genericEntry(rgbc4, 3, 0, 9, 0.9), genericEntry(rgbc4, 1, 0, 9, 1.0)}))}},
        {"sysconfig-r1", {blob("alsCalibration", alsCalibration(1, {genericEntry(rgbc4, 1, 1, 8, 1.0)}))}},
        {"sysconfig-aux",
         {blob("alsCalibration", alsCalibration(1, {auxGeneric})),
          blob("alsAuxCalibration", alsAuxCalibration(auxGeneric))}},
        {"sysconfig-vd6286", {blob("alsCalibration", alsCalibration(0, {vd6286Entry(colour5)}))}},
    };
}

// ---- Output -----------------------------------------------------------------------------------

bool scalarArray(const Json& j)
{
    if (!j.is_array())
        return false;
    for (const Json& e : j)
        if (e.is_structured())
            return false;
    return true;
}

// JSON indented by two spaces, with arrays of plain values on one line.
void writeJson(std::string& out, const Json& j, int indent)
{
    const std::string pad(size_t(indent) * 2, ' ');
    const std::string inner(size_t(indent + 1) * 2, ' ');
    if (j.is_object() && !j.empty()) {
        out += "{\n";
        size_t i = 0;
        for (const auto& [key, v] : j.items()) {
            out += inner + Json(key).dump() + ": ";
            writeJson(out, v, indent + 1);
            out += ++i < j.size() ? ",\n" : "\n";
        }
        out += pad + "}";
    } else if (j.is_array() && !j.empty() && !scalarArray(j)) {
        out += "[\n";
        for (size_t i = 0; i < j.size(); ++i) {
            out += inner;
            writeJson(out, j[i], indent + 1);
            out += i + 1 < j.size() ? ",\n" : "\n";
        }
        out += pad + "]";
    } else {
        out += j.dump(-1, ' ', false, Json::error_handler_t::strict);
    }
}

struct Output {
    std::string bytes;
    std::string json;
};

// The record's bytes from the codec, and the codec's own JSON form of them.
Output produce(const StoredRecord& r)
{
    const auto encoded = recordcodec::encode(r.source);
    if (!encoded)
        throw std::runtime_error(r.binary + ": " + encoded.error);
    const std::vector<uint8_t>& bytes = *encoded.value;
    const auto kind = recordcodec::kindNamed(r.source["format"].get<std::string>());
    const auto decoded = recordcodec::decode(bytes, kind);
    if (!decoded)
        throw std::runtime_error(r.binary + ": " + decoded.error);
    Output out{std::string(bytes.begin(), bytes.end()), {}};
    writeJson(out.json, *decoded.value, 0);
    out.json += "\n";
    return out;
}

std::string readFile(const fs::path& path)
{
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

void writeFile(const fs::path& path, const std::string& content)
{
    fs::create_directories(path.parent_path());
    std::ofstream out(path, std::ios::binary);
    out << content;
    if (!out)
        throw std::runtime_error("cannot write " + path.string());
}

} // namespace

int main(int argc, char** argv)
{
    std::string folder;
    bool check = false;
    if (const auto stop = parseToolArguments(argc, argv,
                                             {"Writes the calibration records of the sample units",
                                              "The data folder (holding sensors/ and devices/)", true, "--check",
                                              "Compare the stored records with what would be written"},
                                             folder, check))
        return *stop;

    try {
        const fs::path data(folder);
        int differing = 0;
        for (const SampleUnit& unit : sampleUnits(data / "sensors")) {
            for (const StoredRecord& r : unit.records) {
                const Output out = produce(r);
                const fs::path dir = data / "devices" / unit.folder;
                if (!check) {
                    writeFile(dir / r.binary, out.bytes);
                    writeFile(dir / r.json, out.json);
                    continue;
                }
                for (const auto& [path, content] :
                     {std::pair{dir / r.binary, out.bytes}, std::pair{dir / r.json, out.json}}) {
                    if (readFile(path) != content) {
                        std::fprintf(stderr, "make_sample_units: %s differs from its source\n", path.c_str());
                        ++differing;
                    }
                }
            }
        }
        return differing == 0 ? 0 : 1;
    } catch (const std::exception& e) {
        std::fprintf(stderr, "make_sample_units: %s\n", e.what());
        return 2;
    }
}
