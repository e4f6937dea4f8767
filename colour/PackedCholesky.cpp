// Cholesky factorisation G = U^T U of a packed symmetric matrix and the two
// triangular solves on M x 4 blocks (three right-hand sides in lanes 0 to 2,
// lane 3 carried along).
#include "colour/SolverSupport.h"

#include <cmath>

using solver::packedIndex;

namespace {

// The diagonal element of row a; the last one subtracts the summed squares at
// once, the others one square at a time.
float choleskyPivot(int M, const float* U, int a)
{
    float value = U[packedIndex(M, a, a)];
    if (a == M - 1 && a > 0) {
        float squares = 0.0f;
        for (int k = 0; k < a; ++k) {
            float u = U[packedIndex(M, k, a)];
            squares += u * u;
        }
        value -= squares;
    } else {
        for (int k = 0; k < a; ++k) {
            float u = U[packedIndex(M, k, a)];
            value -= u * u;
        }
    }
    return std::sqrt(value);
}

} // namespace

extern "C" void choleskyPacked(int M, float* G)
{
    for (int a = 0; a < M; ++a) {
        float pivot = choleskyPivot(M, G, a);
        G[packedIndex(M, a, a)] = pivot;
        // Several elements share one reciprocal; a single one is divided.
        bool byReciprocal = M - 1 - a >= 2;
        float reciprocal = byReciprocal ? 1.0f / pivot : 0.0f;
        for (int b = a + 1; b < M; ++b) {
            float value = G[packedIndex(M, a, b)];
            for (int k = 0; k < a; ++k)
                value -= G[packedIndex(M, k, a)] * G[packedIndex(M, k, b)];
            G[packedIndex(M, a, b)] = byReciprocal ? value * reciprocal : value / pivot;
        }
    }
}

extern "C" void forwardSubstitutePacked(int M, float* Y, const float* U)
{
    const float* u = U; // walks the packed rows in order
    for (int k = 0; k < M; ++k) {
        float* row = Y + 4 * k;
        float pivot = *u++;
        for (int l = 0; l < 4; ++l)
            row[l] /= pivot;
        for (int j = k + 1; j < M; ++j) {
            float factor = *u++;
            for (int l = 0; l < 4; ++l)
                Y[4 * j + l] -= row[l] * factor;
        }
    }
}

extern "C" void backSubstitutePacked(int M, float* Y, const float* U)
{
    if (M < 1)
        return;
    const float* u = U + solver::packedSize(M); // walks the packed rows backwards
    for (int k = M - 1; k >= 0; --k) {
        float* row = Y + 4 * k;
        for (int j = M - 1; j > k; --j) {
            float factor = *--u;
            for (int l = 0; l < 4; ++l)
                row[l] -= Y[4 * j + l] * factor;
        }
        float pivot = *--u;
        for (int l = 0; l < 4; ++l)
            row[l] /= pivot;
    }
}
