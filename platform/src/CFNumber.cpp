// Numbers: a signed integer or a floating value, remembering the type they
// were created with, readable as any other type.
#include "CFObject.h"

#include <charconv>
#include <cmath>
#include <cstring>
#include <limits>
#include <optional>

namespace {

enum class Kind { Int8, Int16, Int32, Int64, Float32, Float64 };

std::optional<Kind> kindOf(CFNumberType type)
{
    switch (type) {
    case kCFNumberSInt8Type:
    case kCFNumberCharType:
        return Kind::Int8;
    case kCFNumberSInt16Type:
    case kCFNumberShortType:
        return Kind::Int16;
    case kCFNumberSInt32Type:
    case kCFNumberIntType:
        return Kind::Int32;
    case kCFNumberSInt64Type:
    case kCFNumberLongLongType:
    case kCFNumberLongType:
    case kCFNumberCFIndexType:
        static_assert(sizeof(long) == 8 && sizeof(CFIndex) == 8);
        return Kind::Int64;
    case kCFNumberFloat32Type:
    case kCFNumberFloatType:
        return Kind::Float32;
    case kCFNumberFloat64Type:
    case kCFNumberDoubleType:
        return Kind::Float64;
    default:
        return std::nullopt;
    }
}

template <class T>
T load(const void* p)
{
    T value;
    std::memcpy(&value, p, sizeof value);
    return value;
}

template <class T>
void store(void* p, T value)
{
    std::memcpy(p, &value, sizeof value);
}

// 2^63 as a double; every int64_t lies below it.
constexpr double kInt64Limit = 9223372036854775808.0;

} // namespace

struct __CFNumber final : vp::CFObject {
    __CFNumber(CFNumberType type, Kind kind, const void* valuePtr) : CFObject(vp::kNumberTypeID), type(type), kind(kind)
    {
        switch (kind) {
        case Kind::Int8:
            integer = load<int8_t>(valuePtr);
            break;
        case Kind::Int16:
            integer = load<int16_t>(valuePtr);
            break;
        case Kind::Int32:
            integer = load<int32_t>(valuePtr);
            break;
        case Kind::Int64:
            integer = load<int64_t>(valuePtr);
            break;
        case Kind::Float32:
            real = load<float>(valuePtr);
            break;
        case Kind::Float64:
            real = load<double>(valuePtr);
            break;
        }
    }

    bool isFloat() const { return kind == Kind::Float32 || kind == Kind::Float64; }

    bool equals(const CFObject& other) const override
    {
        const auto& o = static_cast<const __CFNumber&>(other);
        if (isFloat() && o.isFloat())
            return real == o.real || (std::isnan(real) && std::isnan(o.real));
        if (!isFloat() && !o.isFloat())
            return integer == o.integer;
        const __CFNumber& f = isFloat() ? *this : o;
        const __CFNumber& i = isFloat() ? o : *this;
        // Exact: the floating value must be a whole number within int64_t.
        if (!(f.real >= -kInt64Limit && f.real < kInt64Limit) || std::trunc(f.real) != f.real)
            return false;
        return int64_t(f.real) == i.integer;
    }

    std::string describe() const override
    {
        char text[64];
        std::to_chars_result r;
        if (kind == Kind::Float32)
            r = std::to_chars(text, text + sizeof text, float(real));
        else if (kind == Kind::Float64)
            r = std::to_chars(text, text + sizeof text, real);
        else
            r = std::to_chars(text, text + sizeof text, integer);
        return std::string(text, r.ptr);
    }

    const CFNumberType type;
    const Kind kind;
    int64_t integer = 0;
    double real = 0.0;
};

namespace {

const __CFNumber* asNumber(CFNumberRef number, const char* function)
{
    return vp::checked<__CFNumber>(number, vp::kNumberTypeID, function);
}

// Truncates towards zero and saturates; exact when nothing was lost.
template <class Int>
bool toInteger(const __CFNumber& n, void* out)
{
    constexpr Int lowest = std::numeric_limits<Int>::min();
    constexpr Int highest = std::numeric_limits<Int>::max();
    if (!n.isFloat()) {
        Int value = n.integer < lowest ? lowest : n.integer > highest ? highest : Int(n.integer);
        store(out, value);
        return value == n.integer;
    }
    if (std::isnan(n.real)) {
        store(out, Int(0));
        return false;
    }
    // -lowest is 2^(bits-1), exactly representable as a double.
    const double limit = -double(lowest);
    double whole = std::trunc(n.real);
    Int value = whole >= limit ? highest : whole < -limit ? lowest : Int(whole);
    store(out, value);
    return whole == n.real && whole < limit && whole >= -limit;
}

bool toFloat32(const __CFNumber& n, void* out)
{
    if (!n.isFloat()) {
        float value = float(n.integer);
        store(out, value);
        return double(value) < kInt64Limit && int64_t(value) == n.integer;
    }
    constexpr double highest = std::numeric_limits<float>::max();
    if (std::isnan(n.real) || std::isinf(n.real)) {
        store(out, float(n.real));
        return true;
    }
    if (std::fabs(n.real) > highest) {
        store(out, float(std::copysign(highest, n.real)));
        return false;
    }
    float value = float(n.real);
    store(out, value);
    return double(value) == n.real;
}

bool toFloat64(const __CFNumber& n, void* out)
{
    if (n.isFloat()) {
        store(out, n.real);
        return true;
    }
    double value = double(n.integer);
    store(out, value);
    return value < kInt64Limit && int64_t(value) == n.integer;
}

} // namespace

CFTypeID CFNumberGetTypeID(void) { return vp::kNumberTypeID; }

CFNumberRef CFNumberCreate(CFAllocatorRef, CFNumberType type, const void* valuePtr)
{
    auto kind = kindOf(type);
    if (!kind || !valuePtr)
        return nullptr;
    return new __CFNumber(type, *kind, valuePtr);
}

CFNumberType CFNumberGetType(CFNumberRef number) { return asNumber(number, "CFNumberGetType")->type; }

Boolean CFNumberIsFloatType(CFNumberRef number) { return asNumber(number, "CFNumberIsFloatType")->isFloat(); }

Boolean CFNumberGetValue(CFNumberRef number, CFNumberType type, void* valuePtr)
{
    const __CFNumber& n = *asNumber(number, "CFNumberGetValue");
    auto kind = kindOf(type);
    if (!kind || !valuePtr)
        return false;
    switch (*kind) {
    case Kind::Int8:
        return toInteger<int8_t>(n, valuePtr);
    case Kind::Int16:
        return toInteger<int16_t>(n, valuePtr);
    case Kind::Int32:
        return toInteger<int32_t>(n, valuePtr);
    case Kind::Int64:
        return toInteger<int64_t>(n, valuePtr);
    case Kind::Float32:
        return toFloat32(n, valuePtr);
    case Kind::Float64:
        return toFloat64(n, valuePtr);
    }
    return false;
}
