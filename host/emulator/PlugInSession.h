// One plug-in instance attached to a unit, driven as the event system drives
// it: match, open, then events and client properties through the table.
#pragma once

#include "host/emulator/Bundle.h"
#include "host/emulator/Unit.h"

#include <condition_variable>
#include <memory>
#include <mutex>

namespace host {

class PlugInSession {
public:
    // Creates the instance; throws std::runtime_error when the bundle declines.
    PlugInSession(const Bundle& bundle, Unit& unit);
    ~PlugInSession(); // the host's last Release
    PlugInSession(const PlugInSession&) = delete;
    PlugInSession& operator=(const PlugInSession&) = delete;

    SInt32 match();
    // Opens the plug-in. The work open queues (the calibration bring-up) is
    // held until waitForQueuedWork: nothing it does or logs happens before
    // open has returned, so what open logged is told apart by when it arrived.
    void open();
    // Lets the work queued by open run and waits until it (and what it queued) has run.
    void waitForQueuedWork();

    IOHIDEventRef filter(IOHIDEventRef event);
    IOHIDEventRef copyEvent(IOHIDEventRef event);
    void setProperty(CFStringRef key, CFTypeRef value);

    FilterInterface interface() const { return filter_; }

private:
    // Occupies every worker of the global queues until released, so that work
    // queued meanwhile waits in its queue.
    class QueueHold {
    public:
        QueueHold();
        ~QueueHold(); // releases
        void release();

    private:
        struct State {
            std::mutex mutex;
            std::condition_variable changed;
            size_t holding = 0;
            bool released = false;
        };
        std::shared_ptr<State> state_;
    };

    Unit& unit_;
    FilterInterface filter_ = nullptr;
    std::unique_ptr<QueueHold> hold_;
};

} // namespace host
