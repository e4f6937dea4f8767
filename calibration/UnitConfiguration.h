// What the plug-in knows about the unit it is opened on: read by `open` from
// the service, the device tree and device information, and refined by
// calibration from the unit's calibration record (channel counts, algorithm
// and cache versions, chip type).
//
// Threads: `open` resets and fills it on the host's thread before it queues
// calibration; calibration writes on the global queues under the calibration
// lock; clients change mitigationType on the host's thread; the filter reads
// it for every event. Every field is an atomic, read once per use.
#pragma once

#include "lightdb/CachedDB.h"

#include <atomic>
#include <cstdint>

struct UnitConfiguration {
    std::atomic<uint32_t> orientation{1};
    std::atomic<uint8_t> algoVersion{0};
    std::atomic<uint8_t> colorAlgoOverride{0}; // from the device tree; kept across opens
    std::atomic<float> smallDBVersion{1.1f};
    std::atomic<uint32_t> numberOfChannels{0}; // channels the sensor delivers
    std::atomic<uint32_t> dbChannelCount{0};   // channels of the per-chip database
    std::atomic<uint32_t> spectrumSampleCount{0};
    std::atomic<uint8_t> channelRatioMitigation{0};
    std::atomic<uint32_t> mitigationType{0};
    std::atomic<uint32_t> chipType{0};
    std::atomic<uint32_t> sensorType{0};
    std::atomic<uint32_t> deviceColor{0};
    std::atomic<uint32_t> chipId{0};
    std::atomic<uint8_t> isDravikOS{0};

    // What the unit's per-chip cache is kept for.
    CacheKey cacheKey() const { return {int(orientation.load()), smallDBVersion.load(), chipId.load()}; }
};
