// The driver's per-sample record, carried as the vendor data of an ALS
// event's first child: a packed little-endian layout of 137 bytes. It is read
// into a plain struct and written back field by field, never cast onto bytes.
#pragma once

#include <IOKit/hid/IOHIDEvent.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

struct ALSSampleRecord {
    // Bytes a record must have for every field below to be present.
    static constexpr size_t kSize = 137;

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
    uint8_t sampleChannelCount = 0;       // channels present in this sample
    uint8_t sampleOrientation = 0;
    uint16_t nits = 0;                    // display brightness
    uint32_t integrationTime = 0;
    uint32_t reportInterval = 0;
    int32_t gain = 0;                     // 16.16 fixed point
    float lux = 0.0f;                     // illuminance from the sensor side
    float rawLux = 0.0f;
    std::array<float, 6> channelValues{}; // c0 to c5
    float cct = 0.0f;
    uint32_t timestamp = 0;
    uint16_t subsamples = 0;
    uint8_t mode = 0;                     // 0 synchronous, other asynchronous
    std::array<uint32_t, 5> xTalk{};
    uint8_t xyzInRecord = 0;              // the plug-in's XYZ goes into xyzResult
    std::array<float, 3> xyzResult{};
    std::array<float, 3> xyzSensor{};     // X, Y, Z from the sensor side
    float filteredLux = 0.0f;
    uint8_t filteredLuxValid = 0;

    // The record in `bytes`, or nothing when they are too few to hold it.
    // Bytes past the record are ignored.
    static std::optional<ALSSampleRecord> decode(std::span<const uint8_t> bytes);

    // Write-backs into a record's bytes; false (nothing written) when the
    // bytes are too few to hold the record.
    static bool writeChannelValues(std::span<uint8_t> bytes, const std::array<float, 6>& values);
    static bool writeXYZResult(std::span<uint8_t> bytes, const std::array<float, 3>& xyz);
};

// The record bytes of an ALS event: the vendor data of its first child, as
// long as the child's announced length. Empty when the event has no child,
// the child no data, or the length is not positive.
std::span<uint8_t> sampleRecordBytes(IOHIDEventRef event);
