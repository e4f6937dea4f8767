#include "host/emulator/DriverSample.h"

#include "support/LittleEndian.h"

namespace host {

std::array<uint8_t, ALSSampleRecord::kSize> encodeSampleRecord(const ALSSampleRecord& r)
{
    using R = ALSSampleRecord;
    std::array<uint8_t, R::kSize> bytes{};
    std::span<uint8_t> b(bytes);
    le::put<uint32_t>(b, R::kStatusOffset, r.status);
    le::put<uint8_t>(b, R::kSampleChannelCountOffset, r.sampleChannelCount);
    le::put<uint8_t>(b, R::kSampleOrientationOffset, r.sampleOrientation);
    le::put<uint16_t>(b, R::kNitsOffset, r.nits);
    le::put<uint32_t>(b, R::kIntegrationTimeOffset, r.integrationTime);
    le::put<uint32_t>(b, R::kReportIntervalOffset, r.reportInterval);
    le::put<int32_t>(b, R::kGainOffset, r.gain);
    le::put<float>(b, R::kLuxOffset, r.lux);
    le::put<float>(b, R::kRawLuxOffset, r.rawLux);
    for (size_t i = 0; i < r.channelValues.size(); ++i)
        le::put<float>(b, R::kChannelValuesOffset + 4 * i, r.channelValues[i]);
    le::put<float>(b, R::kCctOffset, r.cct);
    le::put<uint32_t>(b, R::kTimestampOffset, r.timestamp);
    le::put<uint16_t>(b, R::kSubsamplesOffset, r.subsamples);
    le::put<uint8_t>(b, R::kModeOffset, r.mode);
    for (size_t i = 0; i < r.xTalk.size(); ++i)
        le::put<uint32_t>(b, R::kXTalkOffset + 4 * i, r.xTalk[i]);
    le::put<uint8_t>(b, R::kXyzInRecordOffset, r.xyzInRecord);
    for (size_t i = 0; i < 3; ++i) {
        le::put<float>(b, R::kXyzResultOffset + 4 * i, r.xyzResult[i]);
        le::put<float>(b, R::kXyzSensorOffset + 4 * i, r.xyzSensor[i]);
    }
    le::put<float>(b, R::kFilteredLuxOffset, r.filteredLux);
    le::put<uint8_t>(b, R::kFilteredLuxValidOffset, r.filteredLuxValid);
    return bytes;
}

IOHIDEventRef createALSEvent(const ALSSampleRecord& record, uint64_t timeStamp)
{
    IOHIDEventRef event = IOHIDEventCreate(kCFAllocatorDefault, kIOHIDEventTypeAmbientLightSensor, timeStamp, 0);
    IOHIDEventSetFloatValue(event, kIOHIDEventFieldAmbientLightSensorLevel, record.lux);
    IOHIDEventSetDoubleValue(event, kIOHIDEventFieldAmbientLightSensorIlluminance, record.lux);
    const IOHIDEventField raw[4] = {
        kIOHIDEventFieldAmbientLightSensorRawChannel0, kIOHIDEventFieldAmbientLightSensorRawChannel1,
        kIOHIDEventFieldAmbientLightSensorRawChannel2, kIOHIDEventFieldAmbientLightSensorRawChannel3};
    for (int i = 0; i < 4; ++i)
        IOHIDEventSetFloatValue(event, raw[i], record.channelValues[size_t(i)]);

    const auto bytes = encodeSampleRecord(record);
    IOHIDEventRef child = IOHIDEventCreateVendorDefinedEvent(kCFAllocatorDefault, timeStamp, 0xFF00, 0x0004, 0,
                                                             bytes.data(), CFIndex(bytes.size()), 0);
    IOHIDEventAppendEvent(event, child, 0);
    CFRelease(child);
    return event;
}

std::optional<std::array<float, 3>> readXYZResult(IOHIDEventRef event)
{
    CFArrayRef children = IOHIDEventGetChildren(event);
    if (!children || CFArrayGetCount(children) < 1)
        return std::nullopt;
    auto child = static_cast<IOHIDEventRef>(const_cast<void*>(CFArrayGetValueAtIndex(children, 0)));
    const CFIndex length = IOHIDEventGetIntegerValue(child, kIOHIDEventFieldVendorDefinedDataLength);
    const uint8_t* data = IOHIDEventGetDataValue(child, kIOHIDEventFieldVendorDefinedData);
    if (!data || length < CFIndex(ALSSampleRecord::kSize))
        return std::nullopt;
    std::span<const uint8_t> bytes(data, size_t(length));
    std::array<float, 3> xyz{};
    for (size_t i = 0; i < 3; ++i)
        xyz[i] = le::get<float>(bytes, ALSSampleRecord::kXyzResultOffset + 4 * i);
    return xyz;
}

} // namespace host
