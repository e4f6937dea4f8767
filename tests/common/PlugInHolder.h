// A plug-in instance made by the factory, as the host gets one, released with
// its holder.
#pragma once

#include "plugin/TestAccess.h"

namespace vt {

// What the factory returns for the service-filter type; aborts if it returns
// nothing, so that callers need no check.
VantishPlugIn* createPlugIn();

// Runs queued and delayed work until none is left.
void runQueuedWork();

class PlugIn {
public:
    enum class AtRelease {
        Release,           // the host's Release only; queued work may still hold the instance
        RunQueuedWorkFirst // queued and delayed work runs to its end, then the host's Release
    };

    explicit PlugIn(AtRelease atRelease = AtRelease::Release);
    ~PlugIn() { release(); }
    PlugIn(const PlugIn&) = delete;
    PlugIn& operator=(const PlugIn&) = delete;

    // The host lets go now (at most once); returns the references left.
    ULONG release();

    VantishPlugIn* get() const { return p_; }
    VantishPlugIn* operator->() const { return p_; }
    VantishPlugIn& operator*() const { return *p_; }
    VantishPlugInTestAccess parts() const { return ::parts(*p_); }

private:
    VantishPlugIn* p_;
    AtRelease atRelease_;
};

} // namespace vt
