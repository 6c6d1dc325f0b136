// SPDX-License-Identifier: MIT
#include "steady/tracker_output.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "core/dense_model.h"
#include "core/output_matrices.h"
#include "steady/measurements.h"

namespace n3ds::steady {

namespace {

struct Point {
  float x[3];
};

Point ToOutput(const OutputFrame& frame, const float* model_point) {
  float d[3];
  for (int i = 0; i < 3; i++) d[i] = model_point[i] - frame.shift[i];
  const float* r = frame.turn.m;
  Point p;
  for (int i = 0; i < 3; i++) {
    p.x[i] = (r[i] * d[0] + r[3 + i] * d[1] + r[6 + i] * d[2]) / frame.growth;
  }
  return p;
}

// Coefficients of the model file, within what the mesh's products of both can hold.
struct Coefficients {
  float identity[kIdentityCount];
  float expression[kExpressionCount];
};
Coefficients CoefficientsOf(const StateMean& mean) {
  constexpr float kLargestIdentity = 0.8f;
  constexpr float kLargestExpression = 1.2f;
  Coefficients c;
  for (int k = 0; k < kIdentityCount; k++) {
    c.identity[k] = std::clamp(mean.identity[k] / 8, -kLargestIdentity, kLargestIdentity);
  }
  for (int j = 0; j < kExpressionCount; j++) {
    c.expression[j] = std::clamp(mean.expression[j], -kLargestExpression, kLargestExpression);
  }
  return c;
}

}  // namespace

OutputFrame OutputFrameOf(const Model& model, const Face& face) {
  const StateMean& mean = face.mean;
  float motion[7] = {};
  for (int i = 0; i < 7; i++) {
    for (int k = 0; k < kIdentityCount; k++) {
      motion[i] += model.output_frame[i][k] * mean.identity[k];
    }
  }
  OutputFrame frame;
  frame.turn = TurnBy(motion);
  for (int i = 0; i < 3; i++) frame.shift[i] = motion[3 + i];
  frame.growth = std::max(1 + motion[6], 0.1f);
  frame.rotation = mean.rotation * frame.turn;
  const auto depth = static_cast<float>(std::exp(static_cast<double>(mean.place[2])));
  const float centre[3] = {mean.place[0] * depth, mean.place[1] * depth, depth};
  for (int i = 0; i < 3; i++) {
    const float* row = mean.rotation.m + 3 * ptrdiff_t{i};
    float at = centre[i];
    for (int k = 0; k < 3; k++) at += row[k] * (frame.shift[k] - model.centre[k]);
    frame.translation[i] = at / frame.growth;
  }
  return frame;
}

void ReportFace(const Model& model, const Face& face, const float* camera, bool tilted,
                uint32_t landmark_count, N3DS_RIGID_MATRIX* record) {
  const OutputFrame frame = OutputFrameOf(model, face);
  float rotation[9];
  if (tilted) {
    TiltRotation(frame.rotation.m, rotation);
  } else {
    std::memcpy(rotation, frame.rotation.m, sizeof(rotation));
  }
  N3DS_RIGID_MATRIX result = {};
  WriteModelViewAndProjection(rotation, frame.translation, camera, result.modelMatrix,
                              result.projectionMatrix);
  SplitModelView(result, record);

  const auto write = [&](int to, int a, int b) {
    float middle[3];
    for (int axis = 0; axis < 3; axis++) {
      middle[axis] = (face.point[axis][a] + face.point[axis][b]) / 2;
    }
    Point p = ToOutput(frame, middle);
    if (tilted) TiltPoint(p.x);
    std::memcpy(record->landmarks3D + 3 * static_cast<ptrdiff_t>(to), p.x, sizeof(p.x));
  };
  for (int i = 0; i < kLandmarkCount; i++) write(i, i, i);
  if (landmark_count <= kLandmarkCount) return;
  write(101, 95, 95);
  write(102, 96, 96);
  for (int i = 0; i < kMiddleCount; i++) write(103 + i, kMiddles[i].a, kMiddles[i].b);
}

void BuildMesh(const TrackingContext& context, const Model& model, const Face& face,
               float* vertices) {
  const Coefficients coefficients = CoefficientsOf(face.mean);
  int16_t products[kProductCount];
  BuildProductTable(coefficients.identity, coefficients.expression, products);
  FaceMeshTask task = {context.meanShape,
                       context.identityBasis,
                       context.expressionBasis,
                       context.tensor,
                       coefficients.identity,
                       coefficients.expression,
                       products,
                       0,
                       kVertexCount,
                       vertices};
  _GetFace3DModel_Thread(&task);
  const OutputFrame frame = OutputFrameOf(model, face);
  for (ptrdiff_t v = 0; v < kVertexCount; v++) {
    float* const vertex = vertices + 3 * v;
    for (int axis = 0; axis < 3; axis++) {
      float offset = 0;
      for (int i = 0; i < Model::kOffsetNeighbours; i++) {
        offset += model.neighbour_share[v][i] * face.offset[axis][model.neighbour[v][i]];
      }
      vertex[axis] += offset;
    }
    const Point p = ToOutput(frame, vertex);
    std::memcpy(vertex, p.x, sizeof(p.x));
  }
}

}  // namespace n3ds::steady
