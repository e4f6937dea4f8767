// The solver family against an independent double-precision reference: every
// member and every dispatch path on well-conditioned problems, any channel
// count, and the kernels' own contracts.
#include "SolverReference.h"
#include "colour/SolverSupport.h"
#include "colour/Solvers.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <random>

using namespace colourtest;

namespace {

bool sameBits(const std::vector<float>& a, const std::vector<float>& b)
{
    return a.size() == b.size() && std::memcmp(a.data(), b.data(), a.size() * sizeof(float)) == 0;
}

// Single-precision agreement for these well-conditioned problems.
constexpr double kTolerance = 2e-5;

} // namespace

TEST(SolverFamily, UnregularisedMembersMatchTheClosedForm)
{
    for (int M : {4, 5}) {
        for (unsigned seed : {1u, 2u, 3u}) {
            Problem p = randomProblem(100, M, seed);
            Eigen::MatrixXd want = closedForm(p, 0.0);
            for (Unregularised solver : {hybridSolve, specialSolve, generalSolve})
                EXPECT_LT(relativeError(coefficients(run(solver, p), M), want), kTolerance) << "M=" << M;
            for (Regularised solver :
                 {hybridSolveWithRegularization, specialSolveWithRegularization, generalSolveWithRegularization})
                EXPECT_LT(relativeError(coefficients(run(solver, p, 0.0f), M), want), kTolerance) << "M=" << M;
        }
    }
}

TEST(SolverFamily, RegularisedMembersMatchTheClosedForm)
{
    for (int M : {4, 5}) {
        for (Weights kind : {Weights::Light, Weights::OneHeavy, Weights::AllHeavy}) {
            Problem p = randomProblem(100, M, 7u + M, kind);
            // A ridge that matters against the Gram matrix of each weight kind.
            float lambda = kind == Weights::AllHeavy ? 2000.0f : 20.0f;
            Eigen::MatrixXd want = closedForm(p, lambda);
            ASSERT_GT(relativeError(closedForm(p, 0.0), want), 1e-3);
            for (Regularised solver :
                 {hybridSolveWithRegularization, specialSolveWithRegularization, generalSolveWithRegularization})
                EXPECT_LT(relativeError(coefficients(run(solver, p, lambda), M), want), kTolerance)
                    << "M=" << M << " kind=" << int(kind);
        }
    }
}

TEST(SolverDispatch, PicksThePathByLambdaAndTheLargestWeight)
{
    Problem light = randomProblem(120, 5, 11u);
    // Zero of either sign is the unregularised fit.
    EXPECT_TRUE(sameBits(run(hybridSolveWithRegularization, light, 0.0f), run(hybridSolve, light)));
    EXPECT_TRUE(sameBits(run(hybridSolveWithRegularization, light, -0.0f), run(hybridSolve, light)));
    // Every weight below 100: the regularised normal equations.
    light.w[3] = 99.99f;
    EXPECT_TRUE(
        sameBits(run(hybridSolveWithRegularization, light, 3.0f), run(specialSolveWithRegularization, light, 3.0f)));
    // A weight of exactly 100 is heavy: the augmented system of order M + 1,
    // which agrees with the closed form but not bit for bit with the normal equations.
    light.w[3] = 100.0f;
    std::vector<float> augmented = run(hybridSolveWithRegularization, light, 3.0f);
    EXPECT_LT(relativeError(coefficients(augmented, 5), closedForm(light, 3.0)), kTolerance);
    EXPECT_FALSE(sameBits(augmented, run(specialSolveWithRegularization, light, 3.0f)));
    // All heavy: the same system as the all-samples augmented member.
    Problem heavy = randomProblem(120, 5, 12u, Weights::AllHeavy);
    EXPECT_LT(relativeError(coefficients(run(hybridSolveWithRegularization, heavy, 500.0f), 5),
                            coefficients(run(generalSolveWithRegularization, heavy, 500.0f), 5)),
              kTolerance);
}

// Weights 1 to 10^12, log-uniform: most samples heavy, some extremely so.
Problem wideWeights(int N, int M, unsigned seed)
{
    Problem p = randomProblem(N, M, seed);
    std::mt19937 rng(seed + 100);
    std::uniform_real_distribution<double> exponent(0.0, 12.0);
    for (float& w : p.w)
        w = float(std::pow(10.0, exponent(rng)));
    return p;
}

TEST(HeavySamples, TheLinearPathAgreesWithTheClosedForm)
{
    struct Case {
        const char* name;
        Problem p;
        float lambda;
    };
    Problem one = randomProblem(150, 5, 21u, Weights::OneHeavy); // K = 1
    Problem all = randomProblem(150, 4, 22u, Weights::AllHeavy); // K = N
    // Light samples that cannot tell channels 3 and 4 apart (a rank-deficient
    // light block); a few heavy ones that can.
    Problem deficient = randomProblem(150, 5, 23u);
    for (int i = 0; i < deficient.N; ++i)
        deficient.R[size_t(4) * deficient.N + i] = deficient.R[size_t(3) * deficient.N + i];
    for (int i : {10, 70, 140})
        deficient.w[i] = 1e6f, deficient.R[size_t(4) * deficient.N + i] = 0.5f;
    // Light samples with one channel always zero and no heavy sample seeing it.
    Problem blind = randomProblem(150, 4, 24u, Weights::OneHeavy);
    for (int i = 0; i < blind.N; ++i)
        blind.R[size_t(2) * blind.N + i] = 0.0f;
    for (const Case& c :
         {Case{"one heavy", one, 0.5f}, Case{"all heavy", all, 2000.0f},
          Case{"wide weights", wideWeights(400, 5, 25u), 0.01f},
          Case{"wide weights, strong ridge", wideWeights(400, 4, 26u), 1e4f},
          Case{"rank-deficient light block", deficient, 0.01f},
          Case{"twelve channels", wideWeights(300, 12, 27u), 0.5f}, Case{"a channel nobody sees", blind, 0.01f}}) {
        EXPECT_LT(relativeError(coefficients(run(hybridSolveWithRegularization, c.p, c.lambda), c.p.M),
                                closedForm(c.p, c.lambda)),
                  kTolerance)
            << c.name;
    }
}

// What a client's lambda meets in the plug-in: samples of a few light
// families pointing in nearly the same direction, weighted by their similarity
// to a measurement (up to 10^10), so nearly every sample is heavy and the few
// light ones leave their Gram matrix close to singular.
TEST(HeavySamples, SimilarityWeightsOnNearlyParallelSamples)
{
    for (int M : {4, 5}) {
        Problem p = randomProblem(425, M, 41u + unsigned(M));
        std::mt19937 rng(51u + unsigned(M));
        std::uniform_real_distribution<float> spread(-0.03f, 0.03f);
        std::vector<double> x(static_cast<size_t>(M));
        for (int j = 0; j < M; ++j)
            x[size_t(j)] = 1.0 + 0.4 * j;
        for (int i = 0; i < p.N; ++i)
            for (int j = 0; j < M; ++j)
                p.R[size_t(j) * p.N + i] = float(x[size_t(j)] * (1.0 + spread(rng) * (1 + i % 3)));
        for (int i = 0; i < p.N; ++i) {
            double dot = 0, rr = 0, xx = 0;
            for (int j = 0; j < M; ++j) {
                const double r = p.R[size_t(j) * p.N + i];
                dot += r * x[size_t(j)], rr += r * r, xx += x[size_t(j)] * x[size_t(j)];
            }
            const double d = 1.0 - dot / std::sqrt(rr * xx) + 0.00001;
            p.w[size_t(i)] = float(1.0 / (d * d));
        }
        EXPECT_LT(relativeError(coefficients(run(hybridSolveWithRegularization, p, 0.01f), M), closedFormQR(p, 0.01)),
                  kTolerance)
            << "M=" << M;
    }
}

TEST(HeavySamples, NegativeOrNonFiniteInputsKeepTheAugmentedSystem)
{
    // Called directly: a NaN weight is not equal to itself, so the usual
    // check that the arrays are unchanged cannot be used here.
    auto solve = [](Regularised solver, const Problem& p, float lambda) {
        std::vector<float> H(size_t(4) * p.M, kUnset);
        solver(p.N, p.M, p.T.data(), p.w.data(), p.R.data(), H.data(), lambda);
        return H;
    };
    auto augmented = [](int N, int M, const float* T, const float* w, const float* R, float* H, float lambda) {
        solver::augmentedSolve(N, M, T, w, R, H, lambda);
    };
    Problem p = randomProblem(120, 5, 31u, Weights::OneHeavy);
    EXPECT_TRUE(sameBits(solve(hybridSolveWithRegularization, p, -0.5f), solve(augmented, p, -0.5f)));
    EXPECT_TRUE(sameBits(solve(hybridSolveWithRegularization, p, INFINITY), solve(augmented, p, INFINITY)));
    p.w[7] = NAN;
    EXPECT_TRUE(sameBits(solve(hybridSolveWithRegularization, p, 0.5f), solve(augmented, p, 0.5f)));
    p.w[7] = INFINITY;
    EXPECT_TRUE(sameBits(solve(hybridSolveWithRegularization, p, 0.5f), solve(augmented, p, 0.5f)));
    // A finite positive lambda takes the linear path: not the same bits.
    p.w[7] = 1.0f;
    EXPECT_FALSE(sameBits(solve(hybridSolveWithRegularization, p, 0.5f), solve(augmented, p, 0.5f)));
}

TEST(SolverFamily, AnyChannelCountUpToTheLimit)
{
    for (int M : {1, 2, 3, 6, 8, kSolverMaxChannels}) {
        Problem p = randomProblem(200, M, 20u + M);
        EXPECT_LT(relativeError(coefficients(run(hybridSolve, p), M), closedForm(p, 0.0)), 5e-5) << M;
        EXPECT_LT(relativeError(coefficients(run(specialSolveWithRegularization, p, 5.0f), M), closedForm(p, 5.0)),
                  5e-5)
            << M;
    }
    Problem tooMany = randomProblem(200, kSolverMaxChannels + 1, 3u);
    EXPECT_TRUE(allNaN(run(hybridSolve, tooMany)));
    EXPECT_TRUE(allNaN(run(hybridSolveWithRegularization, tooMany, 1.0f)));
}

TEST(PackedCholesky, FactorsAnySizeLikeTheReference)
{
    for (int M : {1, 3, 4, 5, 6}) {
        Eigen::MatrixXd A = Eigen::MatrixXd::Random(M, M + 3);
        Eigen::MatrixXd G = A * A.transpose() + Eigen::MatrixXd::Identity(M, M);
        std::vector<float> packed;
        for (int a = 0; a < M; ++a)
            for (int b = a; b < M; ++b)
                packed.push_back(float(G(a, b)));
        choleskyPacked(M, packed.data());
        Eigen::MatrixXd U = G.llt().matrixU();
        size_t k = 0;
        for (int a = 0; a < M; ++a)
            for (int b = a; b < M; ++b, ++k)
                EXPECT_NEAR(packed[k], U(a, b), 1e-5 * U.cwiseAbs().maxCoeff()) << M << " " << a << "," << b;
        // The substitutions invert G on every lane.
        std::vector<float> Y(size_t(4) * M);
        for (size_t i = 0; i < Y.size(); ++i)
            Y[i] = float(i % 7) - 3.0f;
        std::vector<float> X = Y;
        forwardSubstitutePacked(M, X.data(), packed.data());
        backSubstitutePacked(M, X.data(), packed.data());
        for (int l = 0; l < 4; ++l)
            for (int a = 0; a < M; ++a) {
                double sum = 0;
                for (int b = 0; b < M; ++b)
                    sum += G(a, b) * X[4 * b + l];
                EXPECT_NEAR(sum, Y[4 * a + l], 1e-4) << M;
            }
    }
}

TEST(WeightedSums, LanesFoldInTheFixedOrder)
{
    // Sixteen terms: lanes 0 and 8 cancel before the tiny lane-1 term meets
    // them, which a running sum would have lost.
    std::vector<float> terms(16, 0.0f), ones(16, 1.0f);
    terms[0] = 1e8f;
    terms[8] = -1e8f;
    terms[1] = 1.0f;
    std::vector<float> rows(ones);
    rows.insert(rows.end(), terms.begin(), terms.end());
    float G[3];
    weightedGramPacked(16, 2, rows.data(), 16, ones.data(), G);
    EXPECT_EQ(G[1], 1.0f);
    float C[4] = {kUnset, kUnset, kUnset, kUnset};
    weightedCrossProduct(16, 1, terms.data(), 0, ones.data(), ones.data(), 16, C);
    EXPECT_EQ(C[0], 1.0f);
    EXPECT_EQ(C[3], kUnset);
    // Twelve terms: the eight lanes are folded to four before the block of
    // four is added, so lane 4's 1 is absorbed by 1e8 first.
    std::vector<float> twelve(12, 0.0f);
    twelve[0] = 1e8f;
    twelve[4] = 1.0f;
    twelve[8] = -1e8f;
    weightedCrossProduct(12, 1, twelve.data(), 0, ones.data(), ones.data(), 12, C);
    EXPECT_EQ(C[0], 0.0f);
    // Seven terms: a block of four is folded to two lanes (1e8 and -1e8
    // cancel) before the pair adds its 1.
    const std::vector<float> seven = {1e8f, 0.0f, -1e8f, 0.0f, 1.0f, 0.0f, 0.0f};
    weightedCrossProduct(7, 1, seven.data(), 0, ones.data(), ones.data(), 7, C);
    EXPECT_EQ(C[0], 1.0f);
    // Three terms: the pair's lanes are added (absorbing the 1) before the
    // last sample comes in.
    const std::vector<float> three = {1e8f, 1.0f, -1e8f};
    weightedCrossProduct(3, 1, three.data(), 0, ones.data(), ones.data(), 3, C);
    EXPECT_EQ(C[0], 0.0f);
}
