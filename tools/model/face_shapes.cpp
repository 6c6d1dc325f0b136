// SPDX-License-Identifier: MIT
#include "model/face_shapes.h"

#include <algorithm>
#include <cstdint>

#include "support/vector3.h"

namespace n3ds::tool {
namespace {

constexpr double kTensorStep = 40;  // in the file's fixed-point units

Points Decode(const std::int16_t* stored, double factor) {
  Points points(kModelVertices);
  for (std::size_t v = 0; v < kModelVertices; ++v) {
    points[v] = UprightPoint(stored + 3 * v);
    for (double& value : points[v]) value *= factor;
  }
  return points;
}

Points DecodeSteps(const std::int8_t* stored, double identity_unit) {
  if (std::all_of(stored, stored + kModelCoordinates, [](std::int8_t s) { return s == 0; })) {
    return {};
  }
  const std::vector<std::int16_t> wide(stored, stored + kModelCoordinates);
  return Decode(wide.data(), kTensorStep / identity_unit);
}

void AddShape(double factor, const Points& shape, Points& face) {
  if (factor == 0) return;
  for (std::size_t v = 0; v < shape.size(); ++v) AddScaled(factor, shape[v], face[v]);
}

}  // namespace

FaceShapes::FaceShapes(const FaceModelFile& model, double identity_unit) : mean_(MeanFace(model)) {
  for (std::size_t i = 0; i < kModelIdentities; ++i) {
    identity_.push_back(Decode(&model.identity[i * kModelCoordinates], 1 / identity_unit));
  }
  for (std::size_t e = 0; e < kModelExpressions; ++e) {
    expression_.push_back(Decode(&model.expression[e * kModelCoordinates], 1));
  }
  for (std::size_t block = 0; block < kModelIdentities * kModelExpressions; ++block) {
    interaction_.push_back(
        DecodeSteps(&model.interaction[block * kModelCoordinates], identity_unit));
  }
}

Points FaceShapes::Compose(const FaceCoefficients& coefficients) const {
  Points face = mean_;
  for (std::size_t i = 0; i < kModelIdentities; ++i) {
    AddShape(coefficients.identity[i], identity_[i], face);
  }
  for (std::size_t e = 0; e < kModelExpressions; ++e) {
    if (coefficients.expression[e] == 0) continue;
    AddShape(coefficients.expression[e], expression_[e], face);
    for (std::size_t i = 0; i < kModelIdentities; ++i) {
      if (!IsInteractionRead(i, e)) continue;
      AddShape(coefficients.identity[i] * coefficients.expression[e], Interaction(i, e), face);
    }
  }
  return face;
}

}  // namespace n3ds::tool
