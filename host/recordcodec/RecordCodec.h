// Calibration records as JSON and back: every factory record, registry
// calibration blob and driver record the plug-in reads or writes.
//
// A decoded record is {"format", "size", "fields", "unnamed"}: "fields" names
// every field of the layout (fixed-point values as {"raw", "value"}, floats
// as numbers or {"bits"} when not finite, texts as {"text"} or {"hex"}), and
// "unnamed" keeps every byte no field covers as {"offset", "hex"}, so that
// encoding a decoded record gives back the same bytes.
//
// Encoding takes the raw value of a fixed-point field when given, else its
// converted value; a field missing from the JSON is written as zero.
#pragma once

#include "host/recordcodec/FieldLayout.h"

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace recordcodec {

enum class Kind {
    XwCl,              // factory XwCl, one or two entries (5156, 10236 bytes)
    XwCAT2,            // factory XwCA T2 (9962)
    VD6287v1,          // factory VD6287 version 1 (10440)
    VD6287v3,          // factory VD6287 version 3 (10348)
    AlsCalibration,    // registry "alsCalibration" (any size)
    AlsAuxCalibration, // registry "alsAuxCalibration" (any size)
    Driver4Channel,    // "ALSCalibrationData", 145 bytes
    Driver5Channel,    // 193
    Driver6Channel,    // 220
    DriverVD6287,      // 776
    ColorCalibration,  // "ALSColorCalibration", 28163
};

// The name used in the JSON "format" member.
std::string_view kindName(Kind kind);
std::optional<Kind> kindNamed(std::string_view name);
const std::vector<Kind>& allKinds();
// The kind of a record of `size` bytes when the size alone tells it (every
// factory and driver record); the registry blobs have to be named.
std::optional<Kind> kindForSize(size_t size);

template <typename T>
struct Result {
    std::optional<T> value;
    std::string error; // why there is no value
    explicit operator bool() const { return value.has_value(); }
};

// Decodes `bytes` as `kind`, or as the kind their size tells when not given.
Result<Json> decode(std::span<const uint8_t> bytes, std::optional<Kind> kind = std::nullopt);
// Encodes a JSON record of the form decode produces.
Result<std::vector<uint8_t>> encode(const Json& record);

} // namespace recordcodec
