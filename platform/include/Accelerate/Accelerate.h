// Vector and linear-algebra routines. BLAS and LAPACK come from OpenBLAS; the
// few vDSP / vForce operations are small loops of our own.
#pragma once

#include <cblas.h>
#include <cstddef>

typedef long vDSP_Stride;
typedef unsigned long vDSP_Length;

extern "C" {
// *C = the largest of the N elements A[0], A[IA], ...; -infinity when N is 0.
void vDSP_maxv(const float* A, vDSP_Stride IA, float* C, vDSP_Length N);
// C[n*IC] = A[n*IA] * B[n*IB] for n < N.
void vDSP_vmul(const float* A, vDSP_Stride IA, const float* B, vDSP_Stride IB, float* C, vDSP_Stride IC, vDSP_Length N);
// y[i] = sqrt(x[i]) for i < *n.
void vvsqrtf(float* y, const float* x, const int* n);

// LAPACK symmetric indefinite solve (Bunch-Kaufman), column-major.
void ssysv_(const char* uplo, const int* n, const int* nrhs, float* a, const int* lda, int* ipiv, float* b,
            const int* ldb, float* work, const int* lwork, int* info);
}
