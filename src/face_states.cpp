// SPDX-License-Identifier: MIT
#include "face_states.h"

#include <cmath>
#include <cstring>

#include "core/output_matrices.h"
#include "steady/tracker_output.h"

namespace n3ds {

namespace {

// A classic fit that is off by this share of the face's size is half trusted.
constexpr float kDoubtfulMisfit = 0.05f;

float Degrees(double sine, double cosine) {
  constexpr double kDegrees = 57.29577951308232;
  return static_cast<float>(std::atan2(sine, cosine) * kDegrees);
}

// Head position and angles from the pose of the upright head, rotation row by row.
void SetPose(const float* rotation, const float* translation, Norvale_3DSticker_Face_State* state) {
  std::memcpy(state->headPosition, translation, sizeof(state->headPosition));
  // The directions of the nose and of the head's top in the camera frame.
  const double nose[3] = {static_cast<double>(rotation[2]), static_cast<double>(rotation[5]),
                          static_cast<double>(rotation[8])};
  const double top[3] = {static_cast<double>(rotation[1]), static_cast<double>(rotation[4]),
                         static_cast<double>(rotation[7])};
  const double level = std::sqrt(nose[0] * nose[0] + nose[2] * nose[2]);
  state->yaw = Degrees(nose[0], -nose[2]);
  state->pitch = Degrees(-nose[1], level);
  // Without roll the top lies in the upright plane through the nose.
  const double across[3] = {level > 0 ? -nose[2] / level : 1, 0, level > 0 ? nose[0] / level : 0};
  const double up[3] = {across[2] * nose[1], across[0] * nose[2] - across[2] * nose[0],
                        -across[0] * nose[1]};
  const double sine = top[0] * across[0] + top[2] * across[2];
  const double cosine = top[0] * up[0] + top[1] * up[1] + top[2] * up[2];
  state->roll = Degrees(sine, cosine);
}

float Distance(const int32_t* landmarks, int a, int b) {
  const float x = static_cast<float>(landmarks[2 * a]) - static_cast<float>(landmarks[2 * b]);
  const float y =
      static_cast<float>(landmarks[2 * a + 1]) - static_cast<float>(landmarks[2 * b + 1]);
  return std::sqrt(x * x + y * y);
}

// Root mean square distance of the inner landmarks from their vertices in the image, pixels.
float ClassicMisfit(const TrackingContext& context, uint32_t face, const float* rotation,
                    const int32_t* landmarks) {
  const float* const camera = context.camera;
  const float* const t = context.pose[face] + 4;
  float sum = 0;
  for (int i = 0; i < kInnerLandmarkCount; i++) {
    const float* v =
        context.shape[face] + 3 * static_cast<ptrdiff_t>(kInnerLandmarkVertexIndices[i]);
    float p[3];
    for (int row = 0; row < 3; row++) {
      const float* r = rotation + 3 * static_cast<ptrdiff_t>(row);
      p[row] = r[0] * v[0] + r[1] * v[1] + r[2] * v[2] + t[row];
    }
    const float depth = p[2] > 1.0f ? p[2] : 1.0f;
    const int32_t* landmark = landmarks + 2 * static_cast<ptrdiff_t>(kOutlineLandmarkCount + i);
    const float x = camera[0] * p[0] / depth + camera[2] - static_cast<float>(landmark[0]);
    const float y = camera[4] * p[1] / depth + camera[5] - static_cast<float>(landmark[1]);
    sum += x * x + y * y;
  }
  return std::sqrt(sum / kInnerLandmarkCount);
}

}  // namespace

Norvale_3DSticker_Face_State ClassicFaceState(const TrackingContext& context, uint32_t face) {
  Norvale_3DSticker_Face_State state = {};
  float rotation[9];
  QuatToRotationMatrix(context.pose[face], rotation);
  float tilted[9];
  TiltRotation(rotation, tilted);
  SetPose(tilted, context.pose[face] + 4, &state);
  const int32_t* landmarks =
      context.landmarkHistory + 2 * static_cast<size_t>(context.landmarkNum) * face;
  state.misfit = ClassicMisfit(context, face, rotation, landmarks);
  const float size = Distance(landmarks, 39, 57) + Distance(landmarks, 9, 97);
  const float off = state.misfit / (kDoubtfulMisfit * (size + 1));
  state.confidence = context.fitGivenUp[face] != 0 ? 0.0f : 1.0f / (1.0f + off * off);
  std::memcpy(state.expression, context.expressionCoef[face], sizeof(state.expression));
  for (int k = 0; k < kIdentityCount; k++) state.identity[k] = 8 * context.identityCoef[face][k];
  return state;
}

Norvale_3DSticker_Face_State SteadyFaceState(const steady::Model& model, const steady::Face& face) {
  Norvale_3DSticker_Face_State state = {};
  const steady::OutputFrame frame = steady::OutputFrameOf(model, face);
  float tilted[9];
  TiltRotation(frame.rotation.m, tilted);
  SetPose(tilted, frame.translation, &state);
  state.id = face.id;
  state.framesTracked = static_cast<uint32_t>(face.age);
  state.isNew = face.age <= 1 ? 1 : 0;
  state.misfit = face.misfit;
  state.confidence = face.confidence;
  std::memcpy(state.expression, face.mean.expression, sizeof(state.expression));
  std::memcpy(state.identity, face.mean.identity, sizeof(state.identity));
  return state;
}

}  // namespace n3ds
