// Chip IDs of factory records: a stored ID matches the sensor's when it is
// equal to it or equal with its four bytes reversed (records written in the
// other byte order).
#pragma once

#include <cstdint>

namespace calib {

constexpr uint32_t reversedChipId(uint32_t id)
{
    return (id >> 24) | ((id >> 8) & 0x0000FF00u) | ((id << 8) & 0x00FF0000u) | (id << 24);
}

constexpr bool chipIdMatches(uint32_t stored, uint32_t sensor)
{
    return stored == sensor || reversedChipId(stored) == sensor;
}

} // namespace calib
