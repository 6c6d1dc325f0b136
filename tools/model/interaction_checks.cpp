// SPDX-License-Identifier: MIT
#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <string>

#include "eval/text_table.h"
#include "model/face_shapes.h"
#include "model/model_checks.h"
#include "model/random_people.h"

namespace n3ds::tool {
namespace {

// Blocks that hold a value, identity (outer) by expression.
std::vector<bool> FilledBlocks(const FaceModelFile& model) {
  std::vector<bool> filled;
  for (std::size_t b = 0; b < kModelIdentities * kModelExpressions; ++b) {
    const auto first =
        model.interaction.begin() + static_cast<std::ptrdiff_t>(b * kModelCoordinates);
    filled.push_back(std::any_of(first, first + kModelCoordinates, [](int v) { return v != 0; }));
  }
  return filled;
}

// Whether a product that meets a filled block reaches 1, where the dense mesh's 16 bits wrap.
bool Wraps(const FaceCoefficients& person, double identity_unit, const std::vector<bool>& filled) {
  for (std::size_t i = 0; i < kModelIdentities; ++i) {
    for (std::size_t e = 0; e < kModelExpressions; ++e) {
      if (!filled[i * kModelExpressions + e] || !IsInteractionRead(i, e)) continue;
      const double product = person.identity[i] / identity_unit * person.expression[e];
      if (std::abs(product) >= 1) return true;
    }
  }
  return false;
}

double LargestValue(const std::vector<std::int16_t>& values) {
  int largest = 0;
  for (const std::int16_t value : values) largest = std::max(largest, std::abs(int{value}));
  return largest / 256.0;
}

}  // namespace

void CheckInteraction(const FaceModelFile& model, double identity_unit, CheckReport& report) {
  report.Section("Interaction and scales");
  const std::vector<bool> filled = FilledBlocks(model);
  const auto count = std::count(filled.begin(), filled.end(), true);
  report.Figure("filled blocks of 320", std::to_string(count));
  std::size_t unread = 0;
  for (std::size_t b = 0; b < filled.size(); ++b) {
    if (filled[b] && !IsInteractionRead(b / kModelExpressions, b % kModelExpressions)) ++unread;
  }
  report.Equal("filled blocks that nothing reads", unread, 0);
  RandomPeople people;
  std::size_t usual = 0;
  std::size_t full = 0;
  for (std::size_t n = 0; n < kRandomPeople; ++n) {
    FaceCoefficients person = {people.Identity(), people.Expressions(1)};
    if (Wraps(person, identity_unit, filled)) ++usual;
    person.expression.fill(1);
    if (Wraps(person, identity_unit, filled)) ++full;
  }
  report.Equal("people of 1,000 whose products wrap", usual, 0);
  report.Check("the same with every expression at full intensity", std::to_string(full), full <= 1,
               "<= 1");
  report.Figure("largest identity value, mm at coefficient 1",
                Decimal(LargestValue(model.identity), 1));
  report.Figure("largest expression value, mm at coefficient 1",
                Decimal(LargestValue(model.expression), 1));
}

}  // namespace n3ds::tool
