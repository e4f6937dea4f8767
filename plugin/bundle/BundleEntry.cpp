// The bundle's library: everything comes from the plug-in's code; this unit
// only keeps the factory referenced so the linker exports it.
#include "plugin/VantishPlugIn.h"

extern "C" __attribute__((visibility("default"),
                          used)) void* (*const vantishBundleFactory)(CFAllocatorRef, CFUUIDRef) = &VantishPlugInFactory;
