// The built-in calibration the driver gets when the unit's own cannot be used.
#include "calibration/Calibration.h"
#include "calibration/DriverRecords.h"
#include "support/CFOwned.h"
#include "support/Log.h"

#include <optional>

namespace {

using namespace driver;

constexpr uint16_t kDefaultFudge = 0x4000; // 1.0
constexpr uint16_t kDefaultITime = 250;
constexpr uint16_t kDefaultAux1 = 100;
constexpr uint16_t kDefaultAux2 = 99;
constexpr uint16_t kDefaultAux3 = 62;
constexpr uint16_t kUnitGainScale = 0x8000;
// Lux coefficient of the last channel of 4-channel sensors (16 fraction bits),
// by device colour: colour 2 has a different cover glass.
constexpr int32_t kFourChannelLux = 11658;
constexpr int32_t kFourChannelLuxColour2 = 15040;
constexpr float kFiveChannelLux = 0.0086f;
constexpr float kSixChannelLux = 0.086f;

RecordHeader defaultHeader()
{
    return {.source = CalibrationSource::Default,
            .chipType = 0,
            .calibrationVersion = kCalibrationVersion,
            .fudge = kDefaultFudge,
            .iTime = kDefaultITime,
            .aux1 = kDefaultAux1,
            .aux2 = kDefaultAux2};
}

ChannelBlock unitBlock(unsigned gains)
{
    ChannelBlock block;
    for (unsigned g = 0; g < gains; ++g)
        block.gainScale[g] = kUnitGainScale;
    return block;
}

ChannelRecord fourChannelDefault(bool typeB, bool colour2)
{
    ChannelRecord record(kFourChannelRecord);
    record.setHeader(defaultHeader());
    const uint8_t nGains = typeB ? 9 : 8;
    record.setGain(0, typeB ? 8 : (colour2 ? 6 : 8));
    record.setGain(1, typeB ? 9 : 8);
    record.setGain(2, typeB ? 9 : 8);
    record.setCounts(4, nGains);
    const int32_t lux[4] = {0, 0, 0, colour2 ? kFourChannelLuxColour2 : kFourChannelLux};
    for (unsigned c = 0; c < 4; ++c) {
        record.setLuxCoeffFixed(c, lux[c]);
        record.setChannelBlock(c, unitBlock(nGains));
        VLOG_DEBUG("luxCoeff[%d]=%d/65536", int(c), int(lux[c]));
    }
    return record;
}

// The 5- and 6-channel defaults: the first channel carries no lux weight.
ChannelRecord wideDefault(const ChannelRecordLayout& layout, float lux)
{
    ChannelRecord record(layout);
    record.setHeader(defaultHeader());
    record.setAux3(kDefaultAux3);
    const uint8_t gains[4] = {8, 9, 9, 8};
    for (unsigned i = 0; i < 4; ++i)
        record.setGain(i, gains[i]);
    record.setCounts(uint8_t(layout.maxChannels), kMaxGains);
    for (unsigned c = 0; c < layout.maxChannels; ++c) {
        const float value = c == 0 ? 0.0f : lux;
        record.setLuxCoeff(c, value);
        record.setCctCoeff(c, 0.0f);
        record.setChannelBlock(c, unitBlock(kMaxGains));
        VLOG_DEBUG("luxCoeff[%d]=%f", int(c), double(value));
    }
    return record;
}

} // namespace

bool Calibration::calibrateSensorWithDefaultCalibration(eALSSensorType type)
{
    VLOG_DEFAULT("Calibrate sensor with default calibration data. Sensor type = %d", int(type));

    std::optional<ChannelRecord> record;
    switch (type) {
    case eALSSensorType4ChannelA:
    case eALSSensorType4ChannelB:
        record.emplace(fourChannelDefault(type == eALSSensorType4ChannelB, unit_.deviceColor.load() == 2));
        unit_.numberOfChannels = 4;
        break;
    case eALSSensorType5ChannelA:
    case eALSSensorType5ChannelB:
    case eALSSensorType5ChannelC:
        record.emplace(wideDefault(kFiveChannelRecord, kFiveChannelLux));
        unit_.chipType = 0;
        unit_.numberOfChannels = 5;
        unit_.dbChannelCount = 5;
        break;
    case eALSSensorType6ChannelA:
    case eALSSensorType6ChannelB:
        record.emplace(wideDefault(kSixChannelRecord, kSixChannelLux));
        unit_.chipType = 0;
        unit_.numberOfChannels = 6;
        unit_.dbChannelCount = 5;
        break;
    default:
        return false;
    }

    CFOwned<CFDataRef> data(record->createData());
    if (!data || !host_.service())
        return false;
    if (!IOHIDServiceSetProperty(host_.service(), CFSTR("ALSCalibrationData"), data.get())) {
        VLOG_ERROR("Failed to set ALS calibration data.");
        return false;
    }
    return true;
}
