// Events that a client copies from the service instead of receiving them
// through the event stream: they get the colour of the last filtered sample.
#include "plugin/ChromaticityOverride.h"
#include "plugin/VantishPlugIn.h"
#include "support/Log.h"

#include <array>

namespace {

// Fills an ALS event's colour from the last result when it has none, applies
// the chromaticity override, and logs what the client gets.
void fillCopiedColour(const std::array<std::atomic<float>, 3>& lastXYZ, const ClientOverrides& overrides,
                      IOHIDEventRef event)
{
    std::array<float, 3> xyz{};
    long colourSpace = long(IOHIDEventGetIntegerValue(event, kIOHIDEventFieldAmbientLightColorSpace));
    if (colourSpace != 0) {
        xyz = {float(IOHIDEventGetFloatValue(event, kIOHIDEventFieldAmbientLightColorComponent0)),
               float(IOHIDEventGetFloatValue(event, kIOHIDEventFieldAmbientLightColorComponent1)),
               float(IOHIDEventGetFloatValue(event, kIOHIDEventFieldAmbientLightColorComponent2))};
    } else {
        xyz = {lastXYZ[0].load(), lastXYZ[1].load(), lastXYZ[2].load()};
        IOHIDEventSetFloatValue(event, kIOHIDEventFieldAmbientLightColorComponent0, xyz[0]);
        IOHIDEventSetFloatValue(event, kIOHIDEventFieldAmbientLightColorComponent1, xyz[1]);
        IOHIDEventSetFloatValue(event, kIOHIDEventFieldAmbientLightColorComponent2, xyz[2]);
        IOHIDEventSetIntegerValue(event, kIOHIDEventFieldAmbientLightColorSpace, 1);
        colourSpace = 1;
    }
    if (const auto override = ChromaticityOverride::active(overrides))
        xyz = applyChromaticityOverride(event, *override);
    VLOG_INFO("Copy event with color = [%f, %f, %f], color space = %ld", double(xyz[0]), double(xyz[1]), double(xyz[2]),
              colourSpace);
}

} // namespace

IOHIDEventRef VantishPlugIn::filterCopyEvent(IOHIDEventRef event)
{
    // This sensor's copies carry their own sample record: filter them whole.
    if (unit_.sensorType == eALSSensorTypeVD6287) {
        filter(event, true);
        return event;
    }
    if (!event)
        VLOG_ERROR("Event is null");
    else if (IOHIDEventGetType(event) == kIOHIDEventTypeAmbientLightSensor && databases_.isReady())
        fillCopiedColour(lastXYZ_, overrides_, event);
    logALSSample(event, true);
    return event;
}
