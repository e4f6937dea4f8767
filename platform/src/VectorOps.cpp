// The few vDSP / vForce vector operations the colour solver uses.
#include <Accelerate/Accelerate.h>

#include <cmath>
#include <cstddef>
#include <limits>

// A NaN element makes the result NaN: a maximum over data that holds a NaN is
// not a number either, and callers test for it.
void vDSP_maxv(const float* A, vDSP_Stride IA, float* C, vDSP_Length N)
{
    // Sixteen running maxima (the maximum does not depend on the order) and a
    // note of any NaN; only then the first NaN is looked for, as it is the result.
    constexpr vDSP_Length kLanes = 16;
    float lanes[kLanes];
    for (float& lane : lanes)
        lane = -std::numeric_limits<float>::infinity();
    int nans = 0; // counted without branches, so the loop vectorises
    vDSP_Length n = 0;
    if (IA == 1) {
        for (; n + kLanes <= N; n += kLanes) {
            for (vDSP_Length l = 0; l < kLanes; ++l) {
                const float v = A[n + l];
                nans += int(v != v);
                lanes[l] = v > lanes[l] ? v : lanes[l];
            }
        }
    }
    for (; n < N; ++n) {
        const float v = A[ptrdiff_t(n) * IA];
        nans += int(v != v);
        lanes[0] = v > lanes[0] ? v : lanes[0];
    }
    float largest = lanes[0];
    for (vDSP_Length l = 1; l < kLanes; ++l)
        largest = lanes[l] > largest ? lanes[l] : largest;
    if (nans != 0) {
        for (n = 0; n < N; ++n) {
            const float v = A[ptrdiff_t(n) * IA];
            if (std::isnan(v)) {
                largest = v;
                break;
            }
        }
    }
    *C = largest;
}

void vDSP_vmul(const float* A, vDSP_Stride IA, const float* B, vDSP_Stride IB, float* C, vDSP_Stride IC, vDSP_Length N)
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
