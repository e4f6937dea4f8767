// Light-spike detection: a sudden flash (a camera flash, a reflection) shows
// up in low light as channel ratios no steady light source produces. These
// tests compare the sample's channels with each other; a hit makes the filter
// report zero lux and zero colour for that sample.
#pragma once

#include "formats/ALSSampleRecord.h"

#include <cstdint>

struct SpikeSettings {
    bool mitigationEnabled = false; // channelRatioMitigation
    uint32_t mitigationType = 0;    // T; 0 turns the tests off
    uint32_t chipType = 0;          // V
    uint32_t sensorType = 0;
};

struct SpikeResult {
    bool spike = false;
    float ratio = 0.0f; // the channel ratio of the test that decided, for the log
};

// Samples at or above this many lux never count as spikes.
float spikeLuxLimit(uint32_t sensorType);

// Runs the channel-ratio tests on the sample as the driver reported it (raw
// channel values, negatives included).
SpikeResult detectSpike(const ALSSampleRecord& record, const SpikeSettings& settings);
