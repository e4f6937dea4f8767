// Random weighted least-squares problems in the solver family's layout, and
// independent double-precision answers for them.
#pragma once

#include "colour/Solvers.h"

#include <Eigen/Dense>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <random>
#include <vector>

namespace colourtest {

struct Problem {
    int N = 0;
    int M = 0;
    std::vector<float> T; // 3 x N, component-major
    std::vector<float> w; // N
    std::vector<float> R; // M x N, channel-major
};

enum class Weights { Light, OneHeavy, AllHeavy };

// Responses uniform in [-1, 1] (a well-conditioned Gram matrix), targets a
// fixed linear map of them plus noise, weights by kind: light ones in
// [0.5, 2), heavy ones in [100, 400].
inline Problem randomProblem(int N, int M, unsigned seed, Weights kind = Weights::Light)
{
    std::mt19937 rng(seed);
    std::uniform_real_distribution<float> unit(-1.0f, 1.0f);
    std::uniform_real_distribution<float> light(0.5f, 2.0f);
    std::uniform_real_distribution<float> heavy(100.0f, 400.0f);
    Problem p;
    p.N = N;
    p.M = M;
    p.R.resize(size_t(M) * N);
    p.T.resize(size_t(3) * N);
    p.w.resize(N);
    for (auto& r : p.R)
        r = unit(rng);
    for (int i = 0; i < N; ++i) {
        for (int c = 0; c < 3; ++c) {
            float t = 0.1f * unit(rng);
            for (int j = 0; j < M; ++j)
                t += float(c + 1 + j) * p.R[size_t(j) * N + i];
            p.T[size_t(c) * N + i] = t;
        }
        p.w[i] = kind == Weights::AllHeavy ? heavy(rng) : light(rng);
    }
    if (kind == Weights::OneHeavy && N > 0)
        p.w[N / 2] = 500.0f;
    return p;
}

// Independent double-precision answers (Eigen). They are compiled once, in
// SolverReference.cpp: Eigen's decompositions take most of the build time of
// the colour tests when every test file instantiates them.

// The problem in double precision: R (M x N), T^T (N x 3) and w (N).
Eigen::MatrixXd responses(const Problem& p);
Eigen::MatrixXd targets(const Problem& p);
Eigen::VectorXd weights(const Problem& p);

// (R W R^T + lambda I)^-1 R W T^T, M x 3.
Eigen::MatrixXd closedForm(const Problem& p, double lambda);

// The same by a QR factorisation of the stacked system [sqrt(W) R^T; sqrt(lambda) I],
// which stays accurate where the normal equations lose digits (weights spanning
// many orders of magnitude, nearly parallel samples).
Eigen::MatrixXd closedFormQR(const Problem& p, double lambda);

// The minimum-norm weighted least-squares solution, M x 3, for any rank.
Eigen::MatrixXd minimumNorm(const Problem& p);

// A solver's result rows (M x 4 floats) as an M x 3 matrix.
Eigen::MatrixXd coefficients(const std::vector<float>& H, int M);

// Largest element difference relative to the largest element of the reference.
double relativeError(const Eigen::MatrixXd& got, const Eigen::MatrixXd& want);

using Unregularised = void (*)(int, int, const float*, const float*, const float*, float*);
using Regularised = void (*)(int, int, const float*, const float*, const float*, float*, float);

// What a result element holds when the solver did not write it.
constexpr float kUnset = -12345.0f;

// Runs one solver and checks that it left the caller's arrays alone.
template <typename Call>
std::vector<float> runChecked(const Problem& p, Call call)
{
    Problem before = p;
    std::vector<float> H(size_t(4) * std::max(p.M, 0), kUnset);
    call(H.data());
    EXPECT_EQ(p.T, before.T);
    EXPECT_EQ(p.w, before.w);
    EXPECT_EQ(p.R, before.R);
    return H;
}

inline std::vector<float> run(Regularised solver, const Problem& p, float lambda)
{
    return runChecked(p, [&](float* H) { solver(p.N, p.M, p.T.data(), p.w.data(), p.R.data(), H, lambda); });
}

inline std::vector<float> run(Unregularised solver, const Problem& p)
{
    return runChecked(p, [&](float* H) { solver(p.N, p.M, p.T.data(), p.w.data(), p.R.data(), H); });
}

inline bool allNaN(const std::vector<float>& H)
{
    return std::all_of(H.begin(), H.end(), [](float v) { return std::isnan(v); });
}

} // namespace colourtest
