// Calibration bring-up after open: the unit's factory calibration, or the
// built-in default with colour adaptation off.
#include "calibration/Calibration.h"

#include "support/CFOwned.h"
#include "support/Log.h"

#include <sys/sysctl.h>

#include <cstring>
#include <mutex>
#include <string_view>

namespace {

// The kernel boot argument that forces the default calibration; only its
// presence counts.
constexpr std::string_view kForceDefaultArgument = "als_default_calibration=";

bool defaultCalibrationForced()
{
    char args[1024] = {};
    size_t length = sizeof(args);
    if (sysctlbyname("kern.bootargs", args, &length, nullptr, 0) != 0)
        return false;
    const std::string_view text(args, strnlen(args, sizeof(args)));
    if (text.find(kForceDefaultArgument) == std::string_view::npos)
        return false;
    VLOG_DEFAULT("boot-args are set to use default calibration");
    return true;
}

} // namespace

void Calibration::runCalibrationBringUp()
{
    const auto guard = lock();
    const bool forced = defaultCalibrationForced();
    VLOG_INFO("Getting QVT calibration...\n");
    if (!forced) {
        if (loadQVTCalibration(false)) {
            VLOG_DEFAULT("QVT Calibration has been loaded successfully");
            return;
        }
        VLOG_DEFAULT("Failed to load QVT calibration.\n");
    }

    VLOG_DEFAULT("Switching off color adaptation support.\n");
    const int off = 0;
    CFOwned<CFNumberRef> crgb(CFNumberCreate(kCFAllocatorDefault, kCFNumberIntType, &off));
    if (crgb && host_.service())
        IOHIDServiceSetProperty(host_.service(), CFSTR("crgb"), crgb.get());
    databases_.setReady(false);
    calibrateSensorWithDefaultCalibration(eALSSensorType(unit_.sensorType.load()));
}
