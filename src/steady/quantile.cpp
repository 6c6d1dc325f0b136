// SPDX-License-Identifier: MIT
#include "steady/quantile.h"

#include <algorithm>

namespace n3ds::steady {

float SelectSmallest(float* values, int count, int rank) {
  std::nth_element(values, values + rank, values + count);
  return values[rank];
}

}  // namespace n3ds::steady
