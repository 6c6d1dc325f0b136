// SPDX-License-Identifier: MIT
#include "steady/dense_solver.h"

#include <algorithm>
#include <cmath>
#include <cstddef>

namespace n3ds::steady {

bool FactorSymmetric(double* a, int n) {
  for (ptrdiff_t k = 0; k < n; k++) {
    double* const pivot_row = a + k * n;
    if (!(pivot_row[k] > 0)) return false;
    const double scale = 1 / std::sqrt(pivot_row[k]);
    for (ptrdiff_t j = k; j < n; j++) pivot_row[j] *= scale;
    for (ptrdiff_t i = k + 1; i < n; i++) {
      const double factor = pivot_row[i];
      double* const row = a + i * n;
      for (ptrdiff_t j = i; j < n; j++) row[j] -= factor * pivot_row[j];
    }
  }
  return true;
}

void SolveFactored(const double* u, int n, double* x) {
  for (ptrdiff_t k = 0; k < n; k++) {
    x[k] /= u[k * n + k];
    for (ptrdiff_t j = k + 1; j < n; j++) x[j] -= u[k * n + j] * x[k];
  }
  for (ptrdiff_t k = n - 1; k >= 0; k--) {
    double sum = x[k];
    for (ptrdiff_t j = k + 1; j < n; j++) sum -= u[k * n + j] * x[j];
    x[k] = sum / u[k * n + k];
  }
}

void InvertFactored(const double* u, int n, double* inverse) {
  for (ptrdiff_t i = 0; i < n; i++) {
    double* const row = inverse + i * n;
    std::fill_n(row, n, 0.0);
    row[i] = 1;
    SolveFactored(u, n, row);
  }
}

}  // namespace n3ds::steady
