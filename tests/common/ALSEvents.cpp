#include "common/ALSEvents.h"

namespace vt {

Event createEvent(IOHIDEventType type, const Record* record, uint64_t timeStamp)
{
    IOHIDEventRef event = IOHIDEventCreate(kCFAllocatorDefault, type, timeStamp, 0);
    if (record) {
        const auto& b = record->bytes();
        IOHIDEventRef child = IOHIDEventCreateVendorDefinedEvent(kCFAllocatorDefault, timeStamp, 0xFF00, 4, 0, b.data(),
                                                                 CFIndex(b.size()), 0);
        if (child) {
            IOHIDEventAppendEvent(event, child, 0);
            CFRelease(child);
        }
    }
    return Event(event);
}

std::vector<uint8_t> recordOf(IOHIDEventRef event)
{
    auto child = (IOHIDEventRef) CFArrayGetValueAtIndex(IOHIDEventGetChildren(event), 0);
    const uint8_t* data = IOHIDEventGetDataValue(child, kIOHIDEventFieldVendorDefinedData);
    const CFIndex length = IOHIDEventGetIntegerValue(child, kIOHIDEventFieldVendorDefinedDataLength);
    return {data, data + length};
}

std::array<double, 3> eventXYZ(IOHIDEventRef event)
{
    return {IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent0),
            IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent1),
            IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent2)};
}

CFIndex colourSpaceOf(IOHIDEventRef event)
{
    return IOHIDEventGetIntegerValue(event, kIOHIDEventFieldAmbientLightColorSpace);
}

} // namespace vt
