// The few vDSP / vForce vector operations the colour solver uses.
#include <Accelerate/Accelerate.h>

#include <cmath>
#include <cstddef>
#include <limits>

// A NaN element makes the result NaN: a maximum over data that holds a NaN is
// not a number either, and callers test for it.
void vDSP_maxv(const float* A, vDSP_Stride IA, float* C, vDSP_Length N)
{
    float largest = -std::numeric_limits<float>::infinity();
    for (vDSP_Length n = 0; n < N; ++n) {
        float v = A[ptrdiff_t(n) * IA];
        if (std::isnan(v)) {
            largest = v;
            break;
        }
        if (v > largest)
            largest = v;
    }
    *C = largest;
}

void vDSP_vmul(const float* A, vDSP_Stride IA, const float* B, vDSP_Stride IB, float* C, vDSP_Stride IC,
               vDSP_Length N)
{
    for (vDSP_Length n = 0; n < N; ++n)
        C[ptrdiff_t(n) * IC] = A[ptrdiff_t(n) * IA] * B[ptrdiff_t(n) * IB];
}

void vvsqrtf(float* y, const float* x, const int* n)
{
    for (int i = 0; i < *n; ++i)
        y[i] = std::sqrt(x[i]);
}

namespace {
// BLAS runs on the caller's thread. The plug-in's solves are small and are
// entered from several queues at once; OpenBLAS's own thread pool would only
// oversubscribe the cores (and hides the calls from thread checkers).
const bool singleThreadedBlas = [] {
    openblas_set_num_threads(1);
    return true;
}();
} // namespace
