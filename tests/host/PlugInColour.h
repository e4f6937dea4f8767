// What the real plug-in makes of one light sample, for the tests that drive
// the built bundle with a unit's readings.
#pragma once

#include "host/emulator/DriverSample.h"
#include "host/emulator/PlugInSession.h"
#include "spectra/Colorimetry.h"

#include <optional>
#include <vector>

namespace vt {

// The X, Y, Z the plug-in gives a sample of `channels` at `lux`, or nothing
// when it did not colour the event.
inline std::optional<spectra::Xyz> plugInColour(host::PlugInSession& session, const std::vector<double>& channels,
                                                double lux)
{
    ALSSampleRecord record;
    record.sampleChannelCount = uint8_t(channels.size());
    record.sampleOrientation = 1;
    record.integrationTime = 100;
    record.reportInterval = 100;
    record.gain = 65536;
    record.lux = float(lux);
    record.rawLux = float(lux);
    for (size_t c = 0; c < channels.size(); ++c)
        record.channelValues[c] = float(channels[c]);
    IOHIDEventRef event = host::createALSEvent(record, 1000);
    session.filter(event);
    std::optional<spectra::Xyz> xyz;
    if (IOHIDEventGetIntegerValue(event, kIOHIDEventFieldAmbientLightColorSpace) == 1)
        xyz = spectra::Xyz{IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent0),
                           IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent1),
                           IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent2)};
    CFRelease(event);
    return xyz;
}

} // namespace vt
