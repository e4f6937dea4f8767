// UUIDs: sixteen bytes. Constant UUIDs are interned by their bytes and never
// freed; created ones are counted objects equal to the constant of the same bytes.
#include "CFObject.h"
#include "UUIDBytes.h"

#include <map>
#include <mutex>
#include <string_view>

struct __CFUUID final : vp::CFObject {
    __CFUUID(const vp::UUIDBytes& bytes, vp::Lifetime lifetime) : CFObject(vp::kUUIDTypeID, lifetime), bytes(bytes) {}

    bool equals(const CFObject& other) const override { return bytes == static_cast<const __CFUUID&>(other).bytes; }

    // "6B0340D3-5798-4064-AA17-9204C7B06FFD"
    std::string describe() const override
    {
        static constexpr char digits[] = "0123456789ABCDEF";
        std::string text;
        for (size_t i = 0; i < bytes.size(); ++i) {
            if (i == 4 || i == 6 || i == 8 || i == 10)
                text += '-';
            text += digits[bytes[i] >> 4];
            text += digits[bytes[i] & 0xF];
        }
        return text;
    }

    const vp::UUIDBytes bytes;
};

namespace vp {
UUIDBytes uuidBytes(CFUUIDRef uuid, const char* function)
{
    return checked<__CFUUID>(uuid, kUUIDTypeID, function)->bytes;
}
} // namespace vp

namespace {

class ConstantUUIDs {
public:
    CFUUIDRef intern(const vp::UUIDBytes& bytes)
    {
        std::lock_guard lock(mutex_);
        auto [it, added] = uuids_.try_emplace(bytes, nullptr);
        if (added)
            it->second = new __CFUUID(bytes, vp::Lifetime::Immortal);
        return it->second;
    }

private:
    std::mutex mutex_;
    std::map<vp::UUIDBytes, const __CFUUID*> uuids_;
};

int hexValue(char c)
{
    if (c >= '0' && c <= '9')
        return c - '0';
    if (c >= 'a' && c <= 'f')
        return c - 'a' + 10;
    if (c >= 'A' && c <= 'F')
        return c - 'A' + 10;
    return -1;
}

// Parses the canonical 8-4-4-4-12 form.
bool parseUUID(std::string_view text, vp::UUIDBytes& bytes)
{
    if (text.size() != 36)
        return false;
    size_t at = 0;
    for (size_t i = 0; i < bytes.size(); ++i) {
        if (i == 4 || i == 6 || i == 8 || i == 10) {
            if (text[at++] != '-')
                return false;
        }
        int high = hexValue(text[at++]);
        int low = hexValue(text[at++]);
        if (high < 0 || low < 0)
            return false;
        bytes[i] = UInt8(high << 4 | low);
    }
    return true;
}

} // namespace

CFTypeID CFUUIDGetTypeID(void) { return vp::kUUIDTypeID; }

CFUUIDRef CFUUIDGetConstantUUIDWithBytes(CFAllocatorRef, UInt8 byte0, UInt8 byte1, UInt8 byte2, UInt8 byte3,
                                         UInt8 byte4, UInt8 byte5, UInt8 byte6, UInt8 byte7, UInt8 byte8, UInt8 byte9,
                                         UInt8 byte10, UInt8 byte11, UInt8 byte12, UInt8 byte13, UInt8 byte14,
                                         UInt8 byte15)
{
    // Allocated once and never destroyed, so constants outlive every static.
    static auto* constants = new ConstantUUIDs;
    return constants->intern({byte0, byte1, byte2, byte3, byte4, byte5, byte6, byte7, byte8, byte9, byte10, byte11,
                              byte12, byte13, byte14, byte15});
}

CFUUIDRef CFUUIDCreateFromUUIDBytes(CFAllocatorRef, CFUUIDBytes bytes)
{
    return new __CFUUID(vp::toArray(bytes), vp::Lifetime::Counted);
}

CFUUIDRef CFUUIDCreateFromString(CFAllocatorRef, CFStringRef uuidStr)
{
    if (!uuidStr)
        return nullptr;
    const char* text = CFStringGetCStringPtr(uuidStr, kCFStringEncodingASCII);
    vp::UUIDBytes bytes;
    if (!text || !parseUUID(text, bytes))
        return nullptr;
    return new __CFUUID(bytes, vp::Lifetime::Counted);
}

CFStringRef CFUUIDCreateString(CFAllocatorRef, CFUUIDRef uuid)
{
    const auto* u = vp::checked<__CFUUID>(uuid, vp::kUUIDTypeID, "CFUUIDCreateString");
    return CFStringCreateWithCString(kCFAllocatorDefault, u->describe().c_str(), kCFStringEncodingASCII);
}

CFUUIDBytes CFUUIDGetUUIDBytes(CFUUIDRef uuid)
{
    const auto b = vp::uuidBytes(uuid, "CFUUIDGetUUIDBytes");
    return {b[0], b[1], b[2], b[3], b[4], b[5], b[6], b[7], b[8], b[9], b[10], b[11], b[12], b[13], b[14], b[15]};
}
