// Small checks and views of CoreFoundation values that arrive from outside
// (service properties, registry blobs, client values): a value is used only
// once its type has been checked.
#pragma once

#include <CoreFoundation/CoreFoundation.h>

#include <cstdint>
#include <optional>
#include <span>

namespace cf {

inline bool isNumber(CFTypeRef value) { return value && CFGetTypeID(value) == CFNumberGetTypeID(); }
inline bool isData(CFTypeRef value) { return value && CFGetTypeID(value) == CFDataGetTypeID(); }
inline bool isBoolean(CFTypeRef value) { return value && CFGetTypeID(value) == CFBooleanGetTypeID(); }
inline bool isString(CFTypeRef value) { return value && CFGetTypeID(value) == CFStringGetTypeID(); }
inline bool isArray(CFTypeRef value) { return value && CFGetTypeID(value) == CFArrayGetTypeID(); }

// The bytes of a CFData (empty for null or empty data).
inline std::span<const uint8_t> bytesOf(CFDataRef data)
{
    const CFIndex length = data ? CFDataGetLength(data) : 0;
    if (length <= 0)
        return {};
    return {CFDataGetBytePtr(data), size_t(length)};
}

// The bytes of a value already checked to be data.
inline std::span<const uint8_t> bytesOf(CFTypeRef data) { return bytesOf(static_cast<CFDataRef>(data)); }

// A number as int, or nothing when the value is not a number.
inline std::optional<int> intValue(CFTypeRef value)
{
    int result = 0;
    if (!isNumber(value))
        return std::nullopt;
    CFNumberGetValue(static_cast<CFNumberRef>(value), kCFNumberIntType, &result);
    return result;
}

// A number as double, or nothing when the value is not a number.
inline std::optional<double> doubleValue(CFTypeRef value)
{
    double result = 0.0;
    if (!isNumber(value))
        return std::nullopt;
    CFNumberGetValue(static_cast<CFNumberRef>(value), kCFNumberDoubleType, &result);
    return result;
}

// A number as float, or nothing when the value is not a number.
inline std::optional<float> floatValue(CFTypeRef value)
{
    float result = 0.0f;
    if (!isNumber(value))
        return std::nullopt;
    CFNumberGetValue(static_cast<CFNumberRef>(value), kCFNumberFloatType, &result);
    return result;
}

} // namespace cf
