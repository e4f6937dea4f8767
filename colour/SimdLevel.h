// Which vector instructions the colour fit's two hot loops (the similarity
// weights and the weighted sums) run with. Each loop is compiled for every
// level below and chosen at run time; the arithmetic and its order are the
// same at every level (no fused multiply-add, lane-wise sums), so the results
// are bit-identical whichever level runs.
#pragma once

#include <optional>

enum class SimdLevel {
    Baseline, // the build's target (x86-64: SSE2)
    Avx2,
    Avx512,
};

// The widest level this processor supports.
SimdLevel detectedSimdLevel();
// The level the kernels use now: the detected one, unless forced.
SimdLevel activeSimdLevel();
// Tests and benchmarks: run the kernels at `level` (a level above the detected
// one is lowered to it); std::nullopt returns to the detected level.
void forceSimdLevel(std::optional<SimdLevel> level);
// The name of a level, as benchmarks print it.
const char* simdLevelName(SimdLevel level);
