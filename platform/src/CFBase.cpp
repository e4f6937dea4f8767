// Operations every CF object supports, and the allocator calls.
#include "CFObject.h"

#include <cstdio>
#include <cstdlib>
#include <limits>

namespace vp {

CFIndex CFObject::retainCount() const
{
    return immortal_ ? std::numeric_limits<CFIndex>::max() : refs_.load(std::memory_order_relaxed);
}

void CFObject::retain() const
{
    if (!immortal_)
        refs_.fetch_add(1, std::memory_order_relaxed);
}

void CFObject::release() const
{
    if (immortal_)
        return;
    // The last release must see every write made under earlier references.
    if (refs_.fetch_sub(1, std::memory_order_acq_rel) == 1)
        delete this;
}

void fatal(const char* function, const char* problem)
{
    std::fprintf(stderr, "%s: %s\n", function, problem);
    std::abort();
}

std::string describe(CFTypeRef ref) { return ref ? object(ref)->describe() : "(null)"; }

bool equalOrBothNull(CFTypeRef a, CFTypeRef b)
{
    if (!a || !b)
        return a == b;
    return CFEqual(a, b);
}

CFTypeRef retainIfPresent(CFTypeRef ref)
{
    if (ref)
        object(ref)->retain();
    return ref;
}

void releaseIfPresent(CFTypeRef ref)
{
    if (ref)
        object(ref)->release();
}

} // namespace vp

using vp::object;

const CFAllocatorRef kCFAllocatorSystemDefault = nullptr;

void* CFAllocatorAllocate(CFAllocatorRef, CFIndex size, CFOptionFlags)
{
    return size > 0 ? std::malloc(size_t(size)) : nullptr;
}

void CFAllocatorDeallocate(CFAllocatorRef, void* ptr) { std::free(ptr); }

CFTypeRef CFRetain(CFTypeRef cf)
{
    if (!cf)
        vp::fatal("CFRetain", "null object");
    object(cf)->retain();
    return cf;
}

void CFRelease(CFTypeRef cf)
{
    if (!cf)
        vp::fatal("CFRelease", "null object");
    object(cf)->release();
}

CFIndex CFGetRetainCount(CFTypeRef cf)
{
    if (!cf)
        vp::fatal("CFGetRetainCount", "null object");
    return object(cf)->retainCount();
}

CFTypeID CFGetTypeID(CFTypeRef cf)
{
    if (!cf)
        vp::fatal("CFGetTypeID", "null object");
    return object(cf)->typeID();
}

Boolean CFEqual(CFTypeRef a, CFTypeRef b)
{
    if (!a || !b)
        vp::fatal("CFEqual", "null object");
    if (a == b)
        return true;
    if (object(a)->typeID() != object(b)->typeID())
        return false;
    return object(a)->equals(*object(b));
}

// Null is described as "(null)" so that printing an absent value with %@
// gives the familiar text instead of stopping the process.
CFStringRef CFCopyDescription(CFTypeRef cf)
{
    return CFStringCreateWithCString(kCFAllocatorDefault, vp::describe(cf).c_str(), kCFStringEncodingUTF8);
}
