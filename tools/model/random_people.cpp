// SPDX-License-Identifier: MIT
#include "model/random_people.h"

#include <cmath>

namespace n3ds::tool {

// The standard library's distributions may differ between libraries, its generators do not.
double RandomPeople::Uniform() { return static_cast<double>(bits_() >> 11) * 0x1p-53; }

double RandomPeople::Normal() {
  constexpr double kTwoPi = 6.283185307179586;
  const double radius = std::sqrt(-2 * std::log(1 - Uniform()));
  return radius * std::cos(kTwoPi * Uniform());
}

std::array<double, kModelIdentities> RandomPeople::Identity() {
  std::array<double, kModelIdentities> identity{};
  for (double& value : identity) value = Normal();
  return identity;
}

std::array<double, kModelExpressions> RandomPeople::Expressions(double share) {
  std::array<double, kModelExpressions> expression{};
  for (double& value : expression) {
    const double intensity = Uniform();
    value = Uniform() < share ? intensity : 0;
  }
  return expression;
}

}  // namespace n3ds::tool
