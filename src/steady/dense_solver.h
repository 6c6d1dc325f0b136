// SPDX-License-Identifier: MIT
// Symmetric positive systems in double precision, for what happens once a model or once a face.
#pragma once

namespace n3ds::steady {

// Overwrites the upper triangle of the symmetric n x n matrix with U, U'U = A. False when the matrix
// is not positive.
bool FactorSymmetric(double* a, int n);

// Solves U'U x = b in place.
void SolveFactored(const double* u, int n, double* x);

// Writes the inverse of the matrix that was factored, n x n, to `inverse`.
void InvertFactored(const double* u, int n, double* inverse);

}  // namespace n3ds::steady
