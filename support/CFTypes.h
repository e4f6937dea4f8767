// Small checks and views of CoreFoundation values that arrive from outside
// (service properties, registry blobs, client values): a value is used only
// once its type has been checked.
#pragma once

#include <CoreFoundation/CoreFoundation.h>

#include <cstdint>
#include <optional>
#include <span>
#include <type_traits>

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

// A number as T (int, float or double), or nothing when the value is not a number.
template <typename T>
std::optional<T> numberValue(CFTypeRef value)
{
    static_assert(std::is_same_v<T, int> || std::is_same_v<T, float> || std::is_same_v<T, double>);
    constexpr CFNumberType type = std::is_same_v<T, int>     ? kCFNumberIntType
                                  : std::is_same_v<T, float> ? kCFNumberFloatType
                                                             : kCFNumberDoubleType;
    T result{};
    if (!isNumber(value))
        return std::nullopt;
    CFNumberGetValue(static_cast<CFNumberRef>(value), type, &result);
    return result;
}

inline std::optional<int> intValue(CFTypeRef value) { return numberValue<int>(value); }
inline std::optional<double> doubleValue(CFTypeRef value) { return numberValue<double>(value); }
inline std::optional<float> floatValue(CFTypeRef value) { return numberValue<float>(value); }

} // namespace cf
