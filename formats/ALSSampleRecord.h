// The driver's per-sample record, carried as the vendor data of an ALS
// event's first child: a packed little-endian layout of 137 bytes. It is read
// into a plain struct and written back field by field, never cast onto bytes.
#pragma once

#include "support/LittleEndian.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

struct ALSSampleRecord {
    // Bytes a record must have for every field below to be present.
    static constexpr size_t kSize = 137;
    // Bytes up to the last field the filter reads (xyzSensor); filteredLux and
    // filteredLuxValid after it are only logged.
    static constexpr size_t kFilterSize = 132;

    // Field offsets in the driver's layout.
    static constexpr size_t kStatusOffset = 0;
    static constexpr size_t kSampleChannelCountOffset = 4;
    static constexpr size_t kSampleOrientationOffset = 5;
    static constexpr size_t kNitsOffset = 6;
    static constexpr size_t kIntegrationTimeOffset = 8;
    static constexpr size_t kReportIntervalOffset = 12;
    static constexpr size_t kGainOffset = 16;
    static constexpr size_t kLuxOffset = 20;
    static constexpr size_t kRawLuxOffset = 24;
    static constexpr size_t kChannelValuesOffset = 28;
    static constexpr size_t kCctOffset = 52;
    static constexpr size_t kTimestampOffset = 72;
    static constexpr size_t kSubsamplesOffset = 80;
    static constexpr size_t kModeOffset = 82;
    static constexpr size_t kXTalkOffset = 83;
    static constexpr size_t kXyzInRecordOffset = 107;
    static constexpr size_t kXyzResultOffset = 108;
    static constexpr size_t kXyzSensorOffset = 120;
    static constexpr size_t kFilteredLuxOffset = 132;
    static constexpr size_t kFilteredLuxValidOffset = 136;

    uint32_t status = 0;
    uint8_t sampleChannelCount = 0; // channels present in this sample
    uint8_t sampleOrientation = 0;
    uint16_t nits = 0; // display brightness
    uint32_t integrationTime = 0;
    uint32_t reportInterval = 0;
    int32_t gain = 0; // 16.16 fixed point
    float lux = 0.0f; // illuminance from the sensor side
    float rawLux = 0.0f;
    std::array<float, 6> channelValues{}; // c0 to c5
    float cct = 0.0f;
    uint32_t timestamp = 0;
    uint16_t subsamples = 0;
    uint8_t mode = 0; // 0 synchronous, other asynchronous
    std::array<uint32_t, 5> xTalk{};
    uint8_t xyzInRecord = 0; // the plug-in's XYZ goes into xyzResult
    std::array<float, 3> xyzResult{};
    std::array<float, 3> xyzSensor{}; // X, Y, Z from the sensor side
    float filteredLux = 0.0f;
    uint8_t filteredLuxValid = 0;

    // The record in `bytes`, or nothing when they are too few for the filter
    // (kFilterSize); fields past the end of a shorter record read as 0. Bytes
    // past the record are ignored.
    static std::optional<ALSSampleRecord> decode(std::span<const uint8_t> bytes);

    // Write-backs into a record's bytes; false (nothing written) when the
    // bytes are too few for the filter.
    static bool writeChannelValues(std::span<uint8_t> bytes, const std::array<float, 6>& values);
    static bool writeXYZResult(std::span<uint8_t> bytes, const std::array<float, 3>& xyz);
};

namespace sample_record_detail {

template <typename T, size_t N>
inline void getArray(std::span<const uint8_t> bytes, size_t offset, std::array<T, N>& out)
{
    for (size_t i = 0; i < N; ++i)
        out[i] = le::get<T>(bytes, offset + i * sizeof(T));
}

template <typename T, size_t N>
inline void putArray(std::span<uint8_t> bytes, size_t offset, const std::array<T, N>& values)
{
    for (size_t i = 0; i < N; ++i)
        le::put<T>(bytes, offset + i * sizeof(T), values[i]);
}

} // namespace sample_record_detail

inline std::optional<ALSSampleRecord> ALSSampleRecord::decode(std::span<const uint8_t> bytes)
{
    if (bytes.size() < kFilterSize)
        return std::nullopt;
    const auto record = bytes.first(std::min(bytes.size(), kSize));

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
    sample_record_detail::getArray(record, kChannelValuesOffset, r.channelValues);
    r.cct = le::get<float>(record, kCctOffset);
    r.timestamp = le::get<uint32_t>(record, kTimestampOffset);
    r.subsamples = le::get<uint16_t>(record, kSubsamplesOffset);
    r.mode = le::get<uint8_t>(record, kModeOffset);
    sample_record_detail::getArray(record, kXTalkOffset, r.xTalk);
    r.xyzInRecord = le::get<uint8_t>(record, kXyzInRecordOffset);
    sample_record_detail::getArray(record, kXyzResultOffset, r.xyzResult);
    sample_record_detail::getArray(record, kXyzSensorOffset, r.xyzSensor);
    r.filteredLux = le::get<float>(record, kFilteredLuxOffset);
    r.filteredLuxValid = le::get<uint8_t>(record, kFilteredLuxValidOffset);
    return r;
}

inline bool ALSSampleRecord::writeChannelValues(std::span<uint8_t> bytes, const std::array<float, 6>& values)
{
    if (bytes.size() < kFilterSize)
        return false;
    sample_record_detail::putArray(bytes, kChannelValuesOffset, values);
    return true;
}

inline bool ALSSampleRecord::writeXYZResult(std::span<uint8_t> bytes, const std::array<float, 3>& xyz)
{
    if (bytes.size() < kFilterSize)
        return false;
    sample_record_detail::putArray(bytes, kXyzResultOffset, xyz);
    return true;
}
