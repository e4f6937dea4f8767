// Shared pieces of the calibration tests: a byte writer of their own (so the
// expected records do not come from the code under test), a plug-in on a
// service with a factory store, and a small reference database.
#pragma once

#include "common/PlugInHolder.h"
#include "common/TestSupport.h"

#include <CoreFoundation/CoreFoundation.h>
#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/DispatchControl.h>
#include <VantishPlatform/HIDHost.h>
#include <VantishPlatform/Paths.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>
#include <vector>

namespace ct {

// Little-endian bytes written field by field with explicit shifts; indexes
// are checked (an offset past the end fails the test with an exception).
class Bytes {
public:
    explicit Bytes(size_t size) : b_(size, 0) {}
    Bytes& u8(size_t at, unsigned v)
    {
        b_.at(at) = uint8_t(v & 0xFF);
        return *this;
    }
    Bytes& u16(size_t at, unsigned v) { return u8(at, v).u8(at + 1, v >> 8); }
    Bytes& u32(size_t at, uint32_t v) { return u16(at, v & 0xFFFF).u16(at + 2, v >> 16); }
    Bytes& i8(size_t at, int v) { return u8(at, uint8_t(int8_t(v))); }
    Bytes& i16(size_t at, int v) { return u16(at, uint16_t(int16_t(v))); }
    Bytes& i32(size_t at, int32_t v) { return u32(at, uint32_t(v)); }
    Bytes& f32(size_t at, float v)
    {
        uint32_t bits;
        std::memcpy(&bits, &v, 4);
        return u32(at, bits);
    }
    Bytes& text(size_t at, std::string_view s)
    {
        for (size_t i = 0; i < s.size(); ++i)
            u8(at + i, uint8_t(s[i]));
        return *this;
    }
    uint8_t at(size_t i) const { return b_.at(i); }
    size_t size() const { return b_.size(); }
    const std::vector<uint8_t>& vec() const { return b_; }
    std::vector<uint8_t>& vec() { return b_; }
    CFDataRef data() const { return CFDataCreate(nullptr, b_.data(), CFIndex(b_.size())); }

private:
    std::vector<uint8_t> b_;
};

inline std::vector<uint8_t> bytesOf(CFDataRef data)
{
    if (!data)
        return {};
    const UInt8* p = CFDataGetBytePtr(data);
    return {p, p + CFDataGetLength(data)};
}
// The bytes of a data object the caller owns, which is released.
inline std::vector<uint8_t> takeBytes(CFDataRef data)
{
    std::vector<uint8_t> out = bytesOf(data);
    if (data)
        CFRelease(data);
    return out;
}

inline uint32_t rd32(const std::vector<uint8_t>& b, size_t at)
{
    return uint32_t(b.at(at)) | uint32_t(b.at(at + 1)) << 8 | uint32_t(b.at(at + 2)) << 16 |
           uint32_t(b.at(at + 3)) << 24;
}
inline uint16_t rd16(const std::vector<uint8_t>& b, size_t at) { return uint16_t(b.at(at) | b.at(at + 1) << 8); }
inline float rdf(const std::vector<uint8_t>& b, size_t at)
{
    const uint32_t bits = rd32(b, at);
    float v;
    std::memcpy(&v, &bits, 4);
    return v;
}

// The first offset where two byte arrays differ, for readable failures.
inline std::string firstDifference(const std::vector<uint8_t>& got, const std::vector<uint8_t>& want)
{
    if (got.size() != want.size())
        return "size " + std::to_string(got.size()) + " != " + std::to_string(want.size());
    for (size_t i = 0; i < got.size(); ++i)
        if (got[i] != want[i])
            return "offset " + std::to_string(i) + ": " + std::to_string(got[i]) + " != " + std::to_string(want[i]);
    return "";
}

#define EXPECT_BYTES_EQ(got, want) EXPECT_EQ(ct::firstDifference((got), (want)), "")

// ---- Factory records, every field from a formula of its indexes -------------------

// XwCl: entry k, channel c (all six stored), gain g (all nine stored), sample s.
struct XwClShape {
    unsigned entries = 1;
    uint8_t deviceID = 14;
    uint32_t chipID = 0;
    uint8_t chipType = 0;
    uint8_t selector = 1;
    uint8_t nChannels = 5;
    uint8_t nGains = 9;
};
namespace xwcl {
inline uint16_t iTime(unsigned k) { return uint16_t(100 + k); }
inline uint16_t aux1(unsigned k) { return uint16_t(200 + k); }
inline uint16_t aux2(unsigned k) { return uint16_t(300 + k); }
inline uint16_t aux3(unsigned k) { return uint16_t(400 + k); }
inline uint8_t gain(unsigned k, unsigned i) { return uint8_t(10 + 4 * k + i); }
inline uint16_t fudge(unsigned k) { return uint16_t(0x4000 + k); }
inline uint16_t gainScale(unsigned k, unsigned c, unsigned g) { return uint16_t(0x1000 + 0x100 * k + 0x10 * c + g); }
inline uint16_t paramA(unsigned k, unsigned c) { return uint16_t(0x2000 + 0x100 * k + c); }
inline int16_t offsetCounts(unsigned k, unsigned c) { return int16_t(-(300 + 10 * int(k) + int(c))); }
inline uint8_t darkCounts(unsigned k, unsigned c) { return uint8_t(0xF0 + c + k); }
inline int8_t paramB(unsigned k, unsigned c) { return int8_t(-(5 + int(c) + 10 * int(k))); }
inline int32_t lux(unsigned k, unsigned c) { return int32_t(65536 * (c + 1) + 4096 * k + 3); }
inline int32_t cct(unsigned k, unsigned c) { return -int32_t(1000 * (c + 1) + k); }
inline int16_t sample(unsigned k, unsigned c, unsigned s) { return int16_t(int((s * 3 + c * 11 + k * 5) % 250) - 40); }
} // namespace xwcl
Bytes makeXwCl(const XwClShape& shape);

// XwCA T2: channel c (all six stored spectra, five coefficient slots), gain g.
struct XwCAShape {
    uint8_t major = 1;
    uint8_t minor = 7;
    std::string chipText = "1A2B3C4D";
    uint8_t deviceID = 0x21;
    uint8_t nChannels = 5;
    uint8_t nGains = 5;
    uint16_t fudge = 0x4100;
    uint8_t gainIndex = 12;
    int16_t iTime = 180;
};
namespace xwca {
inline uint16_t gainScale(unsigned c, unsigned g) { return uint16_t(0x3000 + 0x10 * c + g); }
inline uint16_t paramA(unsigned c) { return uint16_t(0x5000 + c); }
inline int16_t offsetCounts(unsigned c) { return int16_t(-(50 + int(c))); }
inline uint8_t darkCounts(unsigned c) { return uint8_t(0x90 + c); }
inline int16_t paramB(unsigned c) { return int16_t(-(1000 + int(c))); }
inline int32_t lux(unsigned c) { return int32_t(c + 1) * 0x01000000; }
inline int32_t cct(unsigned c) { return -int32_t(c + 1) * 16384 * 3; }
inline int32_t sample(unsigned c, unsigned s) { return int32_t(s) * 1000 - int32_t(c) * 77777; }
} // namespace xwca
Bytes makeXwCA(const XwCAShape& shape);

// VD6287 version 3: blob k, channel j, gain g, table entry m, spectrum c.
namespace vd {
inline uint8_t gainIndex(unsigned k) { return uint8_t(3 + k); }
inline uint32_t blobWord(unsigned k) { return 0xA1B2C3D0u + k; }
inline uint16_t valueA(unsigned k) { return uint16_t(1234 + k); }
inline uint16_t valueB(unsigned k) { return uint16_t(8192 + k); }
inline uint8_t channelByte(unsigned k, unsigned j) { return uint8_t(0x40 + j + k); }
inline int16_t channelFactor(unsigned k, unsigned j) { return int16_t(-(4096 + int(j) + int(k))); }
inline int32_t lux(unsigned k, unsigned j) { return int32_t(65536 * (j + 2) + k); }
inline int32_t cct(unsigned k, unsigned j) { return -int32_t(256 * (j + 1) + k); }
inline uint32_t sharedValue(unsigned k) { return 0x00018000u + k; }
inline uint32_t channelValue(unsigned k, unsigned j) { return 0x00020000u + j * 0x100 + k; }
inline int16_t sample(unsigned k, unsigned c, unsigned s)
{
    return int16_t(int((s * 5 + c * 13 + k * 100) % 300) - 50);
}
inline uint16_t table(unsigned k, char name, unsigned m) { return uint16_t(0x100 * (name - 'A' + 1) + 0x10 * k + m); }
} // namespace vd
// Gain ratios: 16384 (1.0) everywhere unless `unitRatios` is false.
Bytes makeVD6287v3(uint8_t entryCount = 7, bool unitRatios = true);
inline uint16_t vdRatio(unsigned k, unsigned j, unsigned g) { return uint16_t(16384 + 1024 * j + 16 * g + k); }

// A reference database of `sources` spectra of 401 samples each, in the
// bundle folder under `systemRoot` (both files of the reference set).
void writeReferenceDatabases(const std::filesystem::path& systemRoot, int sources);

// A plug-in (no open; the test sets what open would) on a service of its
// own, with an empty factory store and every log line captured.
class CalibrationTest : public ::testing::Test {
protected:
    void SetUp() override
    {
        // Reference databases only where a test writes them (writeReferenceDatabases(system.path(), n)).
        VPSetPathRoot("/System/Library/HIDPlugins", system.str());
        VPQVTSetStoreDirectory(store.str());
        VPQVTResetReadCount();
        service = VPServiceCreate(7);
        parts(*plugin).service() = service;
    }

    void TearDown() override
    {
        VPDispatchFireDelayed();
        VPDispatchDrain();
        VPDispatchSetDelayMode(VPDelayMode::Real);
        plugin.release();
        CFRelease(service);
        VPQVTSetStoreDirectory("");
        VPTessaryReset();
        VPSetBootArgs(std::nullopt);
        VPSetSysctlFailure(0);
    }

    void writeStore(const std::string& key, const std::vector<uint8_t>& bytes)
    {
        std::ofstream(store.path() / key, std::ios::binary)
            .write(reinterpret_cast<const char*>(bytes.data()), std::streamsize(bytes.size()));
    }

    std::vector<uint8_t> received(const char* key)
    {
        CFStringRef k = CFStringCreateWithCString(nullptr, key, kCFStringEncodingUTF8);
        CFTypeRef value = VPServiceCopyReceivedProperty(service, k);
        CFRelease(k);
        if (!value)
            return {};
        std::vector<uint8_t> out =
            CFGetTypeID(value) == CFDataGetTypeID() ? bytesOf(CFDataRef(value)) : std::vector<uint8_t>{};
        CFRelease(value);
        return out;
    }

    vt::DeviceRoots roots;
    vt::TempDir system;
    vt::TempDir store;
    vt::LogCapture log{VPLogLevel::Debug};
    vt::PlugIn plugin;
    IOHIDServiceRef service = nullptr;
};

} // namespace ct
