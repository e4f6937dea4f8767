// The colour fit's settings as the unit's configuration and clients give them.
//
// Threads: `open` and calibration set them (the device's lambda switches the
// fit to its normalised form), clients change lambda on the host's thread, and
// the filter reads them once per event through settings(). Atomics.
#pragma once

#include "colour/ColourCalculation.h"

#include <atomic>
#include <cstdint>

struct FitParameters {
    std::atomic<float> weightExponent{2.0f};
    std::atomic<float> weightOffset{0.00001f};
    std::atomic<uint8_t> lambdaConfigured{0}; // the device gave a lambda: normalised databases and fits
    std::atomic<float> lambda{0.0f};

    FitSettings settings() const
    {
        return {weightExponent.load(), weightOffset.load(), lambda.load(), lambdaConfigured.load() != 0};
    }
};
