// Arrays: ordered values, each retained while it is held. Mutable arrays grow
// by appending; like the platform's, they are not synchronised.
#include "CFObject.h"

#include <vector>

const CFArrayCallBacks kCFTypeArrayCallBacks = {0};

struct __CFArray final : vp::CFObject {
    explicit __CFArray(bool isMutable) : CFObject(vp::kArrayTypeID), isMutable(isMutable) {}
    ~__CFArray() override
    {
        for (CFTypeRef value : values)
            vp::releaseIfPresent(value);
    }

    // A null value is kept as a hole; it is neither retained nor released.
    void append(CFTypeRef value) { values.push_back(vp::retainIfPresent(value)); }

    bool equals(const CFObject& other) const override
    {
        const auto& o = static_cast<const __CFArray&>(other);
        if (values.size() != o.values.size())
            return false;
        for (size_t i = 0; i < values.size(); ++i)
            if (!vp::equalOrBothNull(values[i], o.values[i]))
                return false;
        return true;
    }

    // "(a, b)"
    std::string describe() const override
    {
        std::string text = "(";
        for (size_t i = 0; i < values.size(); ++i)
            text += (i ? ", " : "") + vp::describe(values[i]);
        return text + ")";
    }

    const bool isMutable;
    std::vector<CFTypeRef> values;
};

namespace {
const __CFArray* asArray(CFArrayRef array, const char* function)
{
    return vp::checked<__CFArray>(array, vp::kArrayTypeID, function);
}
} // namespace

CFTypeID CFArrayGetTypeID(void) { return vp::kArrayTypeID; }

CFArrayRef CFArrayCreate(CFAllocatorRef, const void** values, CFIndex numValues, const CFArrayCallBacks*)
{
    if (numValues < 0 || (!values && numValues > 0))
        return nullptr;
    auto* array = new __CFArray(false);
    array->values.reserve(size_t(numValues));
    for (CFIndex i = 0; i < numValues; ++i)
        array->append(values[i]);
    return array;
}

CFMutableArrayRef CFArrayCreateMutable(CFAllocatorRef, CFIndex capacity, const CFArrayCallBacks*)
{
    auto* array = new __CFArray(true);
    if (capacity > 0)
        array->values.reserve(size_t(capacity));
    return array;
}

CFIndex CFArrayGetCount(CFArrayRef array) { return CFIndex(asArray(array, "CFArrayGetCount")->values.size()); }

const void* CFArrayGetValueAtIndex(CFArrayRef array, CFIndex idx)
{
    const auto& values = asArray(array, "CFArrayGetValueAtIndex")->values;
    if (idx < 0 || size_t(idx) >= values.size())
        vp::fatal("CFArrayGetValueAtIndex", "index out of range");
    return values[size_t(idx)];
}

void CFArrayAppendValue(CFMutableArrayRef array, const void* value)
{
    auto* a = vp::checkedMutable<__CFArray>(array, vp::kArrayTypeID, "CFArrayAppendValue");
    if (!a->isMutable)
        vp::fatal("CFArrayAppendValue", "immutable array");
    a->append(value);
}
