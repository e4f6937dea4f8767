// Device-information answers.
#pragma once

#include <CoreFoundation/CoreFoundation.h>

CF_EXTERN_C_BEGIN

// A new value for `question` (for example "ProductName", "DeviceColor"), or null.
CFTypeRef QyCopyAnswer(CFStringRef question, CFDictionaryRef options);
// The device-model code.
int QyGetProductType(void);

CF_EXTERN_C_END
