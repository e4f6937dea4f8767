// Channel-ratio spike tests, at and just across every limit.
#include "plugin/SpikeDetector.h"

#include <gtest/gtest.h>

namespace {

struct Case {
    const char* what;
    uint8_t P;              // channels in the sample
    std::array<float, 6> c; // c0..c5 as received
    float lux;
    uint32_t T, V, sensorType;
    bool spike;
};

// Unless a row says otherwise: mitigation on, type T, chip V, sensor type 0.
const Case kCases[] = {
    // Lux limit: 20, or 60 for sensor type 2 (P = 4 test, ratio 2/3).
    {"four-channel below 20 lux", 4, {20, 20, 20, 30}, 19.99f, 1, 0, 0, true},
    {"four-channel at 20 lux", 4, {20, 20, 20, 30}, 20, 1, 0, 0, false},
    {"type-2 sensor below 60 lux", 4, {20, 20, 20, 30}, 59.99f, 1, 0, 2, true},
    {"type-2 sensor at 60 lux", 4, {20, 20, 20, 30}, 60, 1, 0, 2, false},
    {"mitigation type 0", 4, {20, 20, 20, 30}, 15, 0, 0, 0, false},

    // T = 3: (c2 + c3 + c4) / 3 c1 <= 1.2 (as a double) below 10 lux.
    {"flat ratio 1.0", 4, {0, 10, 10, 10, 10}, 5, 3, 0, 0, true},
    {"flat ratio below 10 lux", 4, {0, 10, 10, 10, 10}, 9.99f, 3, 0, 0, true},
    {"flat ratio at 10 lux", 4, {0, 10, 10, 10, 10}, 10, 3, 0, 0, false},
    {"flat ratio 1.2f is above 1.2", 4, {0, 10, 12, 12, 12}, 5, 3, 0, 0, false},
    {"flat ratio just below 1.2", 4, {0, 10, 12, 12, 11.99f}, 5, 3, 0, 0, true},
    {"flat ratio needs c1 > 0: four-channel test decides", 4, {30, 0, 30, 30}, 5, 3, 0, 0, true},
    {"flat ratio needs a positive sum: five-channel, c4 = 0", 5, {0, 10, 0, 0, 0}, 5, 3, 0, 0, false},

    // P = 4: c3 < 50 (any c3 for sensor type 2), c3 > 0, c0 > 0, ratio > 0.5.
    {"four-channel c3 just below 50", 4, {30, 30, 30, 49.9f}, 15, 1, 0, 0, true},
    {"four-channel c3 at 50", 4, {40, 40, 40, 50}, 15, 1, 0, 0, false},
    {"type-2 sensor ignores the c3 limit", 4, {40, 40, 40, 60}, 15, 1, 0, 2, true},
    {"four-channel c3 zero", 4, {20, 20, 20, 0}, 15, 1, 0, 2, false},
    {"four-channel c3 negative", 4, {20, 20, 20, -1}, 15, 1, 0, 0, false},
    {"four-channel c0 zero", 4, {0, 40, 40, 30}, 15, 1, 0, 0, false},
    {"four-channel ratio exactly 0.5", 4, {20, 20, 20, 40}, 15, 1, 0, 0, false},
    {"four-channel ratio above 0.5", 4, {20.1f, 20, 20, 40}, 15, 1, 0, 0, true},

    // P = 6: 1 < c0 < 180, ratio of c1..c5 (c5 halved for chip 1) over c0 > 0.5.
    {"six-channel ratio exactly 0.5", 6, {100, 50, 50, 50, 50, 50}, 15, 1, 0, 0, false},
    {"six-channel ratio 0.52", 6, {100, 50, 50, 50, 50, 60}, 15, 1, 0, 0, true},
    {"six-channel chip 2 keeps c5", 6, {100, 50, 50, 50, 50, 60}, 15, 1, 2, 0, true},
    {"six-channel chip 1 halves c5", 6, {100, 50, 50, 50, 50, 60}, 15, 1, 1, 0, false},
    {"six-channel c0 at 180", 6, {180, 180, 180, 180, 180, 180}, 15, 1, 0, 0, false},
    {"six-channel c0 below 180", 6, {179.9f, 180, 180, 180, 180, 180}, 15, 1, 0, 0, true},
    {"six-channel c0 at 1", 6, {1, 1, 1, 1, 1, 1}, 15, 1, 0, 0, false},
    {"six-channel c0 above 1", 6, {1.01f, 1, 1, 1, 1, 1}, 15, 1, 0, 0, true},

    // P = 6, T = 2: five-channel test over d by chip type, c3 gated.
    {"type 2, chip 0: d = c5 = 40", 6, {10, 50, 50, 50, 50, 40}, 5, 2, 0, 0, true},
    {"type 2, chip 1: d = c5 / 2", 6, {10, 50, 50, 50, 50, 40}, 5, 2, 1, 0, false},
    {"type 2, chip 2: d = c5 - c0", 6, {10, 50, 50, 50, 50, 40}, 5, 2, 2, 0, false},
    {"type 2, chip 2, c0 = 0", 6, {0, 50, 50, 50, 50, 40}, 5, 2, 2, 0, true},
    {"type 2, chip 0: d = 2", 6, {0, 1, 1, 1, 1, 2}, 5, 2, 0, 0, true},
    {"type 2, chip 1: d = 1", 6, {0, 1, 1, 1, 1, 2}, 5, 2, 1, 0, false},
    {"type 2, chip 2: d = 1", 6, {1, 1, 1, 1, 1, 2}, 5, 2, 2, 0, false},
    {"type 2, chip 2: d = 1.01", 6, {0.99f, 1, 1, 1, 1, 2}, 5, 2, 2, 0, true},
    {"type 2 does not fall back to the six-channel test", 6, {100, 60, 60, 60, 60, 60}, 5, 2, 0, 0, false},
    {"the six-channel test would call it a spike", 6, {100, 60, 60, 60, 60, 60}, 5, 1, 0, 0, true},

    // P = 5: five-channel test over c4, c2 gated (< 55 below 10 lux, < 80 above).
    {"five-channel ratio 0.1", 5, {10, 10, 10, 10, 100}, 5, 1, 0, 0, true},
    {"five-channel c4 at 1", 5, {1, 1, 1, 1, 1}, 5, 1, 0, 0, false},
    {"five-channel c4 above 1", 5, {1, 1, 1, 1, 1.01f}, 5, 1, 0, 0, true},
    {"five-channel gated just below 55", 5, {10, 10, 54.9f, 10, 100}, 5, 1, 0, 0, true},
    {"five-channel gated at 55", 5, {10, 10, 55, 10, 100}, 5, 1, 0, 0, false},
    {"five-channel gated just below 80", 5, {10, 10, 79.9f, 10, 100}, 15, 1, 0, 0, true},
    {"five-channel gated at 80", 5, {10, 10, 80, 10, 100}, 15, 1, 0, 0, false},
    {"five-channel at exactly 10 lux", 5, {10, 10, 10, 10, 100}, 10, 1, 0, 0, false},
    {"five-channel ratio exactly 1.5", 5, {70, 70, 30, 70, 40}, 5, 1, 0, 0, true},
    {"five-channel ratio above 1.5", 5, {70.1f, 70, 30, 70, 40}, 5, 1, 0, 0, false},
    {"negative channels count as they are", 5, {100, -60, 10, 10, 10}, 5, 1, 0, 0, true},
    {"the same clamped is no spike", 5, {100, 0, 10, 10, 10}, 5, 1, 0, 0, false},

    {"three channels", 3, {10, 10, 10, 10, 100}, 5, 1, 0, 0, false},
    {"seven channels", 7, {10, 10, 10, 10, 100, 100}, 5, 1, 0, 0, false},
};

} // namespace

TEST(SpikeDetector, EveryLimitAndItsNeighbourAndNothingWithoutMitigation)
{
    for (const Case& t : kCases) {
        ALSSampleRecord r;
        r.sampleChannelCount = t.P;
        r.channelValues = t.c;
        r.lux = t.lux;
        EXPECT_EQ(detectSpike(r, {true, t.T, t.V, t.sensorType}).spike, t.spike) << t.what;
        EXPECT_FALSE(detectSpike(r, {false, t.T, t.V, t.sensorType}).spike) << t.what;
    }
}

TEST(SpikeDetector, ReportsTheDecidingRatio)
{
    ALSSampleRecord r;
    r.sampleChannelCount = 5;
    r.channelValues = {70, 70, 30, 70, 40};
    r.lux = 5;
    EXPECT_FLOAT_EQ(detectSpike(r, {true, 1, 0, 0}).ratio, 1.5f);
    r.channelValues = {0, 10, 10, 10, 10};
    EXPECT_FLOAT_EQ(detectSpike(r, {true, 3, 0, 0}).ratio, 1.0f);
}
