// The unregularised members of the solver family: normal equations by
// Cholesky (with or without the QR fallback) and pivoted QR on the
// sqrt(w)-scaled samples.
#include "colour/SolverSupport.h"

#include <Accelerate/Accelerate.h>

#include <algorithm>

using namespace solver;

extern "C" void hybridSolve(int N, int M, const float* T, const float* w, const float* R, float* H)
{
    if (!argumentsUsable(N, M)) {
        markFailed(M, H);
        return;
    }
    PackedScratch U;
    formNormalEquations(N, M, T, w, R, H, U);
    choleskyPacked(M, U);
    // The last pivot must be at least 1/16 of the first; a NaN pivot fails the
    // comparison too. Below that the normal equations have squared away too
    // many digits and QR on the data itself is used instead.
    float first = U[0];
    float last = U[packedIndex(M, M - 1, M - 1)];
    if (!(first * 0.0625f <= last) || !factorUsable(M, U)) {
        generalSolve(N, M, T, w, R, H);
        return;
    }
    solveWithFactor(M, H, U);
}

extern "C" void specialSolve(int N, int M, const float* T, const float* w, const float* R, float* H)
{
    if (!argumentsUsable(N, M)) {
        markFailed(M, H);
        return;
    }
    PackedScratch U;
    formNormalEquations(N, M, T, w, R, H, U);
    choleskyPacked(M, U);
    solveWithFactor(M, H, U);
}

extern "C" void generalSolve(int N, int M, const float* T, const float* w, const float* R, float* H)
{
    if (!argumentsUsable(N, M)) {
        markFailed(M, H);
        return;
    }
    // Fewer samples than channels: zero rows keep the QR solver's m >= n and
    // change nothing in the least-squares problem.
    int rows = std::max(N, M);
    auto Rs = allocateArray<float>(size_t(M) * rows, true);
    auto Ts = allocateArray<float>(size_t(3) * rows, true);
    auto s = allocateArray<float>(N);
    if (!Rs || !Ts || !s) {
        markFailed(M, H);
        return;
    }
    vvsqrtf(s.get(), w, &N);
    for (int j = 0; j < M; ++j)
        vDSP_vmul(R + size_t(j) * N, 1, s.get(), 1, Rs.get() + size_t(j) * rows, 1, vDSP_Length(N));
    for (int c = 0; c < 3; ++c)
        vDSP_vmul(T + size_t(c) * N, 1, s.get(), 1, Ts.get() + size_t(c) * rows, 1, vDSP_Length(N));
    pivotedQRLeastSquares(rows, M, Rs.get(), Ts.get(), H);
}
