#include "PlatformText.h"

#include <vector>

namespace vp {

std::string textOf(CFStringRef string)
{
    if (!string)
        return {};
    if (const char* direct = CFStringGetCStringPtr(string, kCFStringEncodingUTF8))
        return direct;
    // Four bytes per unit covers any UTF-8 encoding of the string, plus the NUL.
    std::vector<char> buffer(size_t(CFStringGetLength(string)) * 4 + 1);
    if (!CFStringGetCString(string, buffer.data(), CFIndex(buffer.size()), kCFStringEncodingUTF8))
        return {};
    return buffer.data();
}

std::string descriptionOf(CFTypeRef object)
{
    if (!object)
        return "(null)";
    CFStringRef description = CFCopyDescription(object);
    if (!description)
        return "(null)";
    std::string text = textOf(description);
    CFRelease(description);
    return text;
}

} // namespace vp
