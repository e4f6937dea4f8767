#include "plugin/SpikeDetector.h"

#include "formats/ALSSensorType.h"

namespace {

constexpr float kSpikeLuxLimit = 20.0f;
constexpr float kSpikeLuxLimitType2 = 60.0f; // sensor type 2 sees spikes up to brighter light
constexpr float kLowLux = 10.0f;

constexpr double kFlatRatioLimit = 1.2; // type 3: the other channels barely exceed c1
constexpr float kRatioLimit = 0.5f;     // four- and six-channel tests
constexpr float kFiveChannelRatioLimit = 1.5f;

constexpr float kFourChannelC3Limit = 50.0f;
constexpr float kGatedLimitLowLux = 55.0f;
constexpr float kGatedLimitHighLux = 80.0f;
constexpr float kMinDenominator = 1.0f;
constexpr float kSixChannelC0Limit = 180.0f;

constexpr uint32_t kTypeSixChannelDenominator = 2;
constexpr uint32_t kTypeFlatRatio = 3;
constexpr uint32_t kChipHalfC5 = 1;
constexpr uint32_t kChipC5MinusC0 = 2;

// Four channels over a common denominator d, gated on the level of channel g.
SpikeResult fiveChannelTest(float d, float a, float b, float g, float e, float lux)
{
    if (!(d > kMinDenominator))
        return {};
    const bool gateOpen = (lux < kLowLux && g < kGatedLimitLowLux) || (lux > kLowLux && g < kGatedLimitHighLux);
    if (!gateOpen)
        return {};
    const float r = (a / d + b / d + g / d + e / d) * 0.25f;
    return {r <= kFiveChannelRatioLimit, r};
}

SpikeResult flatRatioTest(const std::array<float, 6>& c, float lux)
{
    const float r = (c[2] + c[3] + c[4]) / (3.0f * c[1]);
    return {double(r) <= kFlatRatioLimit && lux < kLowLux, r};
}

SpikeResult fourChannelTest(const std::array<float, 6>& c, uint32_t sensorType)
{
    if (!(c[3] < kFourChannelC3Limit || sensorType == eALSSensorType4ChannelB) || !(c[3] > 0.0f))
        return {};
    const float r = (c[0] / c[3] + c[1] / c[3] + c[2] / c[3]) / 3.0f;
    return {r > kRatioLimit, r};
}

SpikeResult sixChannelTest(const std::array<float, 6>& c, float c5)
{
    const float r = (c[1] / c[0] + c[2] / c[0] + c[3] / c[0] + c[4] / c[0] + c5 / c[0]) / 5.0f;
    return {r > kRatioLimit, r};
}

} // namespace

float spikeLuxLimit(uint32_t sensorType)
{
    return sensorType == eALSSensorType4ChannelB ? kSpikeLuxLimitType2 : kSpikeLuxLimit;
}

SpikeResult detectSpike(const ALSSampleRecord& record, const SpikeSettings& settings)
{
    const float lux = record.lux;
    if (!settings.mitigationEnabled || settings.mitigationType == 0 || !(lux < spikeLuxLimit(settings.sensorType)))
        return {};

    const auto& c = record.channelValues;
    const uint32_t P = record.sampleChannelCount;
    const uint32_t T = settings.mitigationType;
    const uint32_t V = settings.chipType;

    if (P == 6 && T == kTypeSixChannelDenominator) {
        const float d = V == kChipHalfC5 ? c[5] * 0.5f : V == kChipC5MinusC0 ? c[5] - c[0] : c[5];
        return fiveChannelTest(d, c[1], c[2], c[3], c[4], lux);
    }

    const float c5 = V == kChipHalfC5 ? c[5] * 0.5f : c[5];
    if (T == kTypeFlatRatio && c[1] > 0.0f && c[2] + c[3] + c[4] > 0.0f)
        return flatRatioTest(c, lux);
    if (P == 4 && c[0] > 0.0f)
        return fourChannelTest(c, settings.sensorType);
    if (P == 6 && c[0] > kMinDenominator && c[0] < kSixChannelC0Limit)
        return sixChannelTest(c, c5);
    if (P == 5)
        return fiveChannelTest(c[4], c[0], c[1], c[2], c[3], lux);
    return {};
}
