// The driver's sample record inside an ALS event.
#include "plugin/SampleRecordBytes.h"

std::span<uint8_t> sampleRecordBytes(IOHIDEventRef event)
{
    CFArrayRef children = IOHIDEventGetChildren(event);
    if (!children || CFArrayGetCount(children) < 1)
        return {};
    auto child = (IOHIDEventRef) CFArrayGetValueAtIndex(children, 0);
    if (!child)
        return {};
    uint8_t* data = IOHIDEventGetDataValue(child, kIOHIDEventFieldVendorDefinedData);
    CFIndex length = IOHIDEventGetIntegerValue(child, kIOHIDEventFieldVendorDefinedDataLength);
    if (!data || length <= 0)
        return {};
    return {data, size_t(length)};
}
