// SPDX-License-Identifier: MIT
#include "support/statistics.h"

#include <algorithm>
#include <cmath>
#include <cstddef>

namespace n3ds::tool {

double Percentile(std::vector<double> sample, double fraction) {
  if (sample.empty()) return 0;
  const double rank = std::ceil(fraction * static_cast<double>(sample.size()));
  const std::size_t index =
      std::min(sample.size() - 1, static_cast<std::size_t>(std::max(rank, 1.0)) - 1);
  const auto nth = sample.begin() + static_cast<std::ptrdiff_t>(index);
  std::nth_element(sample.begin(), nth, sample.end());
  return *nth;
}

double RootMeanSquare(const std::vector<double>& sample) {
  if (sample.empty()) return 0;
  double sum = 0;
  for (const double value : sample) sum += value * value;
  return std::sqrt(sum / static_cast<double>(sample.size()));
}

}  // namespace n3ds::tool
