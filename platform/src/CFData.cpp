// Data: an immutable run of bytes.
#include "CFObject.h"

#include <algorithm>
#include <cstring>
#include <vector>

namespace {
// Longer data is shown by its first bytes and its length.
constexpr size_t kDescribedBytes = 64;
} // namespace

struct __CFData final : vp::CFObject {
    __CFData(const UInt8* data, size_t length) : CFObject(vp::kDataTypeID), bytes(data, data + length) {}

    bool equals(const CFObject& other) const override { return bytes == static_cast<const __CFData&>(other).bytes; }

    // "<01020304 0506>": hex in groups of four bytes.
    std::string describe() const override
    {
        static constexpr char digits[] = "0123456789abcdef";
        std::string text = "<";
        size_t shown = std::min(bytes.size(), kDescribedBytes);
        for (size_t i = 0; i < shown; ++i) {
            if (i > 0 && i % 4 == 0)
                text += ' ';
            text += digits[bytes[i] >> 4];
            text += digits[bytes[i] & 0xF];
        }
        if (shown < bytes.size())
            text += " ... (" + std::to_string(bytes.size()) + " bytes)";
        return text + ">";
    }

    const std::vector<UInt8> bytes;
};

namespace {
const __CFData* asData(CFDataRef data, const char* function)
{
    return vp::checked<__CFData>(data, vp::kDataTypeID, function);
}
} // namespace

CFTypeID CFDataGetTypeID(void) { return vp::kDataTypeID; }

CFDataRef CFDataCreate(CFAllocatorRef, const UInt8* bytes, CFIndex length)
{
    if (length < 0 || (!bytes && length > 0))
        return nullptr;
    return new __CFData(bytes, size_t(length));
}

CFIndex CFDataGetLength(CFDataRef data) { return CFIndex(asData(data, "CFDataGetLength")->bytes.size()); }

const UInt8* CFDataGetBytePtr(CFDataRef data)
{
    const auto& bytes = asData(data, "CFDataGetBytePtr")->bytes;
    return bytes.empty() ? nullptr : bytes.data();
}

void CFDataGetBytes(CFDataRef data, CFRange range, UInt8* buffer)
{
    const auto& bytes = asData(data, "CFDataGetBytes")->bytes;
    if (range.location < 0 || range.length < 0 || size_t(range.location) > bytes.size() ||
        size_t(range.length) > bytes.size() - size_t(range.location))
        vp::fatal("CFDataGetBytes", "range outside the data");
    if (range.length > 0)
        std::memcpy(buffer, bytes.data() + range.location, size_t(range.length));
}
