// SPDX-License-Identifier: MIT
// A model file's shapes in millimetres, and the faces they add up to.
#pragma once

#include <array>
#include <cstddef>
#include <vector>

#include "model/face_model_file.h"

namespace n3ds::tool {

// Standard deviations of the population in one unit of an identity coefficient, in the shipped
// model. The file does not say it.
constexpr double kIdentityUnit = 8;

struct FaceCoefficients {
  std::array<double, kModelIdentities> identity{};     // standard deviations
  std::array<double, kModelExpressions> expression{};  // 1 is full intensity
};

// Whether the engine's dense mesh takes a block of the interaction into account: those with an even
// sum of indices, and the whole row of the last identity.
constexpr bool IsInteractionRead(std::size_t identity, std::size_t expression) {
  return (identity + expression) % 2 == 0 || identity == kModelIdentities - 1;
}

// Everything in the upright frame of the engine's model matrix.
class FaceShapes {
 public:
  FaceShapes(const FaceModelFile& model, double identity_unit);

  const Points& mean() const { return mean_; }
  // Mean, identity, expression and their interaction, as in the engine's dense mesh but in full
  // precision.
  Points Compose(const FaceCoefficients& coefficients) const;

 private:
  const Points& Interaction(std::size_t identity, std::size_t expression) const {
    return interaction_[identity * kModelExpressions + expression];
  }

  Points mean_;
  std::vector<Points> identity_;     // for one standard deviation
  std::vector<Points> expression_;   // at full intensity
  std::vector<Points> interaction_;  // identity (outer) by expression; empty where all zero
};

}  // namespace n3ds::tool
