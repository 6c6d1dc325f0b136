// SPDX-License-Identifier: MIT
#include <algorithm>
#include <cmath>
#include <set>
#include <vector>

#include "support/bits.h"
#include "support/captured_output.h"
#include "support/memory_pool.h"
#include "support/null_arguments.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

constexpr float kUnwritten = -123.25f;

using Vector = std::vector<float>;  // of exactly the promised size, so that sanitizers see more

Vector RandomVector(Random& random, size_t size) {
  Vector v(size);
  for (float& value : v) value = random.Float(-1, 1);
  return v;
}

// Random with a heavy diagonal: factorises without pivoting.
Vector RandomSquare(Random& random, int n) {
  Vector a = RandomVector(random, static_cast<size_t>(n) * n);
  for (int i = 0; i < n; ++i) a[i * n + i] += a[i * n + i] < 0 ? -n : n;
  return a;
}

// The factorisation element by element, as it is defined: plain float sums in increasing k.
bool ReferenceLU(const Vector& A, int n, Vector* L, Vector* U) {
  for (int i = 0; i < n; ++i) {
    for (int j = 0; j < n; ++j) {
      if (i < j) (*L)[i * n + j] = 0;
      if (i > j) (*U)[i * n + j] = 0;
      if (i == j) (*L)[i * n + j] = 1;
    }
  }
  for (int i = 0; i < n; ++i) {
    for (int j = 0; j < n; ++j) {
      float sum = 0;
      if (j < i) {
        for (int k = 0; k < j; ++k) sum += (*L)[i * n + k] * (*U)[k * n + j];
        (*L)[i * n + j] = (A[i * n + j] - sum) / (*U)[j * n + j];
      } else {
        for (int k = 0; k < i; ++k) sum += (*L)[i * n + k] * (*U)[k * n + j];
        (*U)[i * n + j] = A[i * n + j] - sum;
        if (j == i && std::fabs(static_cast<double>((*U)[i * n + i])) < 1e-6) return false;
      }
    }
  }
  return true;
}

// A x = b in double by Gauss-Jordan with pivoting.
std::vector<double> SolveInDouble(std::vector<double> a, std::vector<double> b) {
  const size_t n = b.size();
  for (size_t c = 0; c < n; ++c) {
    size_t pivot = c;
    for (size_t r = c; r < n; ++r) {
      if (std::fabs(a[r * n + c]) > std::fabs(a[pivot * n + c])) pivot = r;
    }
    for (size_t k = 0; k < n; ++k) std::swap(a[c * n + k], a[pivot * n + k]);
    std::swap(b[c], b[pivot]);
    for (size_t r = 0; r < n; ++r) {
      if (r == c) continue;
      const double f = a[r * n + c] / a[c * n + c];
      for (size_t k = 0; k < n; ++k) a[r * n + k] -= f * a[c * n + k];
      b[r] -= f * b[c];
    }
  }
  for (size_t i = 0; i < n; ++i) b[i] /= a[i * n + i];
  return b;
}

TEST(MatDecompLU, EqualsTheElementwiseDefinitionBitForBit) {
  Random random = TestRandom();
  for (int n = 1; n <= 24; ++n) {
    const Vector A = RandomSquare(random, n);
    const size_t size = A.size();
    Vector L(size, kUnwritten), U(size, kUnwritten), expected_L(size), expected_U(size);
    ASSERT_EQ(MatDecompLU(A.data(), n, L.data(), U.data()), N3DS_OK);
    ASSERT_TRUE(ReferenceLU(A, n, &expected_L, &expected_U));
    EXPECT_TRUE(SameBits(L, expected_L)) << "n = " << n;
    EXPECT_TRUE(SameBits(U, expected_U)) << "n = " << n;
  }
}

TEST(MatDecompLU, FactorsAreTriangularAndMultiplyToTheMatrix) {
  Random random = TestRandom();
  const int n = 20;
  const Vector A = RandomSquare(random, n);
  Vector L(n * n, kUnwritten), U(n * n, kUnwritten);
  ASSERT_EQ(MatDecompLU(A.data(), n, L.data(), U.data()), N3DS_OK);
  for (int i = 0; i < n; ++i) {
    EXPECT_EQ(L[i * n + i], 1.0f);
    for (int j = 0; j < n; ++j) {
      if (j > i) {
        EXPECT_EQ(L[i * n + j], 0.0f);
      }
      if (j < i) {
        EXPECT_EQ(U[i * n + j], 0.0f);
      }
      double sum = 0;
      for (int k = 0; k < n; ++k) sum += double{L[i * n + k]} * U[k * n + j];
      EXPECT_NEAR(sum, A[i * n + j], 2e-5);
    }
  }
}

TEST(MatDecompLU, EmptyMatrixIsFactorisedAtOnce) {
  float untouched = kUnwritten;
  EXPECT_EQ(MatDecompLU(&untouched, 0, &untouched, &untouched), N3DS_OK);
  EXPECT_EQ(untouched, kUnwritten);
}

TEST(MatDecompLU, NegativeSizeIsRefused) {
  float untouched = kUnwritten;
  EXPECT_EQ(MatDecompLU(&untouched, -1, &untouched, &untouched), N3DS_BAD_VALUE);
  EXPECT_EQ(untouched, kUnwritten);
}

TEST(MatDecompLU, NullPointersAreRefusedBeforeTheSizeIsLookedAt) {
  float value = 1;
  for (const int n : {1, 0, -1}) {
    ExpectEachNullRefused(N3DS_NULL_ARGUMENT, MatDecompLU, &value, n, &value, &value);
  }
}

TEST(MatDecompLU, LaterPivotBelowTheThresholdFailsAndPrints) {
  // Rank one: the second pivot is exactly 0.
  const Vector A = {2, 4, 1, 2};
  Vector L(4), U(4);
  MRESULT status = N3DS_OK;
  EXPECT_EQ(PrintedBy([&] { status = MatDecompLU(A.data(), 2, L.data(), U.data()); }),
            "zero in LU\n");
  EXPECT_EQ(status, N3DS_NUMERICAL);
}

TEST(MatDecompLU, AFailureStopsAtThePivotWithTheFixedPartsWritten) {
  Random random = TestRandom();
  const int n = 9;
  for (int failing = 1; failing < n; ++failing) {
    Vector A = RandomSquare(random, n);
    // The same as the first row, so that every step is exact.
    std::copy_n(A.begin(), n, A.begin() + failing * n);
    Vector L(n * n, kUnwritten), U(n * n, kUnwritten), expected_L(L), expected_U(U);
    ASSERT_FALSE(ReferenceLU(A, n, &expected_L, &expected_U));
    MRESULT status = N3DS_OK;
    PrintedBy([&] { status = MatDecompLU(A.data(), n, L.data(), U.data()); });
    EXPECT_EQ(status, N3DS_NUMERICAL);
    EXPECT_TRUE(SameBits(L, expected_L)) << "row " << failing;
    EXPECT_TRUE(SameBits(U, expected_U)) << "row " << failing;
    EXPECT_EQ(U[failing * n + failing], 0.0f);
    if (failing + 1 < n) {
      EXPECT_EQ(U[failing * n + failing + 1], kUnwritten);
    }
  }
}

TEST(MatDecompLU, PivotThatIsNotANumberIsNotTakenForZero) {
  const float A = std::nanf("");
  float L = 0, U = 0;
  EXPECT_EQ(PrintedBy([&] { EXPECT_EQ(MatDecompLU(&A, 1, &L, &U), N3DS_OK); }), "");
  EXPECT_TRUE(std::isnan(U));
}

TEST(SolveLinearAxb, IdentityReturnsTheRightHandSide) {
  for (const int n : {1, 2, 7, 20}) {
    Vector A(static_cast<size_t>(n) * n, 0.0f), b(n), x(n, kUnwritten);
    for (int i = 0; i < n; ++i) {
      A[i * n + i] = 1;
      b[i] = static_cast<float>(i) - 3.5f;
    }
    ASSERT_EQ(SolveLinearAxb(nullptr, A.data(), n, n, x.data(), b.data()), N3DS_OK);
    EXPECT_EQ(x, b);
  }
}

TEST(SolveLinearAxb, PivotThresholdIsAbsoluteAndComparedInDouble) {
  const float b = 1;
  const auto solve = [&](float a, float* x) {
    MRESULT status = N3DS_OK;
    const std::string printed =
        PrintedBy([&] { status = SolveLinearAxb(nullptr, &a, 1, 1, x, &b); });
    EXPECT_EQ(printed, status == N3DS_OK ? "" : "zero in LU\n");
    return status;
  };
  float x = kUnwritten;
  EXPECT_EQ(solve(1e-7f, &x), N3DS_NUMERICAL);
  EXPECT_EQ(solve(1e-6f, &x), N3DS_NUMERICAL);  // the float lies just below the double
  EXPECT_EQ(solve(-1e-6f, &x), N3DS_NUMERICAL);
  EXPECT_EQ(x, kUnwritten);
  EXPECT_EQ(solve(std::nextafter(1e-6f, 1.0f), &x), N3DS_OK);
  EXPECT_EQ(solve(2e-6f, &x), N3DS_OK);
  EXPECT_EQ(x, 1.0f / 2e-6f);
  EXPECT_EQ(solve(-2e-6f, &x), N3DS_OK);
}

TEST(SolveLinearAxb, ZeroLeadingElementFailsThoughTheMatrixIsRegular) {
  const Vector A = {0, 1, 1, 0}, b = {1, 2};
  Vector x(2, kUnwritten);
  MRESULT status = N3DS_OK;
  EXPECT_EQ(
      PrintedBy([&] { status = SolveLinearAxb(nullptr, A.data(), 2, 2, x.data(), b.data()); }),
      "zero in LU\n");
  EXPECT_EQ(status, N3DS_NUMERICAL);
  EXPECT_EQ(x, Vector(2, kUnwritten));
}

TEST(SolveLinearAxb, SquareSystemsAgreeWithDoublePrecision) {
  Random random = TestRandom();
  for (int n = 1; n <= 20; ++n) {
    const Vector A = RandomSquare(random, n), b = RandomVector(random, n);
    Vector x(n, kUnwritten);
    ASSERT_EQ(SolveLinearAxb(nullptr, A.data(), n, n, x.data(), b.data()), N3DS_OK);
    const auto expected = SolveInDouble({A.begin(), A.end()}, {b.begin(), b.end()});
    for (int i = 0; i < n; ++i) EXPECT_NEAR(x[i], expected[i], 1e-5) << "n = " << n;
  }
}

TEST(SolveLinearAxb, RightHandSideMayBeTheSolutionArray) {
  Random random = TestRandom();
  const int n = 7;
  const Vector A = RandomSquare(random, n), b = RandomVector(random, n);
  Vector apart(n), shared = b;
  ASSERT_EQ(SolveLinearAxb(nullptr, A.data(), n, n, apart.data(), b.data()), N3DS_OK);
  ASSERT_EQ(SolveLinearAxb(nullptr, A.data(), n, n, shared.data(), shared.data()), N3DS_OK);
  EXPECT_EQ(shared, apart);
}

TEST(SolveLinearAxb, ConsistentTallSystemIsSolvedExactly) {
  const Vector A = {1, 0, 0, 1, 1, 1}, b = {2, 3, 5};
  Vector x(2, kUnwritten);
  ASSERT_EQ(SolveLinearAxb(nullptr, A.data(), 3, 2, x.data(), b.data()), N3DS_OK);
  EXPECT_EQ(x, (Vector{2, 3}));
}

TEST(SolveLinearAxb, InconsistentTallSystemGetsTheLeastSquaresSolution) {
  // The best line through (0, 1), (1, 3), (2, 4): 7/6 + 3/2 x.
  const Vector A = {1, 0, 1, 1, 1, 2}, b = {1, 3, 4};
  Vector x(2, kUnwritten);
  ASSERT_EQ(SolveLinearAxb(nullptr, A.data(), 3, 2, x.data(), b.data()), N3DS_OK);
  EXPECT_NEAR(x[0], 7.0 / 6.0, 1e-5);
  EXPECT_NEAR(x[1], 1.5, 1e-5);
}

TEST(SolveLinearAxb, TallSystemsAgreeWithDoublePrecision) {
  Random random = TestRandom();
  const struct {
    int rows, cols;
  } sizes[] = {{2, 1}, {8, 7}, {54, 16}, {140, 20}, {210, 20}, {266, 16}};
  for (const auto& [rows, cols] : sizes) {
    const Vector A = RandomVector(random, static_cast<size_t>(rows) * cols);
    const Vector b = RandomVector(random, rows);
    std::vector<double> normal(static_cast<size_t>(cols) * cols), moment(cols);
    for (int r = 0; r < rows; ++r) {
      for (int i = 0; i < cols; ++i) {
        moment[i] += double{A[r * cols + i]} * b[r];
        for (int j = 0; j < cols; ++j) {
          normal[i * cols + j] += double{A[r * cols + i]} * A[r * cols + j];
        }
      }
    }
    const auto expected = SolveInDouble(normal, moment);
    Vector x(cols, kUnwritten);
    ASSERT_EQ(SolveLinearAxb(nullptr, A.data(), rows, cols, x.data(), b.data()), N3DS_OK);
    for (int i = 0; i < cols; ++i) {
      EXPECT_NEAR(x[i], expected[i], rows == cols + 1 ? 1e-2 : 1e-4) << rows << " x " << cols;
    }
  }
}

TEST(SolveLinearAxb, TallSystemIsSolvedThroughFusedNormalEquationsBitForBit) {
  Random random = TestRandom();
  const int rows = 30, cols = 5;
  const Vector A = RandomVector(random, rows * cols), b = RandomVector(random, rows);
  Vector normal(cols * cols, 0.0f), moment(cols, 0.0f);
  for (int i = 0; i < cols; ++i) {
    for (int r = 0; r < rows; ++r) {
      moment[i] = std::fma(A[r * cols + i], b[r], moment[i]);
      for (int j = 0; j < cols; ++j) {
        normal[i * cols + j] = std::fma(A[r * cols + i], A[r * cols + j], normal[i * cols + j]);
      }
    }
  }
  Vector L(cols * cols), U(cols * cols), y(cols), expected(cols), x(cols);
  ASSERT_TRUE(ReferenceLU(normal, cols, &L, &U));
  for (int i = 0; i < cols; ++i) {
    float sum = 0;
    for (int k = 0; k < i; ++k) sum += L[i * cols + k] * y[k];
    y[i] = moment[i] - sum;
  }
  expected[cols - 1] = y[cols - 1] / U[cols * cols - 1];
  for (int i = cols - 2; i >= 0; --i) {
    float sum = 0;
    for (int k = i + 1; k < cols; ++k) sum += U[i * cols + k] * expected[k];
    expected[i] = (y[i] - sum) / U[i * cols + i];
  }
  ASSERT_EQ(SolveLinearAxb(nullptr, A.data(), rows, cols, x.data(), b.data()), N3DS_OK);
  EXPECT_TRUE(SameBits(x, expected));
}

TEST(SolveLinearAxb, RankDeficientTallSystemFailsAndLeavesTheSolution) {
  // The second column repeats the first.
  const Vector A = {1, 1, 2, 2, 3, 3}, b = {1, 2, 3};
  Vector x(2, kUnwritten);
  MRESULT status = N3DS_OK;
  EXPECT_EQ(
      PrintedBy([&] { status = SolveLinearAxb(nullptr, A.data(), 3, 2, x.data(), b.data()); }),
      "zero in LU\n");
  EXPECT_EQ(status, N3DS_NUMERICAL);
  EXPECT_EQ(x, Vector(2, kUnwritten));
}

TEST(SolveLinearAxb, BadSizesAreRefusedWithoutAllocating) {
  const Vector A(4, 1.0f), b(2, 1.0f);
  Vector x(2, kUnwritten);
  const MemoryPool pool(64);  // too small for any of the scratch: an allocation would give -201
  const auto solve = [&](int rows, int cols) {
    return SolveLinearAxb(pool.handle(), A.data(), rows, cols, x.data(), b.data());
  };
  EXPECT_EQ(solve(1, 2), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(20, 40), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(-1, -1), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(-2, -1), N3DS_BAD_VALUE);
  EXPECT_EQ(solve(2, -1), N3DS_BAD_VALUE);
  EXPECT_EQ(x, Vector(2, kUnwritten));
  EXPECT_EQ(solve(2, 2), N3DS_NO_MEMORY);
}

TEST(SolveLinearAxb, NoUnknownsIsSolvedAtOnce) {
  const float value = 1;
  float x = kUnwritten;
  EXPECT_EQ(SolveLinearAxb(nullptr, &value, 0, 0, &x, &value), N3DS_OK);
  EXPECT_EQ(SolveLinearAxb(nullptr, &value, 1, 0, &x, &value), N3DS_OK);
  EXPECT_EQ(x, kUnwritten);
}

TEST(SolveLinearAxb, NullPointersAreRefusedBeforeTheSizesAreLookedAt) {
  float v = 1;
  for (const int rows : {1, -1}) {
    ExpectEachNullRefused(N3DS_NULL_ARGUMENT, SolveLinearAxb, nullptr, &v, rows, 1, &v, &v);
  }
}

// Pools from too small for anything to big enough, in steps finer than any allocation: each
// allocation is the one that fails for some of them.
void ExpectCleanFailureOfEveryAllocation(int rows, int cols) {
  Random random = TestRandom();
  const Vector A = rows == cols ? RandomSquare(random, cols)
                                : RandomVector(random, static_cast<size_t>(rows) * cols);
  const Vector b = RandomVector(random, rows);
  Vector expected(cols);
  ASSERT_EQ(SolveLinearAxb(nullptr, A.data(), rows, cols, expected.data(), b.data()), N3DS_OK);
  int failures = 0;
  for (size_t length = 40;; length += 8) {
    ASSERT_LT(length, 100000u);
    const MemoryPool pool(length);
    Vector x(cols, kUnwritten);
    const MRESULT status = SolveLinearAxb(pool.handle(), A.data(), rows, cols, x.data(), b.data());
    ASSERT_TRUE(pool.Untouched()) << "scratch not released with a pool of " << length;
    if (status == N3DS_OK) {
      EXPECT_TRUE(SameBits(x, expected));
      break;
    }
    ++failures;
    ASSERT_EQ(status, N3DS_NO_MEMORY);
    ASSERT_EQ(x, Vector(cols, kUnwritten));
  }
  EXPECT_GT(failures, rows == cols ? 3 : 6);
}

TEST(SolveLinearAxb, EveryFailedAllocationOfASquareSolveIsReportedAndReleasesTheRest) {
  ExpectCleanFailureOfEveryAllocation(7, 7);
}

TEST(SolveLinearAxb, EveryFailedAllocationOfATallSolveIsReportedAndReleasesTheRest) {
  ExpectCleanFailureOfEveryAllocation(40, 5);
}

TEST(SolveLinearAxb, SingularSystemReleasesItsScratch) {
  const MemoryPool pool(4096);
  const Vector A = {1, 1, 2, 2, 3, 3}, b = {1, 2, 3};
  Vector x(2);
  PrintedBy([&] {
    EXPECT_EQ(SolveLinearAxb(pool.handle(), A.data(), 3, 2, x.data(), b.data()), N3DS_NUMERICAL);
    EXPECT_TRUE(pool.Untouched());
    EXPECT_EQ(SolveLinearAxb(pool.handle(), A.data(), 2, 2, x.data(), b.data()), N3DS_NUMERICAL);
    EXPECT_TRUE(pool.Untouched());
  });
}

}  // namespace
}  // namespace n3ds::testing
