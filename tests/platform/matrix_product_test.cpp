// SPDX-License-Identifier: MIT
#include "platform/matrix_product.h"

#include <gtest/gtest.h>

#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/guarded_array.h"
#include "support/null_arguments.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

constexpr float kUntouched = 12345.0f;

// The product as it is defined, one entry at a time.
std::vector<float> Expected(const std::vector<float>& A, const std::vector<float>& B, int m, int k,
                            int n) {
  std::vector<float> C;
  for (int i = 0; i < m; ++i) {
    for (int j = 0; j < n; ++j) {
      float sum = 0.0f;
      for (int p = 0; p < k; ++p) sum = std::fma(A[i * k + p], B[p * n + j], sum);
      C.push_back(sum);
    }
  }
  return C;
}

std::vector<float> Run(MatrixProduct multiply, const std::vector<float>& A,
                       const std::vector<float>& B, int m, int k, int n) {
  GuardedArray<float> guarded_a(A);
  GuardedArray<float> guarded_b(B);
  GuardedArray<float> C(static_cast<size_t>(m) * n);
  C.Fill(kUntouched);
  multiply(C.data(), guarded_a.data(), guarded_b.data(), m, k, n);
  return C.Values();
}

void CheckAllForms(const std::vector<float>& A, const std::vector<float>& B, int m, int k, int n) {
  SCOPED_TRACE(std::to_string(m) + " x " + std::to_string(k) + " x " + std::to_string(n));
  const std::vector<float> expected = Expected(A, B, m, k, n);
  ASSERT_EQ(FirstDifference(Run(MultiplyPortable, A, B, m, k, n), expected), -1);
  if (const MatrixProduct simd = SimdMatrixProduct()) {
    ASSERT_EQ(FirstDifference(Run(simd, A, B, m, k, n), expected), -1);
  }
  const MatrixProduct exported = [](float* c, const float* a, const float* b, int32_t rows,
                                    int32_t inner, int32_t columns) {
    EXPECT_EQ(mcvMatrixMulMatrixRowMajor_f32(c, a, b, rows, inner, columns), N3DS_OK);
  };
  ASSERT_EQ(FirstDifference(Run(exported, A, B, m, k, n), expected), -1);
}

void CheckRandom(Random& random, int m, int k, int n, bool awkward) {
  const size_t a_size = static_cast<size_t>(m) * k;
  const size_t b_size = static_cast<size_t>(k) * n;
  const auto A = awkward ? random.AwkwardFloats(a_size) : random.Floats(a_size);
  const auto B = awkward ? random.AwkwardFloats(b_size) : random.Floats(b_size);
  CheckAllForms(A, B, m, k, n);
}

TEST(MatrixProduct, SimdFormExistsWhereTheProcessorHasOne) {
#if defined(N3DS_DISABLE_SIMD)
  EXPECT_EQ(SimdMatrixProduct(), nullptr);
#elif defined(__aarch64__)
  EXPECT_NE(SimdMatrixProduct(), nullptr);
#elif defined(__x86_64__)
  const bool has_fma = __builtin_cpu_supports("avx2") && __builtin_cpu_supports("fma");
  EXPECT_EQ(SimdMatrixProduct() != nullptr, has_fma);
#endif
}

TEST(MatrixProduct, SameBitsAsTheDefinitionAtTheSizesOfTheFits) {
  Random random = TestRandom();
  for (const bool awkward : {false, true}) {
    CheckRandom(random, 7, 190, 7, awkward);
    CheckRandom(random, 7, 190, 1, awkward);
    CheckRandom(random, 16, 266, 16, awkward);
    CheckRandom(random, 16, 266, 1, awkward);
    CheckRandom(random, 20, 210, 20, awkward);
    CheckRandom(random, 20, 210, 1, awkward);
  }
}

TEST(MatrixProduct, SameBitsAsTheDefinitionAtEveryWidthAndHeight) {
  Random random = TestRandom();
  for (int n = 1; n <= 36; ++n) {
    for (int m = 1; m <= 10; ++m) CheckRandom(random, m, 5, n, m % 2 == 0);
    CheckRandom(random, 33, 7, n, false);
  }
}

TEST(MatrixProduct, SameBitsAsTheDefinitionAtRandomSizes) {
  Random random = TestRandom();
  for (int trial = 0; trial < 300; ++trial) {
    const int m = random.Int(1, 40);
    const int k = random.Int(0, 60);
    const int n = random.Int(1, 50);
    CheckRandom(random, m, k, n, trial % 3 == 0);
  }
}

TEST(MatrixProduct, KeepsDenormalTerms) {
  // 2^-75 * 2^-74 = 2^-149, the smallest denormal: flushing to zero would lose all of it.
  const std::vector<float> A(9, 0x1p-75f);
  const std::vector<float> B(9 * 9, 0x1p-74f);
  CheckAllForms(A, B, 1, 9, 9);
  EXPECT_TRUE(SameBitsOrNan(Expected(A, B, 1, 9, 9)[8], 9 * 0x1p-149f));
}

TEST(MatrixProduct, RoundsOncePerTerm) {
  // (1 + 2^-12)^2 = 1 + 2^-11 + 2^-24; rounded on its own the product loses 2^-24.
  const float a = 1.0f + 0x1p-12f;
  const float A[2] = {1.0f, a};
  const float B[2] = {-1.0f, a};
  float C = kUntouched;
  ASSERT_EQ(mcvMatrixMulMatrixRowMajor_f32(&C, A, B, 1, 2, 1), N3DS_OK);
  EXPECT_EQ(C, 0x1p-11f + 0x1p-24f);
}

TEST(MatrixProduct, OneByOneIsTheProduct) {
  const float a = 3.0f;
  const float b = -2.5f;
  float c = kUntouched;
  ASSERT_EQ(mcvMatrixMulMatrixRowMajor_f32(&c, &a, &b, 1, 1, 1), N3DS_OK);
  EXPECT_EQ(c, -7.5f);
}

TEST(MatrixProduct, WithoutTermsIsZero) {
  const float unused = 1.0f;
  for (const int k : {0, -1, -2147483647 - 1}) {
    for (const int n : {1, 3, 20}) {
      std::vector<float> C(static_cast<size_t>(2) * n, kUntouched);
      ASSERT_EQ(mcvMatrixMulMatrixRowMajor_f32(C.data(), &unused, &unused, 2, k, n), N3DS_OK);
      for (const float c : C) EXPECT_TRUE(SameBitsOrNan(c, 0.0f));
    }
  }
}

TEST(MatrixProduct, WithoutRowsOrColumnsWritesNothing) {
  const float a = 1.0f;
  float c = kUntouched;
  EXPECT_EQ(mcvMatrixMulMatrixRowMajor_f32(&c, &a, &a, 0, 1, 1), N3DS_OK);
  EXPECT_EQ(mcvMatrixMulMatrixRowMajor_f32(&c, &a, &a, 1, 1, 0), N3DS_OK);
  EXPECT_EQ(mcvMatrixMulMatrixRowMajor_f32(&c, &a, &a, -3, 0, 1), N3DS_OK);
  EXPECT_EQ(mcvMatrixMulMatrixRowMajor_f32(&c, &a, &a, 1, 0, -3), N3DS_OK);
  EXPECT_EQ(c, kUntouched);
}

TEST(MatrixProduct, NullMatrixIsRefusedWhateverTheSizes) {
  const float a = 1.0f;
  float c = kUntouched;
  for (const int size : {1, 0, -1}) {
    ExpectEachNullRefused(-1, mcvMatrixMulMatrixRowMajor_f32, &c, &a, &a, size, size, size);
  }
  EXPECT_EQ(c, kUntouched);
}

}  // namespace
}  // namespace n3ds::testing
