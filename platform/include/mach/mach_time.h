// Host time base: ticks of a monotonic clock and their length.
#pragma once

#include <cstdint>

typedef int kern_return_t;
struct mach_timebase_info {
    uint32_t numer;
    uint32_t denom;
};
typedef struct mach_timebase_info* mach_timebase_info_t;
typedef struct mach_timebase_info mach_timebase_info_data_t;

extern "C" {
uint64_t mach_absolute_time(void);
// One tick lasts numer / denom nanoseconds.
kern_return_t mach_timebase_info(mach_timebase_info_t info);
}
