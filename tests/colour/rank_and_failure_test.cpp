// Rank-deficient problems through the QR solver, problems with too few
// samples, and the failures that the family reports as NaN.
#include "SolverReference.h"
#include "colour/Solvers.h"

#include <gtest/gtest.h>

#include <cmath>

using namespace colourtest;

namespace {

void zeroChannel(Problem& p, int j) { std::fill_n(p.R.begin() + size_t(j) * p.N, p.N, 0.0f); }

Problem withoutChannels(const Problem& p, std::vector<int> dropped)
{
    Problem q = p;
    std::sort(dropped.rbegin(), dropped.rend());
    for (int j : dropped)
        q.R.erase(q.R.begin() + size_t(j) * p.N, q.R.begin() + size_t(j + 1) * p.N);
    q.M = p.M - int(dropped.size());
    return q;
}

// R W R^T H = R W T^T to single-precision residue.
void expectNormalEquations(const Problem& p, const std::vector<float>& H)
{
    Eigen::MatrixXd R = responses(p);
    Eigen::MatrixXd RW = R * weights(p).asDiagonal();
    Eigen::MatrixXd residue = RW * R.transpose() * coefficients(H, p.M) - RW * targets(p);
    EXPECT_LT(residue.cwiseAbs().maxCoeff() / (RW * targets(p)).cwiseAbs().maxCoeff(), 1e-5);
}

} // namespace

TEST(RankDeficient, EmptyChannelsGetZeroAndTheRestTheirOwnFit)
{
    struct Case {
        int M;
        std::vector<int> empty;
    };
    for (const Case& c : {Case{4, {2}}, Case{5, {1, 3}}}) {
        Problem p = randomProblem(100, c.M, 40u + c.M);
        for (int j : c.empty)
            zeroChannel(p, j);
        Problem reduced = withoutChannels(p, c.empty);
        Eigen::MatrixXd want = closedForm(reduced, 0.0);
        // hybridSolve finds the factor broken and falls back to QR.
        for (auto solver : {hybridSolve, generalSolve}) {
            std::vector<float> H = run(solver, p);
            int row = 0;
            for (int j = 0; j < c.M; ++j) {
                bool isEmpty = std::find(c.empty.begin(), c.empty.end(), j) != c.empty.end();
                for (int k = 0; k < 3; ++k) {
                    if (isEmpty)
                        EXPECT_EQ(H[4 * j + k], 0.0f) << "channel " << j;
                    else
                        EXPECT_NEAR(H[4 * j + k], want(row, k), 2e-5 * want.cwiseAbs().maxCoeff()) << "channel " << j;
                }
                row += isEmpty ? 0 : 1;
            }
            expectNormalEquations(p, H);
        }
    }
}

TEST(RankDeficient, DependentChannelsGiveTheMinimumNormSolution)
{
    Problem p = randomProblem(150, 5, 51u);
    // Channel 4 = channel 0 + channel 1, channel 3 = 2 * channel 2: rank 3.
    // Responses on a 1/1024 grid keep the sums exact, so the reference sees
    // the same rank.
    for (float& r : p.R)
        r = std::round(r * 1024.0f) / 1024.0f;
    for (int i = 0; i < p.N; ++i) {
        p.R[4 * p.N + i] = p.R[i] + p.R[p.N + i];
        p.R[3 * p.N + i] = 2.0f * p.R[2 * p.N + i];
    }
    Eigen::MatrixXd want = minimumNorm(p);
    for (auto solver : {hybridSolve, generalSolve}) {
        std::vector<float> H = run(solver, p);
        EXPECT_LT(relativeError(coefficients(H, 5), want), 1e-4);
        expectNormalEquations(p, H);
    }
}

TEST(RankDeficient, FewerSamplesThanChannelsStaysInsideTheQRSolver)
{
    Problem p = randomProblem(3, 5, 60u);
    Eigen::MatrixXd want = minimumNorm(p);
    for (auto solver : {hybridSolve, generalSolve})
        EXPECT_LT(relativeError(coefficients(run(solver, p), 5), want), 1e-4);
    // No samples: nothing is known and the minimum-norm answer is zero.
    Problem empty = randomProblem(0, 4, 61u);
    for (auto solver : {hybridSolve, generalSolve})
        EXPECT_EQ(coefficients(run(solver, empty), 4), Eigen::MatrixXd::Zero(4, 3));
    // The regularised fit of no samples is zero as well.
    EXPECT_EQ(coefficients(run(hybridSolveWithRegularization, empty, 1.0f), 4), Eigen::MatrixXd::Zero(4, 3));
}

TEST(PivotedQR, EqualNormsPivotOnTheLowestPosition)
{
    // Columns (3, 4, 0) and (0, 3, 4) both have norm 5. Pivoting on column 0
    // first leaves its entries below row 0 as they are; pivoting on column 1
    // would reflect column 0 and fill in its last row.
    auto factor = [](float scale1) {
        std::vector<float> A = {3, 4, 0, 0, 3 * scale1, 4 * scale1};
        std::vector<float> B(9, 1.0f);
        std::vector<float> X(8);
        pivotedQRLeastSquares(3, 2, A.data(), B.data(), X.data());
        return A;
    };
    std::vector<float> tie = factor(1.0f);
    EXPECT_EQ(tie[1], 4.0f);
    EXPECT_EQ(tie[2], 0.0f);
    // A strictly larger second column is taken first, and column 0 changes.
    std::vector<float> larger = factor(1.001f);
    EXPECT_NE(larger[2], 0.0f);
}

TEST(PivotedQR, OutsideItsLimitsTheResultIsMarkedFailed)
{
    std::vector<float> A(8, 1.0f), B(6, 1.0f), X(16, 0.0f);
    pivotedQRLeastSquares(2, 4, A.data(), B.data(), X.data()); // fewer rows than columns
    EXPECT_TRUE(allNaN(X));
}

TEST(FailedSolve, SingularAugmentedSystemIsNaN)
{
    // Four heavy samples on the unit vectors with weight 256 and lambda -256:
    // R W R^T + lambda I is zero, and in powers of two the factorisation
    // meets an exactly zero pivot.
    Problem p;
    p.N = 4;
    p.M = 4;
    p.R.assign(16, 0.0f);
    for (int i = 0; i < 4; ++i)
        p.R[size_t(i) * 4 + i] = 1.0f;
    p.T.assign(12, 1.0f);
    p.w.assign(4, 256.0f);
    EXPECT_TRUE(allNaN(run(hybridSolveWithRegularization, p, -256.0f)));
    EXPECT_TRUE(allNaN(run(generalSolveWithRegularization, p, -256.0f)));
    // The same data with light weights goes through Cholesky, which breaks down.
    p.w.assign(4, 1.0f);
    EXPECT_TRUE(allNaN(run(hybridSolveWithRegularization, p, -1.0f)));
}

TEST(FailedSolve, CholeskyWithoutFallbackReportsABreakdown)
{
    Problem p = randomProblem(100, 4, 70u);
    zeroChannel(p, 1);
    EXPECT_TRUE(allNaN(run(specialSolve, p)));
    // A ridge makes the same problem solvable again.
    std::vector<float> H = run(specialSolveWithRegularization, p, 1.0f);
    EXPECT_TRUE(std::all_of(H.begin(), H.end(), [](float v) { return std::isfinite(v); }));
    EXPECT_LT(relativeError(coefficients(H, 4), closedForm(p, 1.0)), 2e-5);
}

TEST(FailedSolve, ArgumentsOutsideTheLimits)
{
    Problem p = randomProblem(10, 4, 80u);
    std::vector<float> H(16, 1.0f);
    for (auto solver : {hybridSolve, specialSolve, generalSolve}) {
        std::fill(H.begin(), H.end(), 1.0f);
        solver(-1, 4, p.T.data(), p.w.data(), p.R.data(), H.data());
        EXPECT_TRUE(allNaN(H));
    }
    // No channels: there is no result to write.
    std::fill(H.begin(), H.end(), 1.0f);
    hybridSolveWithRegularization(10, 0, p.T.data(), p.w.data(), p.R.data(), H.data(), 1.0f);
    EXPECT_EQ(H[0], 1.0f);
}
