// Properties that clients of the event system set on the ALS service: the test
// overrides of channels and chromaticity, two tuning values, and the command
// that rebuilds calibration and databases.
#include "plugin/VantishPlugIn.h"
#include "support/CFTypes.h"
#include "support/Log.h"
#include "sysconfig/SysConfigCalibration.h"

#include <algorithm>
#include <cmath>
#include <mutex>
#include <optional>

namespace {

using cf::doubleValue;
using cf::intValue;
using cf::isNumber;

CFArrayRef asArray(CFTypeRef value) { return cf::isArray(value) ? static_cast<CFArrayRef>(value) : nullptr; }

// Element `index` as a number; nothing for a missing or non-number element,
// which leaves the stored value as it was.
std::optional<double> doubleAt(CFArrayRef array, CFIndex index)
{
    return doubleValue(static_cast<CFTypeRef>(CFArrayGetValueAtIndex(array, index)));
}

const char* onOff(bool on) { return on ? "on" : "off"; }

// A number switches the override on or off, keeping its values; an array of
// one value per database channel sets them and switches it on.
// The channels the filter feeds the fit with: those of the published database,
// or before there is one, those the unit's configuration announces.
uint32_t fittedChannels(const UnitConfiguration& unit, const DatabaseSlot& databases)
{
    const DatabaseSlot::Snapshot snapshot = databases.snapshot();
    return snapshot.db ? snapshot.db->dbChannelCount : unit.dbChannelCount.load();
}

void setRGBCOverride(ClientOverrides& p, uint32_t channels, CFTypeRef value)
{
    if (const auto on = intValue(value)) {
        p.rgbcOverrideActive = *on != 0;
        VLOG_DEBUG("RGBC override turned %s", onOff(*on != 0));
        return;
    }
    CFArrayRef array = asArray(value);
    if (!array || CFArrayGetCount(array) != CFIndex(channels))
        return;
    p.rgbcOverrideActive = 1;
    // The override holds six channels; a longer array has nowhere to go.
    const CFIndex stored = std::min<CFIndex>(CFArrayGetCount(array), CFIndex(p.rgbcOverride.size()));
    for (CFIndex i = 0; i < stored; ++i) {
        const auto channel = intValue(static_cast<CFTypeRef>(CFArrayGetValueAtIndex(array, i)));
        if (!channel)
            continue;
        p.rgbcOverride[size_t(i)] = uint32_t(*channel);
        VLOG_DEBUG("Override ch[%d]: %d", int(i), *channel);
    }
}

// A number switches the override on or off; an array sets x and y, and the
// luminance Y when it has a third element (without one, the event's own
// illuminance is kept).
void setChromaticityOverride(ClientOverrides& p, CFTypeRef value)
{
    if (const auto on = intValue(value)) {
        p.chromaticityOverrideActive = *on != 0;
        VLOG_DEBUG("Chromaticity (xyY) override turned %s", onOff(*on != 0));
        return;
    }
    CFArrayRef array = asArray(value);
    if (!array || CFArrayGetCount(array) < 2)
        return;
    const CFIndex count = CFArrayGetCount(array);
    // x, y and Y that are not finite numbers would make every colour NaN or
    // infinite: the whole setting is refused.
    for (CFIndex i = 0; i < std::min<CFIndex>(count, 3); ++i) {
        if (const auto component = doubleAt(array, i); component && !std::isfinite(*component)) {
            VLOG_ERROR("Chromaticity override refused: component %d is not a finite number", int(i));
            return;
        }
    }
    p.chromaticityOverrideActive = 1;
    if (const auto x = doubleAt(array, 0)) {
        p.overrideX = *x;
        VLOG_DEBUG("Override x: %.2f", *x);
    }
    if (const auto y = doubleAt(array, 1)) {
        p.overrideY = *y;
        VLOG_DEBUG("Override y: %.2f", *y);
    }
    if (count == 2) {
        p.overrideLuminance = -1.0;
    } else if (const auto luminance = doubleAt(array, 2)) {
        p.overrideLuminance = *luminance;
        VLOG_DEBUG("Override Y: %.2f", *luminance);
    }
}

void setLambda(FitParameters& p, CFTypeRef value)
{
    if (!isNumber(value))
        return;
    float v = 0.0f;
    CFNumberGetValue(static_cast<CFNumberRef>(value), kCFNumberFloatType, &v);
    p.lambda = v;
    VLOG_DEFAULT("Setting lambda %f.", double(v));
}

void setMitigationType(UnitConfiguration& p, CFTypeRef value)
{
    const auto type = intValue(value);
    if (!type)
        return;
    p.mitigationType = uint32_t(*type);
    VLOG_DEFAULT("Setting channel ratio mitigation type %d.", *type);
}

// Reruns the calibration the service asks for, on the caller's thread, with a
// forced rebuild of the per-chip database.
void rebuildDatabases(Calibration& calibration, IOHIDServiceRef service)
{
    VLOG_INFO("Rebuild databases.");
    CFTypeRef sysConfig = service ? IOHIDServiceGetProperty(service, CFSTR("SysConfigCalibration")) : nullptr;
    bool useSysConfig = false;
    if (sysConfig && CFGetTypeID(sysConfig) == CFBooleanGetTypeID()) {
        useSysConfig = CFBooleanGetValue(static_cast<CFBooleanRef>(sysConfig));
        VLOG_INFO("%s sysconfig calibration to calibrate sensor\n", useSysConfig ? "Use" : "Don't use");
    }
    if (!useSysConfig && service)
        useSysConfig = IOHIDServiceGetProperty(service, CFSTR("ALSCalibrationSpectrumToProcess")) == kCFBooleanTrue;

    // The factory path reports whether the driver got its record; a rebuild
    // has only succeeded when a new database has been published as well. The
    // lock keeps queued calibration from publishing one in between.
    const auto guard = calibration.lock();
    const SpectralDatabasePtr before = calibration.databases().snapshot().db;
    const bool called = useSysConfig ? processSysConfigCalibration(calibration, false, false, true)
                                     : calibration.loadQVTCalibration(true);
    const bool rebuilt = called && calibration.databases().snapshot().db != before;
    if (rebuilt)
        VLOG_INFO("Databases were rebuilt successfully.");
    else
        VLOG_ERROR("Failed to rebuild databases.");
}

} // namespace

void VantishPlugIn::setPropertyForClient(CFStringRef key, CFTypeRef value, CFTypeRef client)
{
    (void) client;
    if (!key)
        return;
    if (CFEqual(key, CFSTR("RGBCOverride")))
        setRGBCOverride(overrides_, fittedChannels(unit_, databases_), value);
    else if (CFEqual(key, CFSTR("ChromaticityOverride")))
        setChromaticityOverride(overrides_, value);
    else if (CFEqual(key, CFSTR("ColorAlgoLambda")))
        setLambda(fit_, value);
    else if (CFEqual(key, CFSTR("ChannelRatioMitigationType")))
        setMitigationType(unit_, value);
    else if (CFEqual(key, CFSTR("RebuildVelderDB")))
        rebuildDatabases(calibration_, service_);
}
