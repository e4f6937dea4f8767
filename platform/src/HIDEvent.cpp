// HID events: a type, a time stamp, numeric fields, vendor data bytes and
// child events. Like the platform's, an event is used by one thread at a time.
#include "CFObject.h"

#include <IOKit/hid/IOHIDEvent.h>

#include <cmath>
#include <limits>
#include <utility>
#include <vector>

namespace {
// Room for the fields of one sensor event, so that setting them after
// creation does not allocate.
constexpr size_t kFieldCapacity = 16;
} // namespace

struct __IOHIDEvent final : vp::CFObject {
    __IOHIDEvent(IOHIDEventType type, uint64_t timeStamp)
        : CFObject(vp::kHIDEventTypeID), type(type), timeStamp(timeStamp)
    {
        fields.reserve(kFieldCapacity);
    }
    ~__IOHIDEvent() override { vp::releaseIfPresent(children); }

    // The vendor data length always follows the bytes the event holds.
    double get(IOHIDEventField field) const
    {
        if (field == kIOHIDEventFieldVendorDefinedDataLength)
            return double(data.size());
        for (const auto& [f, value] : fields)
            if (f == field)
                return value;
        return 0.0;
    }

    void set(IOHIDEventField field, double value)
    {
        if (field == kIOHIDEventFieldVendorDefinedDataLength)
            return;
        for (auto& [f, stored] : fields)
            if (f == field) {
                stored = value;
                return;
            }
        fields.emplace_back(field, value);
    }

    bool contains(const __IOHIDEvent* event) const
    {
        if (event == this)
            return true;
        if (!children)
            return false;
        for (CFIndex i = 0; i < CFArrayGetCount(children); ++i)
            if (static_cast<const __IOHIDEvent*>(CFArrayGetValueAtIndex(children, i))->contains(event))
                return true;
        return false;
    }

    // "<IOHIDEvent type=12 timeStamp=5 fields=3 data=137 bytes children=1>"
    std::string describe() const override
    {
        return "<IOHIDEvent type=" + std::to_string(type) + " timeStamp=" + std::to_string(timeStamp) +
               " fields=" + std::to_string(fields.size()) + " data=" + std::to_string(data.size()) +
               " bytes children=" + std::to_string(children ? CFArrayGetCount(children) : 0) + ">";
    }

    const IOHIDEventType type;
    const uint64_t timeStamp;
    std::vector<std::pair<IOHIDEventField, double>> fields;
    std::vector<uint8_t> data;
    CFMutableArrayRef children = nullptr;
};

namespace {

__IOHIDEvent* asEvent(IOHIDEventRef event, const char* function)
{
    return vp::checkedMutable<__IOHIDEvent>(event, vp::kHIDEventTypeID, function);
}

// Truncates towards zero, saturating at the ends of CFIndex; NaN reads 0.
CFIndex toIndex(double value)
{
    constexpr double limit = 9223372036854775808.0; // 2^63
    if (std::isnan(value))
        return 0;
    if (value >= limit)
        return std::numeric_limits<CFIndex>::max();
    if (value < -limit)
        return std::numeric_limits<CFIndex>::min();
    return CFIndex(value);
}

void appendChild(__IOHIDEvent* parent, IOHIDEventRef child)
{
    if (!parent->children)
        parent->children = CFArrayCreateMutable(kCFAllocatorDefault, 1, &kCFTypeArrayCallBacks);
    CFArrayAppendValue(parent->children, child);
}

} // namespace

CFTypeID IOHIDEventGetTypeID(void) { return vp::kHIDEventTypeID; }

IOHIDEventType IOHIDEventGetType(IOHIDEventRef event) { return asEvent(event, "IOHIDEventGetType")->type; }

uint64_t IOHIDEventGetTimeStamp(IOHIDEventRef event) { return asEvent(event, "IOHIDEventGetTimeStamp")->timeStamp; }

IOHIDFloat IOHIDEventGetFloatValue(IOHIDEventRef event, IOHIDEventField field)
{
    return asEvent(event, "IOHIDEventGetFloatValue")->get(field);
}

void IOHIDEventSetFloatValue(IOHIDEventRef event, IOHIDEventField field, IOHIDFloat value)
{
    asEvent(event, "IOHIDEventSetFloatValue")->set(field, value);
}

CFIndex IOHIDEventGetIntegerValue(IOHIDEventRef event, IOHIDEventField field)
{
    return toIndex(asEvent(event, "IOHIDEventGetIntegerValue")->get(field));
}

void IOHIDEventSetIntegerValue(IOHIDEventRef event, IOHIDEventField field, CFIndex value)
{
    asEvent(event, "IOHIDEventSetIntegerValue")->set(field, double(value));
}

double IOHIDEventGetDoubleValue(IOHIDEventRef event, IOHIDEventField field)
{
    return asEvent(event, "IOHIDEventGetDoubleValue")->get(field);
}

void IOHIDEventSetDoubleValue(IOHIDEventRef event, IOHIDEventField field, double value)
{
    asEvent(event, "IOHIDEventSetDoubleValue")->set(field, value);
}

uint8_t* IOHIDEventGetDataValue(IOHIDEventRef event, IOHIDEventField field)
{
    auto* e = asEvent(event, "IOHIDEventGetDataValue");
    if (field != kIOHIDEventFieldVendorDefinedData || e->data.empty())
        return nullptr;
    return e->data.data();
}

CFArrayRef IOHIDEventGetChildren(IOHIDEventRef event) { return asEvent(event, "IOHIDEventGetChildren")->children; }

IOHIDEventRef IOHIDEventCreate(CFAllocatorRef, IOHIDEventType type, uint64_t timeStamp, IOOptionBits)
{
    return new __IOHIDEvent(type, timeStamp);
}

IOHIDEventRef IOHIDEventCreateVendorDefinedEvent(CFAllocatorRef, uint64_t timeStamp, uint32_t usagePage, uint32_t usage,
                                                 uint32_t version, const uint8_t* data, CFIndex length, IOOptionBits)
{
    if (length < 0 || (!data && length > 0))
        return nullptr;
    auto* event = new __IOHIDEvent(kIOHIDEventTypeVendorDefined, timeStamp);
    event->set(kIOHIDEventFieldVendorDefinedUsagePage, usagePage);
    event->set(kIOHIDEventFieldVendorDefinedUsage, usage);
    event->set(kIOHIDEventFieldVendorDefinedVersion, version);
    event->data.assign(data, data + length);
    return event;
}

// An event that already holds the parent cannot become its child: the two
// would keep each other alive and every walk of the tree would never end.
void IOHIDEventAppendEvent(IOHIDEventRef parent, IOHIDEventRef child, IOOptionBits)
{
    auto* p = asEvent(parent, "IOHIDEventAppendEvent");
    auto* c = asEvent(child, "IOHIDEventAppendEvent");
    if (c->contains(p))
        vp::fatal("IOHIDEventAppendEvent", "the child already contains the parent");
    appendChild(p, child);
}

IOHIDEventRef IOHIDEventCreateCopy(CFAllocatorRef allocator, IOHIDEventRef event)
{
    const auto* e = asEvent(event, "IOHIDEventCreateCopy");
    auto* copy = new __IOHIDEvent(e->type, e->timeStamp);
    copy->fields = e->fields;
    copy->data = e->data;
    if (e->children) {
        for (CFIndex i = 0; i < CFArrayGetCount(e->children); ++i) {
            auto* child = static_cast<IOHIDEventRef>(const_cast<void*>(CFArrayGetValueAtIndex(e->children, i)));
            IOHIDEventRef childCopy = IOHIDEventCreateCopy(allocator, child);
            appendChild(copy, childCopy);
            CFRelease(childCopy);
        }
    }
    return copy;
}
