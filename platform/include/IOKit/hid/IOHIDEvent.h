// HID events: a type, a time stamp, numeric fields addressed by field number
// (event type x 65536 + index), vendor data, and child events.
#pragma once

#include <CoreFoundation/CoreFoundation.h>
#include <IOKit/IOKitLib.h>

CF_EXTERN_C_BEGIN

typedef struct __IOHIDEvent* IOHIDEventRef;
typedef uint32_t IOHIDEventType;
typedef uint32_t IOHIDEventField;
typedef double IOHIDFloat;

enum {
    kIOHIDEventTypeNULL = 0,
    kIOHIDEventTypeVendorDefined = 1,
    kIOHIDEventTypeAmbientLightSensor = 12,
};

#define IOHIDEventFieldBase(type) ((IOHIDEventField) (type) << 16)

enum {
    kIOHIDEventFieldVendorDefinedUsagePage = IOHIDEventFieldBase(kIOHIDEventTypeVendorDefined) + 0,
    kIOHIDEventFieldVendorDefinedUsage = IOHIDEventFieldBase(kIOHIDEventTypeVendorDefined) + 1,
    kIOHIDEventFieldVendorDefinedVersion = IOHIDEventFieldBase(kIOHIDEventTypeVendorDefined) + 2,
    kIOHIDEventFieldVendorDefinedDataLength = IOHIDEventFieldBase(kIOHIDEventTypeVendorDefined) + 3,
    kIOHIDEventFieldVendorDefinedData = IOHIDEventFieldBase(kIOHIDEventTypeVendorDefined) + 4,
};

enum {
    kIOHIDEventFieldAmbientLightSensorLevel = IOHIDEventFieldBase(kIOHIDEventTypeAmbientLightSensor) + 0,
    kIOHIDEventFieldAmbientLightSensorRawChannel0 = IOHIDEventFieldBase(kIOHIDEventTypeAmbientLightSensor) + 1,
    kIOHIDEventFieldAmbientLightSensorRawChannel1 = IOHIDEventFieldBase(kIOHIDEventTypeAmbientLightSensor) + 2,
    kIOHIDEventFieldAmbientLightSensorRawChannel2 = IOHIDEventFieldBase(kIOHIDEventTypeAmbientLightSensor) + 3,
    kIOHIDEventFieldAmbientLightSensorRawChannel3 = IOHIDEventFieldBase(kIOHIDEventTypeAmbientLightSensor) + 4,
    kIOHIDEventFieldAmbientLightDisplayBrightnessChanged = IOHIDEventFieldBase(kIOHIDEventTypeAmbientLightSensor) + 5,
    kIOHIDEventFieldAmbientLightColorSpace = IOHIDEventFieldBase(kIOHIDEventTypeAmbientLightSensor) + 6,
    kIOHIDEventFieldAmbientLightColorComponent0 = IOHIDEventFieldBase(kIOHIDEventTypeAmbientLightSensor) + 7,
    kIOHIDEventFieldAmbientLightColorComponent1 = IOHIDEventFieldBase(kIOHIDEventTypeAmbientLightSensor) + 8,
    kIOHIDEventFieldAmbientLightColorComponent2 = IOHIDEventFieldBase(kIOHIDEventTypeAmbientLightSensor) + 9,
    kIOHIDEventFieldAmbientLightSensorIlluminance = IOHIDEventFieldBase(kIOHIDEventTypeAmbientLightSensor) + 11,
};

CFTypeID IOHIDEventGetTypeID(void);
IOHIDEventType IOHIDEventGetType(IOHIDEventRef event);
uint64_t IOHIDEventGetTimeStamp(IOHIDEventRef event);

// Numeric fields. Every field holds one number; a field never set reads 0.
IOHIDFloat IOHIDEventGetFloatValue(IOHIDEventRef event, IOHIDEventField field);
void IOHIDEventSetFloatValue(IOHIDEventRef event, IOHIDEventField field, IOHIDFloat value);
CFIndex IOHIDEventGetIntegerValue(IOHIDEventRef event, IOHIDEventField field);
void IOHIDEventSetIntegerValue(IOHIDEventRef event, IOHIDEventField field, CFIndex value);
double IOHIDEventGetDoubleValue(IOHIDEventRef event, IOHIDEventField field);
void IOHIDEventSetDoubleValue(IOHIDEventRef event, IOHIDEventField field, double value);

// Vendor data of a vendor-defined event: a writable pointer to its bytes
// (length in kIOHIDEventFieldVendorDefinedDataLength), or null.
uint8_t* IOHIDEventGetDataValue(IOHIDEventRef event, IOHIDEventField field);

// Child events (borrowed array of IOHIDEventRef), or null when there are none.
CFArrayRef IOHIDEventGetChildren(IOHIDEventRef event);

// ---- Creating events (host and driver side) --------------------------------
IOHIDEventRef IOHIDEventCreate(CFAllocatorRef allocator, IOHIDEventType type, uint64_t timeStamp, IOOptionBits options);
IOHIDEventRef IOHIDEventCreateVendorDefinedEvent(CFAllocatorRef allocator, uint64_t timeStamp, uint32_t usagePage,
                                                 uint32_t usage, uint32_t version, const uint8_t* data, CFIndex length,
                                                 IOOptionBits options);
void IOHIDEventAppendEvent(IOHIDEventRef parent, IOHIDEventRef child, IOOptionBits options);
// Deep copy: fields, vendor data and children.
IOHIDEventRef IOHIDEventCreateCopy(CFAllocatorRef allocator, IOHIDEventRef event);

CF_EXTERN_C_END
