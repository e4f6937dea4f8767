// What clients of the event system set on the service to test the colour
// path: channel values that replace the measured ones ("RGBCOverride") and a
// chromaticity that replaces the estimate ("ChromaticityOverride").
//
// Threads: written by setPropertyForClient on the host's thread; read by the
// filter and the copy-event path. Atomics: a value changed while an event is
// filtered applies to that event or the next.
#pragma once

#include <array>
#include <atomic>
#include <cstdint>

struct ClientOverrides {
    static constexpr size_t kChannels = 6;

    std::atomic<uint8_t> rgbcOverrideActive{0};
    std::array<std::atomic<uint32_t>, kChannels> rgbcOverride{};
    std::atomic<uint8_t> chromaticityOverrideActive{0};
    std::atomic<double> overrideX{0.0};
    std::atomic<double> overrideY{0.0};
    std::atomic<double> overrideLuminance{0.0};
};
