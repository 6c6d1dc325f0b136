// SPDX-License-Identifier: MIT
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <bitset>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/guarded_array.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

template <typename T>
double ExpectedFloatDistance(const std::vector<T>& a, const std::vector<T>& b) {
  float sum = 0.0f;
  for (size_t i = 0; i < a.size(); ++i) {
    const float difference = static_cast<float>(a[i]) - static_cast<float>(b[i]);
    const float square = difference * difference;
    sum = sum + square;
  }
  return std::sqrt(static_cast<double>(sum));
}

template <typename T>
double ExpectedIntegerDistance(const std::vector<T>& a, const std::vector<T>& b) {
  uint64_t sum = 0;
  for (size_t i = 0; i < a.size(); ++i) {
    const int64_t difference = int64_t{a[i]} - b[i];
    sum += static_cast<uint64_t>(difference * difference);
  }
  return std::sqrt(static_cast<double>(sum));
}

template <typename T>
void CheckDistances(double (*kernel)(const T*, const T*, int32_t),
                    double (*expected)(const std::vector<T>&, const std::vector<T>&),
                    const std::vector<T>& a, const std::vector<T>& b) {
  GuardedArray<T> guarded_a(a);
  GuardedArray<T> guarded_b(b);
  ASSERT_EQ(kernel(guarded_a.data(), guarded_b.data(), static_cast<int32_t>(a.size())),
            expected(a, b));
}

template <typename T>
void CheckRandomDistances(double (*kernel)(const T*, const T*, int32_t),
                          double (*expected)(const std::vector<T>&, const std::vector<T>&)) {
  Random random = TestRandom();
  for (size_t n = 0; n < 80; ++n) {
    CheckDistances<T>(kernel, expected, random.Integers<T>(n), random.Integers<T>(n));
  }
}

TEST(VectorDistance, FloatSumsInOrder) {
  Random random = TestRandom();
  for (size_t n = 0; n < 80; ++n) {
    CheckDistances<float>(mcvVectorDiffNorm2f32, ExpectedFloatDistance<float>, random.Floats(n),
                          random.Floats(n));
  }
  // After 2^24 a float sum stays put when 1 is added, but not when all the ones come first.
  const std::vector<float> zeros(4, 0.0f);
  const std::vector<float> large_first = {4096.0f, 1.0f, 1.0f, 1.0f};
  const std::vector<float> large_last = {1.0f, 1.0f, 1.0f, 4096.0f};
  EXPECT_EQ(mcvVectorDiffNorm2f32(large_first.data(), zeros.data(), 4), 4096.0);
  EXPECT_EQ(mcvVectorDiffNorm2f32(large_last.data(), zeros.data(), 4), std::sqrt(16777220.0));
}

TEST(VectorDistance, IntegersAreConvertedToFloatFirst) {
  CheckRandomDistances<uint32_t>(mcvVectorDiffNorm2u32, ExpectedFloatDistance<uint32_t>);
  CheckRandomDistances<int32_t>(mcvVectorDiffNorm2s32, ExpectedFloatDistance<int32_t>);
  // 2^24 and 2^24 + 1 are the same float.
  const uint32_t a = 1u << 24;
  const uint32_t b = a + 1;
  EXPECT_EQ(mcvVectorDiffNorm2u32(&a, &b, 1), 0.0);
  const int32_t low = INT32_MIN;
  const int32_t high = INT32_MAX;
  EXPECT_EQ(mcvVectorDiffNorm2s32(&low, &high, 1), 4294967296.0);
}

TEST(VectorDistance, FastFormsSumExactly) {
  CheckRandomDistances<uint8_t>(mcvVectorDiffNorm2Fastu8, ExpectedIntegerDistance<uint8_t>);
  CheckRandomDistances<int8_t>(mcvVectorDiffNorm2Fasts8, ExpectedIntegerDistance<int8_t>);
  CheckRandomDistances<uint16_t>(mcvVectorDiffNorm2Fastu16, ExpectedIntegerDistance<uint16_t>);
  CheckRandomDistances<int16_t>(mcvVectorDiffNorm2Fasts16, ExpectedIntegerDistance<int16_t>);
}

TEST(VectorDistance, FastFormsHoldTheLargestDifferences) {
  // More terms than a 32-bit sum holds.
  constexpr size_t kCount = 200001;
  CheckDistances<uint8_t>(mcvVectorDiffNorm2Fastu8, ExpectedIntegerDistance<uint8_t>,
                          std::vector<uint8_t>(kCount, 0), std::vector<uint8_t>(kCount, 255));
  CheckDistances<int8_t>(mcvVectorDiffNorm2Fasts8, ExpectedIntegerDistance<int8_t>,
                         std::vector<int8_t>(kCount, -128), std::vector<int8_t>(kCount, 127));
  CheckDistances<uint16_t>(mcvVectorDiffNorm2Fastu16, ExpectedIntegerDistance<uint16_t>,
                           std::vector<uint16_t>(kCount, 0), std::vector<uint16_t>(kCount, 65535));
  CheckDistances<int16_t>(mcvVectorDiffNorm2Fasts16, ExpectedIntegerDistance<int16_t>,
                          std::vector<int16_t>(kCount, 32767),
                          std::vector<int16_t>(kCount, -32768));
}

TEST(VectorDistance, WithoutElementsIsZero) {
  for (const int32_t n : {0, -1, INT32_MIN}) {
    EXPECT_EQ(mcvVectorDiffNorm2f32(nullptr, nullptr, n), 0.0);
    EXPECT_EQ(mcvVectorDiffNorm2u32(nullptr, nullptr, n), 0.0);
    EXPECT_EQ(mcvVectorDiffNorm2s32(nullptr, nullptr, n), 0.0);
    EXPECT_EQ(mcvVectorDiffNorm2Fastu8(nullptr, nullptr, n), 0.0);
    EXPECT_EQ(mcvVectorDiffNorm2Fasts8(nullptr, nullptr, n), 0.0);
    EXPECT_EQ(mcvVectorDiffNorm2Fastu16(nullptr, nullptr, n), 0.0);
    EXPECT_EQ(mcvVectorDiffNorm2Fasts16(nullptr, nullptr, n), 0.0);
  }
}

TEST(DotProduct, ReadsBytesAsUnsigned) {
  Random random = TestRandom();
  for (size_t n = 0; n < 100; ++n) {
    GuardedArray<uint8_t> a(random.Integers<uint8_t>(n));
    GuardedArray<uint8_t> b(random.Integers<uint8_t>(n));
    uint64_t expected = 0;
    for (size_t i = 0; i < n; ++i) expected += uint64_t{a[i]} * b[i];
    ASSERT_EQ(mcvDotProducts8(a.data(), b.data(), static_cast<uint32_t>(n)), expected);
  }
  const int8_t minus_one = -1;
  EXPECT_EQ(mcvDotProducts8(&minus_one, &minus_one, 1), 255u * 255u);
}

TEST(DotProduct, SumsIn64Bits) {
  GuardedArray<uint8_t> a(std::vector<uint8_t>(200001, 255));
  EXPECT_EQ(mcvDotProducts8(a.data(), a.data(), 200001), 200001ull * 65025);
}

TEST(DotProduct, NullAndEmpty) {
  const uint8_t a = 1;
  EXPECT_EQ(mcvDotProducts8(nullptr, &a, 1), UINT64_MAX);
  EXPECT_EQ(mcvDotProducts8(&a, nullptr, 1), UINT64_MAX);
  EXPECT_EQ(mcvDotProducts8(nullptr, nullptr, 0), UINT64_MAX);
  EXPECT_EQ(mcvDotProducts8(&a, &a, 0), 0u);
}

TEST(BitCount, CountsSetBits) {
  const uint8_t bytes[2] = {0xFF, 0x01};
  EXPECT_EQ(mcvBitCountu8(bytes, 2), 9);
  Random random = TestRandom();
  for (size_t n = 0; n < 100; ++n) {
    GuardedArray<uint8_t> p(random.Integers<uint8_t>(n));
    int32_t expected = 0;
    for (size_t i = 0; i < n; ++i) expected += static_cast<int32_t>(std::bitset<8>(p[i]).count());
    ASSERT_EQ(mcvBitCountu8(p.data(), static_cast<uint32_t>(n)), expected);
  }
  EXPECT_EQ(mcvBitCountu8(nullptr, 5), -1);
  EXPECT_EQ(mcvBitCountu8(nullptr, 0), -1);
  EXPECT_EQ(mcvBitCountu8(bytes, 0), 0);
}

// 2^28 bytes of ones, as one piece of memory mapped many times over.
TEST(BitCount, CountBeyondTheResultsRangeIsRefused) {
  constexpr size_t kPiece = size_t{1} << 22, kLength = size_t{1} << 28;
  const int file = memfd_create("ones", 0);
  ASSERT_EQ(ftruncate(file, kPiece), 0);
  void* area = mmap(nullptr, kLength, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  ASSERT_NE(area, MAP_FAILED);
  uint8_t* bytes = static_cast<uint8_t*>(area);
  for (size_t at = 0; at < kLength; at += kPiece) {
    ASSERT_NE(mmap(bytes + at, kPiece, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_FIXED, file, 0),
              MAP_FAILED);
  }
  std::memset(bytes, 0xFF, kPiece);
  EXPECT_EQ(mcvBitCountu8(bytes, static_cast<uint32_t>(kLength)), N3DS_BAD_VALUE);
  EXPECT_EQ(mcvBitCountu8(bytes, static_cast<uint32_t>(kLength) - 1), INT32_MAX - 7);
  munmap(area, kLength);
  close(file);
}

TEST(Division, DividesEachElement) {
  EXPECT_EQ(mcvDivf32(1.0f, 3.0f), 1.0f / 3.0f);
  EXPECT_EQ(mcvDivf32(-1.0f, 0.0f), -std::numeric_limits<float>::infinity());
  Random random = TestRandom();
  for (size_t n = 0; n < 40; ++n) {
    GuardedArray<float> src(random.AwkwardFloats(n));
    GuardedArray<float> dst(n);
    // A quotient by 3 differs from a product by the rounded reciprocal in about a third of cases.
    for (const float s : {3.0f, 0.0f, -7.7f}) {
      std::vector<float> expected(n);
      for (size_t i = 0; i < n; ++i) expected[i] = src[i] / s;
      ASSERT_EQ(mcvVectorDivf32(dst.data(), src.data(), static_cast<int32_t>(n), s), 0);
      ASSERT_EQ(FirstDifference(dst.Values(), expected), -1);
    }
  }
  EXPECT_EQ(mcvVectorDivf32(nullptr, nullptr, 0, 1.0f), 0);
  EXPECT_EQ(mcvVectorDivf32(nullptr, nullptr, -5, 1.0f), 0);
}

}  // namespace
}  // namespace n3ds::testing
