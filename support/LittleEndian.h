// Little-endian fields of packed byte layouts (driver records, factory
// records, registry blobs, sample records). Every access is bounds-checked by
// the span it is given: a read outside it yields nothing, a write outside it
// is refused. Never cast a struct onto bytes; use these.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <span>
#include <type_traits>

namespace le {

template <typename T>
concept Field = std::is_arithmetic_v<T>;

// True when [offset, offset + size) lies inside a buffer of `length` bytes.
constexpr bool fits(size_t length, size_t offset, size_t size) { return offset <= length && size <= length - offset; }

template <Field T>
T decode(const uint8_t* p)
{
    using U = std::conditional_t<
        sizeof(T) == 1, uint8_t,
        std::conditional_t<sizeof(T) == 2, uint16_t, std::conditional_t<sizeof(T) == 4, uint32_t, uint64_t>>>;
    U u = 0;
    for (size_t i = 0; i < sizeof(T); ++i)
        u |= U(p[i]) << (8 * i);
    T value;
    std::memcpy(&value, &u, sizeof(T));
    return value;
}

template <Field T>
void encode(uint8_t* p, T value)
{
    using U = std::conditional_t<
        sizeof(T) == 1, uint8_t,
        std::conditional_t<sizeof(T) == 2, uint16_t, std::conditional_t<sizeof(T) == 4, uint32_t, uint64_t>>>;
    U u;
    std::memcpy(&u, &value, sizeof(T));
    for (size_t i = 0; i < sizeof(T); ++i)
        p[i] = uint8_t(u >> (8 * i));
}

// Read a field; std::nullopt when it does not lie inside `bytes`.
template <Field T>
std::optional<T> read(std::span<const uint8_t> bytes, size_t offset)
{
    if (!fits(bytes.size(), offset, sizeof(T)))
        return std::nullopt;
    return decode<T>(bytes.data() + offset);
}

// Read a field the caller has already bounds-checked (for example after
// checking a whole record's length); still checked, yields 0 when outside.
template <Field T>
T get(std::span<const uint8_t> bytes, size_t offset)
{
    return read<T>(bytes, offset).value_or(T(0));
}

// Write a field; false (nothing written) when it does not lie inside `bytes`.
template <Field T>
bool put(std::span<uint8_t> bytes, size_t offset, T value)
{
    if (!fits(bytes.size(), offset, sizeof(T)))
        return false;
    encode<T>(bytes.data() + offset, value);
    return true;
}

} // namespace le
