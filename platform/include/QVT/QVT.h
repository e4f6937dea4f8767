// Factory-data store: per-class records written at the factory.
#pragma once

#include <CoreFoundation/CoreFoundation.h>

CF_EXTERN_C_BEGIN

typedef void (*QVTLogHandler)(int level, const char* message);

// Installs the function that receives the store's own diagnostic lines.
void QVTLogSetHandler(QVTLogHandler handler);
// The locally stored record of class `classKey` (for example "XwCA") as new
// data, or null when there is none. When the record exists but cannot be read,
// returns null and stores a new CFError with a non-zero code in *error (when
// error is non-null); the caller releases both.
CFDataRef QVTSealingMapCopyLocalDataForClass(CFStringRef classKey, CFDictionaryRef options, CFErrorRef* error);

CF_EXTERN_C_END
