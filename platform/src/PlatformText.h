// Text of CoreFoundation values, for the stand-ins that print or key by them.
#pragma once

#include <CoreFoundation/CoreFoundation.h>

#include <string>

namespace vp {

// The UTF-8 text of a string; empty for null.
std::string textOf(CFStringRef string);
// The description of any CF object, as %@ prints it; "(null)" for null.
std::string descriptionOf(CFTypeRef object);

} // namespace vp
