#include "host/emulator/PlugInSession.h"

#include <VantishPlatform/DispatchControl.h>

#include <stdexcept>

namespace host {

PlugInSession::PlugInSession(const Bundle& bundle, Unit& unit) : unit_(unit), filter_(bundle.createFilter())
{
    if (!filter_)
        throw std::runtime_error("the bundle's factory " + bundle.factoryName() + " gave no service-filter interface");
}

PlugInSession::~PlugInSession() { (*filter_)->Release(filter_); }

SInt32 PlugInSession::match() { return (*filter_)->match(filter_, unit_.service(), 0); }

void PlugInSession::open() { (*filter_)->open(filter_, unit_.service(), 0); }

void PlugInSession::waitForQueuedWork() { VPDispatchDrain(); }

IOHIDEventRef PlugInSession::filter(IOHIDEventRef event) { return (*filter_)->filter(filter_, event); }

IOHIDEventRef PlugInSession::copyEvent(IOHIDEventRef event) { return (*filter_)->filterCopyEvent(filter_, event); }

void PlugInSession::setProperty(CFStringRef key, CFTypeRef value)
{
    (*filter_)->setPropertyForClient(filter_, key, value, nullptr);
}

} // namespace host
