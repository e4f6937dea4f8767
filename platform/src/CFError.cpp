// Errors: a domain, a code and optional user information.
#include "CFObject.h"

struct __CFError final : vp::CFObject {
    __CFError(CFStringRef domain, CFIndex code, CFDictionaryRef userInfo)
        : CFObject(vp::kErrorTypeID), domain(static_cast<CFStringRef>(CFRetain(domain))), code(code),
          userInfo(static_cast<CFDictionaryRef>(vp::retainIfPresent(userInfo)))
    {
    }
    ~__CFError() override
    {
        CFRelease(domain);
        vp::releaseIfPresent(userInfo);
    }

    bool equals(const CFObject& other) const override
    {
        const auto& o = static_cast<const __CFError&>(other);
        return code == o.code && CFEqual(domain, o.domain);
    }

    // "Error Domain=QVT Code=5 UserInfo={...}"
    std::string describe() const override
    {
        std::string text = "Error Domain=" + vp::describe(domain) + " Code=" + std::to_string(code);
        if (userInfo)
            text += " UserInfo=" + vp::describe(userInfo);
        return text;
    }

    const CFStringRef domain;
    const CFIndex code;
    const CFDictionaryRef userInfo;
};

namespace {
const __CFError* asError(CFErrorRef err, const char* function)
{
    return vp::checked<__CFError>(err, vp::kErrorTypeID, function);
}
} // namespace

CFTypeID CFErrorGetTypeID(void) { return vp::kErrorTypeID; }

CFErrorRef CFErrorCreate(CFAllocatorRef, CFStringRef domain, CFIndex code, CFDictionaryRef userInfo)
{
    if (!domain)
        return nullptr;
    return new __CFError(domain, code, userInfo);
}

CFIndex CFErrorGetCode(CFErrorRef err) { return asError(err, "CFErrorGetCode")->code; }

CFStringRef CFErrorGetDomain(CFErrorRef err) { return asError(err, "CFErrorGetDomain")->domain; }
