#include "SolverReference.h"

namespace colourtest {

using RowMajor = Eigen::Matrix<float, Eigen::Dynamic, Eigen::Dynamic, Eigen::RowMajor>;

Eigen::MatrixXd responses(const Problem& p) { return Eigen::Map<const RowMajor>(p.R.data(), p.M, p.N).cast<double>(); }

Eigen::MatrixXd targets(const Problem& p)
{
    return Eigen::Map<const RowMajor>(p.T.data(), 3, p.N).transpose().cast<double>();
}

Eigen::VectorXd weights(const Problem& p) { return Eigen::Map<const Eigen::VectorXf>(p.w.data(), p.N).cast<double>(); }

// (R W R^T + lambda I)^-1 R W T^T, M x 3.
Eigen::MatrixXd closedForm(const Problem& p, double lambda)
{
    Eigen::MatrixXd R = responses(p);
    Eigen::MatrixXd RW = R * weights(p).asDiagonal();
    Eigen::MatrixXd G = RW * R.transpose() + lambda * Eigen::MatrixXd::Identity(p.M, p.M);
    return G.ldlt().solve(RW * targets(p));
}

// The same by a QR factorisation of the stacked system [sqrt(W) R^T; sqrt(lambda) I],
// which stays accurate where the normal equations lose digits (weights spanning
// many orders of magnitude, nearly parallel samples).
Eigen::MatrixXd closedFormQR(const Problem& p, double lambda)
{
    Eigen::VectorXd s = weights(p).cwiseSqrt();
    Eigen::MatrixXd A(p.N + p.M, p.M), B(p.N + p.M, 3);
    A.topRows(p.N) = s.asDiagonal() * responses(p).transpose();
    A.bottomRows(p.M) = std::sqrt(lambda) * Eigen::MatrixXd::Identity(p.M, p.M);
    B.topRows(p.N) = s.asDiagonal() * targets(p);
    B.bottomRows(p.M).setZero();
    return A.colPivHouseholderQr().solve(B);
}

// The minimum-norm weighted least-squares solution, M x 3, for any rank.
Eigen::MatrixXd minimumNorm(const Problem& p)
{
    Eigen::VectorXd s = weights(p).cwiseSqrt();
    Eigen::MatrixXd A = s.asDiagonal() * responses(p).transpose();
    Eigen::MatrixXd B = s.asDiagonal() * targets(p);
    return A.completeOrthogonalDecomposition().solve(B);
}

// A solver's result rows (M x 4 floats) as an M x 3 matrix.
Eigen::MatrixXd coefficients(const std::vector<float>& H, int M)
{
    return Eigen::Map<const RowMajor>(H.data(), M, 4).leftCols(3).cast<double>();
}

// Largest element difference relative to the largest element of the reference.
double relativeError(const Eigen::MatrixXd& got, const Eigen::MatrixXd& want)
{
    double scale = std::max(want.cwiseAbs().maxCoeff(), 1e-30);
    return (got - want).cwiseAbs().maxCoeff() / scale;
}

} // namespace colourtest
