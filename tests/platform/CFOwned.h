// Owning holders for CF objects in tests, so a failed assertion still
// releases what the test created.
#pragma once

#include <CoreFoundation/CoreFoundation.h>

#include <memory>
#include <string>
#include <type_traits>

namespace vt {

struct CFReleaser {
    void operator()(const void* cf) const { CFRelease(cf); }
};

template <class Ref>
using Owned = std::unique_ptr<std::remove_pointer_t<Ref>, CFReleaser>;

template <class Ref>
Owned<Ref> own(Ref ref)
{
    return Owned<Ref>(ref);
}

inline Owned<CFNumberRef> number(int value) { return own(CFNumberCreate(nullptr, kCFNumberIntType, &value)); }
inline Owned<CFNumberRef> number(double value) { return own(CFNumberCreate(nullptr, kCFNumberDoubleType, &value)); }
inline Owned<CFStringRef> string(const char* text)
{
    return own(CFStringCreateWithCString(nullptr, text, kCFStringEncodingUTF8));
}

// The description as text.
inline std::string describe(CFTypeRef cf)
{
    auto description = own(CFCopyDescription(cf));
    return CFStringGetCStringPtr(description.get(), kCFStringEncodingUTF8);
}

} // namespace vt
