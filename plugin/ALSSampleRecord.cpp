#include "plugin/ALSSampleRecord.h"

#include "plugin/LittleEndian.h"

namespace {

template <typename T, size_t N>
void getArray(std::span<const uint8_t> bytes, size_t offset, std::array<T, N>& out)
{
    for (size_t i = 0; i < N; ++i)
        out[i] = le::get<T>(bytes, offset + i * sizeof(T));
}

template <typename T, size_t N>
void putArray(std::span<uint8_t> bytes, size_t offset, const std::array<T, N>& values)
{
    for (size_t i = 0; i < N; ++i)
        le::put<T>(bytes, offset + i * sizeof(T), values[i]);
}

} // namespace

std::optional<ALSSampleRecord> ALSSampleRecord::decode(std::span<const uint8_t> bytes)
{
    if (bytes.size() < kSize)
        return std::nullopt;
    const auto record = bytes.first(kSize);

    ALSSampleRecord r;
    r.status = le::get<uint32_t>(record, kStatusOffset);
    r.sampleChannelCount = le::get<uint8_t>(record, kSampleChannelCountOffset);
    r.sampleOrientation = le::get<uint8_t>(record, kSampleOrientationOffset);
    r.nits = le::get<uint16_t>(record, kNitsOffset);
    r.integrationTime = le::get<uint32_t>(record, kIntegrationTimeOffset);
    r.reportInterval = le::get<uint32_t>(record, kReportIntervalOffset);
    r.gain = le::get<int32_t>(record, kGainOffset);
    r.lux = le::get<float>(record, kLuxOffset);
    r.rawLux = le::get<float>(record, kRawLuxOffset);
    getArray(record, kChannelValuesOffset, r.channelValues);
    r.cct = le::get<float>(record, kCctOffset);
    r.timestamp = le::get<uint32_t>(record, kTimestampOffset);
    r.subsamples = le::get<uint16_t>(record, kSubsamplesOffset);
    r.mode = le::get<uint8_t>(record, kModeOffset);
    getArray(record, kXTalkOffset, r.xTalk);
    r.xyzInRecord = le::get<uint8_t>(record, kXyzInRecordOffset);
    getArray(record, kXyzResultOffset, r.xyzResult);
    getArray(record, kXyzSensorOffset, r.xyzSensor);
    r.filteredLux = le::get<float>(record, kFilteredLuxOffset);
    r.filteredLuxValid = le::get<uint8_t>(record, kFilteredLuxValidOffset);
    return r;
}

bool ALSSampleRecord::writeChannelValues(std::span<uint8_t> bytes, const std::array<float, 6>& values)
{
    if (bytes.size() < kSize)
        return false;
    putArray(bytes, kChannelValuesOffset, values);
    return true;
}

bool ALSSampleRecord::writeXYZResult(std::span<uint8_t> bytes, const std::array<float, 3>& xyz)
{
    if (bytes.size() < kSize)
        return false;
    putArray(bytes, kXyzResultOffset, xyz);
    return true;
}

std::span<uint8_t> sampleRecordBytes(IOHIDEventRef event)
{
    CFArrayRef children = IOHIDEventGetChildren(event);
    if (!children || CFArrayGetCount(children) < 1)
        return {};
    auto child = (IOHIDEventRef) CFArrayGetValueAtIndex(children, 0);
    if (!child)
        return {};
    uint8_t* data = IOHIDEventGetDataValue(child, kIOHIDEventFieldVendorDefinedData);
    CFIndex length = IOHIDEventGetIntegerValue(child, kIOHIDEventFieldVendorDefinedDataLength);
    if (!data || length <= 0)
        return {};
    return {data, size_t(length)};
}
