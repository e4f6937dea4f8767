// Small pieces shared by the solver implementations (not part of the exported family).
#pragma once

#include "colour/Solvers.h"
#include "support/Assert.h"

#include <cmath>
#include <cstddef>
#include <cstdlib>
#include <limits>
#include <memory>

namespace solver {

// Floats of an M x M symmetric matrix in packed storage.
constexpr int packedSize(int M) { return M * (M + 1) / 2; }
// Packed position of (a, b), a <= b.
constexpr int packedIndex(int M, int a, int b)
{
    VANTISH_ASSERT(0 <= a && a <= b && b < M);
    return a * M - a * (a - 1) / 2 + (b - a);
}

// Scratch for one packed matrix of up to kSolverMaxChannels channels.
using PackedScratch = float[packedSize(kSolverMaxChannels)];

// The failure mark of the family: every element of the M x 4 result is NaN.
inline void markFailed(int M, float* H)
{
    for (int k = 0; k < 4 * M; ++k)
        H[k] = std::numeric_limits<float>::quiet_NaN();
}

// The regularised problem with heavy weights (100 or more) as the augmented
// symmetric indefinite system of order M + K, K the heavy samples, solved by
// LAPACK. The dispatcher's path for a negative or non-finite lambda and for
// weights that are not finite.
void augmentedSolve(int N, int M, const float* T, const float* w, const float* R, float* H, float lambda);

// Arguments every solver accepts; anything else is marked failed by the caller.
inline bool argumentsUsable(int N, int M) { return N >= 0 && M >= 1 && M <= kSolverMaxChannels; }

// A Cholesky factor can be substituted through when every pivot is a positive,
// finite number; a breakdown leaves a zero, NaN or infinite diagonal element.
inline bool factorUsable(int M, const float* U)
{
    for (int a = 0; a < M; ++a) {
        float pivot = U[packedIndex(M, a, a)];
        if (!(pivot > 0.0f) || std::isinf(pivot))
            return false;
    }
    return true;
}

// Heap storage released with free; null when the allocation failed.
struct FreeDeleter {
    void operator()(void* p) const { std::free(p); }
};
template <typename T>
using HeapArray = std::unique_ptr<T[], FreeDeleter>;

// count elements (at least one, so an empty request is not taken for a
// failure), zero-filled when asked.
template <typename T>
HeapArray<T> allocateArray(size_t count, bool zeroed = false)
{
    size_t n = count > 0 ? count : 1;
    void* p = zeroed ? std::calloc(n, sizeof(T)) : std::malloc(n * sizeof(T));
    return HeapArray<T>(static_cast<T*>(p));
}

// The normal equations over all N samples: C = R W T^T into H, the packed
// Gram matrix R W R^T into G.
inline void formNormalEquations(int N, int M, const float* T, const float* w, const float* R, float* H, float* G)
{
    weightedCrossProduct(N, M, T, N, w, R, N, H);
    weightedGramPacked(N, M, R, N, w, G);
}

// Solves U^T U X = H in place for a factor from choleskyPacked, or marks the
// result failed when the factor broke down.
inline void solveWithFactor(int M, float* H, const float* U)
{
    if (!factorUsable(M, U)) {
        markFailed(M, H);
        return;
    }
    forwardSubstitutePacked(M, H, U);
    backSubstitutePacked(M, H, U);
}

} // namespace solver
