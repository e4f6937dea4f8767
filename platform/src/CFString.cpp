// Strings: immutable UTF-8 text. Constant strings are interned by content and
// never freed.
#include "CFObject.h"

#include <cstring>
#include <mutex>
#include <string_view>
#include <unordered_map>

struct __CFString final : vp::CFObject {
    __CFString(std::string_view text, vp::Lifetime lifetime) : CFObject(vp::kStringTypeID, lifetime), text(text) {}

    bool equals(const CFObject& other) const override { return text == static_cast<const __CFString&>(other).text; }
    std::string describe() const override { return text; }

    const std::string text;
};

namespace {

const __CFString* asString(CFStringRef str, const char* function)
{
    return vp::checked<__CFString>(str, vp::kStringTypeID, function);
}

bool isASCII(std::string_view text)
{
    for (unsigned char c : text)
        if (c >= 0x80)
            return false;
    return true;
}

// Length of the UTF-8 sequence that starts with `lead`, 0 when it cannot start one.
size_t sequenceLength(unsigned char lead)
{
    if (lead < 0x80)
        return 1;
    if (lead >= 0xC2 && lead <= 0xDF)
        return 2;
    if (lead >= 0xE0 && lead <= 0xEF)
        return 3;
    if (lead >= 0xF0 && lead <= 0xF4)
        return 4;
    return 0;
}

// Decodes one well-formed sequence (no overlong forms, surrogates or values
// beyond U+10FFFF); returns its length, 0 when malformed.
size_t decode(std::string_view text, size_t at, char32_t& codePoint)
{
    auto lead = static_cast<unsigned char>(text[at]);
    size_t n = sequenceLength(lead);
    if (n == 0 || at + n > text.size())
        return 0;
    codePoint = n == 1 ? lead : lead & (0x7F >> n);
    for (size_t i = 1; i < n; ++i) {
        auto c = static_cast<unsigned char>(text[at + i]);
        if ((c & 0xC0) != 0x80)
            return 0;
        codePoint = (codePoint << 6) | (c & 0x3F);
    }
    static constexpr char32_t smallest[] = {0, 0, 0x80, 0x800, 0x10000};
    if (codePoint < smallest[n] || codePoint > 0x10FFFF || (codePoint >= 0xD800 && codePoint <= 0xDFFF))
        return 0;
    return n;
}

bool isValidUTF8(std::string_view text)
{
    char32_t codePoint;
    for (size_t at = 0; at < text.size();) {
        size_t n = decode(text, at, codePoint);
        if (n == 0)
            return false;
        at += n;
    }
    return true;
}

bool isSupported(CFStringEncoding encoding)
{
    return encoding == kCFStringEncodingASCII || encoding == kCFStringEncodingUTF8;
}

bool fitsEncoding(std::string_view text, CFStringEncoding encoding)
{
    return encoding == kCFStringEncodingUTF8 ? isValidUTF8(text) : isASCII(text);
}

class ConstantStrings {
public:
    CFStringRef intern(const char* cStr)
    {
        std::string_view text(cStr);
        std::lock_guard lock(mutex_);
        auto found = strings_.find(text);
        if (found != strings_.end())
            return found->second;
        auto* str = new __CFString(text, vp::Lifetime::Immortal);
        // The key views the immortal object's own text.
        strings_.emplace(str->text, str);
        return str;
    }

private:
    std::mutex mutex_;
    std::unordered_map<std::string_view, const __CFString*> strings_;
};

} // namespace

CFTypeID CFStringGetTypeID(void) { return vp::kStringTypeID; }

CFStringRef CFStringCreateWithCString(CFAllocatorRef, const char* cStr, CFStringEncoding encoding)
{
    if (!cStr || !isSupported(encoding) || !fitsEncoding(cStr, encoding))
        return nullptr;
    return new __CFString(cStr, vp::Lifetime::Counted);
}

// Counted in UTF-16 code units, as the platform counts.
CFIndex CFStringGetLength(CFStringRef str)
{
    const std::string& text = asString(str, "CFStringGetLength")->text;
    CFIndex units = 0;
    for (size_t at = 0; at < text.size();) {
        char32_t codePoint = 0;
        size_t n = decode(text, at, codePoint);
        // A constant string may hold malformed bytes; each counts as one unit.
        units += n && codePoint > 0xFFFF ? 2 : 1;
        at += n ? n : 1;
    }
    return units;
}

const char* CFStringGetCStringPtr(CFStringRef str, CFStringEncoding encoding)
{
    const std::string& text = asString(str, "CFStringGetCStringPtr")->text;
    if (!isSupported(encoding) || !fitsEncoding(text, encoding))
        return nullptr;
    return text.c_str();
}

// Copies the text and its terminator when both fit; otherwise leaves an empty
// string (when there is room for one) and returns false.
Boolean CFStringGetCString(CFStringRef str, char* buffer, CFIndex bufferSize, CFStringEncoding encoding)
{
    const std::string& text = asString(str, "CFStringGetCString")->text;
    if (!buffer || bufferSize <= 0)
        return false;
    if (!isSupported(encoding) || !fitsEncoding(text, encoding) || text.size() + 1 > size_t(bufferSize)) {
        buffer[0] = '\0';
        return false;
    }
    std::memcpy(buffer, text.c_str(), text.size() + 1);
    return true;
}

CFStringRef __CFStringMakeConstantString(const char* cStr)
{
    if (!cStr)
        vp::fatal("__CFStringMakeConstantString", "null text");
    // Allocated once and never destroyed, so constants outlive every static.
    static auto* constants = new ConstantStrings;
    return constants->intern(cStr);
}
