// A synthetic unit for the stress and fault tests: two reference databases,
// a factory record (XwCl) and a registry calibration blob with the same four
// channel spectra, and the ALS events such a unit produces.
//
// Every light source of a reference file has the same XYZ, which differs
// between the two files. The colour fit weights and regularises the sources,
// but whatever it does, a matrix fitted to identical XYZ rows maps any
// measurement onto that one direction. So the chromaticity of every colour the
// filter writes tells which database it came from: that of bzlight.sqlite,
// that of bzlight-02.sqlite, or a blend of the two, which a database published
// whole can never give. Header-only: both test programs include it.
#pragma once

#include "common/ALSEvents.h"
#include "sysconfig/SysConfigFixture.h"

#include <CoreFoundation/CoreFoundation.h>
#include <IOKit/hid/IOHIDEvent.h>
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>
#include <unistd.h>
#include <vector>

namespace unit {

constexpr unsigned kSamples = 401; // 300 nm to 1100 nm in 2 nm steps
constexpr unsigned kChannels = 4;
constexpr int kSources = 24;
constexpr float kLux = 200.0f;

inline double wavelength(unsigned sample) { return 300.0 + 2.0 * sample; }
inline double bump(double nm, double centre, double width)
{
    return std::exp(-0.5 * std::pow((nm - centre) / width, 2));
}

// ---- The two reference databases ---------------------------------------------------

struct Chromaticity {
    double x, y;
};

struct Reference {
    const char* file;
    const char* version;
    std::array<float, 3> xyz; // of every source
    Chromaticity chromaticity() const
    {
        const double sum = double(xyz[0]) + xyz[1] + xyz[2];
        return {xyz[0] / sum, xyz[1] / sum};
    }
};

// Read by the configuration-supplied path and by XwCl units of four channels.
inline const Reference kDefaultReference{"bzlight.sqlite", "1.0", {50.0f, 100.0f, 50.0f}};
// Read by XwCl units of device id 14 (what the factory record below says).
inline const Reference kSecondReference{"bzlight-02.sqlite", "2.0", {120.0f, 100.0f, 30.0f}};

// Source i: a band of light whose centre moves across the visible range,
// on a faint flat floor.
inline double sourcePower(int source, unsigned sample)
{
    const double centre = 420.0 + 260.0 * source / (kSources - 1);
    return 0.05 + bump(wavelength(sample), centre, 35.0);
}

inline void execSql(sqlite3* db, const std::string& sql)
{
    char* error = nullptr;
    ASSERT_EQ(sqlite3_exec(db, sql.c_str(), nullptr, nullptr, &error), SQLITE_OK) << (error ? error : "");
}

inline void writeReference(const std::filesystem::path& bundle, const Reference& reference, int sources = kSources)
{
    std::filesystem::create_directories(bundle);
    const auto file = bundle / reference.file;
    std::filesystem::remove(file);
    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open(file.c_str(), &db), SQLITE_OK);
    execSql(db, "CREATE TABLE Info (version REAL, sources INTEGER)");
    execSql(db, std::string("INSERT INTO Info VALUES (") + reference.version + ", " + std::to_string(sources) + ")");
    std::string create = "CREATE TABLE Spectra (ID INTEGER, X REAL, Y REAL, Z REAL";
    for (unsigned s = 0; s < kSamples; ++s)
        create += ", S" + std::to_string(s) + " REAL";
    execSql(db, create + ")");
    execSql(db, "BEGIN");
    for (int i = 0; i < sources; ++i) {
        std::string row = "INSERT INTO Spectra VALUES (" + std::to_string(i);
        for (float v : reference.xyz)
            row += ", " + std::to_string(v);
        for (unsigned s = 0; s < kSamples; ++s)
            row += ", " + std::to_string(float(sourcePower(i, s)));
        execSql(db, row + ")");
    }
    execSql(db, "COMMIT");
    sqlite3_close(db);
}

inline void writeReferences(const std::filesystem::path& bundle)
{
    writeReference(bundle, kDefaultReference);
    writeReference(bundle, kSecondReference);
}

// ---- The unit's channels ------------------------------------------------------------

// Counts per unit of light: red, green, blue and a broad clear channel.
inline int16_t channelSensitivity(unsigned sample, unsigned channel)
{
    static constexpr double centre[kChannels] = {600.0, 535.0, 460.0, 530.0};
    static constexpr double width[kChannels] = {30.0, 30.0, 25.0, 90.0};
    return int16_t(std::lround(4000.0 * bump(wavelength(sample), centre[channel], width[channel])));
}

// What the sensor counts under a band of light at `centre` nm, scaled to
// about a thousand counts in the brightest channel.
inline std::array<float, kChannels> countsUnder(double centre)
{
    std::array<double, kChannels> sums{};
    for (unsigned s = 0; s < kSamples; ++s)
        for (unsigned c = 0; c < kChannels; ++c)
            sums[c] += channelSensitivity(s, c) * (0.05 + bump(wavelength(s), centre, 35.0));
    const double largest = *std::max_element(sums.begin(), sums.end());
    std::array<float, kChannels> counts{};
    for (unsigned c = 0; c < kChannels; ++c)
        counts[c] = float(1000.0 * sums[c] / largest);
    return counts;
}

// ---- Calibration sources --------------------------------------------------------------

inline void putLE(std::vector<uint8_t>& bytes, size_t offset, uint64_t value, size_t size)
{
    for (size_t i = 0; i < size; ++i)
        bytes.at(offset + i) = uint8_t(value >> (8 * i));
}

// A one-entry XwCl factory record for device id 14 (the second reference
// database), chip ID 0, four channels with unit lux weights.
inline std::vector<uint8_t> xwclRecord()
{
    constexpr size_t kHeader = 76, kEntry = 5080;
    std::vector<uint8_t> b(kHeader + kEntry, 0);
    putLE(b, 4, 2, 1); // version 2.3
    putLE(b, 5, 3, 1);
    putLE(b, 10, 1, 1); // entry 1
    putLE(b, 16, 14, 1);
    const size_t e = kHeader;
    putLE(b, e + 4, kChannels, 1);
    putLE(b, e + 5, 9, 1);
    putLE(b, e + 6, 100, 2);
    putLE(b, e + 18, 0x4000, 2);
    for (unsigned c = 0; c < kChannels; ++c) {
        for (unsigned g = 0; g < 9; ++g)
            putLE(b, e + 20 + 18 * c + 2 * g, 0x4000, 2);
        putLE(b, e + 164 + 4 * c, 65536, 4);
        for (unsigned s = 0; s < kSamples; ++s)
            putLE(b, e + 268 + 802 * c + 2 * s, uint16_t(channelSensitivity(s, c)), 2);
    }
    return b;
}

// An "alsCalibration" blob with one generic entry for `orientation`.
inline sctest::Bytes calibrationBlob(uint8_t orientation)
{
    sctest::GenericEntry entry;
    entry.orientation = orientation;
    entry.spectrum = [](unsigned s, unsigned c) { return channelSensitivity(s, c); };
    return sctest::blob({entry.bytes()});
}

// Cache writes commit statement by statement; with temporary folders on a
// memory file system the tests do not wait for the disk's flushes. Takes
// effect for folders made afterwards, and only when TMPDIR is not set.
inline void preferMemoryTemporaryFolder()
{
    if (!std::getenv("TMPDIR") && std::filesystem::is_directory("/dev/shm") && access("/dev/shm", W_OK) == 0)
        setenv("TMPDIR", "/dev/shm", 0);
}

inline void writeFile(const std::filesystem::path& file, const std::vector<uint8_t>& bytes)
{
    std::ofstream(file, std::ios::binary | std::ios::trunc)
        .write(reinterpret_cast<const char*>(bytes.data()), std::streamsize(bytes.size()));
}

inline std::vector<uint8_t> readFile(const std::filesystem::path& file)
{
    std::ifstream in(file, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

// ---- Events and the colour they come back with ------------------------------------------

// An ALS event carrying the driver's 137-byte sample record.
inline vt::Event createEvent(const std::array<float, kChannels>& counts, float lux = kLux)
{
    std::array<float, 6> channels{};
    std::copy(counts.begin(), counts.end(), channels.begin());
    const vt::Record record = vt::Record().sampleChannelCount(kChannels).lux(lux).channels(channels);
    return vt::createALSEvent(&record);
}

struct EventColour {
    long colourSpace;
    std::array<double, 3> xyz;

    // Chromaticity, or nothing when the event carries no colour.
    std::optional<Chromaticity> chromaticity() const
    {
        const double sum = xyz[0] + xyz[1] + xyz[2];
        if (colourSpace == 0 || !(sum > 0.0))
            return std::nullopt;
        return Chromaticity{xyz[0] / sum, xyz[1] / sum};
    }
};

inline EventColour colourOf(IOHIDEventRef event) { return {long(vt::colourSpaceOf(event)), vt::eventXYZ(event)}; }

// Distance in the chromaticity plane.
inline double distance(Chromaticity a, Chromaticity b) { return std::hypot(a.x - b.x, a.y - b.y); }

} // namespace unit
