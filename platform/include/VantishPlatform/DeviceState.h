// Device state a host sets up before a plug-in runs: boot arguments, time
// base, the factory-data store, device-information answers, and plug-in
// instance counts.
#pragma once

#include <CoreFoundation/CoreFoundation.h>

#include <cstdint>
#include <optional>
#include <string>

// Boot arguments as sysctlbyname("kern.bootargs") reports them. Without an
// override they come from /proc/cmdline. std::nullopt restores that.
void VPSetBootArgs(std::optional<std::string> bootArgs);
// Makes sysctlbyname fail with this errno (0 stops failing).
void VPSetSysctlFailure(int err);

void VPSetTimebase(uint32_t numer, uint32_t denom);

// Factory-data store: one file per class key inside `directory`; empty = none.
void VPQVTSetStoreDirectory(const std::string& directory);
// Makes the next reads of `classKey` fail with an error of this code (0 clears).
void VPQVTSetFailure(const std::string& classKey, long code);
// Reads of the store so far (every class), for tests of retries.
size_t VPQVTReadCount();
void VPQVTResetReadCount();

// Device information: the value returned for a question (null removes it).
void VPTessarySetAnswer(CFStringRef question, CFTypeRef value);
void VPTessarySetProductType(int productType);
void VPTessaryReset();

// Live instances registered for a factory UUID.
long VPPlugInInstanceCount(CFUUIDRef factoryID);
