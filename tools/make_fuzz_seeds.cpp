// Writes seed inputs for every fuzz target: well-formed factory records,
// registry blobs, sample records, property calls, database files and
// `vantish` inputs, each framed as its target reads it, so that fuzzing starts
// from inputs that reach deep into the code. The records are written field by
// field at the layouts' offsets with plausible values.
//
// Usage: fuzz_make_seeds OUTPUT_FOLDER [DATA_FOLDER]   (one sub-folder per target)
// With the project's data/ folder, the sample devices seed the targets too:
// their descriptions, store records and registry blobs, framed as each
// target reads them.
#include "formats/VD6287Layout.h"
#include "formats/XwCAT2Layout.h"
#include "formats/XwClLayout.h"
#include "fuzz/common/FuzzSupport.h"

#include <nlohmann/json.hpp>
#include <sqlite3.h>

#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <iterator>
#include <string>
#include <unistd.h>
#include <vector>

namespace fs = std::filesystem;

namespace {

using Bytes = std::vector<uint8_t>;

fs::path gOut;

void put(Bytes& b, size_t at, uint64_t v, size_t n)
{
    if (b.size() < at + n)
        b.resize(at + n, 0);
    for (size_t i = 0; i < n; ++i)
        b[at + i] = uint8_t(v >> (8 * i));
}
void u8(Bytes& b, size_t at, unsigned v) { put(b, at, v, 1); }
void u16(Bytes& b, size_t at, unsigned v) { put(b, at, v, 2); }
void u32(Bytes& b, size_t at, uint32_t v) { put(b, at, v, 4); }
void f32(Bytes& b, size_t at, float v)
{
    uint32_t bits;
    std::memcpy(&bits, &v, 4);
    u32(b, at, bits);
}
void f64(Bytes& b, size_t at, double v)
{
    uint64_t bits;
    std::memcpy(&bits, &v, 8);
    put(b, at, bits, 8);
}

Bytes framed(std::initializer_list<uint8_t> head, const Bytes& body)
{
    Bytes b(head);
    b.insert(b.end(), body.begin(), body.end());
    return b;
}
Bytes text(const std::string& s) { return Bytes(s.begin(), s.end()); }

void seed(const std::string& target, const std::string& name, const Bytes& bytes)
{
    fs::create_directories(gOut / target);
    std::ofstream(gOut / target / name, std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes.data()), std::streamsize(bytes.size()));
}

// A smooth sensitivity curve per channel, peaking at a channel's own band.
int sensitivity(unsigned c, unsigned s)
{
    const int peak = int(60 + 60 * c);
    const int d = int(s) - peak;
    return std::max(0, 3000 - d * d / 4);
}

// ---- Factory records ------------------------------------------------------------

Bytes xwcl(uint8_t deviceID, unsigned entries, uint8_t chipType, uint8_t nChannels)
{
    namespace x = stored::xwcl;
    Bytes b(x::kHeaderSize + x::kEntrySize * entries);
    u8(b, x::header::versionMajor, 2);
    u8(b, x::header::versionMinor, 3);
    u8(b, x::header::entrySelector, entries);
    u32(b, x::header::chipID, fz::kChipId);
    u8(b, x::header::deviceID, deviceID);
    u8(b, x::header::chipType, chipType);
    for (unsigned k = 0; k < entries; ++k) {
        const size_t e = x::entryOffset(k);
        u8(b, e + x::entry::nChannels, nChannels);
        u8(b, e + x::entry::nGains, 9);
        u16(b, e + x::entry::iTime, 100);
        u16(b, e + x::entry::aux1, 200);
        u16(b, e + x::entry::aux2, 300);
        u16(b, e + x::entry::fudge, 0x4000);
        for (unsigned c = 0; c < x::kStoredChannels; ++c) {
            for (unsigned g = 0; g < x::kStoredGains; ++g)
                u16(b, e + x::entry::gainScale + x::entry::gainScaleStride * c + 2 * g, 0x4000 + 0x100 * g);
            u16(b, e + x::entry::offsetCounts + 2 * c, 0xFF00);
            u32(b, e + x::entry::luxCoeff + 4 * c, 65536 * (c + 1));
            u32(b, e + x::entry::cctCoeff + 4 * c, 256 * (c + 2));
            for (unsigned s = 0; s < x::kSpectrumSamples; ++s)
                u16(b, e + x::entry::spectrum + x::entry::spectrumStride * c + 2 * s, sensitivity(c, s));
        }
    }
    return b;
}

Bytes xwcaT2(uint8_t minor, uint8_t nChannels)
{
    namespace x = stored::xwca;
    Bytes b(x::kSize);
    u8(b, x::versionMajor, 1);
    u8(b, x::versionMinor, minor);
    const char* chip = "1A2B3C4D";
    for (size_t i = 0; i < x::kChipIdDigits; ++i)
        u8(b, x::chipID + i, uint8_t(chip[i]));
    u8(b, x::deviceID, 0x21);
    u8(b, x::nChannels, nChannels);
    u8(b, x::nGains, 5);
    u16(b, x::fudge, 0x4100);
    for (unsigned c = 0; c < x::kMaxChannels; ++c) {
        for (unsigned g = 0; g < 9; ++g)
            u16(b, x::gainScale + x::gainScaleStride * c + 2 * g, 0x3000 + g);
        u32(b, x::luxCoeff + 4 * c, 0x01000000u * (c + 1));
        u32(b, x::cctCoeff + 4 * c, 16384 * (c + 1));
    }
    u8(b, x::gainIndex, 12);
    u16(b, x::iTime, 180);
    for (unsigned c = 0; c < x::kStoredSpectra; ++c)
        for (unsigned s = 0; s < x::kSpectrumSamples; ++s)
            u32(b, x::spectrum + x::spectrumStride * c + 4 * s, uint32_t(sensitivity(c, s) * 10));
    return b;
}

Bytes vd6287v3(uint8_t entries)
{
    namespace v = stored::vd6287;
    Bytes b(v::kV3Size);
    u8(b, v::header::versionMajor, 3);
    u8(b, v::header::versionMinor, 1);
    u8(b, v::header::numBlobs, v::kBlobs);
    for (unsigned k = 0; k < v::kBlobs; ++k) {
        const size_t o = v::v3BlobOffset(k);
        u8(b, o + v::blob::type, k);
        u8(b, o + v::blob::numChannels, v::kChannels);
        u8(b, o + v::blob::numGains, v::kGains);
        u8(b, o + v::blob::gainIndex, 3);
        u16(b, o + v::blob::valueA, 1234);
        u16(b, o + v::blob::valueB, 8192);
        for (unsigned j = 0; j < v::kChannels; ++j) {
            for (unsigned g = 0; g < v::kGains; ++g)
                u16(b, o + v::blob::gainRatio + v::blob::gainRatioStride * j + 2 * g, 16384);
            u8(b, o + v::blob::channelByte + 2 * j, 0x40 + j);
            u16(b, o + v::blob::channelFactor + 2 * j, 16384);
            u32(b, o + v::blob::luxCoeff + 4 * j, 65536 * (j + 1));
            u32(b, o + v::blob::cctCoeff + 4 * j, 256 * (j + 1));
            u32(b, o + v::blob::channelValue + 4 * j, 0x20000);
        }
        for (unsigned c = 0; c < v::kStoredSpectra; ++c)
            for (unsigned s = 0; s < v::kSpectrumSamples; ++s)
                u16(b, o + v::blob::spectrum + v::blob::spectrumStride * c + 2 * s, sensitivity(c, s));
        u8(b, o + v::blob::entryCount, entries);
        for (unsigned m = 0; m < v::kMaxEntries; ++m)
            for (size_t table : {v::blob::tableA, v::blob::tableB, v::blob::tableC, v::blob::tableE, v::blob::tableF})
                u16(b, o + table + 2 * m, 0x100 + m);
    }
    return b;
}

// Version 1 carries the same content at its own offsets ({v3, v1, length}).
Bytes vd6287v1(uint8_t count)
{
    namespace v = stored::vd6287;
    const Bytes v3 = vd6287v3(7);
    Bytes b(v::kV1Size);
    std::copy(v3.begin(), v3.begin() + v::kHeaderSize, b.begin());
    const size_t moves[][3] = {{0, 0, 7}, {11, 9, 6}, {17, 19, 4}, {21, 23, 108}, {141, 143, 95}, {238, 239, 4812}};
    for (unsigned k = 0; k < v::kBlobs; ++k) {
        for (const auto& m : moves)
            std::copy_n(v3.begin() + long(v::v3BlobOffset(k) + m[0]), m[2],
                        b.begin() + long(v::v1BlobOffset(k) + m[1]));
        const size_t o = v::v1BlobOffset(k);
        u8(b, o + v::v1blob::count, count);
        for (unsigned m = 0; m < 4; ++m) {
            u16(b, o + v::v1blob::tableA + 2 * m, 0x200 + m);
            u16(b, o + v::v1blob::tableB + 2 * m, 0x300 + m);
        }
    }
    return b;
}

// ---- Registry blobs -----------------------------------------------------------------

Bytes genericEntry(uint8_t orientation, uint8_t revision)
{
    const unsigned nGains = 9, nChannels = 4;
    const size_t block = 4 + 2 * nGains;
    const size_t spectrum = 24 + block * nChannels;
    const size_t spectra = spectrum + (revision == 0 ? 28 : 32);
    Bytes e(spectra + 401 * 4 * 2);
    u8(e, 0, 2);
    u8(e, 2, orientation);
    u16(e, 4, unsigned(e.size()));
    u16(e, 8, 0x200);
    u16(e, 10, 250);
    u8(e, 17, 8);
    u8(e, 18, 7);
    u8(e, 19, nChannels);
    u8(e, 20, nGains);
    for (unsigned c = 0; c < nChannels; ++c) {
        u8(e, 24 + block * c, 3);
        u16(e, 24 + block * c + 1, 1500);
        for (unsigned g = 0; g < nGains; ++g)
            u16(e, 24 + block * c + 4 + 2 * g, 256 + 64 * g);
    }
    u8(e, spectrum, 3);
    u16(e, spectrum + 2, 401);
    for (unsigned c = 0; c < 4; ++c)
        u32(e, spectrum + 4 + 4 * c, 1000000);
    for (unsigned s = 0; s < 401; ++s)
        for (unsigned c = 0; c < 4; ++c)
            u16(e, spectra + 2 * (4 * s + c), sensitivity(c, s) / 4);
    return e;
}

Bytes vd6286Entry(uint8_t orientation)
{
    Bytes e(4156);
    u8(e, 0, 5);
    u8(e, 2, orientation);
    u8(e, 3, 3);
    u16(e, 4, 4156);
    u16(e, 8, 0x300);
    u8(e, 19, 5);
    u8(e, 20, 5);
    for (unsigned c = 0; c < 5; ++c)
        for (unsigned g = 0; g < 5; ++g)
            u16(e, 24 + 14 * c + 4 + 2 * g, 512 + 32 * g);
    u8(e, 96, 2);
    u16(e, 98, 401);
    for (unsigned c = 0; c < 5; ++c)
        u32(e, 100 + 4 * c, 1000000);
    for (unsigned s = 0; s < 401; ++s)
        for (unsigned c = 0; c < 5; ++c)
            u16(e, 144 + 2 * (5 * s + c), sensitivity(c, s) / 4);
    return e;
}

Bytes blob(const std::vector<Bytes>& entries, uint8_t revision)
{
    Bytes b(8);
    for (const auto& e : entries)
        b.insert(b.end(), e.begin(), e.end());
    u8(b, 0, revision);
    u8(b, 1, 1);
    u8(b, 2, unsigned(entries.size()));
    u16(b, 4, unsigned(b.size()));
    return b;
}

Bytes auxEntry(uint8_t orientation)
{
    Bytes e(56);
    u8(e, 2, orientation);
    u16(e, 4, 56);
    for (unsigned k = 0; k < 4; ++k)
        u32(e, 40 + 4 * k, 900000 + 10000 * k);
    return e;
}

// sysconfig_blobs framing: flags, orientation, channels, u16 length, blob, aux.
Bytes sysconfigInput(uint8_t flags, uint8_t channels, const Bytes& calibration, const Bytes& aux)
{
    Bytes b = {flags, 1, channels, 0, 0};
    u16(b, 3, unsigned(calibration.size()));
    b.insert(b.end(), calibration.begin(), calibration.end());
    b.insert(b.end(), aux.begin(), aux.end());
    return b;
}

// ---- Sample records -------------------------------------------------------------------

Bytes sampleRecord(float lux, bool xyzInRecord)
{
    Bytes r(137);
    u8(r, 4, 5);
    u8(r, 5, 1);
    u32(r, 8, 100);
    u32(r, 12, 100);
    u32(r, 16, 65536);
    f32(r, 20, lux);
    f32(r, 24, lux);
    const float channels[6] = {120, 210, 95, 400, 60, 12};
    for (unsigned i = 0; i < 6; ++i)
        f32(r, 28 + 4 * i, channels[i] * lux / 100.0f);
    u16(r, 80, 1);
    u8(r, 107, xyzInRecord);
    f32(r, 132, lux);
    u8(r, 136, 1);
    return r;
}

// sample_record framing: flags, channels, db channels, sensor, chip, mitigation,
// RGBC values, chromaticity, lambda, time stamp, record.
Bytes sampleInput(uint8_t flags, uint8_t channels, uint8_t dbChannels, uint8_t sensor, uint8_t chip, const Bytes& r)
{
    Bytes b = {flags, channels, dbChannels, sensor, chip, 1};
    for (unsigned i = 0; i < 6; ++i)
        u32(b, b.size(), 100 * (i + 1));
    f64(b, b.size(), 0.3127);
    f64(b, b.size(), 0.3290);
    f64(b, b.size(), 250.0);
    f32(b, b.size(), 0.01f);
    put(b, b.size(), 123456789, 8);
    b.insert(b.end(), r.begin(), r.end());
    return b;
}

// ---- Database files -----------------------------------------------------------------------

Bytes readFile(const fs::path& file)
{
    std::ifstream in(file, std::ios::binary);
    return Bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
}

// A small SQLite file made by running `sql`, as bytes.
Bytes sqliteFile(const std::string& sql)
{
    const fs::path file = fs::temp_directory_path() / ("vantish-seed-" + std::to_string(getpid()) + ".sqlite");
    fs::remove(file);
    sqlite3* db = nullptr;
    sqlite3_open(file.c_str(), &db);
    sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr);
    sqlite3_close(db);
    Bytes bytes = readFile(file);
    fs::remove(file);
    return bytes;
}

std::string spectraRows(int sources, int samples)
{
    std::string t = "T Spectra ID X Y Z";
    for (int s = 0; s < samples; ++s)
        t += " S" + std::to_string(s);
    t += "\n";
    for (int i = 0; i < sources; ++i) {
        t += "R " + std::to_string(i) + " 0." + std::to_string(3 + i) + " 0.35 0.3";
        for (int s = 0; s < samples; ++s)
            t += " " + std::to_string(1 + (s * (i + 1)) % 7);
        t += "\n";
    }
    return t;
}

void databaseSeeds()
{
    const std::string reference = "@ref\nT Info version sources\nR 1.5 3\n" + spectraRows(3, 12);
    seed("light_databases", "reference", framed({0x03}, text(reference)));
    seed("light_databases", "reference2-five-channels",
         framed({0x0C}, text("@ref2\nT Info version sources\nR 2 3\n" + spectraRows(3, 20))));
    const std::string cache = "@cache\nT Info version smallversion sources orientation algo chipID\n"
                              "R 1.5 1.1 3 1 3 439041101\nT RR R G B C\nR 1 2 3 4\nR 2 3 4 5\nR 3 4 5 6\n"
                              "T XX X Y Z\nR 0.3 0.35 0.3\nR 0.4 0.35 0.25\nR 0.5 0.3 0.2\n";
    seed("light_databases", "reference-and-cache", framed({0x43}, text(reference + cache)));
    seed("light_databases", "cache-five-channels",
         framed({0x04}, text("@cache\nT Info version smallversion sources orientation algo\nR 1.5 1.1 6 1 3\n"
                             "T RR CH0 CH1 CH2 CH3 CH4\nR 1 2 3 4 5\nR 2 3 4 5 6\nR 3 4 5 6 7\nR 1 1 1 1 1\n"
                             "R 2 2 2 2 2\nR 3 3 3 3 3\nT XX X Y Z\nR 1 1 1\nR 2 2 2\nR 3 3 3\nR 4 4 4\n"
                             "R 5 5 5\nR 6 6 6\n")));

    std::string spectraSql = "CREATE TABLE Spectra (ID INTEGER PRIMARY KEY, X REAL, Y REAL, Z REAL, S0 REAL, S1 REAL, "
                             "S2 REAL, S3 REAL);";
    for (int i = 0; i < 3; ++i)
        spectraSql += "INSERT INTO Spectra VALUES (" + std::to_string(i) + ", 0.3, 0.35, 0.3, 1, 2, 3, 4);";
    const Bytes rawReference = sqliteFile("CREATE TABLE Info (version REAL, sources INTEGER, columns INTEGER, "
                                          "samples INTEGER); INSERT INTO Info VALUES (1.5, 3, 8, 4);" +
                                          spectraSql);
    Bytes raw = framed({0x03}, text("@rawref\n"));
    raw.insert(raw.end(), rawReference.begin(), rawReference.end());
    seed("light_databases", "raw-reference", raw);
    const Bytes rawCache =
        sqliteFile("CREATE TABLE Info (version Single, smallversion Single, sources Long, orientation Long, algo Long);"
                   "INSERT INTO Info VALUES (1.5, 1.1, 6, 1, 3);"
                   "CREATE TABLE RR (R Single, G Single, B Single, C Single);"
                   "INSERT INTO RR VALUES (1,2,3,4); INSERT INTO RR VALUES (2,3,4,5); INSERT INTO RR VALUES (3,4,5,6);"
                   "INSERT INTO RR VALUES (1,1,1,1); INSERT INTO RR VALUES (2,2,2,2); INSERT INTO RR VALUES (3,3,3,3);"
                   "CREATE TABLE XX (X Single, Y Single, Z Single);"
                   "INSERT INTO XX VALUES (1,1,1); INSERT INTO XX VALUES (2,2,2); INSERT INTO XX VALUES (3,3,3);"
                   "INSERT INTO XX VALUES (4,4,4); INSERT INTO XX VALUES (5,5,5); INSERT INTO XX VALUES (6,6,6);");
    raw = framed({0x03}, text("@rawcache\n"));
    raw.insert(raw.end(), rawCache.begin(), rawCache.end());
    seed("light_databases", "raw-cache", raw);
}

// ---- Targets --------------------------------------------------------------------------------

void factorySeeds()
{
    namespace x = stored::xwcl;
    seed("factory_layouts", "xwca-t2-v1.7", framed({0, 0}, xwcaT2(7, 5)));
    seed("factory_layouts", "xwca-t2-v1.6-four-channels", framed({0, 0}, xwcaT2(6, 4)));
    for (uint8_t device : {x::kDeviceKestrow, x::kDeviceMarlit, x::kDeviceFourChannelA, x::kDeviceSixChannel}) {
        const uint8_t channels = device == x::kDeviceSixChannel ? 6 : device == x::kDeviceFourChannelA ? 4 : 5;
        seed("factory_layouts", "xwcl-device-" + std::to_string(device), framed({1, 0}, xwcl(device, 1, 0, channels)));
    }
    seed("factory_layouts", "xwcl-two-entries-chip-type-2", framed({1, 2}, xwcl(x::kDeviceFourChannelB, 2, 2, 4)));
    seed("factory_layouts", "xwcl-six-channels-chip-type-1", framed({1, 1}, xwcl(x::kDeviceSixChannel, 2, 1, 6)));
    seed("factory_layouts", "vd6287-v1", framed({2, 0}, vd6287v1(3)));
    seed("factory_layouts", "vd6287-v1-no-entries", framed({2, 0}, vd6287v1(255)));
    seed("factory_layouts", "vd6287-v3", framed({3, 0}, vd6287v3(7)));
    seed("factory_layouts", "any-length", framed({9, 0}, Bytes(64, 0x41)));

    // factory_store: class, size choice (0 = as given), channels, sensor type.
    seed("factory_store", "xwca-t2", framed({0x00, 0, 5, 5}, xwcaT2(7, 5)));
    seed("factory_store", "xwca-t2-lambda-cache", framed({0x28, 0, 5, 5}, xwcaT2(7, 5)));
    seed("factory_store", "xwcl-five", framed({0x01, 0, 5, 5}, xwcl(x::kDeviceKestrow, 1, 0, 5)));
    seed("factory_store", "xwcl-four-rebuild", framed({0x11, 0, 4, 1}, xwcl(x::kDeviceFourChannelA, 1, 0, 4)));
    seed("factory_store", "xwcl-six", framed({0x01, 0, 6, 3}, xwcl(x::kDeviceSixChannel, 2, 0, 6)));
    seed("factory_store", "xwcm-vd6287-v3-dravik", framed({0x06, 0, 5, 8}, vd6287v3(7)));
    seed("factory_store", "xwcl-vd6287-v1", framed({0x01, 0, 5, 8}, vd6287v1(3)));
    seed("factory_store", "dravik-without-record", framed({0x05, 0, 5, 5}, Bytes(16, 0)));
}

void sysconfigSeeds()
{
    seed("sysconfig_blobs", "generic", sysconfigInput(0x06, 4, blob({genericEntry(1, 0)}, 0), {}));
    seed("sysconfig_blobs", "generic-revision-1-aux",
         sysconfigInput(0x0E, 4, blob({genericEntry(2, 1), genericEntry(1, 1)}, 1), blob({auxEntry(1)}, 0)));
    seed("sysconfig_blobs", "generic-async-twice", sysconfigInput(0x47, 4, blob({genericEntry(1, 0)}, 0), {}));
    seed("sysconfig_blobs", "vd6286", sysconfigInput(0x06, 5, blob({vd6286Entry(1)}, 0), {}));
    seed("sysconfig_blobs", "vd6286-async-override", sysconfigInput(0x87, 5, blob({vd6286Entry(1)}, 0), {}));
}

void sampleSeeds()
{
    seed("sample_record", "four-channels", sampleInput(0x00, 4, 4, 1, 0, sampleRecord(150, false)));
    seed("sample_record", "five-channels-lambda", sampleInput(0x18, 5, 5, 5, 0, sampleRecord(80, false)));
    seed("sample_record", "six-channels-spike-test", sampleInput(0x04, 6, 5, 3, 1, sampleRecord(3, false)));
    seed("sample_record", "vd6287-xyz-in-record", sampleInput(0x00, 5, 5, 8, 0, sampleRecord(200, true)));
    seed("sample_record", "overrides", sampleInput(0x03, 4, 4, 1, 0, sampleRecord(150, false)));
    seed("sample_record", "short-record", sampleInput(0x00, 4, 4, 8, 0, Bytes(40, 7)));
}

void propertySeeds()
{
    // key byte, value tag, value bytes (see client_properties.cpp).
    seed("client_properties", "rgbc-array",
         {4, 0, 0, 11, 4, 5, 1, 0, 0, 0, 5, 2, 0, 0, 0, 5, 3, 0, 0, 0, 5, 4, 0, 0, 0});
    seed("client_properties", "rgbc-off", {4, 0, 0, 5, 0, 0, 0, 0});
    Bytes chromaticity = {4, 0, 1, 11, 3, 8};
    f64(chromaticity, chromaticity.size(), 0.3127);
    u8(chromaticity, chromaticity.size(), 8);
    f64(chromaticity, chromaticity.size(), 0.329);
    u8(chromaticity, chromaticity.size(), 8);
    f64(chromaticity, chromaticity.size(), 100.0);
    seed("client_properties", "chromaticity", chromaticity);
    Bytes lambda = {5, 0, 2, 7};
    f32(lambda, lambda.size(), 0.05f);
    lambda.insert(lambda.end(), {3, 5, 2, 0, 0, 0});
    seed("client_properties", "lambda-and-mitigation", lambda);
    seed("client_properties", "rebuild", {4, 0, 4, 1});
    seed("client_properties", "rebuild-sysconfig", {4, 1, 4, 1});
    seed("client_properties", "other-key", {4, 0, 5, 4, 'n', 'a', 'm', 'e', 9, 3, 'a', 'b', 'c'});
}

void hostInputSeeds()
{
    seed("event_input", "csv",
         framed({0, 4}, text("# samples\nts,lux,c0,c1,c2,c3\n0,100,50,80,40,200\n"
                             "0.1,120,60,90,45,230\n!set RGBCOverride=[1,2,3,4]\n!copy\n"
                             "0.2,,,,,\n")));
    seed("event_input", "csv-all-fields",
         framed({0, 5},
                text("status,sampleChannelCount,sampleOrientation,nits,integrationTime,reportInterval,gain,lux,"
                     "rawLux,c0,c1,c2,c3,c4,c5,cct,timestamp,subsamples,mode,xTalk0,xTalk1,xTalk2,xTalk3,"
                     "xTalk4,xyzInRecord,xyzSensorX,xyzSensorY,xyzSensorZ,filteredLux,filteredLuxValid,ts\n"
                     "1,5,1,300,100,100,2.5,150,149,1,2,3,4,5,6,5000,7,2,1,1,2,3,4,5,1,0.3,0.35,0.3,151,1,3\n")));
    seed("event_input", "json-lines",
         framed({1, 4}, text("{\"lux\": 100, \"c0\": 50, \"c3\": 200, \"ts\": 0.5}\n"
                             "{\"set\": {\"ChromaticityOverride\": [0.31, 0.33]}}\n"
                             "{\"copy\": true}\n{\"set\": {\"blob\": {\"data\": \"0a0b\"}}}\n"
                             "{\"set\": {\"file\": {\"dataFile\": \"blob.bin\"}}}\n")));

    seed("device_description", "generated-sysconfig", text(R"({"name": "fuzz", "service": {"registryID": 4097,
  "properties": {"IONameMatched": "als,ct711", "NumberOfChannels": 4, "ALSSensorType": 1,
  "SysConfigCalibration": true, "chip_id": {"int": 5}, "color-algo-lambda": {"float": 0.5}}},
  "registry": [{"id": 4097, "parent": 4096}, {"id": 4096, "properties": {
    "IOHIDOrientationType": {"data": "01 00 00 00"}, "color-algo-override": {"dataFile": "blob.bin"},
    "alsCalibration": {"data": "00 01 00 00 08 00 00 00"}}}],
  "bootArgs": "quiet", "deviceInfo": {"ProductName": "Dravik OS", "DeviceColor": "2", "productType": 47}})"));
}

// ---- Sample devices of data/ ------------------------------------------------------------

uint8_t layoutOfSize(size_t size)
{
    namespace v = stored::vd6287;
    namespace x = stored::xwcl;
    if (size == stored::xwca::kSize)
        return 0;
    if (size == x::kOneEntrySize || size == x::kTwoEntrySize)
        return 1;
    return size == v::kV1Size ? 2 : size == v::kV3Size ? 3 : 9;
}

uint8_t storeClass(const std::string& name) { return name == "XwCl" ? 1 : name == "XwCM" ? 2 : 0; }

int serviceInt(const nlohmann::json& device, const char* key, int fallback)
{
    const auto& properties =
        device.value("service", nlohmann::json::object()).value("properties", nlohmann::json::object());
    return properties.contains(key) && properties[key].is_number_integer() ? properties[key].get<int>() : fallback;
}

void deviceSeeds(const fs::path& data)
{
    std::error_code ec;
    for (const auto& entry : fs::directory_iterator(data / "devices", ec)) {
        const fs::path folder = entry.path();
        const std::string name = "data-" + folder.filename().string();
        const Bytes description = readFile(folder / "device.json");
        if (description.empty())
            continue;
        seed("device_description", name, description);
        const nlohmann::json device = nlohmann::json::parse(description.begin(), description.end(), nullptr, false);
        const uint8_t channels = uint8_t(serviceInt(device, "NumberOfChannels", 5));
        const uint8_t sensor = uint8_t(serviceInt(device, "ALSSensorType", 0));

        for (const auto& record : fs::directory_iterator(folder / "store", ec)) {
            if (record.path().has_extension())
                continue; // the decoded .json beside each record
            const Bytes bytes = readFile(record.path());
            const uint8_t cls = storeClass(record.path().filename().string());
            seed("factory_layouts", name, framed({layoutOfSize(bytes.size()), 0}, bytes));
            // "XwCM" is read on Dravik OS only.
            seed("factory_store", name, framed({uint8_t(cls == 2 ? cls | 4 : cls), 0, channels, sensor}, bytes));
        }
        const Bytes calibration = readFile(folder / "registry" / "alsCalibration.bin");
        if (!calibration.empty()) {
            const Bytes aux = readFile(folder / "registry" / "alsAuxCalibration.bin");
            seed("sysconfig_blobs", name,
                 sysconfigInput(uint8_t(aux.empty() ? 0x06 : 0x0E), channels, calibration, aux));
        }
    }
}

} // namespace

int main(int argc, char** argv)
{
    if (argc != 2 && argc != 3) {
        std::fprintf(stderr, "usage: %s OUTPUT_FOLDER [DATA_FOLDER]\n", argv[0]);
        return 2;
    }
    gOut = argv[1];
    if (argc == 3)
        deviceSeeds(argv[2]);
    factorySeeds();
    sysconfigSeeds();
    sampleSeeds();
    propertySeeds();
    databaseSeeds();
    hostInputSeeds();
    return 0;
}
