// SPDX-License-Identifier: MIT
// Random people, the same on every machine.
#pragma once

#include <array>
#include <cstdint>
#include <random>

#include "model/face_shapes.h"

namespace n3ds::tool {

constexpr std::size_t kRandomPeople = 1000;

class RandomPeople {
 public:
  // Identity from the normal distribution of the population.
  std::array<double, kModelIdentities> Identity();
  // A few expressions at once, each with a chance of `share` and up to full intensity.
  std::array<double, kModelExpressions> Expressions(double share);

 private:
  double Uniform();  // from 0 to below 1
  double Normal();

  std::mt19937_64 bits_{2141796};
};

}  // namespace n3ds::tool
