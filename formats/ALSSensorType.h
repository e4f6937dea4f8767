// The sensor types a colour ALS driver publishes as "ALSSensorType".
#pragma once

#include <cstdint>

// Sensor type published by the driver as "ALSSensorType".
enum eALSSensorType : uint32_t {
    eALSSensorTypeUnknown = 0,
    eALSSensorType4ChannelA = 1,
    eALSSensorType4ChannelB = 2,
    eALSSensorType6ChannelA = 3,
    eALSSensorType6ChannelB = 4,
    eALSSensorType5ChannelA = 5,
    eALSSensorType5ChannelB = 6,
    eALSSensorType5ChannelC = 7,
    eALSSensorTypeVD6287 = 8,
};
