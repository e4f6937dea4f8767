// HID services: the usages a service carries, the properties its driver
// publishes, and the properties handed to the driver, which a host can refuse
// and observe. The plug-in sets properties from worker threads while the host
// reads them, so every service has its own lock.
#include "CFObject.h"

#include <IOKit/hid/IOHIDService.h>
#include <VantishPlatform/HIDHost.h>

#include <cstdio>
#include <mutex>
#include <utility>
#include <vector>

namespace {

CFMutableDictionaryRef newDictionary()
{
    return CFDictionaryCreateMutable(kCFAllocatorDefault, 0, &kCFTypeDictionaryKeyCallBacks,
                                     &kCFTypeDictionaryValueCallBacks);
}

CFNumberRef newRegistryIDNumber(uint64_t registryID)
{
    if (registryID == 0)
        return nullptr;
    return CFNumberCreate(kCFAllocatorDefault, kCFNumberSInt64Type, &registryID);
}

std::string hex(uint64_t value)
{
    char text[24];
    std::snprintf(text, sizeof text, "0x%llx", static_cast<unsigned long long>(value));
    return text;
}

} // namespace

struct __IOHIDService final : vp::CFObject {
    using Observer = std::function<void(CFStringRef, CFTypeRef)>;

    // What the driver received for one key.
    struct Received {
        CFStringRef key;
        CFTypeRef last;
        size_t count;
    };

    explicit __IOHIDService(uint64_t registryID)
        : CFObject(vp::kHIDServiceTypeID), registryID(newRegistryIDNumber(registryID)), published(newDictionary()),
          refused(newDictionary())
    {
    }

    ~__IOHIDService() override
    {
        vp::releaseIfPresent(registryID);
        CFRelease(published);
        CFRelease(refused);
        for (const auto& r : received) {
            CFRelease(r.key);
            CFRelease(r.last);
        }
    }

    // "<IOHIDService registryID=0x10 usages=(0xff00:0x4)>"
    std::string describe() const override
    {
        std::lock_guard lock(mutex);
        std::string text = "<IOHIDService registryID=" + (registryID ? vp::describe(registryID) : "none") + " usages=(";
        for (size_t i = 0; i < usages.size(); ++i)
            text += (i ? ", " : "") + hex(usages[i].first) + ":" + hex(usages[i].second);
        return text + ")>";
    }

    Received* findReceived(CFStringRef key)
    {
        for (auto& r : received)
            if (CFEqual(r.key, key))
                return &r;
        return nullptr;
    }

    // Returns false when the driver refuses the key; otherwise records the
    // value and returns the observer to call.
    bool accept(CFStringRef key, CFTypeRef value, Observer& observerToCall)
    {
        std::lock_guard lock(mutex);
        if (CFDictionaryGetValue(refused, key))
            return false;
        CFRetain(value);
        if (Received* r = findReceived(key)) {
            CFRelease(r->last);
            r->last = value;
            ++r->count;
        } else {
            received.push_back({static_cast<CFStringRef>(CFRetain(key)), value, 1});
        }
        observerToCall = observer;
        return true;
    }

    mutable std::mutex mutex;
    const CFNumberRef registryID;
    std::vector<std::pair<uint32_t, uint32_t>> usages;
    const CFMutableDictionaryRef published;
    const CFMutableDictionaryRef refused;
    std::vector<Received> received;
    Observer observer;
};

namespace {
__IOHIDService* asService(IOHIDServiceRef service, const char* function)
{
    return vp::checkedMutable<__IOHIDService>(service, vp::kHIDServiceTypeID, function);
}
} // namespace

CFTypeID IOHIDServiceGetTypeID(void) { return vp::kHIDServiceTypeID; }

Boolean IOHIDServiceConformsTo(IOHIDServiceRef service, uint32_t usagePage, uint32_t usage)
{
    auto* s = asService(service, "IOHIDServiceConformsTo");
    std::lock_guard lock(s->mutex);
    for (const auto& [page, u] : s->usages)
        if (page == usagePage && u == usage)
            return true;
    return false;
}

// The value stays owned by the service; it lives until the driver publishes
// another one for the key, as on the platform.
CFTypeRef IOHIDServiceGetProperty(IOHIDServiceRef service, CFStringRef key)
{
    auto* s = asService(service, "IOHIDServiceGetProperty");
    if (!key)
        return nullptr;
    std::lock_guard lock(s->mutex);
    return CFDictionaryGetValue(s->published, key);
}

CFTypeRef IOHIDServiceCopyProperty(IOHIDServiceRef service, CFStringRef key)
{
    auto* s = asService(service, "IOHIDServiceCopyProperty");
    if (!key)
        return nullptr;
    std::lock_guard lock(s->mutex);
    return vp::retainIfPresent(CFDictionaryGetValue(s->published, key));
}

Boolean IOHIDServiceSetProperty(IOHIDServiceRef service, CFStringRef key, CFTypeRef value)
{
    auto* s = asService(service, "IOHIDServiceSetProperty");
    if (!key || !value)
        return false;
    __IOHIDService::Observer observer;
    if (!s->accept(key, value, observer))
        return false;
    // Called without the lock, so an observer may use the service.
    if (observer)
        observer(key, value);
    return true;
}

CFTypeRef IOHIDServiceGetRegistryID(IOHIDServiceRef service)
{
    return asService(service, "IOHIDServiceGetRegistryID")->registryID;
}

IOHIDServiceRef VPServiceCreate(uint64_t registryID) { return new __IOHIDService(registryID); }

void VPServiceAddUsage(IOHIDServiceRef service, uint32_t usagePage, uint32_t usage)
{
    auto* s = asService(service, "VPServiceAddUsage");
    std::lock_guard lock(s->mutex);
    s->usages.emplace_back(usagePage, usage);
}

void VPServicePublishProperty(IOHIDServiceRef service, CFStringRef key, CFTypeRef value)
{
    auto* s = asService(service, "VPServicePublishProperty");
    std::lock_guard lock(s->mutex);
    if (value)
        CFDictionarySetValue(s->published, key, value);
    else
        CFDictionaryRemoveValue(s->published, key);
}

void VPServiceRefuseProperty(IOHIDServiceRef service, CFStringRef key, bool refuse)
{
    auto* s = asService(service, "VPServiceRefuseProperty");
    std::lock_guard lock(s->mutex);
    if (refuse)
        CFDictionarySetValue(s->refused, key, kCFBooleanTrue);
    else
        CFDictionaryRemoveValue(s->refused, key);
}

CFTypeRef VPServiceCopyReceivedProperty(IOHIDServiceRef service, CFStringRef key)
{
    auto* s = asService(service, "VPServiceCopyReceivedProperty");
    std::lock_guard lock(s->mutex);
    const auto* r = s->findReceived(key);
    return r ? CFRetain(r->last) : nullptr;
}

size_t VPServiceReceivedCount(IOHIDServiceRef service, CFStringRef key)
{
    auto* s = asService(service, "VPServiceReceivedCount");
    std::lock_guard lock(s->mutex);
    const auto* r = s->findReceived(key);
    return r ? r->count : 0;
}

void VPServiceSetReceiveObserver(IOHIDServiceRef service, std::function<void(CFStringRef, CFTypeRef)> observer)
{
    auto* s = asService(service, "VPServiceSetReceiveObserver");
    std::lock_guard lock(s->mutex);
    s->observer = std::move(observer);
}
