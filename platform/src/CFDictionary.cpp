// Dictionaries: key-value pairs with keys compared by value (CFEqual), kept in
// insertion order. Keys and values are retained while held. Like the
// platform's, mutable dictionaries are not synchronised.
#include "CFObject.h"

#include <utility>
#include <vector>

const CFDictionaryKeyCallBacks kCFTypeDictionaryKeyCallBacks = {0};
const CFDictionaryValueCallBacks kCFTypeDictionaryValueCallBacks = {0};

struct __CFDictionary final : vp::CFObject {
    using Pair = std::pair<CFTypeRef, CFTypeRef>;

    __CFDictionary() : CFObject(vp::kDictionaryTypeID) {}
    ~__CFDictionary() override
    {
        for (const auto& [key, value] : pairs) {
            CFRelease(key);
            CFRelease(value);
        }
    }

    // The few keys a dictionary here holds make a linear search the simplest.
    const Pair* find(CFTypeRef key) const
    {
        for (const auto& pair : pairs)
            if (CFEqual(pair.first, key))
                return &pair;
        return nullptr;
    }

    void set(CFTypeRef key, CFTypeRef value)
    {
        CFRetain(value);
        if (auto* pair = const_cast<Pair*>(find(key))) {
            CFRelease(pair->second);
            pair->second = value;
        } else {
            pairs.emplace_back(CFRetain(key), value);
        }
    }

    void remove(CFTypeRef key)
    {
        if (const Pair* pair = find(key)) {
            Pair removed = *pair;
            pairs.erase(pairs.begin() + (pair - pairs.data()));
            CFRelease(removed.first);
            CFRelease(removed.second);
        }
    }

    bool equals(const CFObject& other) const override
    {
        const auto& o = static_cast<const __CFDictionary&>(other);
        if (pairs.size() != o.pairs.size())
            return false;
        for (const auto& [key, value] : pairs) {
            const Pair* match = o.find(key);
            if (!match || !CFEqual(value, match->second))
                return false;
        }
        return true;
    }

    // "{k = v; }"
    std::string describe() const override
    {
        std::string text = "{";
        for (const auto& [key, value] : pairs)
            text += vp::describe(key) + " = " + vp::describe(value) + "; ";
        return text + "}";
    }

    std::vector<Pair> pairs;
};

namespace {
const __CFDictionary* asDictionary(CFDictionaryRef dict, const char* function)
{
    return vp::checked<__CFDictionary>(dict, vp::kDictionaryTypeID, function);
}

__CFDictionary* asMutableDictionary(CFMutableDictionaryRef dict, const char* function)
{
    return vp::checkedMutable<__CFDictionary>(dict, vp::kDictionaryTypeID, function);
}

void requireKey(const void* key, const char* function)
{
    if (!key)
        vp::fatal(function, "null key");
}
} // namespace

CFTypeID CFDictionaryGetTypeID(void) { return vp::kDictionaryTypeID; }

CFMutableDictionaryRef CFDictionaryCreateMutable(CFAllocatorRef, CFIndex capacity, const CFDictionaryKeyCallBacks*,
                                                 const CFDictionaryValueCallBacks*)
{
    auto* dict = new __CFDictionary;
    if (capacity > 0)
        dict->pairs.reserve(size_t(capacity));
    return dict;
}

CFIndex CFDictionaryGetCount(CFDictionaryRef dict)
{
    return CFIndex(asDictionary(dict, "CFDictionaryGetCount")->pairs.size());
}

const void* CFDictionaryGetValue(CFDictionaryRef dict, const void* key)
{
    const auto* d = asDictionary(dict, "CFDictionaryGetValue");
    requireKey(key, "CFDictionaryGetValue");
    const auto* pair = d->find(key);
    return pair ? pair->second : nullptr;
}

// A null value cannot be stored: it would read back as an absent key.
void CFDictionarySetValue(CFMutableDictionaryRef dict, const void* key, const void* value)
{
    auto* d = asMutableDictionary(dict, "CFDictionarySetValue");
    requireKey(key, "CFDictionarySetValue");
    if (!value)
        vp::fatal("CFDictionarySetValue", "null value");
    d->set(key, value);
}

void CFDictionaryRemoveValue(CFMutableDictionaryRef dict, const void* key)
{
    auto* d = asMutableDictionary(dict, "CFDictionaryRemoveValue");
    requireKey(key, "CFDictionaryRemoveValue");
    d->remove(key);
}

void CFDictionaryApplyFunction(CFDictionaryRef dict, CFDictionaryApplierFunction fn, void* context)
{
    const auto* d = asDictionary(dict, "CFDictionaryApplyFunction");
    if (!fn)
        return;
    for (const auto& [key, value] : d->pairs)
        fn(key, value, context);
}
