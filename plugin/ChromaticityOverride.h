// The client's chromaticity override (x, y and optionally luminance Y): ALS
// events report the colour it describes instead of the measured one. Used by
// the event filter and by copied events alike.
#pragma once

#include <IOKit/hid/IOHIDEvent.h>

#include <array>
#include <optional>

struct ClientOverrides;

struct ChromaticityOverride {
    double x = 0.0;
    double y = 0.0;
    double luminance = -1.0; // negative: keep the event's own illuminance

    // The clients' override when one has turned it on with a y above 0.
    static std::optional<ChromaticityOverride> active(const ClientOverrides& overrides);
};

// X, Y, Z of chromaticity (x, y) at luminance Y, each rounded to float.
std::array<float, 3> chromaticityToXYZ(double x, double y, double luminance);

// Writes the override into an ALS event: with a luminance of 0 or more, the
// level and illuminance fields too; then X, Y, Z and colour space 1. Returns
// the X, Y, Z written.
std::array<float, 3> applyChromaticityOverride(IOHIDEventRef event, const ChromaticityOverride& override);
