// SPDX-License-Identifier: MIT
#include "engine_extensions.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <new>

#include "core/model_tables.h"
#include "core/video_driver.h"
#include "face_states.h"
#include "steady/tracker_output.h"

namespace n3ds {

static_assert(sizeof(Norvale_3DSticker_Options) == 24);
static_assert(offsetof(Norvale_3DSticker_Options, tracker) == 4 &&
              offsetof(Norvale_3DSticker_Options, refitLimit) == 8 &&
              offsetof(Norvale_3DSticker_Options, focalLength) == 12 &&
              offsetof(Norvale_3DSticker_Options, smoothing) == 16 &&
              offsetof(Norvale_3DSticker_Options, workers) == 20);
static_assert(sizeof(Norvale_3DSticker_Face_State) == 192);
static_assert(offsetof(Norvale_3DSticker_Face_State, framesTracked) == 8 &&
              offsetof(Norvale_3DSticker_Face_State, misfit) == 16 &&
              offsetof(Norvale_3DSticker_Face_State, headPosition) == 24 &&
              offsetof(Norvale_3DSticker_Face_State, yaw) == 36 &&
              offsetof(Norvale_3DSticker_Face_State, expression) == 48 &&
              offsetof(Norvale_3DSticker_Face_State, identity) == 128);
static_assert(N3DS_EXPRESSION_COUNT == kExpressionCount);
static_assert(N3DS_IDENTITY_COUNT == kIdentityCount);

namespace {

bool IsValid(const Norvale_3DSticker_Options& options) {
  // Comparisons that not-a-number and infinity fail.
  return options.tracker <= N3DS_TRACKER_STEADY && options.focalLength >= 0 &&
         std::isfinite(options.focalLength) && options.smoothing >= 0 && options.smoothing <= 1 &&
         options.workers <= 1;
}

}  // namespace

MRESULT EngineExtensions::SetOptions(const Norvale_3DSticker_Options* options) {
  if (options == nullptr) return N3DS_NULL_ARGUMENT;
  if (options->size != sizeof(*options) || !IsValid(*options)) return N3DS_BAD_VALUE;
  options_ = *options;
  return N3DS_OK;
}

MRESULT EngineExtensions::GetOptions(Norvale_3DSticker_Options* options) const {
  if (options == nullptr) return N3DS_NULL_ARGUMENT;
  if (options->size != sizeof(*options)) return N3DS_BAD_VALUE;
  *options = options_;
  return N3DS_OK;
}

MRESULT EngineExtensions::GetFaceStates(void* core, Norvale_3DSticker_Face_State* states,
                                        uint32_t state_size, uint32_t capacity,
                                        uint32_t* count) const {
  if (count == nullptr || (states == nullptr && capacity > 0)) return N3DS_NULL_ARGUMENT;
  if (state_size != sizeof(*states)) return N3DS_BAD_VALUE;
  if (core == nullptr) return N3DS_NOT_INITIALIZED;
  const TrackingContext& context = *ContextOf(core);
  const bool steady = last_tracker_ == N3DS_TRACKER_STEADY && steady_ != nullptr;
  *count = steady ? steady_->face_count() : context.faceNum;
  for (uint32_t k = 0; k < std::min(*count, capacity); k++) {
    if (steady) {
      states[k] = SteadyFaceState(steady_->model(), steady_->face(k));
      continue;
    }
    states[k] = ClassicFaceState(context, k);
    states[k].id = ids_.id(k);
    states[k].framesTracked = ids_.frames(k);
    states[k].isNew = ids_.frames(k) <= 1 ? 1 : 0;
  }
  return N3DS_OK;
}

MRESULT EngineExtensions::TrackFrame(BuildFunction build, void* core, const NSVL_OFFSCREEN* image,
                                     N3DS_LANDMARK* faces, int32_t nFaces) {
  const MRESULT result = IsSteady() ? TrackSteady(core, image, faces, nFaces)
                                    : TrackClassic(build, core, image, faces, nFaces);
  if (result == N3DS_OK) last_tracker_ = options_.tracker;
  return result;
}

MRESULT EngineExtensions::TrackClassic(BuildFunction build, void* core, const NSVL_OFFSCREEN* image,
                                       N3DS_LANDMARK* faces, int32_t nFaces) {
  TrackingContext* const context = ContextOf(core);
  context->focalLength = options_.focalLength;
  context->refitLimit = options_.refitLimit;
  if (last_tracker_ == N3DS_TRACKER_STEADY) CarryToClassic(context);
  const MRESULT result = build(core, image, faces, nFaces);
  if (result != N3DS_OK) return result;
  clock_.Advance();
  if (nFaces == 0) {
    ids_.Clear();
  } else {
    ids_.Follow(*context, clock_.now());
  }
  return N3DS_OK;
}

MRESULT EngineExtensions::TrackSteady(void* core, const NSVL_OFFSCREEN* image, N3DS_LANDMARK* faces,
                                      int32_t nFaces) {
  const TrackingContext& context = *ContextOf(core);
  const MRESULT result = CheckFrame(context, *image, faces, nFaces);
  if (result != N3DS_OK) return result;
  if (steady_ == nullptr) {
    steady_.reset(new (std::nothrow) steady::Tracker(context, ids_.counter()));
    if (steady_ == nullptr) return N3DS_NO_MEMORY;
  }
  if (last_tracker_ == N3DS_TRACKER_CLASSIC) CarryToSteady(context);
  SetCamera(*image, options_.focalLength, camera_);
  steady::FrameInput input;
  input.width = image->width;
  input.height = image->height;
  input.focal = camera_[0];
  input.seconds = clock_.Advance();
  input.smoothing = options_.smoothing;
  input.threads = options_.workers == 0;
  input.face_count = static_cast<uint32_t>(nFaces);
  input.faces = faces;
  steady_->Track(input);

  last_.face_count = input.face_count;
  for (uint32_t k = 0; k < input.face_count; k++) {
    last_.landmark_count = faces[k].count;
    std::memcpy(last_.landmarks[k], faces[k].points, 2 * sizeof(int32_t) * faces[k].count);
  }
  return N3DS_OK;
}

void EngineExtensions::CarryToSteady(const TrackingContext& context) {
  steady_->Forget();
  for (uint32_t k = 0; k < context.faceNum; k++) {
    const size_t first = 2 * static_cast<size_t>(context.landmarkNum) * k;
    steady_->Adopt(context.landmarkHistory + first, ids_.id(k));
  }
}

void EngineExtensions::CarryToClassic(TrackingContext* context) {
  const uint64_t count = std::min(last_.face_count, steady_->face_count());
  uint64_t ids[kSlotCount] = {};
  const int32_t* landmarks[kSlotCount] = {};
  context->faceNum = 0;
  if (count == 0 || PrepareHistory(context, last_.landmark_count) != N3DS_OK) {
    ids_.Adopt(0, ids, landmarks, clock_.now());
    return;
  }
  const size_t stride = 2 * static_cast<size_t>(context->landmarkNum);
  const size_t used = 2 * static_cast<size_t>(std::min(last_.landmark_count, context->landmarkNum));
  std::memset(context->landmarkHistory, 0, kSlotCount * stride * sizeof(int32_t));
  for (uint32_t k = 0; k < count; k++) {
    const steady::Face& face = steady_->face(k);
    const steady::OutputFrame frame = steady::OutputFrameOf(steady_->model(), face);
    RotationMatrixToQuat(frame.rotation.m, context->pose[k]);
    std::memcpy(context->pose[k] + 4, frame.translation, sizeof(frame.translation));
    std::memcpy(context->poseRef[k], context->pose[k], sizeof(context->pose[k]));
    std::memcpy(context->fitState[k], kDefaultContourVertexIndices, sizeof(context->fitState[k]));
    steady::BuildMesh(*context, steady_->model(), face, context->shape[k]);
    for (int i = 0; i < kIdentityCount; i++) {
      context->identityCoef[k][i] = face.mean.identity[i] / 8;
    }
    std::memcpy(context->expressionCoef[k], face.mean.expression,
                sizeof(context->expressionCoef[k]));
    context->trackFlag[k] = face.valid ? 1 : 0;
    std::memcpy(context->landmarkHistory + k * stride, last_.landmarks[k], used * sizeof(int32_t));
    ids[k] = face.id;
    landmarks[k] = last_.landmarks[k];
  }
  context->faceNum = static_cast<uint32_t>(count);
  ids_.Adopt(static_cast<uint32_t>(count), ids, landmarks, clock_.now());
}

MRESULT EngineExtensions::ReportRigid(void* core, N3DS_RIGID_MATRIX* records,
                                      int32_t nFaces) const {
  if (!IsSteady()) return N3DS_GetRigidMatrix(core, records, nFaces);
  for (int32_t k = 0; k < nFaces; k++) {
    steady::ReportFace(steady_->model(), steady_->face(static_cast<uint32_t>(k)), camera_, true,
                       last_.landmark_count, &records[k]);
  }
  return N3DS_OK;
}

MRESULT EngineExtensions::ReportMask(void* core, N3DS_3D_MODEL* models, N3DS_RIGID_MATRIX* records,
                                     int32_t nFaces) {
  if (!IsSteady()) return N3DS_GetFace3DModel(core, models, records, nFaces);
  TrackingContext* const context = ContextOf(core);
  for (int32_t k = 0; k < nFaces; k++) {
    const steady::Face& face = steady_->face(static_cast<uint32_t>(k));
    steady::ReportFace(steady_->model(), face, camera_, false, last_.landmark_count, &records[k]);
    steady::BuildMesh(*context, steady_->model(), face, context->shape[k]);
    models[k] = {context->shape[k], N3DS_VERTEX_COUNT, &kTriangles[0][0], N3DS_TRIANGLE_COUNT};
  }
  return N3DS_OK;
}

void EngineExtensions::Release() {
  steady_.reset();
  last_.face_count = 0;
  last_tracker_ = N3DS_TRACKER_CLASSIC;
  ids_.Reset();
  clock_.Reset();
}

}  // namespace n3ds
