// Small numerical helpers of the colour fit and the database normalisation:
// unit length for sample vectors, per-row standard deviations, and a
// row-major matrix product.
//
// Sample matrices are rows x samples, row-major: element (row r, sample i) is
// at r*n + i, so a sample's vector is a column with stride n.
#pragma once

// Scales each of the n sample vectors (m rows) to unit length; zero and unit
// vectors are left as they are.
void normalizedByEuklidNorm(float* data, int n, int m);
// out[r] = population standard deviation of row r over the n samples.
void calculateSTD(float* data, float* out, int n, int m);
// C = A B (A rowsA x colsA, B rowsB x colsB, row-major); false, C untouched,
// when the inner sizes differ.
bool multiplyMatrices(float* A, unsigned rowsA, unsigned colsA, float* B, unsigned rowsB, unsigned colsB, float* C);
