// Booleans: two immortal objects.
#include "CFObject.h"

struct __CFBoolean final : vp::CFObject {
    constexpr explicit __CFBoolean(bool value) : CFObject(vp::kBooleanTypeID, vp::Lifetime::Immortal), value(value) {}

    std::string describe() const override { return value ? "true" : "false"; }

    const bool value;
};

namespace {
// Constant-initialised, so the booleans exist before any other static runs.
constinit vp::Immortal<__CFBoolean> trueObject{true};
constinit vp::Immortal<__CFBoolean> falseObject{false};
} // namespace

const CFBooleanRef kCFBooleanTrue = &trueObject.value;
const CFBooleanRef kCFBooleanFalse = &falseObject.value;

CFTypeID CFBooleanGetTypeID(void) { return vp::kBooleanTypeID; }

Boolean CFBooleanGetValue(CFBooleanRef boolean)
{
    return vp::checked<__CFBoolean>(boolean, vp::kBooleanTypeID, "CFBooleanGetValue")->value;
}
