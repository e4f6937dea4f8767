// Test side of registry calibration: blobs written byte by byte at the format's
// offsets (independently of the plug-in's readers), a tiny reference database,
// and a plug-in instance attached to a service whose registry entry carries
// the blobs. Header-only: the plug-in tests use it too.
#pragma once

#include "common/PlugInHolder.h"
#include "common/TestSupport.h"
#include "sysconfig/SysConfigCalibration.h"

#include <VantishPlatform/DispatchControl.h>
#include <VantishPlatform/HIDHost.h>
#include <VantishPlatform/Paths.h>

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace sctest {

// A little-endian byte buffer that grows as fields are written.
class Bytes {
public:
    explicit Bytes(size_t size = 0) : bytes_(size, 0) {}

    Bytes& u8(size_t offset, uint8_t v) { return put(offset, v, 1); }
    Bytes& u16(size_t offset, uint16_t v) { return put(offset, v, 2); }
    Bytes& u32(size_t offset, uint32_t v) { return put(offset, v, 4); }
    Bytes& i16(size_t offset, int16_t v) { return put(offset, uint16_t(v), 2); }
    Bytes& i32(size_t offset, int32_t v) { return put(offset, uint32_t(v), 4); }
    Bytes& append(const Bytes& more)
    {
        // Resized then copied: GCC 12 takes vector::insert of a range for an
        // overflow at -O2 with sanitizers (a false -Warray-bounds).
        const std::vector<uint8_t> tail = more.bytes_; // `more` may be this buffer
        const size_t at = bytes_.size();
        bytes_.resize(at + tail.size());
        std::copy(tail.begin(), tail.end(), bytes_.begin() + std::ptrdiff_t(at));
        return *this;
    }
    Bytes& resize(size_t size)
    {
        bytes_.resize(size, 0);
        return *this;
    }

    size_t size() const { return bytes_.size(); }
    const std::vector<uint8_t>& vector() const { return bytes_; }
    CFDataRef createData() const { return CFDataCreate(nullptr, bytes_.data(), CFIndex(bytes_.size())); }

private:
    Bytes& put(size_t offset, uint64_t v, size_t size)
    {
        if (bytes_.size() < offset + size)
            bytes_.resize(offset + size, 0);
        for (size_t i = 0; i < size; ++i)
            bytes_[offset + i] = uint8_t(v >> (8 * i));
        return *this;
    }

    std::vector<uint8_t> bytes_;
};

// Reading back what the plug-in produced.
inline uint16_t u16At(const std::vector<uint8_t>& b, size_t o) { return uint16_t(b.at(o) | b.at(o + 1) << 8); }
inline uint32_t u32At(const std::vector<uint8_t>& b, size_t o)
{
    return uint32_t(b.at(o)) | uint32_t(b.at(o + 1)) << 8 | uint32_t(b.at(o + 2)) << 16 | uint32_t(b.at(o + 3)) << 24;
}
inline int32_t i32At(const std::vector<uint8_t>& b, size_t o) { return int32_t(u32At(b, o)); }
inline float f32At(const std::vector<uint8_t>& b, size_t o)
{
    const uint32_t u = u32At(b, o);
    float f;
    std::memcpy(&f, &u, 4);
    return f;
}

using SpectrumFn = std::function<int16_t(unsigned sample, unsigned channel)>;

// A generic (four-channel) calibration entry.
struct GenericEntry {
    uint8_t sensorType = 2;
    uint8_t orientation = 1;
    uint8_t chipType = 0;
    std::optional<uint16_t> entrySize; // default: the bytes written
    uint16_t words[4] = {0x200, 250, 100, 99};
    uint8_t gain1 = 8, gain2 = 7;
    uint8_t nChannels = 4;
    uint8_t nGains = 9;
    uint8_t revision = 0; // must match the blob header's
    struct Channel {
        uint8_t dark = 3;
        uint16_t offsetThousandths = 1500;
        uint8_t paramB = 7;
        uint16_t gainBase = 256; // gain k = gainBase + 64 k, in 1/256
    } channel;
    uint8_t algo = 3;
    uint16_t nSamples = 401;
    int32_t weights[4] = {1000000, 1000000, 1000000, 1000000};
    uint32_t cctWords[2] = {0x1234, 0xABCD};
    SpectrumFn spectrum = [](unsigned, unsigned c) { return int16_t(100 * (c + 1)); };

    size_t blockSize() const { return 4 + 2 * size_t(nGains); }
    size_t spectrumOffset() const { return 24 + blockSize() * nChannels; }
    size_t spectraOffset() const { return spectrumOffset() + (revision == 0 ? 28 : 32); }
    // The spectrum block always has room for 401 samples of four channels.
    size_t naturalSize() const { return spectraOffset() + 401 * 4 * 2; }

    Bytes bytes() const
    {
        Bytes e(naturalSize());
        e.u8(0, sensorType).u8(2, orientation).u8(3, chipType).u16(4, entrySize.value_or(uint16_t(naturalSize())));
        for (size_t w = 0; w < 4; ++w)
            e.u16(8 + 2 * w, words[w]);
        e.u8(17, gain1).u8(18, gain2).u8(19, nChannels).u8(20, nGains);
        for (size_t c = 0; c < nChannels; ++c) {
            const size_t b = 24 + blockSize() * c;
            e.u8(b, uint8_t(channel.dark + c))
                .u16(b + 1, uint16_t(channel.offsetThousandths + c))
                .u8(b + 3, channel.paramB);
            for (size_t k = 0; k < nGains; ++k)
                e.u16(b + 4 + 2 * k, uint16_t(channel.gainBase + 64 * k));
        }
        const size_t s0 = spectrumOffset();
        e.u8(s0, algo).u16(s0 + 2, nSamples);
        for (size_t c = 0; c < 4; ++c)
            e.i32(s0 + 4 + 4 * c, weights[c]);
        e.u32(s0 + 20, cctWords[0]).u32(s0 + 24, cctWords[1]);
        for (unsigned s = 0; s < nSamples && s < 401; ++s)
            for (unsigned c = 0; c < 4; ++c)
                e.i16(spectraOffset() + 2 * (4 * s + c), spectrum(s, c));
        if (entrySize && *entrySize > e.size())
            e.resize(*entrySize);
        return e;
    }
};

// A VD6286 (chip type 3, five-channel) calibration entry.
struct VD6286Entry {
    uint8_t sensorType = 5;
    uint8_t orientation = 1;
    uint16_t entrySize = 4156;
    uint16_t words[4] = {0x300, 200, 50, 40};
    uint8_t gains[3] = {4, 5, 6};
    uint8_t nChannels = 5;
    uint8_t nGains = 5;
    uint8_t algo = 2;
    uint16_t nSamples = 401;
    int32_t weights[5] = {500000, 1000000, 1000000, 1000000, 1000000};
    int32_t cct[5] = {-7, 11, 13, 17, 19};
    SpectrumFn spectrum = [](unsigned, unsigned c) { return int16_t(50 * (c + 1)); };

    Bytes bytes() const
    {
        Bytes e(std::max<size_t>(entrySize, 8));
        e.u8(0, sensorType).u8(2, orientation).u8(3, 3).u16(4, entrySize);
        for (size_t w = 0; w < 4; ++w)
            e.u16(8 + 2 * w, words[w]);
        e.u8(16, gains[0]).u8(17, gains[1]).u8(18, gains[2]).u8(19, nChannels).u8(20, nGains);
        for (size_t c = 0; c < nChannels && c < 5; ++c) {
            const size_t b = 24 + 14 * c;
            e.u8(b, uint8_t(10 + c)).u16(b + 1, uint16_t(2000 + c)).u8(b + 3, uint8_t(200 + c));
            for (size_t k = 0; k < nGains && k < 5; ++k)
                e.u16(b + 4 + 2 * k, uint16_t(512 + 32 * k));
        }
        e.u8(96, algo).u16(98, nSamples);
        for (size_t c = 0; c < 5; ++c)
            e.i32(100 + 4 * c, weights[c]).i32(120 + 4 * c, cct[c]);
        for (size_t i = 0; i < size_t(nSamples) * 5 && 144 + 2 * i + 2 <= e.size(); ++i)
            e.i16(144 + 2 * i, spectrum(unsigned(i / 5), unsigned(i % 5)));
        return e;
    }
};

// A blob: the header, then the entries in order.
inline Bytes blob(const std::vector<Bytes>& entries, uint8_t revision = 0, uint8_t version = 1,
                  std::optional<uint16_t> totalSize = std::nullopt, std::optional<uint8_t> entryCount = std::nullopt)
{
    Bytes b(8);
    for (const auto& e : entries)
        b.append(e);
    b.u8(0, revision).u8(1, version).u8(2, entryCount.value_or(uint8_t(entries.size())));
    b.u16(4, totalSize.value_or(uint16_t(b.size())));
    return b;
}

// An "alsAuxCalibration" entry with infrared coefficients in millionths.
inline Bytes auxEntry(uint8_t orientation, const int32_t (&coefficients)[4], uint16_t entrySize = 56)
{
    Bytes e(std::max<size_t>(entrySize, 8));
    e.u8(2, orientation).u16(4, entrySize);
    for (size_t k = 0; k < 4; ++k)
        e.i32(40 + 4 * k, coefficients[k]);
    return e;
}

// Whether a captured line contains `part` (at `type`, when given).
inline bool anyLineContaining(vt::LogCapture& log, const std::string& part,
                              std::optional<os_log_type_t> type = std::nullopt)
{
    for (const auto& line : log.lines())
        if ((!type || line.type == *type) && line.message.find(part) != std::string::npos)
            return true;
    return false;
}

// ---- Reference database ---------------------------------------------------------

inline void exec(sqlite3* db, const std::string& sql)
{
    char* error = nullptr;
    ASSERT_EQ(sqlite3_exec(db, sql.c_str(), nullptr, nullptr, &error), SQLITE_OK) << (error ? error : "");
}

// A reference file with `sources` flat spectra of 401 samples (source i has
// level i + 1) and XYZ (i + 1, 2i + 1, 3i + 1).
inline void writeReference(const std::filesystem::path& file, int sources)
{
    std::filesystem::create_directories(file.parent_path());
    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open(file.c_str(), &db), SQLITE_OK);
    exec(db, "CREATE TABLE Info (version Single, sources Long)");
    exec(db, "INSERT INTO Info VALUES (1.5, " + std::to_string(sources) + ")");
    std::string create = "CREATE TABLE Spectra (ID Long, X Single, Y Single, Z Single";
    for (int s = 0; s < 401; ++s)
        create += ", S" + std::to_string(s) + " Single";
    exec(db, create + ")");
    exec(db, "BEGIN");
    for (int i = 0; i < sources; ++i) {
        std::string row = "INSERT INTO Spectra VALUES (" + std::to_string(i) + ", " + std::to_string(i + 1) + ", " +
                          std::to_string(2 * i + 1) + ", " + std::to_string(3 * i + 1);
        for (int s = 0; s < 401; ++s)
            row += ", " + std::to_string(i + 1);
        exec(db, row + ")");
    }
    exec(db, "COMMIT");
    sqlite3_close(db);
}

// ---- Fixture ----------------------------------------------------------------------

constexpr uint64_t kRegistryID = 0x5C0;
constexpr int kReferenceSources = 3;

// A plug-in on a service whose registry entry (below a parent) can carry the
// blobs; device paths mapped onto temporary folders holding a tiny reference
// database and an empty state folder.
class SysConfigTest : public ::testing::Test {
protected:
    void SetUp() override
    {
        VPRegistryReset();
        VPSetPathRoot("/System/Library/HIDPlugins", system_.str());
        writeReference(system_.path() / "Vantish.plugin" / "bzlight.sqlite", kReferenceSources);
        parent_ = VPRegistryCreateEntry(kRegistryID - 1, 0);
        entry_ = VPRegistryCreateEntry(kRegistryID, parent_);
        service_ = VPServiceCreate(kRegistryID);
        parts(*plugin_).service() = service_;
        parts(*plugin_).registryEntry() =
            IOServiceGetMatchingService(kIOMainPortDefault, IORegistryEntryIDMatching(kRegistryID));
        parts(*plugin_).unit().orientation = 1;
        parts(*plugin_).unit().numberOfChannels = 4;
        parts(*plugin_).unit().dbChannelCount = 4;
    }
    void TearDown() override
    {
        VPDispatchDrain();
        plugin_.release();
        CFRelease(service_);
        VPRegistryReset();
    }

    // Publishes a blob on the parent entry (found by the recursive search).
    void publish(const char* key, const Bytes& bytes) { publishValue(key, bytes.createData()); }
    void publishValue(const char* key, CFTypeRef value)
    {
        CFStringRef k = CFStringCreateWithCString(nullptr, key, kCFStringEncodingUTF8);
        VPRegistrySetProperty(parent_, k, value);
        CFRelease(k);
        CFRelease(value);
    }

    // The record the driver received last, or empty.
    std::vector<uint8_t> receivedRecord() const
    {
        CFTypeRef value = VPServiceCopyReceivedProperty(service_, CFSTR("ALSCalibrationData"));
        if (!value)
            return {};
        CFDataRef data = static_cast<CFDataRef>(value);
        std::vector<uint8_t> bytes(CFDataGetBytePtr(data), CFDataGetBytePtr(data) + CFDataGetLength(data));
        CFRelease(value);
        return bytes;
    }

    std::filesystem::path cacheFile(int orientation = 1) const
    {
        return roots_.cacheDir() / ("bzrgbc_" + std::to_string(orientation) + ".sqlite");
    }
    // Makes the cache folder unwritable: a regular file where it should be.
    void blockCacheFolder() const
    {
        std::filesystem::create_directories(roots_.cacheDir().parent_path());
        std::filesystem::remove_all(roots_.cacheDir());
        FILE* f = std::fopen(roots_.cacheDir().c_str(), "w");
        ASSERT_NE(f, nullptr);
        std::fclose(f);
    }
    void unblockCacheFolder() const { std::filesystem::remove(roots_.cacheDir()); }

    vt::DeviceRoots roots_;
    vt::TempDir system_;
    io_registry_entry_t parent_ = 0, entry_ = 0;
    IOHIDServiceRef service_ = nullptr;
    vt::PlugIn plugin_;
};

} // namespace sctest
