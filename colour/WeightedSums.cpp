// Weighted sums over the database samples: the cross products R W T^T and the
// packed Gram matrix R W R^T. Each element is one single-precision sum whose
// order is fixed (eight lanes, folded as the blocks shrink), so results do not
// depend on how the compiler vectorises the lanes.
#include "colour/SolverSupport.h"

#include <cstddef>

namespace {

// sum over i < count of (w_i * a_i) * b_i in the fixed lane order.
float laneSum(int count, const float* w, const float* a, const float* b)
{
    float lanes[8] = {};
    int i = 0;
    for (; i + 7 < count; i += 8)
        for (int l = 0; l < 8; ++l)
            lanes[l] += (w[i + l] * a[i + l]) * b[i + l];
    for (int l = 0; l < 4; ++l)
        lanes[l] += lanes[l + 4];
    for (; i + 3 < count; i += 4)
        for (int l = 0; l < 4; ++l)
            lanes[l] += (w[i + l] * a[i + l]) * b[i + l];
    lanes[0] += lanes[2];
    lanes[1] += lanes[3];
    for (; i + 1 < count; i += 2) {
        lanes[0] += (w[i] * a[i]) * b[i];
        lanes[1] += (w[i + 1] * a[i + 1]) * b[i + 1];
    }
    lanes[0] += lanes[1];
    if (i < count)
        lanes[0] += (w[i] * a[i]) * b[i];
    return lanes[0];
}

} // namespace

extern "C" void weightedCrossProduct(int count, int M, const float* T, int ldT, const float* w, const float* R,
                                     int ldR, float* C)
{
    for (int j = 0; j < M; ++j)
        for (int c = 0; c < 3; ++c)
            C[4 * j + c] = laneSum(count, w, R + size_t(j) * ldR, T + size_t(c) * ldT);
}

extern "C" void weightedGramPacked(int count, int M, const float* R, int ldR, const float* w, float* G)
{
    for (int a = 0; a < M; ++a)
        for (int b = a; b < M; ++b)
            G[solver::packedIndex(M, a, b)] = laneSum(count, w, R + size_t(a) * ldR, R + size_t(b) * ldR);
}
