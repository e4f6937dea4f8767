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
//
// With a positive, finite lambda and finite weights the dispatcher solves the
// same least-squares problem in time linear in N instead (stackedSolve): the
// light samples enter through a Cholesky factor U of G_l + l I, and the heavy
// samples are then folded into that triangle by Householder reflections as
// rows sqrt(w) r^T, so their weights enter only through their square roots, as
// in the augmented system. The light sums, the triangle and the reflections
// are kept in double precision: with weights up to 1e10 nearly every sample is
// heavy, the light Gram matrix is close to singular, and the augmented system
// in single precision misses the closed form by as much as 0.3 in chromaticity
// on the sample units, where this path agrees with it to 1e-7.
// Everything else (a negative or non-finite lambda, a non-finite weight, a
// factor that breaks down) takes the augmented system.
#include "colour/SimdTargets.h"
#include "colour/SolverSupport.h"

#include <Accelerate/Accelerate.h>

#include <algorithm>
#include <cmath>
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

} // namespace

// The augmented system with the heavy samples as unknowns, light ones folded
// into the lower-right block.
void solver::augmentedSolve(int N, int M, const float* T, const float* w, const float* R, float* H, float lambda)
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

namespace {

// One reflection per column folds the heavy rows (K rows of W doubles: the
// channels, X, Y, Z, then zeros) into the triangle U (M rows of W doubles).
// A reflection for column k touches only row k of U and the heavy rows (U's
// rows below k are zero in column k). Every row is processed at its full
// width W: columns left of k are zero in the heavy rows and in row k of U, so
// they stay as they are, and column k is set afterwards. Fixed widths let the
// row loops run on vectors; each element is updated with the same operations
// in the same order whatever the vector width.
template <int W>
[[gnu::always_inline]] inline void foldHeavyRows(int M, int K, double (*U)[W], double* rows)
{
    for (int k = 0; k < M; ++k) {
        double lanes[4] = {};
        int h = 0;
        for (; h + 3 < K; h += 4)
            for (int l = 0; l < 4; ++l)
                lanes[l] += rows[size_t(h + l) * W + k] * rows[size_t(h + l) * W + k];
        for (; h < K; ++h)
            lanes[0] += rows[size_t(h) * W + k] * rows[size_t(h) * W + k];
        const double sigma = (lanes[0] + lanes[1]) + (lanes[2] + lanes[3]);
        if (sigma == 0.0)
            continue;
        const double alpha = U[k][k];
        const double norm = std::sqrt(alpha * alpha + sigma);
        const double beta = alpha <= 0.0 ? norm : -norm;
        const double tau = (beta - alpha) / beta;
        const double scale = 1.0 / (alpha - beta); // v = (1, heavy column k * scale)

        double dot[W];
        for (int j = 0; j < W; ++j)
            dot[j] = U[k][j];
        for (h = 0; h < K; ++h) {
            const double* row = rows + size_t(h) * W;
            const double v = row[k] * scale;
            for (int j = 0; j < W; ++j)
                dot[j] += v * row[j];
        }
        for (int j = 0; j < W; ++j) {
            dot[j] *= tau;
            U[k][j] -= dot[j];
        }
        for (h = 0; h < K; ++h) {
            double* row = rows + size_t(h) * W;
            const double v = row[k] * scale;
            for (int j = 0; j < W; ++j)
                row[j] -= v * dot[j];
            row[k] = 0.0;
        }
        U[k][k] = beta;
    }
}

VANTISH_SIMD_VARIANTS(foldHeavyRows8At, foldHeavyRows<8>, void, (int M, int K, double (*U)[8], double* rows),
                      (M, K, U, rows))
VANTISH_SIMD_VARIANTS(foldHeavyRows20At, foldHeavyRows<20>, void, (int M, int K, double (*U)[20], double* rows),
                      (M, K, U, rows))

// The light samples' sums into U: G_l = sum w r r^T (upper triangle) and
// C_l = sum w r t^T (columns M .. M+2), in double precision, each over eight
// lanes (sample i in lane i mod 8) folded in a fixed order. Heavy samples
// count with weight 0. When nearly every sample is heavy, G_l is close to
// singular, and single-precision sums would be amplified by its condition
// into the directions the heavy rows leave open.
// Eight lanes as explicit vectors (the compiler does not vectorise the
// conversions on its own); arithmetic on them is lane by lane.
typedef float LightFloat8 __attribute__((vector_size(32)));
typedef int LightInt8 __attribute__((vector_size(32)));
typedef double LightDouble8 __attribute__((vector_size(64)));

// Row a of U from the light samples: U[a][b] = sum (w r_a) r_b for b >= a and
// U[a][M + c] = sum (w r_a) t_c, every sum over its own eight lanes.
template <int W>
[[gnu::always_inline]] inline void lightRow(int N, int M, int a, const float* T, const float* w, const float* R,
                                            double (*U)[W])
{
    // The second factors of row a: channels a .. M-1, then X, Y, Z.
    const float* second[W];
    int count = 0;
    for (int b = a; b < M; ++b)
        second[count++] = R + size_t(b) * N;
    for (int c = 0; c < 3; ++c)
        second[count++] = T + size_t(c) * N;
    const float* first = R + size_t(a) * N;

    LightDouble8 lanes[W] = {};
    const LightFloat8 heavy = {kHeavyWeight, kHeavyWeight, kHeavyWeight, kHeavyWeight,
                               kHeavyWeight, kHeavyWeight, kHeavyWeight, kHeavyWeight};
    int i = 0;
    for (; i + 8 <= N; i += 8) {
        LightFloat8 wv, av;
        std::memcpy(&wv, w + i, sizeof wv);
        std::memcpy(&av, first + i, sizeof av);
        // Heavy samples count with weight 0.
        const LightFloat8 weight = (LightFloat8) ((LightInt8) wv & (wv < heavy));
        const LightDouble8 wa =
            __builtin_convertvector(weight, LightDouble8) * __builtin_convertvector(av, LightDouble8);
        for (int k = 0; k < count; ++k) {
            LightFloat8 bv;
            std::memcpy(&bv, second[k] + i, sizeof bv);
            lanes[k] += wa * __builtin_convertvector(bv, LightDouble8);
        }
    }
    for (int k = 0; k < count; ++k) {
        double tail = 0.0;
        for (int j = i; j < N; ++j) {
            const float weight = w[j] < kHeavyWeight ? w[j] : 0.0f;
            tail += (double(weight) * double(first[j])) * double(second[k][j]);
        }
        const LightDouble8& l = lanes[k];
        const double sum = ((l[0] + l[4]) + (l[1] + l[5])) + ((l[2] + l[6]) + (l[3] + l[7])) + tail;
        if (k < M - a)
            U[a][a + k] = sum;
        else
            U[a][M + (k - (M - a))] = sum;
    }
}

template <int W>
[[gnu::always_inline]] inline void lightSums(int N, int M, const float* T, const float* w, const float* R,
                                             double (*U)[W])
{
    for (int a = 0; a < M; ++a)
        lightRow<W>(N, M, a, T, w, R, U);
}

VANTISH_SIMD_VARIANTS(lightSums8At, lightSums<8>, void,
                      (int N, int M, const float* T, const float* w, const float* R, double (*U)[8]),
                      (N, M, T, w, R, U))
VANTISH_SIMD_VARIANTS(lightSums20At, lightSums<20>, void,
                      (int N, int M, const float* T, const float* w, const float* R, double (*U)[20]),
                      (N, M, T, w, R, U))

// The regularised least-squares problem as an upper triangle U (M x M) with
// the right-hand side Z (M x 3), min |U H - Z|: the light samples and lambda
// through the Cholesky factor of G_l + lambda I, then the heavy samples as rows
// sqrt(w) (r^T | t^T) folded in by Householder reflections, so the cost is
// linear in the samples. Rows are W doubles wide (M + 3 columns, padded).
// False, H untouched, when the problem is not one this path takes.
template <int W>
bool stackedSolve(int N, int M, const float* T, const float* w, const float* R, float* H, float lambda)
{
    static_assert(W >= kSolverMaxChannels + 3 || W == 8);
    int K = 0;
    for (int i = 0; i < N; ++i) {
        if (!std::isfinite(w[i]))
            return false;
        K += isHeavy(w[i]) ? 1 : 0;
    }
    auto heavyRows = allocateArray<double>(size_t(std::max(K, 1)) * W, true);
    if (!heavyRows)
        return false;

    // The light samples summed into U, the heavy ones as rows sqrt(w) (r^T | t^T).
    double U[kSolverMaxChannels][W] = {};
    if constexpr (W == 8)
        lightSums8At(activeSimdLevel(), N, M, T, w, R, U);
    else
        lightSums20At(activeSimdLevel(), N, M, T, w, R, U);
    double* rows = heavyRows.get();
    for (int i = 0, h = 0; i < N; ++i) {
        if (!isHeavy(w[i]))
            continue;
        const double s = std::sqrt(double(w[i]));
        double* row = rows + size_t(h++) * W;
        for (int j = 0; j < M; ++j)
            row[j] = s * double(R[size_t(j) * N + i]);
        for (int c = 0; c < 3; ++c)
            row[M + c] = s * double(T[size_t(c) * N + i]);
    }

    // G_l + lambda I = U^T U and U^T Z = C_l, in place.
    for (int a = 0; a < M; ++a)
        U[a][a] += double(lambda);
    for (int a = 0; a < M; ++a) {
        double pivot = U[a][a];
        for (int k = 0; k < a; ++k)
            pivot -= U[k][a] * U[k][a];
        if (!(pivot > 0.0) || !std::isfinite(pivot))
            return false;
        U[a][a] = std::sqrt(pivot);
        for (int b = a + 1; b < M; ++b) {
            double value = U[a][b];
            for (int k = 0; k < a; ++k)
                value -= U[k][a] * U[k][b];
            U[a][b] = value / U[a][a];
        }
        for (int c = 0; c < 3; ++c) {
            double value = U[a][M + c];
            for (int k = 0; k < a; ++k)
                value -= U[k][a] * U[k][M + c];
            U[a][M + c] = value / U[a][a];
        }
    }
    if constexpr (W == 8)
        foldHeavyRows8At(activeSimdLevel(), M, K, U, rows);
    else
        foldHeavyRows20At(activeSimdLevel(), M, K, U, rows);

    // U H = Z.
    double X[kSolverMaxChannels][3];
    for (int a = M - 1; a >= 0; --a) {
        for (int c = 0; c < 3; ++c) {
            double value = U[a][M + c];
            for (int b = a + 1; b < M; ++b)
                value -= U[a][b] * X[b][c];
            X[a][c] = value / U[a][a];
            if (!std::isfinite(X[a][c]))
                return false;
        }
    }
    for (int a = 0; a < M; ++a)
        for (int c = 0; c < 3; ++c)
            H[4 * a + c] = float(X[a][c]);
    return true;
}

// The linear path for a positive, finite lambda; false when it does not apply.
bool stackedSolve(int N, int M, const float* T, const float* w, const float* R, float* H, float lambda)
{
    if (!(lambda > 0.0f) || !std::isfinite(lambda))
        return false;
    if (M + 3 <= 8)
        return stackedSolve<8>(N, M, T, w, R, H, lambda);
    return stackedSolve<20>(N, M, T, w, R, H, lambda);
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
    if (stackedSolve(N, M, T, w, R, H, lambda))
        return;
    augmentedSolve(N, M, T, w, R, H, lambda);
}

extern "C" void specialSolveWithRegularization(int N, int M, const float* T, const float* w, const float* R, float* H,
                                               float lambda)
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

extern "C" void generalSolveWithRegularization(int N, int M, const float* T, const float* w, const float* R, float* H,
                                               float lambda)
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
