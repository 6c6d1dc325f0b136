// SPDX-License-Identifier: MIT
// Order statistics of small samples.
#pragma once

#include <vector>

namespace n3ds::tool {

// The value below which a share of `fraction` (0 to 1) of the sample lies, by the nearest rank
// (0 for an empty sample). Taken by value because it sorts.
double Percentile(std::vector<double> sample, double fraction);
// Root of the mean square, 0 for an empty sample.
double RootMeanSquare(const std::vector<double>& sample);

}  // namespace n3ds::tool
