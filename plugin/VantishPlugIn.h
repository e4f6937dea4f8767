// The colour ambient-light-sensor filter plug-in: one instance per opened ALS
// service. The host talks to it only through the COM-style table
// sVantishPlugInFtbl, whose address is the object's first member, so the
// instance pointer is also its interface pointer.
//
// The object is a facade over parts that own their state, each with its thread
// rule in its type: the unit's configuration (UnitConfiguration), the fit's
// settings (FitParameters), the clients' overrides (ClientOverrides), the
// published per-chip database (DatabaseSlot) and calibration (Calibration,
// with its lock and store retries). The instance itself holds what the COM
// frame needs, the service it was opened on and its registry entry.
//
// Threads: the host calls every table entry from its own thread; calibration
// runs on the global queues (bring-up, factory retries, cache writes). Every
// queued block holds a reference on the instance and on its service, so a
// host Release never frees an instance (or the service) that queued work
// still uses.
#pragma once

#include "calibration/Calibration.h"
#include "calibration/UnitConfiguration.h"
#include "colour/FitParameters.h"
#include "formats/ALSSensorType.h"
#include "lightdb/DatabaseSlot.h"
#include "plugin/ClientOverrides.h"

#include <CoreFoundation/CoreFoundation.h>
#include <IOKit/IOKitLib.h>
#include <IOKit/hid/IOHIDEvent.h>
#include <IOKit/hid/IOHIDService.h>
#include <IOKit/hid/IOHIDServiceFilterPlugIn.h>
#include <dispatch/dispatch.h>

#include <array>
#include <atomic>
#include <cstdint>
#include <functional>

extern "C" void* VantishPlugInFactory(CFAllocatorRef allocator, CFUUIDRef typeID);

class VantishPlugIn {
public:
    explicit VantishPlugIn(CFUUIDRef factoryID);
    ~VantishPlugIn();
    VantishPlugIn(const VantishPlugIn&) = delete;
    VantishPlugIn& operator=(const VantishPlugIn&) = delete;

    // ---- COM entry points (table slots 1 to 3) -------------------------------
    static HRESULT QueryInterface(void* self, REFIID iid, LPVOID* out);
    static ULONG AddRef(void* self);
    static ULONG Release(void* self);
    HRESULT QueryInterface(REFIID iid, LPVOID* out);
    ULONG AddRef();
    ULONG Release();

    // ---- Service-filter entry points ------------------------------------------
    static SInt32 match(void* self, IOHIDServiceRef service, IOOptionBits options);
    static IOHIDEventRef filter(void* self, IOHIDEventRef event);
    static IOHIDEventRef filterCopyEvent(void* self, IOHIDEventRef event);
    static void open(void* self, IOHIDServiceRef service, IOOptionBits options);
    static void setPropertyForClient(void* self, CFStringRef key, CFTypeRef value, CFTypeRef client);

    SInt32 match(IOHIDServiceRef service, IOOptionBits options);
    void open(IOHIDServiceRef service, IOOptionBits options);
    IOHIDEventRef filter(IOHIDEventRef event, bool isCopyEvent);
    IOHIDEventRef filterCopyEvent(IOHIDEventRef event);
    void setPropertyForClient(CFStringRef key, CFTypeRef value, CFTypeRef client);
    void logALSSample(IOHIDEventRef event, bool isCopyEvent);

    static IOHIDServiceFilterPlugInInterface sVantishPlugInFtbl;

private:
    // The documented seam through which tests reach the parts (plugin/TestAccess.h).
    friend class VantishPlugInTestAccess;

    // Calibration's view of the instance: the service, its registry entry and
    // queued work that keeps the instance alive.
    class Host final : public CalibrationHost {
    public:
        explicit Host(VantishPlugIn& plugin) : plugin_(plugin) {}
        IOHIDServiceRef service() const override { return plugin_.service_; }
        io_registry_entry_t registryEntry() const override { return plugin_.registryEntry_; }
        void dispatchRetained(dispatch_queue_t queue, std::function<void()> work) override;
        void dispatchAfterRetained(dispatch_time_t when, dispatch_queue_t queue, std::function<void()> work) override;

    private:
        VantishPlugIn& plugin_;
    };

    // First: the instance pointer is also its interface pointer.
    IOHIDServiceFilterPlugInInterface* interfaceTable_;
    CFUUIDRef factoryID_;
    std::atomic<uint32_t> refCount_;
    // Set by open on the host's thread before it queues calibration; not
    // retained (queued work retains it while it waits).
    IOHIDServiceRef service_ = nullptr;
    io_service_t registryEntry_ = 0; // released with the instance

    UnitConfiguration unit_;
    FitParameters fit_;
    ClientOverrides overrides_;
    DatabaseSlot databases_;
    Host host_{*this};
    Calibration calibration_{host_, unit_, fit_, databases_};

    // The event path's own: the last colour (for copied events), the short
    // records and non-finite lux values seen (to throttle their log lines),
    // and the clock's scale.
    std::array<std::atomic<float>, 3> lastXYZ_{};
    std::atomic<uint64_t> shortSampleRecords_{0};
    std::atomic<uint64_t> nonFiniteLuxSamples_{0};
    double machTimeToSeconds_ = 0.0; // set at construction
};
