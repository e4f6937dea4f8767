// The plug-in object: factory, construction, the COM entry points, the
// interface table, publication of the per-chip database and
// queued work that keeps the instance alive.
#include "plugin/VantishPlugIn.h"

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
    : interfaceTable(&sVantishPlugInFtbl), factoryID(static_cast<CFUUIDRef>(CFRetain(factory))), refCount(1)
{
    rgbcOverrideActive = 0;
    chromaticityOverrideActive = 0;
    lambdaConfigured = 0;
    lambda = 0.0f;
    registryEntry = 0;
    colorAlgoOverride = 0;
    CFPlugInAddInstanceForFactory(factoryID);
    for (auto& value : rgbcOverride)
        value = 0;
    overrideX = 0.0;
    overrideY = 0.0;
    overrideLuminance = 0.0;
    for (auto& value : lastXYZ)
        value = 0.0f;
    pluginLog = os_log_create(VANTISH_PLUGIN_LOG_SUBSYSTEM, "default");
    mach_timebase_info_data_t timebase{};
    mach_timebase_info(&timebase);
    machTimeToSeconds = double(timebase.numer) / double(timebase.denom) * 1e-9;
}

VantishPlugIn::~VantishPlugIn()
{
    // The registry handle taken in open is ours; give it back with the instance.
    if (registryEntry)
        IOObjectRelease(registryEntry);
    CFPlugInRemoveInstanceForFactory(factoryID);
    CFRelease(factoryID);
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

ULONG VantishPlugIn::AddRef() { return refCount.fetch_add(1) + 1; }

ULONG VantishPlugIn::Release()
{
    const ULONG count = refCount.fetch_sub(1) - 1;
    if (count == 0) {
        // The database (and with it its arrays) goes once the last reader lets go.
        databases.clear();
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

// ---- Publication of the per-chip database -------------------------------------------

void VantishPlugIn::publishDatabase(SpectralDatabasePtr db, bool ready) { databases.publish(std::move(db), ready); }

void VantishPlugIn::setDbReady(bool ready) { databases.setReady(ready); }

VantishPlugIn::DatabaseSnapshot VantishPlugIn::snapshotDatabase() const { return databases.snapshot(); }

bool VantishPlugIn::isDbReady() const { return databases.isReady(); }

// ---- Queued work ---------------------------------------------------------------------

// Queued work holds the instance and the service it calibrates: the host may
// let go of both before the work runs (a store retry can wait 100 seconds).

void VantishPlugIn::dispatchRetained(dispatch_queue_t queue, std::function<void()> work)
{
    AddRef();
    CFTypeRef heldService = service ? CFRetain(service) : nullptr;
    dispatch_async(queue, [this, heldService, work = std::move(work)] {
        work();
        if (heldService)
            CFRelease(heldService);
        Release();
    });
}

void VantishPlugIn::dispatchAfterRetained(dispatch_time_t when, dispatch_queue_t queue, std::function<void()> work)
{
    AddRef();
    CFTypeRef heldService = service ? CFRetain(service) : nullptr;
    dispatch_after(when, queue, [this, heldService, work = std::move(work)] {
        work();
        if (heldService)
            CFRelease(heldService);
        Release();
    });
}
