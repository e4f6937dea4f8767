#include "formats/XwCAT2Layout.h"

#include "calibration/Calibration.h"
#include "calibration/ChipId.h"
#include "calibration/DriverRecords.h"
#include "support/CFOwned.h"
#include "support/Log.h"

#include <Tessary/Tessary.h>

#include <cstdlib>
#include <span>
#include <string>

namespace {

using namespace stored::xwca;

// What units of kProductTypeWithTimingFault use instead of their stored values.
constexpr uint16_t kCorrectedITime = 250;
constexpr uint16_t kCorrectedFudge = 0x4CCC; // 1.2 with 14 fraction bits

constexpr uint16_t kLegacyITime = 150;
constexpr int kLegacyGainIndex = 6;
constexpr uint16_t kAux1 = 100;
constexpr uint16_t kAux2 = 99;
constexpr uint16_t kAux3 = 62;
constexpr uint16_t kUnitGainScale = 0x8000;
constexpr unsigned kFixedGains = 4; // gainScale[0..3] precede the calibrated gains

uint32_t storedChipId(std::span<const uint8_t> data)
{
    const std::string digits(reinterpret_cast<const char*>(data.data() + chipID), kChipIdDigits);
    return uint32_t(std::strtoul(digits.c_str(), nullptr, 16));
}

struct Timing {
    uint16_t iTime;
    int gainIndex;
    uint16_t fudge;
};

Timing timingFor(std::span<const uint8_t> data, int version, unsigned nGains)
{
    Timing t{kLegacyITime, kLegacyGainIndex, le::get<uint16_t>(data, fudge)};
    if (version <= kLastVersionWithoutTiming)
        return t;
    t.iTime = uint16_t(le::get<int16_t>(data, iTime));
    t.gainIndex = int(le::get<uint8_t>(data, gainIndex)) - int(nGains) + 9;
    if (QyGetProductType() == kProductTypeWithTimingFault && version == kVersionWithTimingFault) {
        VLOG_ERROR("WORKAROUND: override iTime (%i -> %i) and fudge (%i -> %i)", int(int16_t(t.iTime)),
                   int(kCorrectedITime), int(t.fudge), int(kCorrectedFudge));
        t.iTime = kCorrectedITime;
        t.fudge = kCorrectedFudge;
    }
    return t;
}

driver::ChannelBlock channelBlock(std::span<const uint8_t> data, unsigned c, unsigned nGains)
{
    driver::ChannelBlock block;
    block.darkCounts = le::get<uint8_t>(data, darkCounts + c);
    block.offsetCounts = le::get<int16_t>(data, offsetCounts + 2 * c);
    block.channelParamA = le::get<uint16_t>(data, channelParamA + 2 * c);
    block.channelParamB = le::get<int16_t>(data, channelParamB + 2 * c);
    for (unsigned g = 0; g < kFixedGains; ++g)
        block.gainScale[g] = kUnitGainScale;
    for (unsigned g = 0; g < nGains; ++g)
        block.gainScale[kFixedGains + g] = le::get<uint16_t>(data, gainScale + gainScaleStride * c + 2 * g);
    return block;
}

CFDataRef buildRecord(std::span<const uint8_t> data, const Timing& timing, uint8_t nChannels, uint8_t nGains)
{
    driver::ChannelRecord record(driver::kFiveChannelRecord);
    record.setHeader({.source = driver::CalibrationSource::Factory,
                      .chipType = 0,
                      .calibrationVersion = driver::kCalibrationVersion,
                      .fudge = timing.fudge,
                      .iTime = timing.iTime,
                      .aux1 = kAux1,
                      .aux2 = kAux2});
    record.setAux3(kAux3);
    for (unsigned i = 0; i < driver::kFiveChannelRecord.gainSlots; ++i)
        record.setGain(i, uint8_t(timing.gainIndex));
    record.setCounts(nChannels, nGains);
    VLOG_DEFAULT("%s: nChannels = %d, nGains = %d", "processQVTCalibrationXwCAT2", int(nChannels), int(nGains));
    VLOG_DEFAULT("%s: gain = %d, iTime = %d", "processQVTCalibrationXwCAT2", timing.gainIndex,
                 int(int16_t(timing.iTime)));

    for (unsigned c = 0; c < nChannels; ++c) {
        const driver::ChannelBlock block = channelBlock(data, c, nGains);
        const float lux = driver::fixedToFloat(le::get<int32_t>(data, luxCoeff + 4 * c), 2147483648.0);
        const float cct = driver::fixedToFloat(le::get<int32_t>(data, cctCoeff + 4 * c), 16384.0);
        record.setLuxCoeff(c, lux);
        record.setCctCoeff(c, cct);
        record.setChannelBlock(c, block);
        VLOG_DEFAULT("%s: luxCoeff[%d]=%f, cctCoeff[%d]=%f, offsetCounts[%d]=%d/255 darkCounts[%d] = %d",
                     "processQVTCalibrationXwCAT2", int(c), double(lux), int(c), double(cct), int(c),
                     int(block.offsetCounts), int(c), int(int8_t(block.darkCounts)));
    }
    return record.createData();
}

} // namespace

CFOwned<CFDataRef> Calibration::processQVTCalibrationXwCAT2(CFDataRef data)
{
    const CFIndex length = data ? CFDataGetLength(data) : 0;
    VLOG_DEFAULT("QVT calibration data length = %ld\n", long(length));
    if (length != CFIndex(kSize)) {
        VLOG_ERROR("QVT calibration data doesn't match with size of XwCA structure (length = %ld)\n", long(length));
        return {};
    }
    const std::span<const uint8_t> bytes(CFDataGetBytePtr(data), size_t(length));
    const uint8_t major = le::get<uint8_t>(bytes, versionMajor);
    const uint8_t minor = le::get<uint8_t>(bytes, versionMinor);
    VLOG_DEFAULT("XwCA version = v%d.%d\n", int(major), int(minor));
    VLOG_DEFAULT("Device_id = 0x%x\n", unsigned(le::get<uint8_t>(bytes, deviceID)));

    const uint32_t storedId = storedChipId(bytes);
    VLOG_DEFAULT("Chip_id is 0x%08X", storedId);
    if (!calib::chipIdMatches(storedId, unit_.chipId.load())) {
        VLOG_ERROR("Chip ID doesn't match - (device chip ID 0x%08X != calibration chip ID 0x%08X and chip_id_reversed "
                   "0x%08X)",
                   unit_.chipId.load(), storedId, calib::reversedChipId(storedId));
        return {};
    }

    const uint8_t nChannels = le::get<uint8_t>(bytes, stored::xwca::nChannels);
    const uint8_t nGains = le::get<uint8_t>(bytes, stored::xwca::nGains);
    if (nChannels < 1 || nChannels > kMaxChannels || nGains > kMaxGains) {
        VLOG_ERROR("XwCA calibration with %u channels and %u gains does not fit the %u-channel record -> "
                   "calibration will be skipped.\n",
                   unsigned(nChannels), unsigned(nGains), kMaxChannels);
        return {};
    }

    const Timing timing = timingFor(bytes, int(major) * 10 + int(minor), nGains);
    CFOwned<CFDataRef> built(buildRecord(bytes, timing, nChannels, nGains));
    if (!built)
        return {};
    unit_.smallDBVersion = 1.3f;
    unit_.numberOfChannels = nChannels;
    unit_.dbChannelCount = nChannels;
    return built;
}
