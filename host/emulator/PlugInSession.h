// One plug-in instance attached to a unit, driven as the event system drives
// it: match, open, then events and client properties through the table.
#pragma once

#include "host/emulator/Bundle.h"
#include "host/emulator/Unit.h"

namespace host {

class PlugInSession {
public:
    // Creates the instance; throws std::runtime_error when the bundle declines.
    PlugInSession(const Bundle& bundle, Unit& unit);
    ~PlugInSession(); // the host's last Release
    PlugInSession(const PlugInSession&) = delete;
    PlugInSession& operator=(const PlugInSession&) = delete;

    SInt32 match();
    void open();
    // Waits until the work queued by open (calibration bring-up) has run.
    void waitForQueuedWork();

    IOHIDEventRef filter(IOHIDEventRef event);
    IOHIDEventRef copyEvent(IOHIDEventRef event);
    void setProperty(CFStringRef key, CFTypeRef value);

    FilterInterface interface() const { return filter_; }

private:
    Unit& unit_;
    FilterInterface filter_ = nullptr;
};

} // namespace host
