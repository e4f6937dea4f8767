// The plug-in object: factory, construction, the COM entry points, the
// interface table, publication of the per-chip database and
// queued work that keeps the instance alive.
#include "plugin/VantishPlugIn.h"

#include "support/Assert.h"
#include "support/Log.h"

#include <mach/mach_time.h>

#include <new>

namespace {

// D1148FE3-60F3-4B3B-8505-E28C1E66EBC8: this plug-in's factory.
CFUUIDRef vantishFactoryID()
{
    return CFUUIDGetConstantUUIDWithBytes(kCFAllocatorSystemDefault, 0xD1, 0x14, 0x8F, 0xE3, 0x60, 0xF3, 0x4B, 0x3B,
                                          0x85, 0x05, 0xE2, 0x8C, 0x1E, 0x66, 0xEB, 0xC8);
}

VantishPlugIn* self(void* p) { return static_cast<VantishPlugIn*>(p); }

} // namespace

IOHIDServiceFilterPlugInInterface VantishPlugIn::sVantishPlugInFtbl = {
    nullptr,
    &VantishPlugIn::QueryInterface,
    &VantishPlugIn::AddRef,
    &VantishPlugIn::Release,
    &VantishPlugIn::match,
    &VantishPlugIn::filter,
    &VantishPlugIn::filterCopyEvent,
    &VantishPlugIn::open,
    nullptr,
    nullptr,
    nullptr,
    nullptr,
    &VantishPlugIn::setPropertyForClient,
    nullptr,
    nullptr,
};

extern "C" void* VantishPlugInFactory(CFAllocatorRef allocator, CFUUIDRef typeID)
{
    (void) allocator;
    if (!CFEqual(typeID, kIOHIDServiceFilterPlugInTypeID))
        return nullptr;
    void* storage = CFAllocatorAllocate(kCFAllocatorDefault, sizeof(VantishPlugIn), 0);
    if (!storage)
        return nullptr;
    return new (storage) VantishPlugIn(vantishFactoryID());
}

VantishPlugIn::VantishPlugIn(CFUUIDRef factory)
    : interfaceTable_(&sVantishPlugInFtbl), factoryID_(static_cast<CFUUIDRef>(CFRetain(factory))), refCount_(1)
{
    // The host calls the table through the instance pointer.
    VANTISH_ASSERT(static_cast<void*>(this) == static_cast<void*>(&interfaceTable_));
    CFPlugInAddInstanceForFactory(factoryID_);
    pluginLog = os_log_create(VANTISH_PLUGIN_LOG_SUBSYSTEM, "default");
    mach_timebase_info_data_t timebase{};
    mach_timebase_info(&timebase);
    machTimeToSeconds_ = double(timebase.numer) / double(timebase.denom) * 1e-9;
}

VantishPlugIn::~VantishPlugIn()
{
    // The registry handle taken in open is ours; give it back with the instance.
    if (registryEntry_)
        IOObjectRelease(registryEntry_);
    CFPlugInRemoveInstanceForFactory(factoryID_);
    CFRelease(factoryID_);
}

// ---- COM entry points -------------------------------------------------------

HRESULT VantishPlugIn::QueryInterface(void* p, REFIID iid, LPVOID* out) { return self(p)->QueryInterface(iid, out); }
ULONG VantishPlugIn::AddRef(void* p) { return self(p)->AddRef(); }
ULONG VantishPlugIn::Release(void* p) { return self(p)->Release(); }

HRESULT VantishPlugIn::QueryInterface(REFIID iid, LPVOID* out)
{
    CFUUIDRef requested = CFUUIDCreateFromUUIDBytes(nullptr, iid);
    HRESULT result = E_NOINTERFACE;
    if (CFEqual(requested, kIOHIDServiceFilterPlugInInterfaceID) ||
        CFEqual(requested, kIOHIDServiceFilterPlugInInterfaceID2) || CFEqual(requested, IUnknownUUID)) {
        AddRef();
        *out = this;
        result = S_OK;
    } else {
        *out = nullptr;
    }
    CFRelease(requested);
    return result;
}

ULONG VantishPlugIn::AddRef() { return refCount_.fetch_add(1) + 1; }

ULONG VantishPlugIn::Release()
{
    const ULONG count = refCount_.fetch_sub(1) - 1;
    if (count == 0) {
        // The database (and with it its arrays) goes once the last reader lets go.
        databases_.clear();
        this->~VantishPlugIn();
        CFAllocatorDeallocate(kCFAllocatorDefault, this);
    }
    return count;
}

// ---- Table entries that forward to the members -----------------------------------

SInt32 VantishPlugIn::match(void* p, IOHIDServiceRef service, IOOptionBits options)
{
    return self(p)->match(service, options);
}

IOHIDEventRef VantishPlugIn::filter(void* p, IOHIDEventRef event) { return self(p)->filter(event, false); }

IOHIDEventRef VantishPlugIn::filterCopyEvent(void* p, IOHIDEventRef event) { return self(p)->filterCopyEvent(event); }

void VantishPlugIn::open(void* p, IOHIDServiceRef service, IOOptionBits options) { self(p)->open(service, options); }

void VantishPlugIn::setPropertyForClient(void* p, CFStringRef key, CFTypeRef value, CFTypeRef client)
{
    self(p)->setPropertyForClient(key, value, client);
}

// ---- Queued work ---------------------------------------------------------------------

// Queued work holds the instance and the service it calibrates: the host may
// let go of both before the work runs (a store retry can wait 100 seconds).

void VantishPlugIn::Host::dispatchRetained(dispatch_queue_t queue, std::function<void()> work)
{
    VantishPlugIn* plugin = &plugin_;
    plugin->AddRef();
    CFTypeRef heldService = plugin->service_ ? CFRetain(plugin->service_) : nullptr;
    dispatch_async(queue, [plugin, heldService, work = std::move(work)] {
        work();
        if (heldService)
            CFRelease(heldService);
        plugin->Release();
    });
}

void VantishPlugIn::Host::dispatchAfterRetained(dispatch_time_t when, dispatch_queue_t queue,
                                                std::function<void()> work)
{
    VantishPlugIn* plugin = &plugin_;
    plugin->AddRef();
    CFTypeRef heldService = plugin->service_ ? CFRetain(plugin->service_) : nullptr;
    dispatch_after(when, queue, [plugin, heldService, work = std::move(work)] {
        work();
        if (heldService)
            CFRelease(heldService);
        plugin->Release();
    });
}
