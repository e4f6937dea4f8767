// ALS events as the driver sends them: its 137-byte sample record written byte
// by byte at the driver's offsets (independently of the plug-in's reader),
// attached as the vendor-defined child of an ambient-light event; and readers
// of what the plug-in wrote back into the record and the event.
#pragma once

#include <IOKit/hid/IOHIDEvent.h>

#include <array>
#include <bit>
#include <cstdint>
#include <memory>
#include <span>
#include <type_traits>
#include <vector>

namespace vt {

inline float floatAt(const uint8_t* p)
{
    return std::bit_cast<float>(uint32_t(p[0]) | uint32_t(p[1]) << 8 | uint32_t(p[2]) << 16 | uint32_t(p[3]) << 24);
}

// The driver's 137-byte sample record, a record of another length, or any bytes.
class Record {
public:
    explicit Record(size_t length = 137) : bytes_(length, 0) {}
    explicit Record(std::span<const uint8_t> bytes) : bytes_(bytes.begin(), bytes.end()) {}

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

// An event of `type` with the record as its vendor-defined child when given.
Event createEvent(IOHIDEventType type, const Record* record, uint64_t timeStamp = 0);
inline Event createALSEvent(const Record* record, uint64_t timeStamp = 0)
{
    return createEvent(kIOHIDEventTypeAmbientLightSensor, record, timeStamp);
}

// The record bytes the event carries now (a copy), read through the event's child.
std::vector<uint8_t> recordOf(IOHIDEventRef event);

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

// The colour the event carries: XYZ and its colour space.
std::array<double, 3> eventXYZ(IOHIDEventRef event);
CFIndex colourSpaceOf(IOHIDEventRef event);

} // namespace vt
