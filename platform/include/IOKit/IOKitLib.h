// I/O registry subset: entries with properties and parents, looked up by
// registry ID, searched for properties towards their ancestors.
#pragma once

#include <CoreFoundation/CoreFoundation.h>

CF_EXTERN_C_BEGIN

typedef int kern_return_t;
typedef uint32_t mach_port_t;
typedef mach_port_t io_object_t;
typedef io_object_t io_service_t;
typedef io_object_t io_registry_entry_t;
typedef uint32_t IOOptionBits;
typedef char io_name_t[128];

enum {
    KERN_SUCCESS = 0,
    KERN_INVALID_ARGUMENT = 4,
};

#define MACH_PORT_NULL ((mach_port_t) 0)
extern const mach_port_t kIOMainPortDefault;

#define kIOServicePlane "IOService"
enum {
    kIORegistryIterateRecursively = 0x00000001,
    kIORegistryIterateParents = 0x00000002,
};

// Matching dictionary for the entry with this registry ID.
CFMutableDictionaryRef IORegistryEntryIDMatching(uint64_t entryID);
// Consumes one reference to `matching`. Returns a handle the caller releases
// with IOObjectRelease, or 0 (IO_OBJECT_NULL) when nothing matches.
io_service_t IOServiceGetMatchingService(mach_port_t mainPort, CFDictionaryRef matching);
// The entry's own property, or with kIORegistryIterateRecursively the first
// one found walking its ancestors (with kIORegistryIterateParents) in order.
// The result is retained; the caller releases it.
CFTypeRef IORegistryEntrySearchCFProperty(io_registry_entry_t entry, const char* plane, CFStringRef key,
                                          CFAllocatorRef allocator, IOOptionBits options);
CFTypeRef IORegistryEntryCreateCFProperty(io_registry_entry_t entry, CFStringRef key, CFAllocatorRef allocator,
                                          IOOptionBits options);
kern_return_t IORegistryEntryGetRegistryEntryID(io_registry_entry_t entry, uint64_t* entryID);
kern_return_t IOObjectRetain(io_object_t object);
kern_return_t IOObjectRelease(io_object_t object);

#define IO_OBJECT_NULL ((io_object_t) 0)

CF_EXTERN_C_END
