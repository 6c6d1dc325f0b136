// SPDX-License-Identifier: MIT
#include "steady/model.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "core/output_matrices.h"
#include "steady/dense_solver.h"
#include "steady/outline_rows.h"

namespace n3ds::steady {

namespace {

constexpr float kModelUnit = 1.0f / 256.0f;         // mm per unit of the model's integers
constexpr float kIdentityUnit = kModelUnit / 8.0f;  // the same per standard deviation

// A weighted sum of the model's vertices: a landmark or a place.
struct Blend {
  float mean[3] = {};
  float identity[kIdentityCount][3] = {};
  float expression[kExpressionCount][3] = {};
};

void AddVertex(const TrackingContext& context, int vertex, float share, Blend* blend) {
  const auto at = [vertex](const int16_t* vectors, int vector, int axis) {
    return static_cast<float>(
        vectors[static_cast<ptrdiff_t>(vector) * kShapeSize + 3 * ptrdiff_t{vertex} + axis]);
  };
  for (int axis = 0; axis < 3; axis++) {
    blend->mean[axis] += share * at(context.meanShape, 0, axis) * kModelUnit;
    for (int k = 0; k < kIdentityCount; k++) {
      blend->identity[k][axis] += share * at(context.identityBasis, k, axis) * kIdentityUnit;
    }
    for (int j = 0; j < kExpressionCount; j++) {
      blend->expression[j][axis] += share * at(context.expressionBasis, j, axis) * kModelUnit;
    }
  }
}

// As everywhere in the model: pairs of even index sum, and all expressions with the last identity.
bool Interact(int identity, int expression) {
  return (identity + expression) % 2 == 0 || identity == kIdentityCount - 1;
}

struct LandmarkVertices {
  int count;
  int vertices[2];
};

LandmarkVertices VerticesOf(int landmark) {
  if (landmark < kOutlineLandmarkCount) return {1, {kDefaultContourVertexIndices[landmark], 0}};
  if (landmark < kFitLandmarkCount) {
    return {1, {kInnerLandmarkVertexIndices[landmark - kOutlineLandmarkCount], 0}};
  }
  if (landmark < kFitLandmarkCount + 2) {
    const int32_t* lids = kLidVertexIndices[landmark - kFitLandmarkCount];
    return {2, {lids[0], lids[1]}};
  }
  return {1, {kRidgeVertexIndices[landmark - kFitLandmarkCount - 2], 0}};
}

void FillLandmark(const TrackingContext& context, int landmark, Model* model) {
  const LandmarkVertices from = VerticesOf(landmark);
  const float share = 1.0f / static_cast<float>(from.count);
  Blend blend;
  for (int i = 0; i < from.count; i++) AddVertex(context, from.vertices[i], share, &blend);
  for (int axis = 0; axis < 3; axis++) {
    model->mean[axis][landmark] = blend.mean[axis];
    for (int k = 0; k < kIdentityCount; k++) {
      model->identity[k][axis][landmark] = blend.identity[k][axis];
    }
    for (int j = 0; j < kExpressionCount; j++) {
      model->expression[j][axis][landmark] = blend.expression[j][axis];
    }
  }
  for (int k = 0; k < kIdentityCount; k++) {
    for (int j = 0; j < kExpressionCount; j++) {
      if (!Interact(k, j)) continue;
      const int16_t* steps =
          context.tensor + static_cast<ptrdiff_t>(k * kExpressionCount + j) * kShapeSize;
      for (int i = 0; i < from.count; i++) {
        for (int axis = 0; axis < 3; axis++) {
          model->interaction[k][j][axis][landmark] +=
              share * static_cast<float>(steps[3 * ptrdiff_t{from.vertices[i]} + axis]) *
              kIdentityUnit;
        }
      }
    }
  }
}

// A detector's outline ends a little behind the mesh's: the first place of the upper rows is carried
// on by so much, mm, from the ear downwards.
constexpr float kRowExtensions[] = {3.0f, 3.0f, 1.2f, 2.4f, 0.9f};
constexpr int kExtendedRows = 5;

// The three rows on either side of the chin's lowest landmark do not slide: detectors put them on
// the skin of the chin, and rows there cost 0.15 degrees.
constexpr int kFirstFixedRow = 7;

void FillRow(const TrackingContext& context, int landmark, Model* model) {
  const int from_ear = std::min(landmark, kOutlineLandmarkCount - 1 - landmark);
  const int first = landmark * kRowPlaces;
  for (int s = 0; s < kRowPlaces; s++) {
    Blend blend;
    if (from_ear >= kFirstFixedRow) {
      AddVertex(context, kDefaultContourVertexIndices[landmark], 1, &blend);
    } else {
      const SurfacePlace& place = kOutlineRows[landmark][s];
      for (int i = 0; i < 3; i++) {
        if (place.shares[i] != 0) AddVertex(context, place.vertices[i], place.shares[i], &blend);
      }
    }
    for (int axis = 0; axis < 2; axis++) {
      model->place_normal[axis][first + s] = kOutlineNormals[landmark][axis];
    }
    for (int axis = 0; axis < 3; axis++) {
      model->place_mean[axis][first + s] = blend.mean[axis];
      for (int k = 0; k < kIdentityCount; k++) {
        model->place_identity[k][axis][first + s] = blend.identity[k][axis];
        model->place_vectors[first + s][3 * k + axis] = blend.identity[k][axis];
      }
      for (int j = 0; j < kExpressionCount; j++) {
        model->place_expression[j][axis][first + s] = blend.expression[j][axis];
        model->place_vectors[first + s][kPlaceExpressionAt + 3 * j + axis] =
            blend.expression[j][axis];
      }
    }
  }
  if (from_ear >= kExtendedRows) return;
  float length = 0;
  for (const auto& mean : model->place_mean) {
    const float step = mean[first + 1] - mean[first];
    length += step * step;
  }
  const float share = kRowExtensions[from_ear] / std::sqrt(length);
  for (auto& mean : model->place_mean) mean[first] += share * (mean[first] - mean[first + 1]);
}

// Small motions of a point: turns about x, y and z, shifts, and growth.
struct Motions {
  double of[3][7];
};
Motions MotionsAt(const double* x, double turn_unit) {
  const double a = x[0] * turn_unit;
  const double b = x[1] * turn_unit;
  const double c = x[2] * turn_unit;
  return {{{0, c, -b, 1, 0, 0, a}, {-c, 0, a, 0, 1, 0, b}, {b, -a, 0, 0, 0, 1, c}}};
}

// What stickers are put on: brows and up, and the nose.
bool CarriesStickers(const double* x) {
  const double upright_y =
      static_cast<double>(kTiltCosine) * x[1] - static_cast<double>(kTiltSine) * x[2];
  const double upright_z =
      static_cast<double>(kTiltSine) * x[1] + static_cast<double>(kTiltCosine) * x[2];
  const bool upper_face = upright_y > 10;
  const bool nose = std::fabs(x[0]) < 15 && upright_y > -12 && upright_z > 80;
  return upper_face || nose;
}

void FillOutputFrame(const TrackingContext& context, Model* model) {
  double normal[7 * 7] = {};
  double right[kIdentityCount][7] = {};
  for (ptrdiff_t v = 0; v < kVertexCount; v++) {
    double x[3];
    for (int axis = 0; axis < 3; axis++) {
      x[axis] = context.meanShape[3 * v + axis] * static_cast<double>(kModelUnit);
    }
    if (!CarriesStickers(x)) continue;
    const Motions motions = MotionsAt(x, 1);
    for (int axis = 0; axis < 3; axis++) {
      const double* m = motions.of[axis];
      for (int i = 0; i < 7; i++) {
        for (int j = 0; j < 7; j++) normal[7 * i + j] += m[i] * m[j];
        for (ptrdiff_t k = 0; k < kIdentityCount; k++) {
          const int16_t step = context.identityBasis[k * kShapeSize + 3 * v + axis];
          right[k][i] += m[i] * step * static_cast<double>(kIdentityUnit);
        }
      }
    }
  }
  FactorSymmetric(normal, 7);
  for (int k = 0; k < kIdentityCount; k++) {
    SolveFactored(normal, 7, right[k]);
    for (int i = 0; i < 7; i++) model->output_frame[i][k] = static_cast<float>(right[k][i]);
  }
}

void FillGauge(Model* model) {
  constexpr double kTurnUnit = 0.02;  // makes turns as long as shifts
  constexpr double kRidge = 1e-3;     // keeps identities apart that the landmarks hardly tell
  for (int landmark = kOutlineLandmarkCount; landmark < kLandmarkCount; landmark++) {
    double x[3];
    for (int axis = 0; axis < 3; axis++) {
      x[axis] = static_cast<double>(model->mean[axis][landmark] - model->centre[axis]);
    }
    const Motions motions = MotionsAt(x, kTurnUnit);
    for (int axis = 0; axis < 3; axis++) {
      const int at = axis * kLandmarkStride + landmark;
      for (int i = 0; i < 7; i++) {
        // Growth is in units of turns, shifts in mm.
        model->gauge[i][at] = static_cast<float>(motions.of[axis][i]);
      }
      for (int k = 0; k < kIdentityCount; k++) {
        model->gauge[7 + k][at] = model->identity[k][axis][landmark];
      }
    }
  }
  double normal[kGaugeCount * kGaugeCount];
  for (int i = 0; i < kGaugeCount; i++) {
    for (int j = 0; j < kGaugeCount; j++) {
      double sum = i == j ? kRidge : 0;
      for (int q = 0; q < 3 * kLandmarkStride; q++) {
        sum += static_cast<double>(model->gauge[i][q]) * static_cast<double>(model->gauge[j][q]);
      }
      normal[i * kGaugeCount + j] = sum;
    }
  }
  FactorSymmetric(normal, kGaugeCount);
  for (int q = 0; q < 3 * kLandmarkStride; q++) {
    double x[kGaugeCount];
    for (int i = 0; i < kGaugeCount; i++) x[i] = static_cast<double>(model->gauge[i][q]);
    SolveFactored(normal, kGaugeCount, x);
    for (int i = 0; i < kGaugeCount; i++) model->gauge_dual[i][q] = static_cast<float>(x[i]);
  }
}

bool IsPupil(int landmark) {
  return landmark == kFitLandmarkCount || landmark == kFitLandmarkCount + 1;
}

// Offsets fade out smoothly over the skin: a Gaussian of the distance to each landmark on the mean
// face, normalised where landmarks are near, less where there is none.
void FillNeighbours(const TrackingContext& context, Model* model) {
  constexpr double kFade = 6.0;        // mm
  constexpr double kBackground = 0.1;  // share that no landmark takes
  for (ptrdiff_t v = 0; v < kVertexCount; v++) {
    struct Near {
      double distance;
      int16_t landmark;
    } nearest[kLandmarkCount];
    int count = 0;
    for (int landmark = kOutlineLandmarkCount; landmark < kLandmarkCount; landmark++) {
      double square = 0;
      for (int axis = 0; axis < 3; axis++) {
        const double step = context.meanShape[3 * v + axis] * static_cast<double>(kModelUnit) -
                            static_cast<double>(model->mean[axis][landmark]);
        square += step * step;
      }
      if (!IsPupil(landmark)) nearest[count++] = {square, static_cast<int16_t>(landmark)};
    }
    std::partial_sort(nearest, nearest + Model::kOffsetNeighbours, nearest + count,
                      [](const Near& a, const Near& b) {
                        return a.distance != b.distance ? a.distance < b.distance
                                                        : a.landmark < b.landmark;
                      });
    double sum = kBackground;
    double weights[Model::kOffsetNeighbours];
    for (int i = 0; i < Model::kOffsetNeighbours; i++) {
      weights[i] = std::exp(-0.5 * nearest[i].distance / (kFade * kFade));
      sum += weights[i];
    }
    for (int i = 0; i < Model::kOffsetNeighbours; i++) {
      model->neighbour[v][i] = nearest[i].landmark;
      model->neighbour_share[v][i] = static_cast<float>(weights[i] / sum);
    }
  }
}

}  // namespace

void BuildModel(const TrackingContext& context, Model* model) {
  std::memset(static_cast<void*>(model), 0, sizeof(*model));
  for (int landmark = 0; landmark < kLandmarkCount; landmark++) {
    FillLandmark(context, landmark, model);
  }
  for (int landmark = 0; landmark < kOutlineLandmarkCount; landmark++) {
    FillRow(context, landmark, model);
  }
  for (int landmark = kOutlineLandmarkCount; landmark < kLandmarkCount; landmark++) {
    if (!IsPupil(landmark)) model->has_offset[landmark] = 1;
  }
  constexpr int kCentreFrom = 39;  // eyes and nose
  constexpr int kCentreEnd = 75;
  for (int axis = 1; axis < 3; axis++) {
    for (int landmark = kCentreFrom; landmark < kCentreEnd; landmark++) {
      model->centre[axis] += model->mean[axis][landmark] / (kCentreEnd - kCentreFrom);
    }
  }
  FillOutputFrame(context, model);
  FillGauge(model);
  FillNeighbours(context, model);
}

}  // namespace n3ds::steady
