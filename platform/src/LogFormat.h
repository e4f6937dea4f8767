// The message text of a log call: printf formatting with the privacy
// annotations ("%{public}s", "%{private}d": the annotation is dropped, the
// value printed) and "%@" (a CF object, printed as its description).
#pragma once

#include <cstdarg>
#include <string>

namespace vp {

std::string formatLogMessage(const char* format, va_list args);

} // namespace vp
