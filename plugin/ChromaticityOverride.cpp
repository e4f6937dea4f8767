#include "plugin/ChromaticityOverride.h"

#include "plugin/ClientOverrides.h"

std::optional<ChromaticityOverride> ChromaticityOverride::active(const ClientOverrides& overrides)
{
    if (!overrides.chromaticityOverrideActive.load())
        return std::nullopt;
    const double y = overrides.overrideY.load();
    if (!(y > 0.0))
        return std::nullopt;
    return ChromaticityOverride{overrides.overrideX.load(), y, overrides.overrideLuminance.load()};
}

std::array<float, 3> chromaticityToXYZ(double x, double y, double luminance)
{
    const double k = luminance / y;
    return {float(x * k), float(luminance), float((1.0 - x - y) * k)};
}

std::array<float, 3> applyChromaticityOverride(IOHIDEventRef event, const ChromaticityOverride& override)
{
    double luminance = override.luminance;
    if (luminance < 0.0) {
        luminance = IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightSensorIlluminance);
    } else {
        IOHIDEventSetFloatValue(event, kIOHIDEventFieldAmbientLightSensorLevel, luminance);
        IOHIDEventSetDoubleValue(event, kIOHIDEventFieldAmbientLightSensorIlluminance, luminance);
    }
    const auto xyz = chromaticityToXYZ(override.x, override.y, luminance);
    IOHIDEventSetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent0, xyz[0]);
    IOHIDEventSetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent1, xyz[1]);
    IOHIDEventSetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent2, xyz[2]);
    IOHIDEventSetIntegerValue(event, kIOHIDEventFieldAmbientLightColorSpace, 1);
    return xyz;
}
