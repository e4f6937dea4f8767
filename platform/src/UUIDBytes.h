// The sixteen bytes of a UUID as a comparable value, for code that keys on
// UUIDs (plug-in instance counting).
#pragma once

#include <CoreFoundation/CoreFoundation.h>

#include <array>

namespace vp {

using UUIDBytes = std::array<UInt8, 16>;

inline UUIDBytes toArray(const CFUUIDBytes& b)
{
    return {b.byte0, b.byte1, b.byte2,  b.byte3,  b.byte4,  b.byte5,  b.byte6,  b.byte7,
            b.byte8, b.byte9, b.byte10, b.byte11, b.byte12, b.byte13, b.byte14, b.byte15};
}

// The bytes of `uuid`; stops the process when it is null or not a UUID.
UUIDBytes uuidBytes(CFUUIDRef uuid, const char* function);

} // namespace vp
