// The interface a HID service-filter plug-in offers the event system: a COM
// style table of function pointers whose first slots are IUnknown's.
#pragma once

#include <CoreFoundation/CoreFoundation.h>
#include <IOKit/hid/IOHIDEvent.h>
#include <IOKit/hid/IOHIDService.h>

CF_EXTERN_C_BEGIN

typedef SInt32 HRESULT;
typedef UInt32 ULONG;
typedef void* LPVOID;
typedef CFUUIDBytes REFIID;

#define S_OK ((HRESULT) 0)
#define E_NOINTERFACE ((HRESULT) 0x80000004)

// 6B0340D3-5798-4064-AA17-9204C7B06FFD: the service-filter plug-in type.
// clang-format off: the sixteen bytes of each ID in two groups of eight
#define kIOHIDServiceFilterPlugInTypeID                                                                             \
    CFUUIDGetConstantUUIDWithBytes(kCFAllocatorSystemDefault, 0x6B, 0x03, 0x40, 0xD3, 0x57, 0x98, 0x40, 0x64, 0xAA, \
                                   0x17, 0x92, 0x04, 0xC7, 0xB0, 0x6F, 0xFD)
// 0505D78D-4F4E-4C41-A3A6-C7A77B41BDAC: the service-filter interface.
#define kIOHIDServiceFilterPlugInInterfaceID                                                                        \
    CFUUIDGetConstantUUIDWithBytes(kCFAllocatorSystemDefault, 0x05, 0x05, 0xD7, 0x8D, 0x4F, 0x4E, 0x4C, 0x41, 0xA3, \
                                   0xA6, 0xC7, 0xA7, 0x7B, 0x41, 0xBD, 0xAC)
// C710951D-1840-456E-82E7-FCA1A0FA7FE4: the second revision of that interface.
#define kIOHIDServiceFilterPlugInInterfaceID2                                                                       \
    CFUUIDGetConstantUUIDWithBytes(kCFAllocatorSystemDefault, 0xC7, 0x10, 0x95, 0x1D, 0x18, 0x40, 0x45, 0x6E, 0x82, \
                                   0xE7, 0xFC, 0xA1, 0xA0, 0xFA, 0x7F, 0xE4)
// 00000000-0000-0000-C000-000000000046: IUnknown.
#define IUnknownUUID                                                                                                \
    CFUUIDGetConstantUUIDWithBytes(kCFAllocatorSystemDefault, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0xC0, \
                                   0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x46)
// clang-format on

// Fifteen pointer slots. Slots the event system offers but a plug-in may leave
// empty are typed as untyped pointers here.
typedef struct IOHIDServiceFilterPlugInInterface {
    void* _reserved;
    HRESULT (*QueryInterface)(void* thisPointer, REFIID iid, LPVOID* ppv);
    ULONG (*AddRef)(void* thisPointer);
    ULONG (*Release)(void* thisPointer);
    SInt32 (*match)(void* self, IOHIDServiceRef service, IOOptionBits options);
    IOHIDEventRef (*filter)(void* self, IOHIDEventRef event);
    IOHIDEventRef (*filterCopyEvent)(void* self, IOHIDEventRef event);
    void (*open)(void* self, IOHIDServiceRef service, IOOptionBits options);
    void* hostOperation8;
    void* hostOperation9;
    void* hostOperation10;
    void* hostOperation11;
    void (*setPropertyForClient)(void* self, CFStringRef key, CFTypeRef value, CFTypeRef client);
    void* hostOperation13;
    void* hostOperation14;
} IOHIDServiceFilterPlugInInterface;

static_assert(sizeof(IOHIDServiceFilterPlugInInterface) == 15 * sizeof(void*), "fifteen slots");

// Usage page / usage of an ambient-light sensor service.
enum {
    kHIDPage_VendorSensor = 0xFF00,
    kHIDUsage_VendorSensor_AmbientLight = 0x0004,
};

CF_EXTERN_C_END
