// SPDX-License-Identifier: MIT
#include <algorithm>
#include <string>

#include "eval/text_table.h"
#include "mesh/face_tables.h"
#include "mesh/mesh_shape.h"
#include "model/face_shapes.h"
#include "model/model_checks.h"
#include "model/random_people.h"
#include "support/vector3.h"

namespace n3ds::tool {
namespace {

constexpr double kSliver = 15;         // degrees, smallest angle that nearly all triangles exceed
constexpr double kSliverShare = 99;    // percent, what nearly all means
constexpr double kSmallestAngle = 5;   // degrees, for every triangle
constexpr double kSmallestArea = 0.3;  // mm2

// Random mixtures: three expressions at a time. Some no face can make, such as a raised lip with
// smile, funnel and puffed cheeks, and one in 1,500 folds at lip or nostril.
constexpr double kMixedShare = 0.15;
constexpr std::size_t kFoldedMixtures = 3;

struct Combination {
  const char* title;
  std::vector<const char*> expressions;
};

const std::vector<Combination>& Combinations() {
  static const std::vector<Combination> combinations = {
      {"smile + blink", {"mouth_smile_L", "mouth_smile_R", "eye_blink_L", "eye_blink_R"}},
      {"jaw open + brows up", {"jaw_open", "brow_inner_up", "brow_outer_up_L", "brow_outer_up_R"}}};
  return combinations;
}

FaceCoefficients Expressed(const std::vector<const char*>& names, double intensity) {
  FaceCoefficients coefficients;
  for (const char* name : names) coefficients.expression[ExpressionByName(name)] = intensity;
  return coefficients;
}

bool GoesBothWays(const std::string& expression) {
  return expression.find("_side") != std::string::npos;
}

void CheckMean(const FaceShapes& shapes, const FoldMeter& folds, CheckReport& report) {
  const std::vector<double> angles = SmallestAngles(shapes.mean(), FaceTriangles());
  const auto good =
      std::count_if(angles.begin(), angles.end(), [](double angle) { return angle > kSliver; });
  const double share = 100.0 * static_cast<double>(good) / static_cast<double>(angles.size());
  report.Check("triangles with all angles over 15 degrees, %", Decimal(share, 2),
               share >= kSliverShare, ">= 99");
  const double least_angle = *std::min_element(angles.begin(), angles.end());
  report.Check("smallest angle in the mean, degrees", Decimal(least_angle, 1),
               least_angle > kSmallestAngle, "> 5");
  const Facets facets = MeasureFacets(shapes.mean(), FaceTriangles());
  const double least_area = *std::min_element(facets.areas.begin(), facets.areas.end());
  report.Check("smallest triangle of the mean, mm2", Decimal(least_area, 2),
               least_area > kSmallestArea, "> 0.3");
  report.Below("sharpest edge of the mean, degrees", folds.SharpestEdge(shapes.mean()), 0,
               kFoldDegrees);
  report.Equal("edges that cut through the face at rest, lips too",
               CountCuts(shapes.mean(), FaceTriangles()), 0);
}

void CheckNeutralPeople(const FaceShapes& shapes, const FoldMeter& folds, CheckReport& report) {
  const Facets rest = MeasureFacets(shapes.mean(), FaceTriangles());
  RandomPeople people;
  double sharpest = 0;
  std::size_t turned = 0;
  for (std::size_t n = 0; n < kRandomPeople; ++n) {
    FaceCoefficients person;
    person.identity = people.Identity();
    const Points face = shapes.Compose(person);
    sharpest = std::max(sharpest, folds.SharpestEdge(face));
    const Facets facets = MeasureFacets(face, FaceTriangles());
    for (std::size_t t = 0; t < facets.normals.size(); ++t) {
      if (Dot(facets.normals[t], rest.normals[t]) < 0) ++turned;
    }
  }
  report.Below("sharpest edge over 1,000 random people", sharpest, 0, kFoldDegrees);
  report.Equal("triangles turned over in them", turned, 0);
}

void CheckExpressions(const FaceShapes& shapes, const FoldMeter& folds, CheckReport& report) {
  const auto check = [&](const std::string& title, const FaceCoefficients& coefficients) {
    report.Below("sharpest edge with " + title, folds.SharpestEdge(shapes.Compose(coefficients)), 0,
                 kFoldDegrees);
  };
  for (const std::string& name : ExpressionNames()) {
    check(name, Expressed({name.c_str()}, 1));
    if (GoesBothWays(name)) check("-" + name, Expressed({name.c_str()}, -1));
  }
  for (const Combination& c : Combinations()) check(c.title, Expressed(c.expressions, 1));
}

void CheckExpressivePeople(const FaceShapes& shapes, const FoldMeter& folds, CheckReport& report) {
  std::vector<FaceCoefficients> usual;
  for (const std::string& name : ExpressionNames()) usual.push_back(Expressed({name.c_str()}, 1));
  for (const Combination& c : Combinations()) usual.push_back(Expressed(c.expressions, 1));
  RandomPeople people;
  std::size_t folded = 0;
  std::size_t folded_mixed = 0;
  for (std::size_t n = 0; n < kRandomPeople; ++n) {
    FaceCoefficients person = usual[n % usual.size()];
    person.identity = people.Identity();
    if (folds.SharpestEdge(shapes.Compose(person)) >= kFoldDegrees) ++folded;
    person.expression = people.Expressions(kMixedShare);
    if (folds.SharpestEdge(shapes.Compose(person)) >= kFoldDegrees) ++folded_mixed;
  }
  report.Equal("folded faces of 1,000 people with each of these in turn", folded, 0);
  report.Check("folded faces of 1,000 people with random mixtures", std::to_string(folded_mixed),
               folded_mixed <= kFoldedMixtures, "<= " + std::to_string(kFoldedMixtures));
}

}  // namespace

void CheckShape(const FaceModelFile& model, double identity_unit, CheckReport& report) {
  report.Section("Shape");
  const FaceShapes shapes(model, identity_unit);
  const FoldMeter folds(FaceTriangles());
  CheckMean(shapes, folds, report);
  CheckNeutralPeople(shapes, folds, report);
  CheckExpressions(shapes, folds, report);
  CheckExpressivePeople(shapes, folds, report);
}

}  // namespace n3ds::tool
