#include "calibration/XwClFormat.h"

#include "calibration/Calibration.h"
#include "calibration/ChipId.h"
#include "calibration/DriverRecords.h"
#include "support/Log.h"

namespace calib {
namespace {

using namespace stored::xwcl;
using driver::ChannelRecord;
using driver::ChannelRecordLayout;

// What a device id selects.
struct Variant {
    const ChannelRecordLayout* layout;
    bool selectsEntry; // entrySelector names the entry; else the first is used
    BigDBType bigDBType;
};

const Variant* variantFor(uint8_t deviceID)
{
    static constexpr Variant kFive{&driver::kFiveChannelRecord, false, BigDBType02};
    static constexpr Variant kFour{&driver::kFourChannelRecord, true, BigDBTypeDefault};
    static constexpr Variant kSix{&driver::kSixChannelRecord, true, BigDBType02};
    switch (deviceID) {
    case kDeviceKestrow:
    case kDeviceMarlit:
        return &kFive;
    case kDeviceFourChannelA:
    case kDeviceFourChannelB:
        return &kFour;
    case kDeviceSixChannel:
        return &kSix;
    default:
        return nullptr;
    }
}

// Offset of the entry to read, or 0 when the selector names no entry of the record.
size_t chooseEntry(const Variant& variant, std::span<const uint8_t> data)
{
    const unsigned entries = unsigned((data.size() - kHeaderSize) / kEntrySize);
    if (!variant.selectsEntry)
        return entryOffset(0);
    const unsigned selector = le::get<uint8_t>(data, header::entrySelector);
    if (selector < 1 || selector > entries) {
        VLOG_ERROR("XwCl entry selector %u names no entry of %u -> calibration will be skipped.\n", selector, entries);
        return 0;
    }
    return entryOffset(selector - 1);
}

driver::ChannelBlock channelBlock(std::span<const uint8_t> e, unsigned c, unsigned nGains)
{
    driver::ChannelBlock block;
    block.darkCounts = le::get<uint8_t>(e, entry::darkCounts + c);
    block.offsetCounts = le::get<int16_t>(e, entry::offsetCounts + 2 * c);
    block.channelParamA = le::get<uint16_t>(e, entry::channelParamA + 2 * c);
    block.channelParamB = le::get<int8_t>(e, entry::channelParamB + c);
    for (unsigned g = 0; g < nGains; ++g)
        block.gainScale[g] = le::get<uint16_t>(e, entry::gainScale + entry::gainScaleStride * c + 2 * g);
    return block;
}

CFDataRef buildRecord(const ChannelRecordLayout& layout, std::span<const uint8_t> e, uint8_t chipType)
{
    const uint8_t nChannels = le::get<uint8_t>(e, entry::nChannels);
    const uint8_t nGains = le::get<uint8_t>(e, entry::nGains);
    const bool sixChannel = layout.maxChannels == 6;

    ChannelRecord record(layout);
    record.setHeader({.source = driver::CalibrationSource::Factory,
                      .chipType = layout.fixedLux ? 0u : chipType,
                      .calibrationVersion = driver::kCalibrationVersion,
                      .fudge = le::get<uint16_t>(e, entry::fudge),
                      .iTime = le::get<uint16_t>(e, entry::iTime),
                      .aux1 = le::get<uint16_t>(e, entry::aux1),
                      .aux2 = le::get<uint16_t>(e, entry::aux2)});
    if (layout.hasAux3)
        record.setAux3(le::get<uint16_t>(e, entry::aux3));
    for (unsigned i = 0; i < layout.gainSlots; ++i)
        record.setGain(i, le::get<uint8_t>(e, entry::gain + i));
    record.setCounts(nChannels, nGains);
    if (layout.fixedLux) {
        record.setCctCoeffRaw(0, le::get<uint32_t>(e, entry::cctCoeff));
        record.setCctCoeffRaw(1, le::get<uint32_t>(e, entry::cctCoeff + 4));
    }

    for (unsigned c = 0; c < nChannels; ++c) {
        const driver::ChannelBlock block = channelBlock(e, c, nGains);
        record.setChannelBlock(c, block);
        const int32_t lux = le::get<int32_t>(e, entry::luxCoeff + 4 * c);
        const int32_t cct = le::get<int32_t>(e, entry::cctCoeff + 4 * c);
        if (layout.fixedLux) {
            record.setLuxCoeffFixed(c, lux);
            VLOG_DEBUG("luxCoeff[%d]=%d/65536, offsetCounts[%d]=%d/255", int(c), int(lux), int(c),
                       int(block.offsetCounts));
            continue;
        }
        // The 6-channel record of chip type 0 stores its colour-temperature
        // coefficients with 16 fraction bits, every other with 8.
        const double cctDivisor = sixChannel && chipType == 0 ? 65536.0 : 256.0;
        const float luxValue = driver::fixedToFloat(lux, 65536.0);
        const float cctValue = driver::fixedToFloat(cct, cctDivisor);
        record.setLuxCoeff(c, luxValue);
        record.setCctCoeff(c, cctValue);
        if (sixChannel)
            VLOG_DEBUG("luxCoeff[%d]=%f, cctCoeff[%d]=%f, offsetCounts[%d]=%d/255", int(c), double(luxValue), int(c),
                       double(cctValue), int(c), int(block.offsetCounts));
        else
            VLOG_DEBUG("%s: luxCoeff[%d]=%f, cctCoeff[%d]=%f, offsetCounts[%d]=%d/255", "loadQVTCalibration", int(c),
                       double(luxValue), int(c), double(cctValue), int(c), int(block.offsetCounts));
    }
    return record.createData();
}

// The layouts hold at most maxChannels channel blocks of 9 gains; a 6-channel
// entry also needs a channel besides the ones used for colour.
bool countsFit(const ChannelRecordLayout& layout, std::span<const uint8_t> e)
{
    const unsigned nChannels = le::get<uint8_t>(e, entry::nChannels);
    const unsigned nGains = le::get<uint8_t>(e, entry::nGains);
    const unsigned minChannels = layout.maxChannels == 6 ? 2 : 1;
    if (nChannels >= minChannels && nChannels <= layout.maxChannels && nGains <= stored::xwcl::kStoredGains)
        return true;
    VLOG_ERROR("XwCl calibration with %u channels and %u gains does not fit the %u-channel record -> calibration "
               "will be skipped.\n",
               nChannels, nGains, layout.maxChannels);
    return false;
}

void applyToPlugIn(Calibration& p, uint8_t deviceID, uint8_t nChannels, uint8_t chipType)
{
    switch (deviceID) {
    case kDeviceKestrow:
    case kDeviceMarlit:
        p.unit().smallDBVersion = 1.3f;
        p.unit().chipType = chipType;
        p.unit().numberOfChannels = nChannels;
        p.unit().dbChannelCount = nChannels;
        break;
    case kDeviceFourChannelA:
    case kDeviceFourChannelB:
        p.unit().algoVersion = 4;
        p.fit().lambdaConfigured = 1;
        p.fit().lambda = 0.01f;
        p.unit().numberOfChannels = nChannels;
        p.unit().dbChannelCount = nChannels;
        break;
    case kDeviceSixChannel:
        p.unit().smallDBVersion = 1.2f;
        p.unit().chipType = chipType;
        p.unit().numberOfChannels = nChannels;
        p.unit().dbChannelCount = nChannels - 1u;
        break;
    }
}

} // namespace

XwClParse parseXwClRecord(Calibration& p, std::span<const uint8_t> data)
{
    XwClParse result;
    if (data.size() != kOneEntrySize && data.size() != kTwoEntrySize)
        return result;

    const uint32_t chipID = le::get<uint32_t>(data, header::chipID);
    const uint8_t deviceID = le::get<uint8_t>(data, header::deviceID);
    const uint8_t chipType = le::get<uint8_t>(data, header::chipType);
    VLOG_DEFAULT("XwCl version = v%d.%d\n", int(le::get<uint8_t>(data, header::versionMajor)),
                 int(le::get<uint8_t>(data, header::versionMinor)));
    VLOG_INFO("Device_id = 0x%x\n", unsigned(deviceID));
    VLOG_DEBUG("Chip_id = 0x%08X\n", chipID);
    VLOG_INFO("Chip_type = %d\n", int(chipType));

    if (!chipIdMatches(chipID, p.unit().chipId.load())) {
        VLOG_ERROR("ID in QVT calibration (0x%x) doesn't match with chip ID (0x%x) -> calibration will be skipped.\n",
                   chipID, p.unit().chipId.load());
        p.databases().setReady(false);
        result.outcome = XwClParse::Outcome::ChipMismatch;
        return result;
    }
    VLOG_INFO("Found calibration for chip with ID = 0x%x\n", p.unit().chipId.load());

    const Variant* variant = variantFor(deviceID);
    if (!variant)
        return result;
    if (deviceID == kDeviceKestrow || deviceID == kDeviceMarlit)
        VLOG_DEBUG("Found %s calibration", deviceID == kDeviceKestrow ? "Kestrow" : "Marlit");

    const size_t offset = chooseEntry(*variant, data);
    if (offset == 0 || !le::fits(data.size(), offset, kEntrySize))
        return result;
    const std::span<const uint8_t> e = data.subspan(offset, kEntrySize);
    if (!countsFit(*variant->layout, e))
        return result;

    result.record.reset(buildRecord(*variant->layout, e, chipType));
    if (!result.record)
        return result;
    applyToPlugIn(p, deviceID, le::get<uint8_t>(e, entry::nChannels), chipType);
    result.outcome = XwClParse::Outcome::Record;
    result.entryOffset = offset;
    result.bigDBType = variant->bigDBType;
    return result;
}

} // namespace calib
