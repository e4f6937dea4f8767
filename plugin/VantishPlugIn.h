// The colour ambient-light-sensor filter plug-in: one instance per opened ALS
// service. The host talks to it only through the COM-style table
// sVantishPlugInFtbl, whose address is the object's first member, so the
// instance pointer is also its interface pointer.
//
// Threads: the host calls every table entry from its own thread; calibration
// runs on the global queues (bring-up, factory retries, cache writes). Values
// shared between them are atomics; the per-chip database is published whole
// (see SpectralDatabase) and read through snapshotDatabase(). Calibration work
// on one instance runs one piece at a time (calibrationMutex). Every queued
// block holds a reference on the instance and on its service, so a host
// Release never frees an instance (or the service) that queued work still uses.
#pragma once

#include "lightdb/LDBMInfo.h"
#include "lightdb/DatabaseSlot.h"
#include "lightdb/SpectralDatabase.h"

#include <CoreFoundation/CoreFoundation.h>
#include <IOKit/IOKitLib.h>
#include <IOKit/hid/IOHIDEvent.h>
#include <IOKit/hid/IOHIDService.h>
#include <IOKit/hid/IOHIDServiceFilterPlugIn.h>
#include <dispatch/dispatch.h>
#include <os/log.h>

#include <array>
#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>

struct Matrices;
struct ALSCalibrationHeader;
struct ALSCalibrationSubHeader;

// Sensor type published by the driver as "ALSSensorType".
enum eALSSensorType : uint32_t {
    eALSSensorTypeUnknown = 0,
    eALSSensorType4ChannelA = 1,
    eALSSensorType4ChannelB = 2,
    eALSSensorType6ChannelA = 3,
    eALSSensorType6ChannelB = 4,
    eALSSensorType5ChannelA = 5,
    eALSSensorType5ChannelB = 6,
    eALSSensorType5ChannelC = 7,
    eALSSensorTypeVD6287 = 8,
};

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

    // ---- Factory calibration -------------------------------------------------------
    void runCalibrationBringUp();
    bool calibrateSensorWithDefaultCalibration(eALSSensorType type);
    bool loadQVTCalibration(bool forceRebuild);
    CFDataRef copyQVTCalibrationData(CFStringRef key);
    bool processQVTCalibrationXwCAT2(CFDataRef& data, CFDataRef& record);
    bool processQVTCalibrationVD6287_XwClv3(CFDataRef& data, CFDataRef& record);
    // A new 10348-byte version-3 record from a 10440-byte version-1 record, or
    // null when the input is not one or cannot be converted safely.
    CFDataRef convertSorvelXwClv1Tov3(CFDataRef versionOne);
    bool processQVTSpectrumXwCAT2(CFDataRef& data, Matrices& matrices);
    bool processQVTSpectrumVD6287_XwClv3(CFDataRef& data, Matrices& matrices);

    // ---- Configuration-supplied calibration --------------------------------------------
    bool processSysConfigCalibration(bool asyncCreate, bool pushCalibration, bool processDatabase);
    bool processSysConfigSensorCalibrationVD6286(CFDataRef& blob, long& entryOffset, ALSCalibrationHeader& header,
                                                 ALSCalibrationSubHeader& subHeader, long& recordSize,
                                                 CFDataRef& record);
    // `build` is the private database that `matrices` points into; it is
    // published once complete.
    bool processSysConfigSpectrumVD6286(bool asyncCreate, CFDataRef& blob, long& entryOffset,
                                        ALSCalibrationSubHeader& subHeader, Matrices& matrices,
                                        const std::shared_ptr<SpectralDatabase>& build);

    // ---- Publication of the per-chip database ---------------------------------------------
    using DatabaseSnapshot = DatabaseSlot::Snapshot;
    // Publishes a complete database and the new dbReady in one step.
    void publishDatabase(SpectralDatabasePtr db, bool ready);
    // Changes dbReady alone (colour off on fallback, on after a cache write).
    void setDbReady(bool ready);
    DatabaseSnapshot snapshotDatabase() const;
    bool isDbReady() const;

    // ---- Queued work that keeps the instance (and its service) alive ----------------------------
    void dispatchRetained(dispatch_queue_t queue, std::function<void()> work);
    void dispatchAfterRetained(dispatch_time_t when, dispatch_queue_t queue, std::function<void()> work);

    static IOHIDServiceFilterPlugInInterface sVantishPlugInFtbl;

    // ---- Members, in the order of the object's layout ------------------------------------------
    IOHIDServiceFilterPlugInInterface* interfaceTable; // first: the instance is its interface pointer
    CFUUIDRef factoryID;
    std::atomic<uint32_t> refCount;
    IOHIDServiceRef service = nullptr;  // not retained; queued work retains it while it waits
    io_service_t registryEntry = 0;     // released with the instance
    std::atomic<uint32_t> orientation{1};
    std::atomic<uint8_t> algoVersion{0};
    std::atomic<uint8_t> colorAlgoOverride{0};
    std::atomic<float> smallDBVersion{1.1f};
    std::atomic<uint32_t> numberOfChannels{0};
    std::atomic<uint32_t> dbChannelCount{0};
    std::atomic<uint32_t> spectrumSampleCount{0};
    DatabaseSlot databases; // the published database and dbReady
    std::atomic<float> weightExponent{2.0f};
    std::atomic<float> weightOffset{0.00001f};
    std::array<std::atomic<float>, 3> lastXYZ;
    std::atomic<uint8_t> rgbcOverrideActive{0};
    std::array<std::atomic<uint32_t>, 6> rgbcOverride;
    std::atomic<uint8_t> chromaticityOverrideActive{0};
    std::atomic<double> overrideX{0.0};
    std::atomic<double> overrideY{0.0};
    std::atomic<double> overrideLuminance{0.0};
    std::atomic<uint8_t> lambdaConfigured{0};
    std::atomic<float> lambda{0.0f};
    std::atomic<uint8_t> channelRatioMitigation{0};
    std::atomic<uint32_t> mitigationType{0};
    std::atomic<uint32_t> chipType{0};
    std::atomic<uint32_t> sensorType{0};
    std::atomic<uint32_t> deviceColor{0};
    std::atomic<uint32_t> chipId{0};
    std::atomic<uint8_t> isDravikOS{0};
    std::atomic<uint32_t> qvtRetryCount{0};
    double machTimeToSeconds = 0.0;
    std::atomic<uint64_t> shortSampleRecords{0}; // sample records too short to read (throttles their log line)

    std::recursive_mutex calibrationMutex;      // one calibration at a time per instance
};
