#include "calibration/DriverRecords.h"

namespace driver {

CFDataRef RecordBuffer::createData() const
{
    if (!ok_)
        return nullptr;
    return CFDataCreate(kCFAllocatorDefault, bytes_.data(), CFIndex(bytes_.size()));
}

ChannelRecord::ChannelRecord(const ChannelRecordLayout& layout) : RecordBuffer(layout.size), layout_(layout)
{
    put<uint8_t>(header::recordVersion, kRecordVersion);
    put<uint16_t>(header::recordLength, uint16_t(layout.size));
}

void ChannelRecord::setHeader(const RecordHeader& h)
{
    put<uint32_t>(header::calibrationSource, uint32_t(h.source));
    put<uint32_t>(header::chipType, h.chipType);
    put<uint8_t>(header::calibrationVersion, h.calibrationVersion);
    put<uint16_t>(header::fudge, h.fudge);
    put<uint16_t>(header::iTime, h.iTime);
    put<uint16_t>(header::aux1, h.aux1);
    put<uint16_t>(header::aux2, h.aux2);
}

void ChannelRecord::setAux3(uint16_t value)
{
    if (!layout_.hasAux3)
        return refuse();
    put<uint16_t>(layout_.aux3, value);
}

void ChannelRecord::setGain(unsigned index, uint8_t value)
{
    if (index >= layout_.gainSlots)
        return refuse();
    put<uint8_t>(layout_.gain + index, value);
}

void ChannelRecord::setCounts(uint8_t nChannels, uint8_t nGains)
{
    if (nChannels > layout_.maxChannels || nGains > kMaxGains)
        return refuse();
    put<uint8_t>(layout_.nChannels, nChannels);
    put<uint8_t>(layout_.nGains, nGains);
}

void ChannelRecord::setLuxCoeffFixed(unsigned channel, int32_t raw)
{
    if (!layout_.fixedLux || channel >= layout_.maxChannels)
        return refuse();
    put<int32_t>(layout_.luxCoeff + 4 * channel, raw);
}

void ChannelRecord::setCctCoeffRaw(unsigned index, uint32_t raw)
{
    if (!layout_.fixedLux || index >= 2)
        return refuse();
    put<uint32_t>(layout_.cctCoeff + 4 * index, raw);
}

void ChannelRecord::setLuxCoeff(unsigned channel, float value)
{
    if (layout_.fixedLux || channel >= layout_.maxChannels)
        return refuse();
    put<float>(layout_.luxCoeff + 4 * channel, value);
}

void ChannelRecord::setCctCoeff(unsigned channel, float value)
{
    if (layout_.fixedLux || channel >= layout_.maxChannels)
        return refuse();
    put<float>(layout_.cctCoeff + 4 * channel, value);
}

void ChannelRecord::setChannelBlock(unsigned channel, const ChannelBlock& block)
{
    if (channel >= layout_.maxChannels)
        return refuse();
    const size_t at = layout_.blockOffset(channel);
    const ChannelBlockLayout& form = layout_.block;
    put<uint8_t>(at + form.darkCounts, block.darkCounts);
    put<int16_t>(at + form.offsetCounts, block.offsetCounts);
    put<uint16_t>(at + form.channelParamA, block.channelParamA);
    if (form.wideParamB)
        put<int16_t>(at + form.channelParamB, block.channelParamB);
    else
        put<uint8_t>(at + form.channelParamB, uint8_t(block.channelParamB));
    for (unsigned g = 0; g < kMaxGains; ++g)
        put<uint16_t>(at + form.gainScale + 2 * g, block.gainScale[g]);
}

} // namespace driver
