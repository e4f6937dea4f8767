// Weighted sums over the database samples: the cross products R W T^T and the
// packed Gram matrix R W R^T. Each element is one single-precision sum of the
// terms (w_i * first factor) * second factor in a fixed order: eight lanes
// (sample i in lane i mod 8) over blocks of eight, folded to four lanes for
// blocks of four, to two for pairs, to one for a last sample. The order does
// not depend on how the compiler vectorises the lanes.
//
// Several sums that share the first factor are formed in one pass, which
// shares the products w_i * a_i and keeps independent additions in flight;
// every sum still sees exactly its own terms in its own order.
#include "colour/SimdTargets.h"
#include "colour/SolverSupport.h"

#include <algorithm>
#include <cstddef>
#include <cstring>

namespace {

// Second factors handled in one pass at most.
constexpr int kMaxShared = 4;

// Four and eight lanes, each its own single-precision sum; arithmetic on them
// is lane by lane, whatever vector registers carry them.
typedef float Float4 __attribute__((vector_size(16)));
typedef float Float8 __attribute__((vector_size(32)));

[[gnu::always_inline]] inline Float4 load4(const float* p)
{
    Float4 v;
    std::memcpy(&v, p, sizeof v);
    return v;
}

// out[k] = sum over i < count of (w_i * a_i) * b[k][i], for k < K.
template <int K>
[[gnu::always_inline]] inline void laneSums(int count, const float* w, const float* a, const float* const* b,
                                            float* out)
{
    // Lanes 0-7 of every sum, then lanes 0-3 plus 4-7.
    Float8 eight[K] = {};
    int i = 0;
    for (; i + 7 < count; i += 8) {
        // Loaded in place: an eight-lane value is never passed or returned,
        // so the baseline build needs no wide-vector calling convention.
        Float8 wv, av;
        std::memcpy(&wv, w + i, sizeof wv);
        std::memcpy(&av, a + i, sizeof av);
        const Float8 wa = wv * av;
        for (int k = 0; k < K; ++k) {
            Float8 bv;
            std::memcpy(&bv, b[k] + i, sizeof bv);
            eight[k] += wa * bv;
        }
    }
    Float4 low[K];
    for (int k = 0; k < K; ++k)
        low[k] = Float4{eight[k][0], eight[k][1], eight[k][2], eight[k][3]} +
                 Float4{eight[k][4], eight[k][5], eight[k][6], eight[k][7]};
    for (; i + 3 < count; i += 4) {
        Float4 wa = load4(w + i) * load4(a + i);
        for (int k = 0; k < K; ++k)
            low[k] += wa * load4(b[k] + i);
    }
    for (int k = 0; k < K; ++k) {
        float lane0 = low[k][0] + low[k][2];
        float lane1 = low[k][1] + low[k][3];
        for (int j = i; j + 1 < count; j += 2) {
            lane0 += (w[j] * a[j]) * b[k][j];
            lane1 += (w[j + 1] * a[j + 1]) * b[k][j + 1];
        }
        lane0 += lane1;
        if ((count - i) % 2 == 1)
            lane0 += (w[count - 1] * a[count - 1]) * b[k][count - 1];
        out[k] = lane0;
    }
}

// The same for 1 ... kMaxShared second factors chosen at run time.
[[gnu::always_inline]] inline void sharedSums(int count, const float* w, const float* a, const float* const* b, int K,
                                              float* out)
{
    switch (K) {
    case 1:
        return laneSums<1>(count, w, a, b, out);
    case 2:
        return laneSums<2>(count, w, a, b, out);
    case 3:
        return laneSums<3>(count, w, a, b, out);
    default:
        return laneSums<4>(count, w, a, b, out);
    }
}

[[gnu::always_inline]] inline void crossProduct(int count, int M, const float* T, int ldT, const float* w,
                                                const float* R, int ldR, float* C)
{
    const float* targets[3] = {T, T + ldT, T + size_t(2) * ldT};
    for (int j = 0; j < M; ++j)
        laneSums<3>(count, w, R + size_t(j) * ldR, targets, C + 4 * j);
}

[[gnu::always_inline]] inline void gramPacked(int count, int M, const float* R, int ldR, const float* w, float* G)
{
    for (int a = 0; a < M; ++a) {
        const float* first = R + size_t(a) * ldR;
        for (int b = a; b < M; b += kMaxShared) {
            int K = std::min(kMaxShared, M - b);
            const float* second[kMaxShared];
            for (int k = 0; k < K; ++k)
                second[k] = R + size_t(b + k) * ldR;
            sharedSums(count, w, first, second, K, G + solver::packedIndex(M, a, b));
        }
    }
}

VANTISH_SIMD_VARIANTS(crossProductAt, crossProduct, void,
                      (int count, int M, const float* T, int ldT, const float* w, const float* R, int ldR, float* C),
                      (count, M, T, ldT, w, R, ldR, C))
VANTISH_SIMD_VARIANTS(gramPackedAt, gramPacked, void,
                      (int count, int M, const float* R, int ldR, const float* w, float* G), (count, M, R, ldR, w, G))

} // namespace

extern "C" void weightedCrossProduct(int count, int M, const float* T, int ldT, const float* w, const float* R, int ldR,
                                     float* C)
{
    crossProductAt(activeSimdLevel(), count, M, T, ldT, w, R, ldR, C);
}

extern "C" void weightedGramPacked(int count, int M, const float* R, int ldR, const float* w, float* G)
{
    gramPackedAt(activeSimdLevel(), count, M, R, ldR, w, G);
}
