// The solver family behind the colour fit, and the numerical kernels it shares.
//
// Every solver finds the M x 3 matrix H that minimises
//     sum_i w_i |t_i - H^T r_i|^2 + lambda |H|^2
// over N samples, i.e. solves (R W R^T + lambda I) H = R W T^T. The six
// solvers take one parameter list:
//   N  number of samples
//   M  number of channels (1 ... kSolverMaxChannels; the sensors have 4 or 5)
//   T  3 x N targets, component-major: X of sample i at i, Y at N + i, Z at 2N + i
//   w  N non-negative sample weights
//   R  M x N channel responses, channel-major: channel j of sample i at j*N + i
//   H  result, M rows of four floats: H[4j + c] is the coefficient of channel j
//      for component c (0 = X, 1 = Y, 2 = Z); H[4j + 3] is never a result
// The inputs are only read; whatever is reordered or scaled is a private copy.
//
// A failed solve - a Cholesky factor that breaks down on a path without the
// QR fallback, a singular augmented system, a failed allocation, or arguments
// outside the limits above - leaves a quiet NaN in all 4*M elements of H
// (nothing is written when M < 1). A caller tells success from failure by
// checking that the coefficients are finite.
//
// Fewer samples than channels, and no samples at all, are solved as the same
// least-squares problem padded with zero rows: the QR solver then returns the
// minimum-norm solution (all zeros when nothing is known).
#pragma once

// Stack scratch of the solvers and the QR kernel is sized for this many channels.
constexpr int kSolverMaxChannels = 16;

extern "C" {

// Unregularised solvers.
// Normal equations by Cholesky; falls back to generalSolve when the factor is
// ill-conditioned (last pivot below 1/16 of the first) or breaks down.
void hybridSolve(int N, int M, const float* T, const float* w, const float* R, float* H);
// Normal equations by Cholesky, without the conditioning test.
void specialSolve(int N, int M, const float* T, const float* w, const float* R, float* H);
// Pivoted QR on the sqrt(w)-scaled data; handles rank deficiency.
void generalSolve(int N, int M, const float* T, const float* w, const float* R, float* H);

// Regularised solvers; lambda == 0 gives the unregularised solution.
// The dispatcher: unregularised for lambda == 0, regularised normal equations
// when every weight is below 100, else the augmented system in which only the
// heavy samples (weight 100 or more) become unknowns.
void hybridSolveWithRegularization(int N, int M, const float* T, const float* w, const float* R, float* H,
                                   float lambda);
// Regularised normal equations by Cholesky.
void specialSolveWithRegularization(int N, int M, const float* T, const float* w, const float* R, float* H,
                                    float lambda);
// Augmented symmetric indefinite system with every sample as an unknown.
void generalSolveWithRegularization(int N, int M, const float* T, const float* w, const float* R, float* H,
                                    float lambda);

// Kernels.
// Packed symmetric storage: the upper triangle row by row, (a, b) with a <= b
// at a*M - a*(a-1)/2 + (b - a).
//
// C[4j + c] = sum over i < count of (w_i * R[j*ldR + i]) * T[c*ldT + i], for
// j < M and c < 3; C[4j + 3] is not written. Summed in single precision over
// eight lanes (i mod 8), folded to four, two and one lane as the blocks shrink.
void weightedCrossProduct(int count, int M, const float* T, int ldT, const float* w, const float* R, int ldR, float* C);
// Packed G(a, b) = sum over i < count of (w_i * R[a*ldR + i]) * R[b*ldR + i],
// summed like weightedCrossProduct.
void weightedGramPacked(int count, int M, const float* R, int ldR, const float* w, float* G);
// In place G = U^T U (U upper triangular, packed), any M >= 1. No pivot test:
// a breakdown shows as a zero, negative-rooted (NaN) or infinite diagonal.
void choleskyPacked(int M, float* G);
// Solves U^T Z = Y in place for the four lanes of the M x 4 block Y.
void forwardSubstitutePacked(int M, float* Y, const float* U);
// Solves U X = Y in place for the four lanes of the M x 4 block Y.
void backSubstitutePacked(int M, float* Y, const float* U);
// Least-squares solution of A X ~ B by Householder QR with column pivoting; the
// minimum-norm solution when A is rank deficient. A is m x n column-major, B is
// m x 3 column-major, X receives n rows of four floats (X[4q + c]). A and B are
// overwritten. Needs m >= n and 1 <= n <= kSolverMaxChannels; otherwise X is
// marked failed.
void pivotedQRLeastSquares(int m, int n, float* A, float* B, float* X);

} // extern "C"
