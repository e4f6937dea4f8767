#include "colour/SimdLevel.h"

#include <atomic>

namespace {

// -1: not forced; otherwise a SimdLevel.
std::atomic<int> forced{-1};

} // namespace

SimdLevel detectedSimdLevel()
{
#if defined(__x86_64__) || defined(__i386__)
    static const SimdLevel detected = [] {
        __builtin_cpu_init();
        if (__builtin_cpu_supports("avx512f") && __builtin_cpu_supports("avx512dq") &&
            __builtin_cpu_supports("avx512vl"))
            return SimdLevel::Avx512;
        if (__builtin_cpu_supports("avx2"))
            return SimdLevel::Avx2;
        return SimdLevel::Baseline;
    }();
    return detected;
#else
    return SimdLevel::Baseline;
#endif
}

SimdLevel activeSimdLevel()
{
    const int level = forced.load(std::memory_order_relaxed);
    const SimdLevel detected = detectedSimdLevel();
    if (level < 0 || level > int(detected))
        return detected;
    return SimdLevel(level);
}

void forceSimdLevel(std::optional<SimdLevel> level) { forced = level ? int(*level) : -1; }

const char* simdLevelName(SimdLevel level)
{
    switch (level) {
    case SimdLevel::Avx512:
        return "avx512";
    case SimdLevel::Avx2:
        return "avx2";
    case SimdLevel::Baseline:
        break;
    }
    return "baseline";
}
