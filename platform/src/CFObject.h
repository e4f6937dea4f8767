// The common base of every CF object in this library: an atomic reference
// count, a type ID, and value equality and description hooks that CFEqual and
// CFCopyDescription dispatch to.
//
// Each CF type is a struct with the opaque name its public header declares
// (struct __CFString and so on) deriving from CFObject, so a CFStringRef
// points at the object itself. A CFTypeRef is the address of the CFObject base,
// which single inheritance places at the start of every object.
#pragma once

#include <CoreFoundation/CoreFoundation.h>

#include <atomic>
#include <string>

namespace vp {

enum TypeID : CFTypeID {
    kStringTypeID = 1,
    kNumberTypeID,
    kBooleanTypeID,
    kDataTypeID,
    kArrayTypeID,
    kDictionaryTypeID,
    kErrorTypeID,
    kUUIDTypeID,
    kHIDServiceTypeID,
    kHIDEventTypeID,
};

// Immortal objects (constant strings and UUIDs, the booleans) ignore retain
// and release and are never destroyed.
enum class Lifetime { Counted, Immortal };

class CFObject {
public:
    constexpr CFObject(CFTypeID type, Lifetime lifetime = Lifetime::Counted)
        : refs_(1), type_(type), immortal_(lifetime == Lifetime::Immortal)
    {
    }
    CFObject(const CFObject&) = delete;
    CFObject& operator=(const CFObject&) = delete;
    virtual ~CFObject() = default;

    CFTypeID typeID() const { return type_; }
    bool immortal() const { return immortal_; }
    CFIndex retainCount() const;
    void retain() const;
    // Destroys the object when the last reference goes.
    void release() const;

    // Called only with an object of the same type ID; identity by default.
    virtual bool equals(const CFObject& other) const { return this == &other; }
    virtual std::string describe() const = 0;

private:
    mutable std::atomic<CFIndex> refs_;
    const CFTypeID type_;
    const bool immortal_;
};

// Keeps an object in static storage without ever running its destructor, so
// immortal objects stay valid while other statics are torn down at exit.
template <class T>
union Immortal {
    template <class... Args>
    constexpr explicit Immortal(Args&&... args) : value(static_cast<Args&&>(args)...)
    {
    }
    constexpr ~Immortal() {}
    T value;
};

// Misuse that the host platform would crash on: report it and stop.
[[noreturn]] void fatal(const char* function, const char* problem);

inline const CFObject* object(CFTypeRef ref) { return static_cast<const CFObject*>(ref); }

// The object behind `ref` as type T; stops the process when `ref` is null or
// of another type.
template <class T>
const T* checked(CFTypeRef ref, CFTypeID type, const char* function)
{
    if (!ref)
        fatal(function, "null object");
    if (object(ref)->typeID() != type)
        fatal(function, "object of the wrong type");
    return static_cast<const T*>(object(ref));
}

template <class T>
T* checkedMutable(CFTypeRef ref, CFTypeID type, const char* function)
{
    return const_cast<T*>(checked<T>(ref, type, function));
}

// The description of any object, "(null)" for null.
std::string describe(CFTypeRef ref);
// Value equality where both may be null.
bool equalOrBothNull(CFTypeRef a, CFTypeRef b);
// Retains a non-null value; returns it.
CFTypeRef retainIfPresent(CFTypeRef ref);
void releaseIfPresent(CFTypeRef ref);

} // namespace vp
