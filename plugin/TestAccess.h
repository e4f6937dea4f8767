// The one seam through which tests, fuzz targets and the stress test reach an
// instance's parts, to set up a unit's configuration or to look at what a step
// left behind without going through the host. Product code never includes it.
#pragma once

#include "plugin/VantishPlugIn.h"

class VantishPlugInTestAccess {
public:
    explicit VantishPlugInTestAccess(VantishPlugIn& plugin) : p_(plugin) {}

    UnitConfiguration& unit() { return p_.unit_; }
    FitParameters& fit() { return p_.fit_; }
    ClientOverrides& overrides() { return p_.overrides_; }
    DatabaseSlot& databases() { return p_.databases_; }
    Calibration& calibration() { return p_.calibration_; }
    std::array<std::atomic<float>, 3>& lastXYZ() { return p_.lastXYZ_; }
    uint32_t refCount() const { return p_.refCount_.load(); }
    double& machTimeToSeconds() { return p_.machTimeToSeconds_; }
    CFUUIDRef factoryID() const { return p_.factoryID_; }
    // The service the instance was opened on (tests that skip open set it).
    IOHIDServiceRef& service() { return p_.service_; }
    io_service_t& registryEntry() { return p_.registryEntry_; }

private:
    VantishPlugIn& p_;
};

// parts(plugin).unit().numberOfChannels = 5, and so on.
inline VantishPlugInTestAccess parts(VantishPlugIn& plugin) { return VantishPlugInTestAccess(plugin); }
