#include "colour/MatrixUtilities.h"

#include "support/Log.h"

#include <cmath>

void normalizedByEuklidNorm(float* data, int n, int m)
{
    if (!data || n < 1)
        return;
    for (int i = 0; i < n; ++i) {
        double sum = 0.0;
        for (int r = 0; r < m; ++r) {
            float element = data[size_t(r) * n + i];
            float square = element * element;
            sum += square;
        }
        double length = std::sqrt(sum);
        // Zero vectors have no direction, unit vectors are done already.
        if (length == 1.0 || length == 0.0)
            continue;
        VLOG_DEBUG("Normalization - Euklid norm = %f\n", length);
        for (int r = 0; r < m; ++r) {
            float& element = data[size_t(r) * n + i];
            element = static_cast<float>(element / length);
        }
    }
}

void calculateSTD(float* data, float* out, int n, int m)
{
    if (!out || !data || n < 1 || m < 1)
        return;
    for (int r = 0; r < m; ++r) {
        const float* row = data + size_t(r) * n;
        double sum = 0.0;
        for (int i = 0; i < n; ++i)
            sum += row[i];
        float mean = static_cast<float>(sum / n);
        double squares = 0.0;
        for (int i = 0; i < n; ++i) {
            float difference = row[i] - mean;
            float square = difference * difference;
            squares += square;
        }
        // Population deviation: divided by n, not n - 1.
        float variance = static_cast<float>(squares / n);
        out[r] = std::sqrt(variance);
        VLOG_DEBUG("Standard deviation[%d]: %f\n", r, static_cast<double>(out[r]));
    }
}

bool multiplyMatrices(float* A, unsigned rowsA, unsigned colsA, float* B, unsigned rowsB, unsigned colsB, float* C)
{
    if (colsA != rowsB) {
        VLOG_ERROR("wrong matrix size \n");
        return false;
    }
    for (unsigned i = 0; i < rowsA; ++i) {
        for (unsigned j = 0; j < colsB; ++j) {
            float sum = 0.0f;
            for (unsigned k = 0; k < colsA; ++k) {
                float product = A[size_t(i) * colsA + k] * B[size_t(k) * colsB + j];
                sum += product;
            }
            C[size_t(i) * colsB + j] = sum;
        }
    }
    return true;
}
