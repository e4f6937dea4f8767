// Ownership of one CoreFoundation value obtained by a Create or Copy call:
// released when the holder goes away, unless handed on with release().
#pragma once

#include <CoreFoundation/CoreFoundation.h>

#include <utility>

template <typename Ref>
class CFOwned {
public:
    CFOwned() = default;
    explicit CFOwned(Ref ref) : ref_(ref) {}
    ~CFOwned() { reset(); }
    CFOwned(const CFOwned&) = delete;
    CFOwned& operator=(const CFOwned&) = delete;
    CFOwned(CFOwned&& other) noexcept : ref_(other.release()) {}
    CFOwned& operator=(CFOwned&& other) noexcept
    {
        reset(other.release());
        return *this;
    }

    Ref get() const { return ref_; }
    explicit operator bool() const { return ref_ != nullptr; }
    // Gives up ownership; the caller releases the value.
    Ref release() { return std::exchange(ref_, nullptr); }
    void reset(Ref ref = nullptr)
    {
        if (ref_)
            CFRelease(ref_);
        ref_ = ref;
    }

private:
    Ref ref_ = nullptr;
};
