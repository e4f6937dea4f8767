// Decoding the registry calibration blobs: header, subheaders, the entry walk
// and the generic entry's layout.
#include "sysconfig/SysConfigFormat.h"

#include "support/LittleEndian.h"
#include "support/Log.h"

std::optional<ALSCalibrationHeader> ALSCalibrationHeader::decode(std::span<const uint8_t> blob)
{
    if (!le::fits(blob.size(), 0, kSize))
        return std::nullopt;
    ALSCalibrationHeader header;
    header.revision = le::get<uint8_t>(blob, 0);
    header.version = le::get<uint8_t>(blob, 1);
    header.entryCount = le::get<uint8_t>(blob, 2);
    header.totalSize = le::get<uint16_t>(blob, 4);
    return header;
}

std::optional<ALSCalibrationSubHeader> ALSCalibrationSubHeader::decode(std::span<const uint8_t> blob, size_t offset)
{
    if (!le::fits(blob.size(), offset, kSize))
        return std::nullopt;
    const auto bytes = blob.subspan(offset, kSize);
    ALSCalibrationSubHeader subHeader;
    subHeader.sensorType = le::get<uint8_t>(bytes, 0);
    subHeader.orientation = le::get<uint8_t>(bytes, 2);
    subHeader.chipType = le::get<uint8_t>(bytes, 3);
    subHeader.entrySize = le::get<uint16_t>(bytes, 4);
    return subHeader;
}

namespace sysconfig {

std::optional<CalibrationEntry> findCalibrationEntry(std::span<const uint8_t> blob, unsigned entryCount,
                                                     uint32_t orientation, const char* blobName)
{
    const long blobLength = long(blob.size());
    size_t offset = kFirstEntryOffset;
    for (unsigned index = 0; index < entryCount; ++index) {
        const auto subHeader = ALSCalibrationSubHeader::decode(blob, offset);
        if (!subHeader) {
            VLOG_ERROR("%s entry %u at offset %ld: subheader runs past the end of the data (%ld bytes).\n", blobName,
                       index, long(offset), blobLength);
            return std::nullopt;
        }
        // A size below the subheader's would make the walk stand still or step backwards.
        if (subHeader->entrySize < ALSCalibrationSubHeader::kSize) {
            VLOG_ERROR("%s entry %u at offset %ld: entry size %u is smaller than its subheader.\n", blobName, index,
                       long(offset), unsigned(subHeader->entrySize));
            return std::nullopt;
        }
        if (!le::fits(blob.size(), offset, subHeader->entrySize)) {
            VLOG_ERROR("%s entry %u at offset %ld: %u bytes run past the end of the data (%ld bytes).\n", blobName,
                       index, long(offset), unsigned(subHeader->entrySize), blobLength);
            return std::nullopt;
        }
        if (subHeader->orientation == orientation)
            return CalibrationEntry{long(offset), *subHeader, blob.subspan(offset, subHeader->entrySize)};
        offset += subHeader->entrySize;
    }
    return std::nullopt;
}

std::optional<GenericEntryLayout> genericEntryLayout(std::span<const uint8_t> entry, uint8_t revision)
{
    GenericEntryLayout layout;
    layout.nChannels = le::get<uint8_t>(entry, generic::kChannelCount);
    layout.nGains = le::get<uint8_t>(entry, generic::kGainCount);
    if (layout.nChannels > generic::kMaxChannels || layout.nGains > generic::kMaxGains) {
        VLOG_ERROR("Calibration entry declares %u channels and %u gains; the record holds at most %u and %u.\n",
                   layout.nChannels, layout.nGains, generic::kMaxChannels, generic::kMaxGains);
        return std::nullopt;
    }
    layout.channelBlockSize = 4 + 2 * size_t(layout.nGains);
    layout.spectrumOffset = generic::kChannelBlocks + layout.channelBlockSize * layout.nChannels;
    layout.spectrumSize = generic::spectrumBlockSize(revision);
    layout.spectraOffset = generic::spectraOffset(revision);
    if (!le::fits(entry.size(), layout.spectrumOffset, layout.spectrumSize)) {
        VLOG_ERROR("Calibration entry of %lu bytes is too short for its channel blocks and spectrum block (%lu "
                   "bytes).\n",
                   static_cast<unsigned long>(entry.size()),
                   static_cast<unsigned long>(layout.spectrumOffset + layout.spectrumSize));
        return std::nullopt;
    }
    return layout;
}

std::optional<std::span<const uint8_t>> vd6286::entryAt(CFDataRef blob, long entryOffset, uint16_t entrySize)
{
    if (!entryLargeEnough(entrySize)) {
        VLOG_ERROR("Calibration data are smaller than ALSCalibrationDataVD6286 structure.");
        return std::nullopt;
    }
    VLOG_INFO("ALSCalibrationDataVD6286 size: %lu, calibration data %u.", static_cast<unsigned long>(kEntrySize),
              unsigned(entrySize));

    const auto bytes = bytesOf(blob);
    if (entryOffset < 0 || !le::fits(bytes.size(), size_t(entryOffset), kEntrySize)) {
        VLOG_ERROR("Calibration entry at offset %ld runs past the end of the data (%ld bytes).\n", entryOffset,
                   long(bytes.size()));
        return std::nullopt;
    }
    return bytes.subspan(size_t(entryOffset), kEntrySize);
}

} // namespace sysconfig
