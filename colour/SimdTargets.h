// Compiles one kernel body for every SimdLevel and picks the active one at run
// time. A kernel is a function template `Name<Level>` whose body and helpers
// are always inlined, so each instance is compiled for its level's
// instructions:
//
//     template <SimdLevel L> [[gnu::always_inline]] inline void kernel(...);
//     VANTISH_SIMD_VARIANTS(kernelVariant, kernel, void, (int n, float* x), (n, x))
//
// defines kernelVariant(SimdLevel, args...) that calls the instance for the
// level. Only x86-64 has the wider levels; elsewhere every level runs the
// baseline instance.
#pragma once

#include "colour/SimdLevel.h"

#if defined(__x86_64__)
#define VANTISH_TARGET_AVX2 __attribute__((target("avx2")))
#define VANTISH_TARGET_AVX512 __attribute__((target("avx2,avx512f,avx512dq,avx512vl")))
#else
#define VANTISH_TARGET_AVX2
#define VANTISH_TARGET_AVX512
#endif

#define VANTISH_SIMD_VARIANTS(name, kernel, result, parameters, arguments)            \
    result name##Baseline parameters { return kernel arguments; }                     \
    VANTISH_TARGET_AVX2 result name##Avx2 parameters { return kernel arguments; }     \
    VANTISH_TARGET_AVX512 result name##Avx512 parameters { return kernel arguments; } \
    result name(SimdLevel level, VANTISH_SIMD_UNPACK parameters)                      \
    {                                                                                 \
        switch (level) {                                                              \
        case SimdLevel::Avx512:                                                       \
            return name##Avx512 arguments;                                            \
        case SimdLevel::Avx2:                                                         \
            return name##Avx2 arguments;                                              \
        case SimdLevel::Baseline:                                                     \
            break;                                                                    \
        }                                                                             \
        return name##Baseline arguments;                                              \
    }
#define VANTISH_SIMD_UNPACK(...) __VA_ARGS__
