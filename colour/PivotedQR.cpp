// Rank-revealing least squares: Householder QR with column pivoting, and for a
// rank-deficient matrix the minimum-norm solution through a complete
// orthogonal factorisation.
//
// A is m x n column-major; A(i, q) is row i of column q. The pivot order p maps
// positions to columns; v[q] holds the remaining norm of column q while it
// waits and its diagonal element R(k, k) once it has been pivoted.
#include "colour/SolverSupport.h"

#include <Accelerate/Accelerate.h>

#include <cmath>
#include <cstddef>
#include <utility>

namespace {

// Downdated norms fall back to a fresh computation once their square is at or
// below R(0,0)^2 / 64, where cancellation starts to eat their digits.
constexpr float kRecomputeFraction = 0.015625f;
// Columns whose remaining norm is below R(0,0) * 2^-22 count as dependent.
constexpr float kRankTolerance = 2.3841858e-07f;

class PivotedQR {
public:
    PivotedQR(int m, int n, float* A, float* B) : m_(m), n_(n), A_(A), B_(B)
    {
        for (int j = 0; j < n; ++j)
            p_[j] = j;
    }

    // Reduces A to [R11 R12; 0 0] and applies the same reflections to B.
    // Returns the rank.
    int factor()
    {
        for (int k = 0; k < n_; ++k) {
            int pivot = k;
            float largest = remainingNorms(k, pivot);
            // Nothing to pivot on: the whole matrix is zero.
            if (k == 0 && largest == 0.0f)
                return 0;
            if (k >= 1 && largest < std::fabs(v_[p_[0]] * kRankTolerance))
                return k;
            std::swap(p_[k], p_[pivot]);
            reflect(k, largest);
        }
        return n_;
    }

    void solveFullRank(float* X)
    {
        for (int c = 0; c < 3; ++c) {
            float* b = column(B_, c);
            for (int i = n_ - 1; i >= 0; --i) {
                b[i] /= v_[p_[i]];
                for (int l = i - 1; l >= 0; --l)
                    b[l] -= b[i] * at(l, p_[i]);
            }
            for (int i = 0; i < n_; ++i)
                X[4 * p_[i] + c] = b[i];
        }
    }

    void solveMinimumNorm(int r, float* X)
    {
        toLowerTrapezoid(r);
        for (int c = 0; c < 3; ++c) {
            float* b = column(B_, c);
            for (int i = 0; i < r; ++i) {
                b[i] /= v_[p_[i]];
                for (int l = i + 1; l < r; ++l)
                    b[l] -= b[i] * at(l, p_[i]);
            }
            for (int j = r; j < n_; ++j)
                b[j] = 0.0f;
            for (int i = r - 1; i >= 0; --i) {
                float d = 0.0f;
                for (int j = i; j < n_; ++j)
                    d += b[j] * at(i, p_[j]);
                for (int j = i; j < n_; ++j)
                    b[j] -= 2.0f * d * at(i, p_[j]);
            }
            for (int j = 0; j < n_; ++j)
                X[4 * p_[j] + c] = b[j];
        }
    }

private:
    float* column(float* M, int q) const { return M + size_t(q) * m_; }
    float& at(int i, int q) const { return A_[size_t(q) * m_ + i]; }

    // Norms of the columns at positions k ... n-1 below row k; returns the
    // largest and its position (ties keep the lowest position).
    float remainingNorms(int k, int& pivot)
    {
        float largest = -1.0f;
        for (int j = k; j < n_; ++j) {
            int q = p_[j];
            if (k == 0) {
                v_[q] = cblas_snrm2(m_, column(A_, q), 1);
            } else {
                float above = at(k - 1, q);
                float t = v_[q] * v_[q] - above * above;
                float r00 = v_[p_[0]];
                v_[q] = t <= r00 * r00 * kRecomputeFraction ? cblas_snrm2(m_ - k, column(A_, q) + k, 1) : std::sqrt(t);
            }
            if (v_[q] > largest) {
                largest = v_[q];
                pivot = j;
            }
        }
        return largest;
    }

    // Householder reflection of the column at position k (norm nu) applied to
    // the later columns and to the right-hand sides.
    void reflect(int k, float nu)
    {
        int q = p_[k];
        float a = at(k, q);
        float alpha = a < 0.0f ? nu : -nu;
        at(k, q) = a - alpha;
        float beta = 1.0f / (alpha * (a - alpha));
        v_[q] = alpha;
        const float* u = column(A_, q) + k;
        int length = m_ - k;
        for (int j = k + 1; j < n_; ++j) {
            float* target = column(A_, p_[j]) + k;
            cblas_saxpy(length, beta * cblas_sdot(length, u, 1, target, 1), u, 1, target, 1);
        }
        for (int c = 0; c < 3; ++c) {
            float* target = column(B_, c) + k;
            cblas_saxpy(length, beta * cblas_sdot(length, u, 1, target, 1), u, 1, target, 1);
        }
    }

    // Turns rows 0 ... r-1 of [R11 R12] into [L 0] Q from the right. Afterwards
    // row i holds the unit reflector u_i at positions i ... n-1, L(l, k) sits at
    // (l, position k) for k < l, and v[p[i]] = L(i, i).
    void toLowerTrapezoid(int r)
    {
        // The positions left of each diagonal still hold the QR reflectors;
        // the trapezoid has zeros there.
        for (int l = 0; l < r; ++l) {
            at(l, p_[l]) = v_[p_[l]];
            for (int k = 0; k < l; ++k)
                at(l, p_[k]) = 0.0f;
        }
        for (int i = 0; i < r; ++i) {
            float squares = 0.0f;
            for (int j = i; j < n_; ++j)
                squares += at(i, p_[j]) * at(i, p_[j]);
            float a = at(i, p_[i]);
            float sigma = a < 0.0f ? -std::sqrt(squares) : std::sqrt(squares);
            at(i, p_[i]) = a + sigma;
            float scale = std::sqrt(2.0f * sigma * (a + sigma));
            for (int j = i; j < n_; ++j)
                at(i, p_[j]) /= scale;
            for (int l = i + 1; l < r; ++l) {
                float d = 0.0f;
                for (int j = i; j < n_; ++j)
                    d += at(l, p_[j]) * at(i, p_[j]);
                for (int j = i; j < n_; ++j)
                    at(l, p_[j]) -= 2.0f * d * at(i, p_[j]);
            }
            v_[p_[i]] = -sigma;
        }
    }

    int m_, n_;
    float* A_;
    float* B_;
    int p_[kSolverMaxChannels];
    float v_[kSolverMaxChannels];
};

} // namespace

extern "C" void pivotedQRLeastSquares(int m, int n, float* A, float* B, float* X)
{
    if (n < 1 || n > kSolverMaxChannels || m < n) {
        solver::markFailed(n, X);
        return;
    }
    PivotedQR qr(m, n, A, B);
    int rank = qr.factor();
    if (rank == n)
        qr.solveFullRank(X);
    else
        qr.solveMinimumNorm(rank, X);
}
