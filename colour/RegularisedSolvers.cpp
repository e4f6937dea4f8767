// The regularised members of the solver family: the dispatcher used by the
// colour fit, the regularised normal equations, and the augmented symmetric
// indefinite systems solved with LAPACK.
//
// The augmented system keeps heavy weights out of the squared terms: with
// R_h, T_h the heavy samples, S = diag(sqrt(w)) of them and R_l, W_l, T_l the
// light ones, it is
//     [ I       S R_h^T                 ] [Y]   [ S T_h^T       ]
//     [ R_h S  -(R_l W_l R_l^T + l I)   ] [H] = [ -R_l W_l T_l^T ]
// and eliminating Y gives (R W R^T + l I) H = R W T^T over all samples.
#include "colour/SolverSupport.h"

#include <Accelerate/Accelerate.h>

#include <algorithm>
#include <cstring>
#include <utility>

using namespace solver;

namespace {

// A weight at or above this is a heavy sample on the augmented path.
constexpr float kHeavyWeight = 100.0f;

bool isHeavy(float weight) { return weight >= kHeavyWeight; }

// Column-major n x n matrix element (row a, column b).
float& element(float* A, int n, int a, int b) { return A[size_t(b) * n + a]; }

// ssysv_ with the workspace query. False when the work area cannot be had or
// the factorisation reports a problem (a singular system).
bool solveSymmetricIndefinite(int n, float* A, int* pivots, float* B)
{
    const char uplo = 'U';
    const int nrhs = 3;
    int info = 0;
    float optimal = 0.0f;
    int query = -1;
    ssysv_(&uplo, &n, &nrhs, A, &n, pivots, B, &n, &optimal, &query, &info);
    if (info != 0)
        return false;
    int lwork = std::max(1, static_cast<int>(optimal));
    auto work = allocateArray<float>(size_t(lwork));
    if (!work)
        return false;
    ssysv_(&uplo, &n, &nrhs, A, &n, pivots, B, &n, work.get(), &lwork, &info);
    return info == 0;
}

// Private copies of the samples, reordered so that the light ones come first.
struct PartitionedSamples {
    HeapArray<float> R, T, w;
    int N = 0, M = 0;
    int light = 0; // samples 0 ... light-1 are light, the rest heavy

    bool copy(int n, int m, const float* Rin, const float* Tin, const float* win)
    {
        N = n;
        M = m;
        R = allocateArray<float>(size_t(M) * N);
        T = allocateArray<float>(size_t(3) * N);
        w = allocateArray<float>(N);
        if (!R || !T || !w)
            return false;
        std::memcpy(R.get(), Rin, sizeof(float) * M * N);
        std::memcpy(T.get(), Tin, sizeof(float) * 3 * N);
        std::memcpy(w.get(), win, sizeof(float) * N);
        return true;
    }

    void swapSamples(int a, int b)
    {
        for (int j = 0; j < M; ++j)
            std::swap(R[size_t(j) * N + a], R[size_t(j) * N + b]);
        for (int c = 0; c < 3; ++c)
            std::swap(T[size_t(c) * N + a], T[size_t(c) * N + b]);
        std::swap(w[a], w[b]);
    }

    // Moves light samples from the back into the heavy ones' places at the front.
    void partition()
    {
        int p = 0;
        while (p < N && !isHeavy(w[p]))
            ++p;
        for (int j = N - 1; j > p; --j) {
            if (isHeavy(w[j]))
                continue;
            swapSamples(j, p);
            ++p;
            while (p < j && !isHeavy(w[p]))
                ++p;
        }
        light = p;
    }
};

// The augmented system with the heavy samples as unknowns, light ones folded
// into the lower-right block.
void augmentedSolve(int N, int M, const float* T, const float* w, const float* R, float* H, float lambda)
{
    PartitionedSamples samples;
    if (!samples.copy(N, M, R, T, w)) {
        markFailed(M, H);
        return;
    }
    samples.partition();
    int p = samples.light;
    int K = N - p;
    int n = M + K;
    auto pivots = allocateArray<int>(n);
    auto A = allocateArray<float>(size_t(n) * n, true);
    auto B = allocateArray<float>(size_t(n) * 3, true);
    auto s = allocateArray<float>(K);
    if (!pivots || !A || !B || !s) {
        markFailed(M, H);
        return;
    }
    float* a = A.get();
    float* b = B.get();
    for (int k = 0; k < K; ++k)
        element(a, n, k, k) = 1.0f;

    PackedScratch lightGram = {};
    weightedGramPacked(p, M, samples.R.get(), N, samples.w.get(), lightGram);
    for (int r = 0; r < M; ++r) {
        for (int c = r; c < M; ++c)
            element(a, n, K + r, K + c) = -lightGram[packedIndex(M, r, c)];
        element(a, n, K + r, K + r) -= lambda;
    }

    vvsqrtf(s.get(), samples.w.get() + p, &K);
    for (int j = 0; j < M; ++j)
        vDSP_vmul(samples.R.get() + size_t(j) * N + p, 1, s.get(), 1, a + size_t(K + j) * n, 1, vDSP_Length(K));
    for (int c = 0; c < 3; ++c)
        vDSP_vmul(samples.T.get() + size_t(c) * N + p, 1, s.get(), 1, b + size_t(c) * n, 1, vDSP_Length(K));

    weightedCrossProduct(p, M, samples.T.get(), N, samples.w.get(), samples.R.get(), N, H);
    for (int j = 0; j < M; ++j)
        for (int c = 0; c < 3; ++c)
            b[size_t(c) * n + K + j] = -H[4 * j + c];

    if (!solveSymmetricIndefinite(n, a, pivots.get(), b)) {
        markFailed(M, H);
        return;
    }
    for (int j = 0; j < M; ++j)
        for (int c = 0; c < 3; ++c)
            H[4 * j + c] = b[size_t(c) * n + K + j];
}

} // namespace

extern "C" void hybridSolveWithRegularization(int N, int M, const float* T, const float* w, const float* R, float* H,
                                              float lambda)
{
    if (!argumentsUsable(N, M)) {
        markFailed(M, H);
        return;
    }
    if (lambda == 0.0f) {
        hybridSolve(N, M, T, w, R, H);
        return;
    }
    float largest = 0.0f;
    vDSP_maxv(w, 1, &largest, vDSP_Length(N));
    if (largest < kHeavyWeight) {
        specialSolveWithRegularization(N, M, T, w, R, H, lambda);
        return;
    }
    augmentedSolve(N, M, T, w, R, H, lambda);
}

extern "C" void specialSolveWithRegularization(int N, int M, const float* T, const float* w, const float* R,
                                               float* H, float lambda)
{
    if (!argumentsUsable(N, M)) {
        markFailed(M, H);
        return;
    }
    PackedScratch U;
    formNormalEquations(N, M, T, w, R, H, U);
    for (int a = 0; a < M; ++a)
        U[packedIndex(M, a, a)] += lambda;
    choleskyPacked(M, U);
    solveWithFactor(M, H, U);
}

extern "C" void generalSolveWithRegularization(int N, int M, const float* T, const float* w, const float* R,
                                               float* H, float lambda)
{
    if (!argumentsUsable(N, M)) {
        markFailed(M, H);
        return;
    }
    if (lambda == 0.0f) {
        generalSolve(N, M, T, w, R, H);
        return;
    }
    int n = N + M;
    auto pivots = allocateArray<int>(n);
    auto A = allocateArray<float>(size_t(n) * n, true);
    auto B = allocateArray<float>(size_t(n) * 3, true);
    auto s = allocateArray<float>(N);
    if (!pivots || !A || !B || !s) {
        markFailed(M, H);
        return;
    }
    float* a = A.get();
    float* b = B.get();
    for (int k = 0; k < N; ++k)
        element(a, n, k, k) = 1.0f;
    for (int j = 0; j < M; ++j)
        element(a, n, N + j, N + j) = -lambda;
    vvsqrtf(s.get(), w, &N);
    for (int j = 0; j < M; ++j)
        vDSP_vmul(R + size_t(j) * N, 1, s.get(), 1, a + size_t(N + j) * n, 1, vDSP_Length(N));
    for (int c = 0; c < 3; ++c)
        vDSP_vmul(T + size_t(c) * N, 1, s.get(), 1, b + size_t(c) * n, 1, vDSP_Length(N));

    if (!solveSymmetricIndefinite(n, a, pivots.get(), b)) {
        markFailed(M, H);
        return;
    }
    for (int j = 0; j < M; ++j)
        for (int c = 0; c < 3; ++c)
            H[4 * j + c] = b[size_t(c) * n + N + j];
}
