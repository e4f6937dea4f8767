// Which HID services the plug-in attaches to: ambient-light sensors whose
// device-tree name or driver class is one of the colour sensors.
#include "plugin/VantishPlugIn.h"
#include "support/Log.h"

#include <array>

namespace {

constexpr SInt32 kMatchScore = 1000;

// The accepted names, compared with CFEqual.
const std::array<CFStringRef, 4>& nameMatches()
{
    static const std::array<CFStringRef, 4> names = {CFSTR("als,ct709"), CFSTR("als,ct711"), CFSTR("als,ct720"),
                                                     CFSTR("als,tcs3490")};
    return names;
}

const std::array<CFStringRef, 7>& classMatches()
{
    static const std::array<CFStringRef, 7> classes = {
        CFSTR("TavroSPUCT709"), CFSTR("TavroSPUCT720"),  CFSTR("TavroSPUCT721"), CFSTR("TavroSPUCT724"),
        CFSTR("TavroSPUCT725"), CFSTR("TavroSPUVD6286"), CFSTR("TavroSPUVD6287")};
    return classes;
}

template <size_t N>
bool isOneOf(CFStringRef value, const std::array<CFStringRef, N>& table)
{
    for (CFStringRef candidate : table)
        if (CFEqual(value, candidate))
            return true;
    return false;
}

bool isString(CFTypeRef value) { return value && CFGetTypeID(value) == CFStringGetTypeID(); }

void logMatch(CFStringRef name)
{
    VLOG_DEFAULT("Matched on: %{public}s\n", CFStringGetCStringPtr(name, kCFStringEncodingASCII));
}

// The first accepted device-tree name in "IONameMatch" (a string or an array of them).
CFStringRef matchingName(CFTypeRef names)
{
    if (!names)
        return nullptr;
    if (CFGetTypeID(names) == CFArrayGetTypeID()) {
        CFArrayRef array = static_cast<CFArrayRef>(names);
        for (CFIndex i = 0; i < CFArrayGetCount(array); ++i) {
            CFTypeRef element = CFArrayGetValueAtIndex(array, i);
            if (isString(element) && isOneOf(static_cast<CFStringRef>(element), nameMatches()))
                return static_cast<CFStringRef>(element);
        }
        return nullptr;
    }
    if (isString(names) && isOneOf(static_cast<CFStringRef>(names), nameMatches()))
        return static_cast<CFStringRef>(names);
    return nullptr;
}

} // namespace

SInt32 VantishPlugIn::match(IOHIDServiceRef candidate, IOOptionBits options)
{
    (void) options;
    if (!IOHIDServiceConformsTo(candidate, kHIDPage_VendorSensor, kHIDUsage_VendorSensor_AmbientLight))
        return 0;

    CFTypeRef names = IOHIDServiceCopyProperty(candidate, CFSTR("IONameMatch"));
    CFStringRef name = matchingName(names);
    if (name)
        logMatch(name);
    if (names)
        CFRelease(names);
    if (name)
        return kMatchScore;

    CFTypeRef driverClass = IOHIDServiceCopyProperty(candidate, CFSTR("IOClass"));
    SInt32 score = 0;
    if (isString(driverClass) && isOneOf(static_cast<CFStringRef>(driverClass), classMatches())) {
        logMatch(static_cast<CFStringRef>(driverClass));
        score = kMatchScore;
    }
    if (driverClass)
        CFRelease(driverClass);
    return score;
}
