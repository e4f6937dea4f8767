// Driver record from a VD6286 registry entry (chip type 3): the 193-byte
// five-channel layout.
#include "plugin/LittleEndian.h"
#include "plugin/Log.h"
#include "plugin/VantishPlugIn.h"
#include "sysconfig/FixedPoint.h"
#include "sysconfig/SysConfigFormat.h"

#include <vector>

using namespace sysconfig;

namespace {

constexpr size_t kRecordSize = 193;

// Offsets of the five-channel record.
constexpr size_t kCalibrationSource = 1;
constexpr size_t kCalibrationVersion = 9;
constexpr size_t kRecordLength = 10;
constexpr size_t kFudge = 12;
constexpr size_t kDriverWords = 14; // iTime, aux1, aux2
constexpr size_t kGains = 22;
constexpr size_t kChannelCount = 26;
constexpr size_t kGainCount = 27;
constexpr size_t kLuxCoefficients = 28;
constexpr size_t kCctCoefficients = 48;
constexpr size_t kChannelBlocks = 68;
constexpr size_t kChannelBlockSize = 25;
constexpr unsigned kFixedGainScales = 4; // the first four gain scales are 2.0 for this chip

constexpr uint32_t kSourceConfiguration = 1;

void putChannelBlock(std::span<uint8_t> block, std::span<const uint8_t> source, unsigned nGains)
{
    le::put<uint8_t>(block, 0, le::get<uint8_t>(source, 0));                             // dark counts
    le::put<uint16_t>(block, 1, toQ8_8(float(le::get<uint16_t>(source, 1)) / 1000.0f)); // offset counts
    le::put<uint16_t>(block, 5, uint16_t(le::get<uint8_t>(source, 3)));                 // channel parameter B
    for (unsigned k = 0; k < kFixedGainScales; ++k)
        le::put<uint16_t>(block, 7 + 2 * k, uint16_t(0x8000));
    for (unsigned k = 0; k < nGains; ++k)
        le::put<uint16_t>(block, 7 + 2 * (kFixedGainScales + k),
                          toQ2_14(float(le::get<uint16_t>(source, 4 + 2 * k)) / 256.0f));
}

std::vector<uint8_t> buildRecord(std::span<const uint8_t> entry, uint8_t entryCount, unsigned nChannels,
                                 unsigned nGains)
{
    std::vector<uint8_t> record(kRecordSize, 0);
    std::span<uint8_t> out(record);

    le::put<uint8_t>(out, 0, 1);
    le::put<uint32_t>(out, kCalibrationSource, kSourceConfiguration);
    le::put<uint8_t>(out, kCalibrationVersion, entryCount);
    le::put<uint16_t>(out, kRecordLength, uint16_t(kRecordSize));
    le::put<uint16_t>(out, kFudge, toQ2_14(float(le::get<uint16_t>(entry, generic::kWordA)) / 256.0f));
    for (size_t w = 0; w < 3; ++w)
        le::put<uint16_t>(out, kDriverWords + 2 * w, le::get<uint16_t>(entry, generic::kWordB + 2 * w));
    for (size_t g = 0; g < 3; ++g)
        le::put<uint8_t>(out, kGains + g, le::get<uint8_t>(entry, vd6286::kGain0 + g));
    le::put<uint8_t>(out, kChannelCount, uint8_t(nChannels));
    le::put<uint8_t>(out, kGainCount, uint8_t(nGains));

    for (size_t k = 0; k < vd6286::kMaxChannels; ++k) {
        const float lux = float(le::get<int32_t>(entry, vd6286::kWeights + 4 * k)) / 1000000.0f;
        le::put<float>(out, kLuxCoefficients + 4 * k, lux);
        le::put<float>(out, kCctCoefficients + 4 * k, float(le::get<int32_t>(entry, vd6286::kCctCoefficients + 4 * k)));
    }
    for (unsigned c = 0; c < nChannels; ++c)
        putChannelBlock(out.subspan(kChannelBlocks + kChannelBlockSize * c, kChannelBlockSize),
                        entry.subspan(vd6286::kChannelBlocks + vd6286::kChannelBlockSize * c,
                                      vd6286::kChannelBlockSize),
                        nGains);
    return record;
}

} // namespace

bool VantishPlugIn::processSysConfigSensorCalibrationVD6286(CFDataRef& blob, long& entryOffset,
                                                            ALSCalibrationHeader& header,
                                                            ALSCalibrationSubHeader& subHeader, long& recordSize,
                                                            CFDataRef& record)
{
    if (!vd6286::entryLargeEnough(subHeader.entrySize)) {
        VLOG_ERROR("Calibration data are smaller than ALSCalibrationDataVD6286 structure.");
        return false;
    }
    VLOG_INFO("ALSCalibrationDataVD6286 size: %lu, calibration data %u.", static_cast<unsigned long>(vd6286::kEntrySize),
              unsigned(subHeader.entrySize));

    const auto bytes = bytesOf(blob);
    if (entryOffset < 0 || !le::fits(bytes.size(), size_t(entryOffset), vd6286::kEntrySize)) {
        VLOG_ERROR("Calibration entry at offset %ld runs past the end of the data (%ld bytes).\n", entryOffset,
                   long(bytes.size()));
        return false;
    }
    const auto entry = bytes.subspan(size_t(entryOffset), vd6286::kEntrySize);
    const unsigned nChannels = le::get<uint8_t>(entry, generic::kChannelCount);
    const unsigned nGains = le::get<uint8_t>(entry, generic::kGainCount);
    if (nChannels > vd6286::kMaxChannels || nGains > vd6286::kMaxGains) {
        VLOG_ERROR("Calibration entry declares %u channels and %u gains; the record holds at most %u and %u.\n",
                   nChannels, nGains, vd6286::kMaxChannels, vd6286::kMaxGains);
        return false;
    }

    const auto bytesOut = buildRecord(entry, header.entryCount, nChannels, nGains);
    CFDataRef created = CFDataCreate(kCFAllocatorDefault, bytesOut.data(), CFIndex(bytesOut.size()));
    if (!created)
        return false;
    numberOfChannels = nChannels;
    dbChannelCount = nChannels;
    recordSize = long(kRecordSize);
    record = created;
    return true;
}
