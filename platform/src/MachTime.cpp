// Host time base: nanoseconds of the monotonic clock, one tick = numer/denom ns
// as reported (1/1 unless a test sets another time base).
#include <mach/mach_time.h>

#include <VantishPlatform/DeviceState.h>

#include <atomic>
#include <ctime>

namespace {

constexpr kern_return_t kSuccess = 0;
constexpr kern_return_t kInvalidArgument = 4;

// numer in the high half, denom in the low half: read and set as one pair.
std::atomic<uint64_t> timebase{(uint64_t(1) << 32) | 1};

} // namespace

uint64_t mach_absolute_time(void)
{
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return uint64_t(now.tv_sec) * 1000000000ull + uint64_t(now.tv_nsec);
}

kern_return_t mach_timebase_info(mach_timebase_info_t info)
{
    if (!info)
        return kInvalidArgument;
    uint64_t pair = timebase.load();
    info->numer = uint32_t(pair >> 32);
    info->denom = uint32_t(pair);
    return kSuccess;
}

// A zero in either part would make every conversion divide by zero or vanish;
// it restores 1/1 instead.
void VPSetTimebase(uint32_t numer, uint32_t denom)
{
    if (numer == 0 || denom == 0)
        numer = denom = 1;
    timebase.store((uint64_t(numer) << 32) | denom);
}
