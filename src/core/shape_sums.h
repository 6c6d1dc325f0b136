// SPDX-License-Identifier: MIT
// Weighted sums of the model's 16-bit vectors, coordinate by coordinate: what a face's mesh is made
// of. Lanes of the vector forms are different coordinates, and float terms are added in order;
// integer terms may be added in pairs, which sums that wrap do not show. So every form gives the
// same bits as the portable one, which is the definition.
#pragma once

#include <cstdint>

namespace n3ds {

// Vectors added in one pass over the sums.
constexpr int kSumGroup = 4;

// sums[i] += weights[g] * vectors[g][i], g in order; products and sums are rounded one by one.
void AddWeighted(const float* weights, const int16_t* const* vectors, int count, float* sums);
void AddWeightedPortable(const float* weights, const int16_t* const* vectors, int count,
                         float* sums);

// The same in integers; the sums wrap.
void AddProducts(const int16_t* weights, const int16_t* const* vectors, int count, int32_t* sums);
void AddProductsPortable(const int16_t* weights, const int16_t* const* vectors, int count,
                         int32_t* sums);

}  // namespace n3ds
