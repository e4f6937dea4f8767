// Host side of the HID stand-in: what the event system and the drivers do
// that a plug-in never calls. Creates services and registry entries, publishes
// driver properties, and lets a test see or refuse what a plug-in sets.
#pragma once

#include <CoreFoundation/CoreFoundation.h>
#include <IOKit/IOKitLib.h>
#include <IOKit/hid/IOHIDService.h>

#include <functional>
#include <string>
#include <vector>

// A new service (owned by the caller; CFRelease it). registryID 0 means the
// service has no registry ID.
IOHIDServiceRef VPServiceCreate(uint64_t registryID);
void VPServiceAddUsage(IOHIDServiceRef service, uint32_t usagePage, uint32_t usage);
// Publishes a driver property (what IOHIDServiceGetProperty returns). A null
// value removes it.
void VPServicePublishProperty(IOHIDServiceRef service, CFStringRef key, CFTypeRef value);
// The driver refuses IOHIDServiceSetProperty for this key (or stops refusing).
void VPServiceRefuseProperty(IOHIDServiceRef service, CFStringRef key, bool refuse);
// The last value the plug-in set for `key` (retained; caller releases), or null.
CFTypeRef VPServiceCopyReceivedProperty(IOHIDServiceRef service, CFStringRef key);
// How many times the plug-in set `key` successfully.
size_t VPServiceReceivedCount(IOHIDServiceRef service, CFStringRef key);
// Called (on the setter's thread) for every property the driver accepts.
void VPServiceSetReceiveObserver(IOHIDServiceRef service, std::function<void(CFStringRef, CFTypeRef)> observer);

// Registry entries. Entries live until VPRegistryReset. `parent` 0 = a root.
io_registry_entry_t VPRegistryCreateEntry(uint64_t entryID, io_registry_entry_t parent);
void VPRegistrySetProperty(io_registry_entry_t entry, CFStringRef key, CFTypeRef value);
// References held on the entry's handle by IOServiceGetMatchingService and
// IOObjectRetain, not yet given back with IOObjectRelease.
int VPRegistryOutstandingReferences(io_registry_entry_t entry);
void VPRegistryReset();
