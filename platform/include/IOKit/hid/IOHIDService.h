// HID service objects as the event system hands them to filter plug-ins.
#pragma once

#include <CoreFoundation/CoreFoundation.h>
#include <IOKit/IOKitLib.h>

CF_EXTERN_C_BEGIN

typedef struct __IOHIDService* IOHIDServiceRef;

CFTypeID IOHIDServiceGetTypeID(void);
// Non-zero when the service carries this usage page / usage pair.
Boolean IOHIDServiceConformsTo(IOHIDServiceRef service, uint32_t usagePage, uint32_t usage);
// Retained value published by the driver, or null.
CFTypeRef IOHIDServiceCopyProperty(IOHIDServiceRef service, CFStringRef key);
// Borrowed value published by the driver, or null.
CFTypeRef IOHIDServiceGetProperty(IOHIDServiceRef service, CFStringRef key);
// Hands a property to the driver; false when the driver refuses it.
Boolean IOHIDServiceSetProperty(IOHIDServiceRef service, CFStringRef key, CFTypeRef value);
// The service's registry ID as a CFNumber (borrowed), or null.
CFTypeRef IOHIDServiceGetRegistryID(IOHIDServiceRef service);

CF_EXTERN_C_END
