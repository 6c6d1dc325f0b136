// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/guarded_array.h"
#include "support/null_arguments.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

// No compiler of ours lacks it, though it is no part of the language.
__extension__ typedef __int128 Int128;

// Low 32 bits of a result that was computed without overflow.
int32_t Low32(Int128 value) { return static_cast<int32_t>(static_cast<uint32_t>(value)); }

struct Sizes {
  int m;
  int k;
  int n;
  size_t mk() const { return static_cast<size_t>(m) * k; }
  size_t kn() const { return static_cast<size_t>(k) * n; }
  size_t mn() const { return static_cast<size_t>(m) * n; }
};

Sizes RandomSizes(Random& random) {
  return {random.Int(1, 17), random.Int(0, 20), random.Int(1, 17)};
}

TEST(MatrixElementKernels, FloatFormsOnRandomSizes) {
  Random random = TestRandom();
  for (int trial = 0; trial < 100; ++trial) {
    const int rows = random.Int(1, 9);
    const int cols = random.Int(1, 13);
    const size_t count = static_cast<size_t>(rows) * cols;
    GuardedArray<float> a(random.AwkwardFloats(count));
    GuardedArray<float> b(random.AwkwardFloats(count));
    GuardedArray<float> dst(count);
    const float s = random.Float(-3.0f, 3.0f);
    std::vector<float> sum(count);
    std::vector<float> difference(count);
    std::vector<float> scaled(count);
    for (size_t i = 0; i < count; ++i) {
      sum[i] = a[i] + b[i];
      difference[i] = a[i] - b[i];
      scaled[i] = a[i] * s;
    }
    ASSERT_EQ(mcvMatrixAddMatrix_f32(dst.data(), a.data(), b.data(), rows, cols), 0);
    ASSERT_EQ(FirstDifference(dst.Values(), sum), -1);
    ASSERT_EQ(mcvMatrixSubMatrix_f32(dst.data(), a.data(), b.data(), rows, cols), 0);
    ASSERT_EQ(FirstDifference(dst.Values(), difference), -1);
    ASSERT_EQ(mcvMatrixMulScalar_f32(dst.data(), a.data(), rows, cols, s), 0);
    ASSERT_EQ(FirstDifference(dst.Values(), scaled), -1);
    // In place.
    ASSERT_EQ(mcvMatrixAddMatrix_f32(a.data(), a.data(), b.data(), rows, cols), 0);
    ASSERT_EQ(FirstDifference(a.Values(), sum), -1);
  }
}

TEST(MatrixElementKernels, IntegerFormsWrapOnRandomSizes) {
  Random random = TestRandom();
  for (int trial = 0; trial < 100; ++trial) {
    const int rows = random.Int(1, 9);
    const int cols = random.Int(1, 13);
    const size_t count = static_cast<size_t>(rows) * cols;
    GuardedArray<int32_t> a(random.Integers<int32_t>(count));
    GuardedArray<int32_t> b(random.Integers<int32_t>(count));
    GuardedArray<int32_t> dst(count);
    const int32_t s = random.Integers<int32_t>(1)[0];
    ASSERT_EQ(mcvMatrixAddMatrix_s32(dst.data(), a.data(), b.data(), rows, cols), 0);
    for (size_t i = 0; i < count; ++i) ASSERT_EQ(dst[i], Low32(Int128{a[i]} + b[i]));
    ASSERT_EQ(mcvMatrixSubMatrix_s32(dst.data(), a.data(), b.data(), rows, cols), 0);
    for (size_t i = 0; i < count; ++i) ASSERT_EQ(dst[i], Low32(Int128{a[i]} - b[i]));
    ASSERT_EQ(mcvMatrixMulScalar_s32(dst.data(), a.data(), s, rows, cols), 0);
    for (size_t i = 0; i < count; ++i) ASSERT_EQ(dst[i], Low32(Int128{a[i]} * s));
  }
}

TEST(MatrixElementKernels, WithoutElementsWriteNothing) {
  float f = 1.0f;
  int32_t i = 1;
  for (const int32_t none : {0, -1, INT32_MIN}) {
    EXPECT_EQ(mcvMatrixAddMatrix_f32(&f, &f, &f, none, 1), 0);
    EXPECT_EQ(mcvMatrixAddMatrix_s32(&i, &i, &i, 1, none), 0);
    EXPECT_EQ(mcvMatrixSubMatrix_f32(&f, &f, &f, none, none), 0);
    EXPECT_EQ(mcvMatrixSubMatrix_s32(&i, &i, &i, none, 1), 0);
    EXPECT_EQ(mcvMatrixMulScalar_f32(&f, &f, 1, none, 5.0f), 0);
    EXPECT_EQ(mcvMatrixMulScalar_s32(&i, &i, 5, none, 1), 0);
  }
  EXPECT_EQ(f, 1.0f);
  EXPECT_EQ(i, 1);
}

TEST(MatrixElementKernels, NullMatrixIsRefusedWhateverTheSizes) {
  float f = 1.0f;
  int32_t i = 1;
  for (const int32_t size : {1, 0}) {
    ExpectEachNullRefused(-1, mcvMatrixAddMatrix_f32, &f, &f, &f, size, size);
    ExpectEachNullRefused(-1, mcvMatrixAddMatrix_s32, &i, &i, &i, size, size);
    ExpectEachNullRefused(-1, mcvMatrixSubMatrix_f32, &f, &f, &f, size, size);
    ExpectEachNullRefused(-1, mcvMatrixSubMatrix_s32, &i, &i, &i, size, size);
    ExpectEachNullRefused(-1, mcvMatrixMulScalar_f32, &f, &f, size, size, 2.0f);
    ExpectEachNullRefused(-1, mcvMatrixMulScalar_s32, &i, &i, 2, size, size);
  }
}

TEST(MatrixProducts, IntegerRowMajorWrapsOnRandomSizes) {
  Random random = TestRandom();
  for (int trial = 0; trial < 100; ++trial) {
    const Sizes size = RandomSizes(random);
    GuardedArray<int32_t> A(random.Integers<int32_t>(size.mk()));
    GuardedArray<int32_t> B(random.Integers<int32_t>(size.kn()));
    GuardedArray<int32_t> C(size.mn());
    C.Fill(77);
    ASSERT_EQ(mcvMatrixMulMatrixRowMajor_s32(C.data(), A.data(), B.data(), size.m, size.k, size.n),
              0);
    for (int i = 0; i < size.m; ++i) {
      for (int j = 0; j < size.n; ++j) {
        Int128 sum = 0;
        for (int p = 0; p < size.k; ++p) sum += Int128{A[i * size.k + p]} * B[p * size.n + j];
        ASSERT_EQ(C[i * size.n + j], Low32(sum));
      }
    }
  }
}

TEST(MatrixProducts, WideSumsTakeProductsOf32Bits) {
  Random random = TestRandom();
  for (int trial = 0; trial < 100; ++trial) {
    const Sizes size = RandomSizes(random);
    GuardedArray<int16_t> A(random.Integers<int16_t>(size.mk()));
    GuardedArray<int32_t> B(random.Integers<int32_t>(size.kn()));
    GuardedArray<int64_t> C(size.mn());
    C.Fill(77);
    ASSERT_EQ(mcvMatrixMulMatrixRowMajor_s64(C.data(), A.data(), B.data(), size.m, size.k, size.n),
              0);
    for (int i = 0; i < size.m; ++i) {
      for (int j = 0; j < size.n; ++j) {
        int64_t sum = 0;
        for (int p = 0; p < size.k; ++p) {
          sum += Low32(Int128{A[i * size.k + p]} * B[p * size.n + j]);
        }
        ASSERT_EQ(C[i * size.n + j], sum);
      }
    }
  }
  // The product wraps, the sum does not: 3 * 2^30 in 32 bits is -2^30.
  const int16_t A[4] = {3, 3, 3, 3};
  const int32_t B[4] = {1 << 30, 1 << 30, 1 << 30, 1 << 30};
  int64_t C = 0;
  ASSERT_EQ(mcvMatrixMulMatrixRowMajor_s64(&C, A, B, 1, 4, 1), 0);
  EXPECT_EQ(C, -4 * (int64_t{1} << 30));
}

TEST(MatrixProducts, ColumnMajorFormsOnRandomSizes) {
  Random random = TestRandom();
  for (int trial = 0; trial < 100; ++trial) {
    const Sizes size = RandomSizes(random);
    GuardedArray<float> A(random.Floats(size.mk()));
    GuardedArray<float> B(random.Floats(size.kn()));
    GuardedArray<float> C(size.mn());
    GuardedArray<int32_t> Ai(random.Integers<int32_t>(size.mk()));
    GuardedArray<int32_t> Bi(random.Integers<int32_t>(size.kn()));
    GuardedArray<int32_t> Ci(size.mn());
    ASSERT_EQ(mcvMatrixMulMatrixColMajor_f32(C.data(), A.data(), B.data(), size.m, size.k, size.n),
              0);
    ASSERT_EQ(
        mcvMatrixMulMatrixColMajor_s32(Ci.data(), Ai.data(), Bi.data(), size.m, size.k, size.n), 0);
    for (int i = 0; i < size.m; ++i) {
      for (int j = 0; j < size.n; ++j) {
        float sum = 0.0f;
        Int128 integer_sum = 0;
        for (int p = 0; p < size.k; ++p) {
          sum = std::fma(A[p * size.m + i], B[j * size.k + p], sum);
          integer_sum += Int128{Ai[p * size.m + i]} * Bi[j * size.k + p];
        }
        ASSERT_TRUE(SameBitsOrNan(C[j * size.m + i], sum));
        ASSERT_EQ(Ci[j * size.m + i], Low32(integer_sum));
      }
    }
  }
}

TEST(MatrixProducts, MultiplyAddFormsAddAfterTheProduct) {
  Random random = TestRandom();
  for (int trial = 0; trial < 100; ++trial) {
    const Sizes size = RandomSizes(random);
    GuardedArray<float> A(random.Floats(size.mk()));
    GuardedArray<float> B(random.Floats(size.kn()));
    GuardedArray<float> E(random.Floats(size.mn(), -1000.0f, 1000.0f));
    GuardedArray<float> D(size.mn());
    GuardedArray<int32_t> Ai(random.Integers<int32_t>(size.mk()));
    GuardedArray<int32_t> Bi(random.Integers<int32_t>(size.kn()));
    GuardedArray<int32_t> Ei(random.Integers<int32_t>(size.mn()));
    GuardedArray<int32_t> Di(size.mn());
    ASSERT_EQ(
        mcvMatrixMulAddRowMajor_f32(D.data(), A.data(), B.data(), E.data(), size.m, size.k, size.n),
        0);
    ASSERT_EQ(mcvMatrixMulAddRowMajor_s32(Di.data(), Ai.data(), Bi.data(), Ei.data(), size.m,
                                          size.k, size.n),
              0);
    for (int i = 0; i < size.m; ++i) {
      for (int j = 0; j < size.n; ++j) {
        float sum = 0.0f;
        Int128 integer_sum = Ei[i * size.n + j];
        for (int p = 0; p < size.k; ++p) {
          sum = std::fma(A[i * size.k + p], B[p * size.n + j], sum);
          integer_sum += Int128{Ai[i * size.k + p]} * Bi[p * size.n + j];
        }
        ASSERT_TRUE(SameBitsOrNan(D[i * size.n + j], sum + E[i * size.n + j]));
        ASSERT_EQ(Di[i * size.n + j], Low32(integer_sum));
      }
    }
  }
}

TEST(MatrixProducts, WithoutTermsAreZero) {
  const int32_t a = 5;
  const float f = 5.0f;
  const int16_t s = 5;
  for (const int32_t k : {0, -1, INT32_MIN}) {
    int32_t C[2] = {7, 7};
    EXPECT_EQ(mcvMatrixMulMatrixRowMajor_s32(C, &a, &a, 1, k, 2), 0);
    EXPECT_EQ(C[0] | C[1], 0);
    int64_t wide[2] = {7, 7};
    EXPECT_EQ(mcvMatrixMulMatrixRowMajor_s64(wide, &s, &a, 2, k, 1), 0);
    EXPECT_EQ(wide[0] | wide[1], 0);
    C[0] = C[1] = 7;
    EXPECT_EQ(mcvMatrixMulMatrixColMajor_s32(C, &a, &a, 1, k, 2), 0);
    EXPECT_EQ(C[0] | C[1], 0);
    float F[2] = {7.0f, 7.0f};
    EXPECT_EQ(mcvMatrixMulMatrixColMajor_f32(F, &f, &f, 2, k, 1), 0);
    EXPECT_TRUE(SameBitsOrNan(F[0], 0.0f) && SameBitsOrNan(F[1], 0.0f));
    const int32_t E[2] = {3, -4};
    EXPECT_EQ(mcvMatrixMulAddRowMajor_s32(C, &a, &a, E, 1, k, 2), 0);
    EXPECT_TRUE(C[0] == 3 && C[1] == -4);
    const float G[2] = {3.0f, -4.0f};
    EXPECT_EQ(mcvMatrixMulAddRowMajor_f32(F, &f, &f, G, 1, k, 2), 0);
    EXPECT_TRUE(F[0] == 3.0f && F[1] == -4.0f);
  }
}

TEST(MatrixProducts, WithoutRowsOrColumnsWriteNothing) {
  const int32_t a = 5;
  const float f = 5.0f;
  const int16_t s = 5;
  int32_t C = 7;
  int64_t wide = 7;
  float F = 7.0f;
  for (const int32_t none : {0, -1, INT32_MIN}) {
    for (const bool rows : {true, false}) {
      const int32_t m = rows ? none : 1;
      const int32_t n = rows ? 1 : none;
      EXPECT_EQ(mcvMatrixMulMatrixRowMajor_s32(&C, &a, &a, m, 1, n), 0);
      EXPECT_EQ(mcvMatrixMulMatrixRowMajor_s64(&wide, &s, &a, m, 1, n), 0);
      EXPECT_EQ(mcvMatrixMulMatrixColMajor_s32(&C, &a, &a, m, 1, n), 0);
      EXPECT_EQ(mcvMatrixMulMatrixColMajor_f32(&F, &f, &f, m, 1, n), 0);
      EXPECT_EQ(mcvMatrixMulAddRowMajor_s32(&C, &a, &a, &a, m, 1, n), 0);
      EXPECT_EQ(mcvMatrixMulAddRowMajor_f32(&F, &f, &f, &f, m, 1, n), 0);
    }
  }
  EXPECT_EQ(C, 7);
  EXPECT_EQ(wide, 7);
  EXPECT_EQ(F, 7.0f);
}

TEST(MatrixProducts, NullMatrixIsRefusedWhateverTheSizes) {
  const int32_t a = 5;
  const float f = 5.0f;
  const int16_t s = 5;
  int32_t C = 7;
  int64_t wide = 7;
  float F = 7.0f;
  for (const int32_t d : {1, 0}) {
    ExpectEachNullRefused(-1, mcvMatrixMulMatrixRowMajor_s32, &C, &a, &a, d, d, d);
    ExpectEachNullRefused(-1, mcvMatrixMulMatrixRowMajor_s64, &wide, &s, &a, d, d, d);
    ExpectEachNullRefused(-1, mcvMatrixMulMatrixColMajor_s32, &C, &a, &a, d, d, d);
    ExpectEachNullRefused(-1, mcvMatrixMulMatrixColMajor_f32, &F, &f, &f, d, d, d);
    ExpectEachNullRefused(-1, mcvMatrixMulAddRowMajor_s32, &C, &a, &a, &a, d, d, d);
    ExpectEachNullRefused(-1, mcvMatrixMulAddRowMajor_f32, &F, &f, &f, &f, d, d, d);
  }
  EXPECT_EQ(C, 7);
  EXPECT_EQ(wide, 7);
  EXPECT_EQ(F, 7.0f);
}

}  // namespace
}  // namespace n3ds::testing
