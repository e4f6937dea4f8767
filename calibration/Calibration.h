// Calibration of one plug-in instance: bring-up after open, the factory-data
// store path (with its retries), the built-in default, and the per-chip
// database built for the unit and published for the filter. The
// configuration-supplied path (sysconfig/) runs on the same part.
//
// Calibration owns its lock and its retry count; it works on the unit's
// configuration, the fit parameters and the database slot, which the plug-in
// owns and lends it, and reaches the service and the queues only through
// CalibrationHost.
//
// Threads: bring-up and retries run on the global queues, a client's rebuild
// on the host's thread. One calibration at a time per instance: every entry
// point takes the (recursive) calibration lock, and the helpers that require
// it assert that it is held.
#pragma once

#include "calibration/UnitConfiguration.h"
#include "colour/FitParameters.h"
#include "formats/ALSSensorType.h"
#include "lightdb/DatabaseSlot.h"
#include "lightdb/Matrices.h"
#include "support/CFOwned.h"

#include <CoreFoundation/CoreFoundation.h>
#include <IOKit/IOKitLib.h>
#include <IOKit/hid/IOHIDService.h>
#include <dispatch/dispatch.h>

#include <atomic>
#include <cstdint>
#include <functional>
#include <mutex>
#include <thread>

// What calibration needs from the instance it calibrates.
class CalibrationHost {
public:
    // The service the plug-in was opened on (null before open), and its
    // registry entry (0 when it has none).
    virtual IOHIDServiceRef service() const = 0;
    virtual io_registry_entry_t registryEntry() const = 0;
    // Queued work that keeps the instance and its service alive until it has run.
    virtual void dispatchRetained(dispatch_queue_t queue, std::function<void()> work) = 0;
    virtual void dispatchAfterRetained(dispatch_time_t when, dispatch_queue_t queue, std::function<void()> work) = 0;

protected:
    ~CalibrationHost() = default;
};

class Calibration {
public:
    Calibration(CalibrationHost& host, UnitConfiguration& unit, FitParameters& fit, DatabaseSlot& databases);
    Calibration(const Calibration&) = delete;
    Calibration& operator=(const Calibration&) = delete;

    // A new open starts the store retries afresh.
    void resetForOpen() { qvtRetryCount_ = 0; }

    // ---- Factory calibration ----------------------------------------------------
    void runCalibrationBringUp();
    bool calibrateSensorWithDefaultCalibration(eALSSensorType type);
    bool loadQVTCalibration(bool forceRebuild);
    CFDataRef copyQVTCalibrationData(CFStringRef key);
    // The driver record parsed from a factory record of that layout (and the
    // unit's channel counts and cache version set from it), or null.
    CFOwned<CFDataRef> processQVTCalibrationXwCAT2(CFDataRef data);
    CFOwned<CFDataRef> processQVTCalibrationVD6287_XwClv3(CFDataRef data);
    // A new 10348-byte version-3 record from a 10440-byte version-1 record, or
    // null when the input is not one or cannot be converted safely.
    CFDataRef convertSorvelXwClv1Tov3(CFDataRef versionOne);
    // The channel spectra and weights of a factory record into `matrices`
    // (whose nChannels and firstChannel the caller has set).
    bool processQVTSpectrumXwCAT2(CFDataRef data, Matrices& matrices);
    bool processQVTSpectrumVD6287_XwClv3(CFDataRef data, Matrices& matrices);

    // ---- What the calibration paths share -----------------------------------------
    // The lock that keeps calibration on this instance to one piece at a time,
    // held for the life of the guard. Recursive: a synchronous build writes its
    // cache under its caller's lock.
    class [[nodiscard]] Guard {
    public:
        explicit Guard(Calibration& calibration);
        ~Guard();
        Guard(const Guard&) = delete;
        Guard& operator=(const Guard&) = delete;

    private:
        Calibration& calibration_;
    };
    Guard lock() { return Guard(*this); }
    // Whether the calling thread holds the lock (for the assertions of the
    // helpers that require it).
    bool lockHeldByCaller() const { return owner_.load() == std::this_thread::get_id(); }

    CalibrationHost& host() { return host_; }
    UnitConfiguration& unit() { return unit_; }
    const UnitConfiguration& unit() const { return unit_; }
    FitParameters& fit() { return fit_; }
    DatabaseSlot& databases() { return databases_; }
    uint32_t storeRetries() const { return qvtRetryCount_.load(); }

private:
    // Schedules the next store read 5 seconds from now, at most 20 times.
    void scheduleStoreRetry();
    CFDataRef readFactoryData();

    CalibrationHost& host_;
    UnitConfiguration& unit_;
    FitParameters& fit_;
    DatabaseSlot& databases_;
    std::recursive_mutex mutex_;
    int depth_ = 0;                        // guarded by mutex_
    std::atomic<std::thread::id> owner_{}; // the thread holding mutex_, if any
    std::atomic<uint32_t> qvtRetryCount_{0};
};
