#include "host/emulator/PlugInSession.h"

#include <VantishPlatform/DispatchControl.h>
#include <dispatch/dispatch.h>

#include <stdexcept>

namespace host {

PlugInSession::QueueHold::QueueHold() : state_(std::make_shared<State>())
{
    // One waiting block per worker; once all of them run, no worker is free.
    const size_t workers = VPDispatchWorkerCount();
    for (size_t i = 0; i < workers; ++i) {
        dispatch_async(dispatch_get_global_queue(DISPATCH_QUEUE_PRIORITY_HIGH, 0), [state = state_] {
            std::unique_lock lock(state->mutex);
            ++state->holding;
            state->changed.notify_all();
            state->changed.wait(lock, [&] { return state->released; });
        });
    }
    std::unique_lock lock(state_->mutex);
    state_->changed.wait(lock, [&] { return state_->holding == workers; });
}

PlugInSession::QueueHold::~QueueHold() { release(); }

void PlugInSession::QueueHold::release()
{
    std::lock_guard lock(state_->mutex);
    state_->released = true;
    state_->changed.notify_all();
}

PlugInSession::PlugInSession(const Bundle& bundle, Unit& unit) : unit_(unit), filter_(bundle.createFilter())
{
    if (!filter_)
        throw std::runtime_error("the bundle's factory " + bundle.factoryName() + " gave no service-filter interface");
}

PlugInSession::~PlugInSession()
{
    hold_.reset();
    (*filter_)->Release(filter_);
}

SInt32 PlugInSession::match() { return (*filter_)->match(filter_, unit_.service(), 0); }

void PlugInSession::open()
{
    hold_ = std::make_unique<QueueHold>();
    (*filter_)->open(filter_, unit_.service(), 0);
}

void PlugInSession::waitForQueuedWork()
{
    hold_.reset();
    VPDispatchDrain();
}

IOHIDEventRef PlugInSession::filter(IOHIDEventRef event) { return (*filter_)->filter(filter_, event); }

IOHIDEventRef PlugInSession::copyEvent(IOHIDEventRef event) { return (*filter_)->filterCopyEvent(filter_, event); }

void PlugInSession::setProperty(CFStringRef key, CFTypeRef value)
{
    (*filter_)->setPropertyForClient(filter_, key, value, nullptr);
}

} // namespace host
