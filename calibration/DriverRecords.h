// Writing the driver's calibration records (their layouts are in
// formats/DriverRecordLayouts.h).
//
// Records are built in zero-filled buffers through le::put, so every byte not
// given a value stays zero. A write that falls outside the record or outside
// the layout's slots (a channel or gain index the layout has no room for) is
// refused and makes the record unusable: createData() then yields nothing, so
// a record is never sent half-written or with a field in another's place.
#pragma once

#include "formats/DriverRecordLayouts.h"
#include "support/LittleEndian.h"

#include <CoreFoundation/CoreFoundation.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

namespace driver {

// A record under construction (see the top of this file).
class RecordBuffer {
public:
    explicit RecordBuffer(size_t size) : bytes_(size, 0) {}

    template <le::Field T>
    void put(size_t offset, T value)
    {
        if (!le::put<T>(bytes_, offset, value))
            refuse();
    }
    // Copies `bytes` to `offset`.
    void putBytes(size_t offset, std::span<const uint8_t> bytes)
    {
        if (!le::fits(bytes_.size(), offset, bytes.size()))
            return refuse();
        std::copy(bytes.begin(), bytes.end(), bytes_.begin() + std::ptrdiff_t(offset));
    }
    bool ok() const { return ok_; }
    std::span<const uint8_t> bytes() const { return bytes_; }
    // The record as new data (the caller releases it), or null when a write
    // was refused or the data cannot be created.
    CFDataRef createData() const;

protected:
    void refuse() { ok_ = false; }

private:
    std::vector<uint8_t> bytes_;
    bool ok_ = true;
};

struct RecordHeader {
    CalibrationSource source = CalibrationSource::Factory;
    uint32_t chipType = 0;
    uint8_t calibrationVersion = kCalibrationVersion;
    uint16_t fudge = 0;
    uint16_t iTime = 0;
    uint16_t aux1 = 0;
    uint16_t aux2 = 0;
};

struct ChannelBlock {
    uint8_t darkCounts = 0;
    int16_t offsetCounts = 0;
    uint16_t channelParamA = 0;
    int16_t channelParamB = 0; // the 24-byte form keeps its low byte
    std::array<uint16_t, kMaxGains> gainScale{};
};

// A 4-, 5- or 6-channel record. The constructor writes recordVersion and
// recordLength; the setters refuse indexes and field kinds the layout has no
// slot for.
class ChannelRecord : public RecordBuffer {
public:
    explicit ChannelRecord(const ChannelRecordLayout& layout);

    const ChannelRecordLayout& layout() const { return layout_; }
    void setHeader(const RecordHeader& header);
    void setAux3(uint16_t value);
    void setGain(unsigned index, uint8_t value);
    void setCounts(uint8_t nChannels, uint8_t nGains);
    // 4-channel record: the lux coefficient with 16 fraction bits and the two
    // raw colour-temperature words.
    void setLuxCoeffFixed(unsigned channel, int32_t raw);
    void setCctCoeffRaw(unsigned index, uint32_t raw);
    // 5- and 6-channel records.
    void setLuxCoeff(unsigned channel, float value);
    void setCctCoeff(unsigned channel, float value);
    void setChannelBlock(unsigned channel, const ChannelBlock& block);

private:
    const ChannelRecordLayout& layout_;
};

} // namespace driver
