// SPDX-License-Identifier: MIT
#include "core/shape_sums.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <memory>
#include <vector>

#include "support/bits.h"
#include "support/test_random.h"

namespace n3ds::testing {

namespace {

// Vectors in allocations of exactly their size, with all values in use, the extremes often.
class Vectors {
 public:
  Vectors(int count, Random* random) {
    for (int g = 0; g < kSumGroup; g++) {
      data_[g].reset(new int16_t[count]);
      for (int i = 0; i < count; i++) {
        const int kind = random->Int(0, 7);
        data_[g][i] = static_cast<int16_t>(kind == 0   ? INT16_MIN
                                           : kind == 1 ? INT16_MAX
                                                       : random->Int(INT16_MIN, INT16_MAX));
      }
      pointers_[g] = data_[g].get();
    }
  }
  const int16_t* const* get() const { return pointers_; }

 private:
  std::unique_ptr<int16_t[]> data_[kSumGroup];
  const int16_t* pointers_[kSumGroup];
};

TEST(ShapeSums, WeightedFormsGiveTheSameBits) {
  Random random = TestRandom();
  for (int count = 0; count <= 70; count++) {
    const Vectors vectors(count, &random);
    float weights[kSumGroup];
    for (float& w : weights) w = static_cast<float>(random.In(-3, 3));
    std::unique_ptr<float[]> sums(new float[count]), expected(new float[count]);
    for (int i = 0; i < count; i++) {
      sums[i] = expected[i] = static_cast<float>(random.In(-1e5, 1e5));
    }
    AddWeighted(weights, vectors.get(), count, sums.get());
    AddWeightedPortable(weights, vectors.get(), count, expected.get());
    ASSERT_EQ(Bits(sums, static_cast<size_t>(count)), Bits(expected, static_cast<size_t>(count)))
        << count;
  }
}

TEST(ShapeSums, ProductFormsGiveTheSameBits) {
  Random random = TestRandom();
  for (int count = 0; count <= 70; count++) {
    const Vectors vectors(count, &random);
    int16_t weights[kSumGroup];
    for (int16_t& w : weights) w = static_cast<int16_t>(random.Int(INT16_MIN, INT16_MAX));
    weights[count % kSumGroup] = count % 2 == 0 ? INT16_MAX : INT16_MIN;
    if (count % 5 == 0) std::fill_n(weights, kSumGroup, int16_t{INT16_MIN});
    std::unique_ptr<int32_t[]> sums(new int32_t[count]), expected(new int32_t[count]);
    for (int i = 0; i < count; i++) {
      sums[i] = expected[i] = random.Int(INT32_MIN, INT32_MAX);
    }
    AddProducts(weights, vectors.get(), count, sums.get());
    AddProductsPortable(weights, vectors.get(), count, expected.get());
    for (int i = 0; i < count; i++) ASSERT_EQ(sums[i], expected[i]) << i << " of " << count;
  }
}

// The terms are added to what is there, one by one and in order: in another order, or fused, these
// numbers come out differently.
TEST(ShapeSums, WeightedTermsAreRoundedOneByOneInOrder) {
  const std::vector<int16_t> one(9, 1), large(9, 16384), minus(9, -16384);
  const int16_t* vectors[kSumGroup] = {large.data(), one.data(), minus.data(), one.data()};
  const float weights[kSumGroup] = {1024.0f, 0.4f, 1024.0f, 0.25f};
  std::vector<float> sums(9, 0.5f);
  AddWeighted(weights, vectors, 9, sums.data());
  // 2^24 + 0.5 rounds to 2^24, and so does 2^24 + 0.4; only the last term is left.
  for (const float sum : sums) EXPECT_EQ(sum, 0.25f);
}

TEST(ShapeSums, ProductSumsWrap) {
  const std::vector<int16_t> lowest(9, INT16_MIN);
  const int16_t* vectors[kSumGroup] = {lowest.data(), lowest.data(), lowest.data(), lowest.data()};
  const int16_t weights[kSumGroup] = {-INT16_MAX, -INT16_MAX, -INT16_MAX, -INT16_MAX};
  std::vector<int32_t> sums(9, 0);
  AddProducts(weights, vectors, 9, sums.data());
  // 4 * 32767 * 32768 = 2^32 - 2^17
  for (const int32_t sum : sums) EXPECT_EQ(sum, -(1 << 17));
}

}  // namespace
}  // namespace n3ds::testing
