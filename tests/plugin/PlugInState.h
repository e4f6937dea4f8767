// Test-side ALS events: the driver's sample record written byte by byte at
// the driver's offsets (independently of the plug-in's reader), attached as
// the vendor-defined child of an ambient-light event; a linear database; and a
// plug-in instance made by the factory.
#pragma once

#include "plugin/TestAccess.h"

#include <IOKit/hid/IOHIDEvent.h>
#include <IOKit/hid/IOHIDServiceFilterPlugIn.h>

#include <array>
#include <bit>
#include <cstdint>
#include <memory>
#include <type_traits>
#include <vector>

namespace alstest {

inline float floatAt(const uint8_t* p)
{
    return std::bit_cast<float>(uint32_t(p[0]) | uint32_t(p[1]) << 8 | uint32_t(p[2]) << 16 | uint32_t(p[3]) << 24);
}

// The driver's 137-byte sample record (or a record of another length).
class Record {
public:
    explicit Record(size_t length = 137) : bytes_(length, 0) {}

    Record& status(uint32_t v) { return put(0, v, 4); }
    Record& sampleChannelCount(uint8_t v) { return put(4, v, 1); }
    Record& orientation(uint8_t v) { return put(5, v, 1); }
    Record& nits(uint16_t v) { return put(6, v, 2); }
    Record& integrationTime(uint32_t v) { return put(8, v, 4); }
    Record& reportInterval(uint32_t v) { return put(12, v, 4); }
    Record& gain(int32_t v) { return put(16, uint32_t(v), 4); }
    Record& lux(float v) { return putFloat(20, v); }
    Record& rawLux(float v) { return putFloat(24, v); }
    Record& channels(std::array<float, 6> c) { return putFloats(28, c); }
    Record& cct(float v) { return putFloat(52, v); }
    Record& timestamp(uint32_t v) { return put(72, v, 4); }
    Record& subsamples(uint16_t v) { return put(80, v, 2); }
    Record& mode(uint8_t v) { return put(82, v, 1); }
    Record& xTalk(std::array<uint32_t, 5> x)
    {
        for (size_t i = 0; i < 5; ++i)
            put(83 + 4 * i, x[i], 4);
        return *this;
    }
    Record& xyzInRecord(uint8_t v) { return put(107, v, 1); }
    Record& xyzResult(std::array<float, 3> xyz) { return putFloats(108, xyz); }
    Record& xyzSensor(std::array<float, 3> xyz) { return putFloats(120, xyz); }
    Record& filteredLux(float v) { return putFloat(132, v); }
    Record& filteredLuxValid(uint8_t v) { return put(136, v, 1); }
    // Bytes past the driver's fields (in a longer record).
    Record& fillFrom(size_t offset, uint8_t v)
    {
        for (size_t i = offset; i < bytes_.size(); ++i)
            bytes_[i] = v;
        return *this;
    }

    const std::vector<uint8_t>& bytes() const { return bytes_; }

private:
    // Little-endian; a field past the end of a shorter record is left out.
    Record& put(size_t offset, uint64_t v, size_t size)
    {
        for (size_t i = 0; i < size && offset + size <= bytes_.size(); ++i)
            bytes_[offset + i] = uint8_t(v >> (8 * i));
        return *this;
    }
    Record& putFloat(size_t offset, float v) { return put(offset, std::bit_cast<uint32_t>(v), 4); }
    template <size_t n>
    Record& putFloats(size_t offset, const std::array<float, n>& values)
    {
        for (size_t i = 0; i < n; ++i)
            putFloat(offset + 4 * i, values[i]);
        return *this;
    }

    std::vector<uint8_t> bytes_;
};

struct EventReleaser {
    void operator()(IOHIDEventRef event) const { CFRelease(event); }
};
using Event = std::unique_ptr<std::remove_pointer_t<IOHIDEventRef>, EventReleaser>;

// An ambient-light event, with the record as its vendor-defined child when given.
inline Event createALSEvent(const Record* record, uint64_t timeStamp = 0)
{
    IOHIDEventRef event = IOHIDEventCreate(kCFAllocatorDefault, kIOHIDEventTypeAmbientLightSensor, timeStamp, 0);
    if (record) {
        const auto& b = record->bytes();
        IOHIDEventRef child = IOHIDEventCreateVendorDefinedEvent(kCFAllocatorDefault, timeStamp, 0xFF00, 4, 0, b.data(),
                                                                 CFIndex(b.size()), 0);
        IOHIDEventAppendEvent(event, child, 0);
        CFRelease(child);
    }
    return Event(event);
}

// The record bytes the event carries now (a copy), read through the event's child.
inline std::vector<uint8_t> recordOf(IOHIDEventRef event)
{
    auto child = (IOHIDEventRef) CFArrayGetValueAtIndex(IOHIDEventGetChildren(event), 0);
    const uint8_t* data = IOHIDEventGetDataValue(child, kIOHIDEventFieldVendorDefinedData);
    const CFIndex length = IOHIDEventGetIntegerValue(child, kIOHIDEventFieldVendorDefinedDataLength);
    return {data, data + length};
}

template <size_t n>
std::array<float, n> floatsOf(IOHIDEventRef event, size_t offset)
{
    const auto bytes = recordOf(event);
    std::array<float, n> out{};
    for (size_t i = 0; i < n; ++i)
        out[i] = floatAt(&bytes[offset + 4 * i]);
    return out;
}

inline std::array<float, 3> xyzResultOf(IOHIDEventRef event) { return floatsOf<3>(event, 108); }
inline std::array<float, 6> channelsOf(IOHIDEventRef event) { return floatsOf<6>(event, 28); }

inline std::array<double, 3> eventXYZ(IOHIDEventRef event)
{
    return {IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent0),
            IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent1),
            IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent2)};
}

inline CFIndex colourSpaceOf(IOHIDEventRef event)
{
    return IOHIDEventGetIntegerValue(event, kIOHIDEventFieldAmbientLightColorSpace);
}

inline void setLastXYZ(VantishPlugIn& plugin, float x, float y, float z)
{
    parts(plugin).lastXYZ()[0] = x;
    parts(plugin).lastXYZ()[1] = y;
    parts(plugin).lastXYZ()[2] = z;
}

inline void overrideChromaticity(VantishPlugIn& plugin, double x, double y, double luminance)
{
    parts(plugin).overrides().chromaticityOverrideActive = 1;
    parts(plugin).overrides().overrideX = x;
    parts(plugin).overrides().overrideY = y;
    parts(plugin).overrides().overrideLuminance = luminance;
}

// An exactly linear database (X = ch0, Y = ch1 + ch2, Z = ch3 + ch4), so the
// colour written back shows which channel values reached the calculation.
inline SpectralDatabasePtr linearDatabase(uint32_t channels)
{
    auto db = std::make_shared<SpectralDatabase>();
    const uint32_t n = 12;
    db->allocate(n, channels);
    for (uint32_t i = 0; i < n; ++i) {
        float sum[3] = {};
        for (uint32_t j = 0; j < channels; ++j) {
            const float r = float(1 + (i * (j + 2) + 3 * j) % 7);
            db->dbChannelResponses[j * n + i] = r;
            sum[j == 0 ? 0 : j <= 2 ? 1 : 2] += r;
        }
        for (uint32_t c = 0; c < 3; ++c)
            db->dbXYZ[c * n + i] = sum[c];
    }
    return db;
}

inline std::array<float, 3> lastXYZOf(VantishPlugIn& plugin)
{
    return {parts(plugin).lastXYZ()[0].load(), parts(plugin).lastXYZ()[1].load(), parts(plugin).lastXYZ()[2].load()};
}

// A plug-in instance from the factory, released with the holder.
class PlugIn {
public:
    PlugIn() : p_(static_cast<VantishPlugIn*>(VantishPlugInFactory(nullptr, kIOHIDServiceFilterPlugInTypeID))) {}
    ~PlugIn() { p_->Release(); }
    PlugIn(const PlugIn&) = delete;
    PlugIn& operator=(const PlugIn&) = delete;
    VantishPlugIn* operator->() const { return p_; }
    VantishPlugIn& operator*() const { return *p_; }

private:
    VantishPlugIn* p_;
};

} // namespace alstest
