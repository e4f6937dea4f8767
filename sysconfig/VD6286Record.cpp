// Driver record from a VD6286 registry entry (chip type 3): the 193-byte
// five-channel layout.
#include "calibration/DriverRecords.h"
#include "support/LittleEndian.h"
#include "support/Log.h"
#include "sysconfig/SysConfigCalibration.h"

#include "calibration/Calibration.h"
#include "sysconfig/FixedPoint.h"
#include "sysconfig/RecordFields.h"
#include "sysconfig/SysConfigFormat.h"

using namespace sysconfig;

namespace {

constexpr unsigned kFixedGainScales = 4;   // the first four gain scales are 2.0 for this chip
constexpr uint16_t kGainScaleTwo = 0x8000; // 2.0 with 14 fraction bits

// A channel block: the first four gain scales are fixed, the entry's follow.
driver::ChannelBlock vd6286ChannelBlock(std::span<const uint8_t> source, unsigned nGains)
{
    driver::ChannelBlock block = channelBlock(source, nGains, kFixedGainScales);
    for (unsigned k = 0; k < kFixedGainScales; ++k)
        block.gainScale[k] = kGainScaleTwo;
    return block;
}

// The five-channel record for a checked entry, or null.
CFDataRef createRecord(std::span<const uint8_t> entry, uint8_t entryCount, unsigned nChannels, unsigned nGains)
{
    driver::ChannelRecord record(driver::kFiveChannelRecord);
    record.setHeader(recordHeader(entry, entryCount));
    for (unsigned g = 0; g < 3; ++g)
        record.setGain(g, le::get<uint8_t>(entry, vd6286::kGain0 + g));
    record.setCounts(uint8_t(nChannels), uint8_t(nGains));

    for (unsigned k = 0; k < vd6286::kMaxChannels; ++k) {
        record.setLuxCoeff(k, float(le::get<int32_t>(entry, vd6286::kWeights + 4 * k)) / 1000000.0f);
        record.setCctCoeff(k, float(le::get<int32_t>(entry, vd6286::kCctCoefficients + 4 * k)));
    }
    for (unsigned c = 0; c < nChannels; ++c)
        record.setChannelBlock(c,
                               vd6286ChannelBlock(entry.subspan(vd6286::kChannelBlocks + vd6286::kChannelBlockSize * c,
                                                                vd6286::kChannelBlockSize),
                                                  nGains));
    return record.createData();
}

} // namespace

CFOwned<CFDataRef> processSysConfigSensorCalibrationVD6286(Calibration& calibration, CFDataRef blob, long entryOffset,
                                                           const ALSCalibrationHeader& header,
                                                           const ALSCalibrationSubHeader& subHeader)
{
    const auto located = vd6286::entryAt(blob, entryOffset, subHeader.entrySize);
    if (!located)
        return {};
    const auto entry = *located;
    const unsigned nChannels = le::get<uint8_t>(entry, generic::kChannelCount);
    const unsigned nGains = le::get<uint8_t>(entry, generic::kGainCount);
    if (nChannels > vd6286::kMaxChannels || nGains > vd6286::kMaxGains) {
        VLOG_ERROR("Calibration entry declares %u channels and %u gains; the record holds at most %u and %u.\n",
                   nChannels, nGains, vd6286::kMaxChannels, vd6286::kMaxGains);
        return {};
    }

    CFOwned<CFDataRef> record(createRecord(entry, header.entryCount, nChannels, nGains));
    if (!record)
        return {};
    calibration.unit().numberOfChannels = nChannels;
    calibration.unit().dbChannelCount = nChannels;
    return record;
}
