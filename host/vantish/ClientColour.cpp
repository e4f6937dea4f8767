#include "host/vantish/ClientColour.h"

#include "host/emulator/DriverSample.h"

namespace vantish {

ClientColour readClientColour(IOHIDEventRef event, const ALSSampleRecord& input)
{
    ClientColour r;
    r.lux = IOHIDEventGetFloatValue(event, kIOHIDEventFieldAmbientLightSensorLevel);
    r.colorSpace = IOHIDEventGetIntegerValue(event, kIOHIDEventFieldAmbientLightColorSpace);
    r.X = IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent0);
    r.Y = IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent1);
    r.Z = IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent2);
    if (input.xyzInRecord) {
        // The colour went into the driver's record instead of the event's fields.
        if (auto xyz = host::readXYZResult(event)) {
            r.X = (*xyz)[0];
            r.Y = (*xyz)[1];
            r.Z = (*xyz)[2];
        }
    }
    r.spike = input.lux > 0 && r.lux == 0 && r.X == 0 && r.Y == 0 && r.Z == 0;
    return r;
}

} // namespace vantish
