// SPDX-License-Identifier: MIT
// Every vector operation against plain arithmetic on each lane. Lanes get different values, so an
// operation that mixes them is seen.
#include "platform/simd.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <limits>
#include <vector>

#include "platform/integer_arithmetic.h"
#include "support/bits.h"
#include "support/guarded_array.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

using Floats = std::array<float, 4>;
using Integers = std::array<int32_t, 4>;

constexpr float kInfinity = std::numeric_limits<float>::infinity();
constexpr float kNaN = std::numeric_limits<float>::quiet_NaN();
constexpr float kTiny = std::numeric_limits<float>::denorm_min();
constexpr float kLargest = std::numeric_limits<float>::max();
constexpr float kSpecial[] = {0.0f,  -0.0f,  1.0f,     -1.0f,     1.5f,      -2.75f,     1e-30f,
                              3e9f,  1e30f,  kTiny,    -kTiny,    254.999f,  255.0f,     256.0f,
                              -0.9f, 0.999f, kLargest, -kLargest, kInfinity, -kInfinity, kNaN};
constexpr size_t kSpecialCount = std::size(kSpecial);

// Four neighbours of the special values, from the one numbered `first` on.
Floats Special(size_t first) {
  Floats lanes;
  for (size_t i = 0; i < 4; ++i) lanes[i] = kSpecial[(first + i) % kSpecialCount];
  return lanes;
}

F32x4 Load(const Floats& lanes) { return F32x4::Load(lanes.data()); }
I32x4 Load(const Integers& lanes) { return I32x4::Load(lanes.data()); }

Floats Lanes(F32x4 a) {
  Floats lanes;
  a.Store(lanes.data());
  return lanes;
}
Integers Lanes(I32x4 a) {
  Integers lanes;
  a.Store(lanes.data());
  return lanes;
}

void ExpectSame(const Floats& actual, const Floats& expected) {
  for (size_t i = 0; i < 4; ++i) {
    EXPECT_TRUE(SameBitsOrNan(actual[i], expected[i]))
        << "lane " << i << ": " << actual[i] << " instead of " << expected[i];
  }
}

// Checks vector(a) or vector(a, b) against scalar for all special values, each with each.
template <typename Vector, typename Scalar>
void CheckUnary(Vector vector, Scalar scalar) {
  for (size_t s = 0; s < kSpecialCount; ++s) {
    const Floats a = Special(s);
    Floats expected;
    for (size_t i = 0; i < 4; ++i) expected[i] = scalar(a[i]);
    ExpectSame(Lanes(vector(Load(a))), expected);
  }
}
template <typename Vector, typename Scalar>
void CheckBinary(Vector vector, Scalar scalar) {
  for (size_t s = 0; s < kSpecialCount; ++s) {
    for (size_t t = 0; t < kSpecialCount; ++t) {
      const Floats a = Special(s), b = Special(t);
      Floats expected;
      for (size_t i = 0; i < 4; ++i) expected[i] = scalar(a[i], b[i]);
      SCOPED_TRACE(::testing::Message() << "values " << s << " and " << t);
      ExpectSame(Lanes(vector(Load(a), Load(b))), expected);
    }
  }
}
template <typename Vector, typename Scalar>
void CheckComparison(Vector vector, Scalar scalar) {
  for (size_t s = 0; s < kSpecialCount; ++s) {
    for (size_t t = 0; t < kSpecialCount; ++t) {
      const Floats a = Special(s), b = Special(t);
      unsigned expected = 0;
      for (size_t i = 0; i < 4; ++i) expected |= scalar(a[i], b[i]) ? 1u << i : 0u;
      EXPECT_EQ(Bits(vector(Load(a), Load(b))), expected) << "values " << s << " and " << t;
    }
  }
}

// The mask whose lanes are the bits of `bits`.
Mask32x4 MaskOf(unsigned bits) {
  Floats lanes;
  for (size_t i = 0; i < 4; ++i) lanes[i] = (bits >> i & 1) != 0 ? 1.0f : 0.0f;
  return Load(lanes) > F32x4::Splat(0.5f);
}

TEST(Simd, DisablingItTurnsAllOfItOff) {
#ifdef N3DS_DISABLE_SIMD
  EXPECT_FALSE(N3DS_SIMD_SSE2 || N3DS_SIMD_NEON || N3DS_SIMD_AVX2);
  EXPECT_FALSE(HasAvx2());
#else
  EXPECT_EQ(N3DS_SIMD_AVX2, N3DS_SIMD_SSE2);
#endif
}

TEST(Simd, FloatsAreLoadedStoredAndSpread) {
  GuardedArray<float> values(std::vector<float>{1, -2, kNaN, -0.0f, 5});
  GuardedArray<float> out(4);
  F32x4::Load(values.data() + 1).Store(out.data());
  ExpectSame({out[0], out[1], out[2], out[3]}, {-2, kNaN, -0.0f, 5});
  ExpectSame(Lanes(F32x4::Splat(-0.0f)), {-0.0f, -0.0f, -0.0f, -0.0f});
  ExpectSame(Lanes(F32x4::Of(1, 2, 3, 4)), {1, 2, 3, 4});
}

TEST(Simd, ArithmeticRoundsEachOperation) {
  CheckBinary([](F32x4 a, F32x4 b) { return a + b; }, [](float a, float b) { return a + b; });
  CheckBinary([](F32x4 a, F32x4 b) { return a - b; }, [](float a, float b) { return a - b; });
  CheckBinary([](F32x4 a, F32x4 b) { return a * b; }, [](float a, float b) { return a * b; });
  CheckBinary([](F32x4 a, F32x4 b) { return a / b; }, [](float a, float b) { return a / b; });
  CheckUnary([](F32x4 a) { return Sqrt(a); }, [](float a) { return std::sqrt(a); });
  // Fused, this were not 0.
  const float a = 1.0f + 0x1p-12f, square = a * a;
  const F32x4 difference = F32x4::Splat(a) * F32x4::Splat(a) + F32x4::Splat(-square);
  ExpectSame(Lanes(difference), {0, 0, 0, 0});
}

TEST(Simd, SignsOfZerosChangeToo) {
  CheckUnary([](F32x4 a) { return -a; }, [](float a) { return -a; });
  CheckUnary([](F32x4 a) { return Abs(a); }, [](float a) { return std::fabs(a); });
}

TEST(Simd, MinAndMaxTakeTheSecondOfEqualsAndOfNaN) {
  CheckBinary([](F32x4 a, F32x4 b) { return Min(a, b); },
              [](float a, float b) { return a < b ? a : b; });
  CheckBinary([](F32x4 a, F32x4 b) { return Max(a, b); },
              [](float a, float b) { return a > b ? a : b; });
}

TEST(Simd, ComparisonsWithNaNAreFalse) {
  CheckComparison([](F32x4 a, F32x4 b) { return a < b; }, [](float a, float b) { return a < b; });
  CheckComparison([](F32x4 a, F32x4 b) { return a <= b; }, [](float a, float b) { return a <= b; });
  CheckComparison([](F32x4 a, F32x4 b) { return a > b; }, [](float a, float b) { return a > b; });
  CheckComparison([](F32x4 a, F32x4 b) { return a >= b; }, [](float a, float b) { return a >= b; });
  CheckComparison([](F32x4 a, F32x4 b) { return a == b; }, [](float a, float b) { return a == b; });
}

TEST(Simd, MasksCombineAndSelect) {
  for (unsigned a = 0; a < 16; ++a) {
    const Mask32x4 mask = MaskOf(a);
    EXPECT_EQ(Bits(mask), a);
    EXPECT_EQ(Any(mask), a != 0);
    EXPECT_EQ(All(mask), a == 15);
    EXPECT_EQ(FirstTrue(mask), a == 0 ? 4 : __builtin_ctz(a));
    for (unsigned b = 0; b < 16; ++b) {
      EXPECT_EQ(Bits(mask & MaskOf(b)), a & b);
      EXPECT_EQ(Bits(mask | MaskOf(b)), a | b);
    }
    const Floats yes = {kNaN, -0.0f, 1, -kInfinity}, no = {0.0f, 2, kNaN, 7};
    Floats expected;
    for (size_t i = 0; i < 4; ++i) expected[i] = (a >> i & 1) != 0 ? yes[i] : no[i];
    ExpectSame(Lanes(Select(mask, Load(yes), Load(no))), expected);
  }
  EXPECT_EQ(Bits(Mask32x4{}), 0u);
}

TEST(Simd, LanesAreZippedAndTransposed) {
  const F32x4 a = F32x4::Of(0, 1, 2, 3), b = F32x4::Of(10, 11, 12, 13);
  ExpectSame(Lanes(ZipLow(a, b)), {0, 10, 1, 11});
  ExpectSame(Lanes(ZipHigh(a, b)), {2, 12, 3, 13});
  F32x4 rows[] = {a, b, F32x4::Of(20, 21, 22, 23), F32x4::Of(30, 31, 32, 33)};
  Transpose(rows);
  for (size_t i = 0; i < 4; ++i) {
    const float column = static_cast<float>(i);
    ExpectSame(Lanes(rows[i]), {column, column + 10, column + 20, column + 30});
  }
}

TEST(Simd, IntegersWrapAndConvert) {
  constexpr int32_t kLow = INT32_MIN, kHigh = INT32_MAX;
  const Integers a = {kLow, kHigh, -7, 16777217}, b = {1, -1, kHigh, kLow};
  for (size_t i = 0; i < 4; ++i) {
    EXPECT_EQ(Lanes(Load(a) + Load(b))[i], WrapAdd(a[i], b[i]));
    EXPECT_EQ(Lanes(Load(a) - Load(b))[i], WrapSubtract(a[i], b[i]));
    EXPECT_EQ(Lanes(ToFloat(Load(a)))[i], static_cast<float>(a[i]));
    EXPECT_EQ(Lanes(ToFloat(Load(b)))[i], static_cast<float>(b[i]));
    EXPECT_EQ(Lanes(I32x4::Splat(kLow))[i], kLow);
  }
}

TEST(Simd, TwoOfThreeAreTakenApart) {
  GuardedArray<int32_t> triples(12);
  for (size_t i = 0; i < 12; ++i) triples[i] = static_cast<int32_t>(i * 0x10000001u);
  I32x4 first, second;
  LoadFirstTwoOfThree(triples.data(), &first, &second);
  for (size_t i = 0; i < 4; ++i) {
    EXPECT_EQ(Lanes(first)[i], triples[3 * i]);
    EXPECT_EQ(Lanes(second)[i], triples[3 * i + 1]);
  }
}

// All pairs of the extremes, so that both products and their sum pass 31 bits.
TEST(Simd, ShortsWidenAndTheirProductsWrap) {
  constexpr int16_t kExtremes[] = {INT16_MIN, INT16_MIN + 1, -1, 0, 1, 1234, INT16_MAX};
  Random random = TestRandom();
  for (const int16_t s : kExtremes) {
    for (const int16_t t : kExtremes) {
      std::vector<int16_t> a = random.Integers<int16_t>(8), b = random.Integers<int16_t>(8);
      a[0] = b[0] = a[7] = b[7] = INT16_MIN;
      std::vector<int32_t> sums = random.Integers<int32_t>(8);
      const I16x8 va = I16x8::Load(a.data()), vb = I16x8::Load(b.data());
      I32x4 low = I32x4::Load(sums.data()), high = I32x4::Load(sums.data() + 4);
      AddProducts(va, s, vb, t, &low, &high);
      for (size_t i = 0; i < 8; ++i) {
        const Integers sum = i < 4 ? Lanes(low) : Lanes(high);
        EXPECT_EQ(sum[i % 4], WrapAdd(WrapAdd(sums[i], a[i] * s), b[i] * t)) << i;
        EXPECT_EQ(Lanes(i < 4 ? WidenLow(va) : WidenHigh(va))[i % 4], a[i]) << i;
      }
    }
  }
}

TEST(Simd, BytesBecomeFloatsAndBack) {
  GuardedArray<uint8_t> bytes(8);
  GuardedArray<uint8_t> out(4);
  for (int first = 0; first < 256; first += 8) {
    for (size_t i = 0; i < 8; ++i) bytes[i] = static_cast<uint8_t>(first + static_cast<int>(i));
    F32x4 low, high;
    LoadBytes(bytes.data(), &low, &high);
    for (size_t i = 0; i < 4; ++i) {
      EXPECT_EQ(Lanes(low)[i], static_cast<float>(bytes[i]));
      EXPECT_EQ(Lanes(high)[i], static_cast<float>(bytes[i + 4]));
    }
    StoreBytes(high, out.data());
    for (size_t i = 0; i < 4; ++i) EXPECT_EQ(out[i], bytes[i + 4]);
  }
}

TEST(Simd, StoredBytesTruncateAndSaturate) {
  for (size_t s = 0; s < kSpecialCount; ++s) {
    const Floats a = Special(s);
    GuardedArray<uint8_t> out(4);
    StoreBytes(Load(a), out.data());
    for (size_t i = 0; i < 4; ++i) {
      const int expected = a[i] >= 255.0f ? 255 : a[i] > 0.0f ? static_cast<int>(a[i]) : 0;
      EXPECT_EQ(out[i], expected) << a[i];
    }
  }
}

}  // namespace
}  // namespace n3ds::testing
