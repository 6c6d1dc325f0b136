// SPDX-License-Identifier: MIT
// The two per-frame entry points of the tracking core: they check a frame, match its faces to the
// tracks and run one worker per face on a task pool of the frame's own.
#include <algorithm>
#include <cstring>

#include "core/face_matching.h"
#include "core/face_task.h"
#include "core/mask_worker.h"
#include "core/rigid_worker.h"
#include "core/tracking_context.h"
#include "platform/scratch_array.h"

namespace n3ds {

namespace {

constexpr int kFastWorkerFaces = 4;  // from this many faces on, rigid mode uses the fast worker

// The frame's landmarks and what stands to the workers' disposal, in memory of the frame.
struct Frame {
  const NSVL_OFFSCREEN& image;
  N3DS_LANDMARK* faces;
  uint32_t face_count;
  const float* mean_shape;
  const int32_t* previous_landmarks;  // face k's from landmark 2 * landmarkNum * k on
};

MRESULT CheckFrame(const TrackingContext& context, const N3DS_LANDMARK* faces, int32_t face_count) {
  if (faces == nullptr || !HasModel(context)) return N3DS_NULL_ARGUMENT;
  for (int32_t k = 0; k < face_count; k++) {
    if (faces[k].points == nullptr) return N3DS_NULL_ARGUMENT;
    const uint32_t count = faces[k].count;
    if ((count != N3DS_LANDMARKS_101 && count != N3DS_LANDMARKS_165) || count != faces[0].count)
      return N3DS_BAD_VALUE;
  }
  return N3DS_OK;
}

void ResetTracks(TrackingContext* context) {
  context->faceNum = 0;
  std::memset(context->identityCoef, 0, sizeof(context->identityCoef));
  std::memset(context->expressionCoef, 0, sizeof(context->expressionCoef));
  std::memset(context->trackState, 0, sizeof(context->trackState));
  std::memset(context->trackFlag, 0, sizeof(context->trackFlag));
}

// The frame's landmarks as landmarkNum pairs a face: a frame of another count is cut or filled with
// zeros, so that nothing outside the caller's buffers is touched.
void CollectLandmarks(const N3DS_LANDMARK* faces, uint32_t face_count, uint32_t landmark_num,
                      int32_t* landmarks) {
  const size_t stride = 2 * static_cast<size_t>(landmark_num);
  std::memset(landmarks, 0, kSlotCount * stride * sizeof(int32_t));
  for (uint32_t k = 0; k < face_count; k++) {
    const size_t used = 2 * static_cast<size_t>(std::min(faces[k].count, landmark_num));
    std::memcpy(landmarks + k * stride, faces[k].points, used * sizeof(int32_t));
  }
}

// A pinhole camera in the middle of the picture with a focal length between width and height: close
// enough for phones, and a wrong focal length shows as a wrong distance only.
void SetCamera(const NSVL_OFFSCREEN& image, float* camera) {
  const auto width = static_cast<float>(image.width);
  const auto height = static_cast<float>(image.height);
  const float focal = (width + height) / 2.0f;
  const float matrix[9] = {focal, 0, width / 2.0f, 0, focal, height / 2.0f, 0, 0, 1};
  std::memcpy(camera, matrix, sizeof(matrix));
}

// What rigid and mask tasks have in common.
template <typename Task>
void FillTask(TrackingContext* context, const Frame& frame, uint32_t k, Task* task) {
  const size_t stride = 2 * static_cast<size_t>(context->landmarkNum);
  task->memory = context->memory;
  task->meanShapeF = frame.mean_shape;
  task->landmarks = frame.faces[k].points;
  task->prevLandmarks = frame.previous_landmarks + k * stride;
  task->camera = context->camera;
  task->scale = static_cast<float>(std::max(frame.image.width, frame.image.height)) / 640.0f;
  task->result = &context->rigidResult[k];
  task->pose = context->pose[k];
  task->poseRef = context->poseRef[k];
  task->identityCoef = context->identityCoef[k];
  task->expressionCoef = context->expressionCoef[k];
  task->shape = context->shape[k];
  task->fitState = context->fitState[k];
  task->meanShape = context->meanShape;
  task->identityBasis = context->identityBasis;
  task->expressionBasis = context->expressionBasis;
  task->tensor = context->tensor;
  task->trackFlag = &context->trackFlag[k];
}

struct RigidMode {
  using Task = RigidFaceTask;
  static mcvTaskFunction Worker(uint32_t face_count) {
    return face_count >= kFastWorkerFaces ? _Build3DFaceForVideo_Rigid_Thread_Acce
                                          : _Build3DFaceForVideo_Rigid_Thread;
  }
  static void FillOwn(TrackingContext* context, uint32_t k, Task* task) {
    task->trackState = context->trackState[k];
    task->contourState = context->contourState[k];
  }
};

struct MaskMode {
  using Task = MaskFaceTask;
  static mcvTaskFunction Worker(uint32_t /*face_count*/) {
    return _Build3DFaceForVideo_Mask_Thread;
  }
  static void FillOwn(TrackingContext* context, uint32_t k, Task* task) {
    task->maskPose = context->maskPose[k];
  }
};

template <typename Mode>
MRESULT RunWorkers(TrackingContext* context, const Frame& frame) {
  void* pool = mcvParallelInit(context->memory, frame.face_count);
  if (pool == nullptr) return N3DS_NUMERICAL;
  MRESULT result = N3DS_OK;
  {
    const ScratchArray<typename Mode::Task> tasks(context->memory, frame.face_count);
    int32_t ids[kSlotCount];
    if (!tasks) {
      result = N3DS_NO_MEMORY;
    } else {
      for (uint32_t k = 0; k < frame.face_count; k++) {
        FillTask(context, frame, k, &tasks[k]);
        Mode::FillOwn(context, k, &tasks[k]);
        ids[k] = mcvAddTask(pool, Mode::Worker(frame.face_count), &tasks[k]);
      }
      // A failure does not end the waiting: the other workers still use the task records.
      for (uint32_t k = 0; k < frame.face_count; k++) {
        if (ids[k] < 0 || mcvWaitTask(pool, ids[k]) != 0) result = N3DS_NUMERICAL;
      }
    }
  }
  if (mcvParallelUninit(pool) != 0) result = N3DS_NUMERICAL;
  return result;
}

template <typename Mode>
MRESULT BuildFaces(void* core, const NSVL_OFFSCREEN* image, N3DS_LANDMARK* faces, int32_t nFaces) {
  if (core == nullptr || image == nullptr) return N3DS_NULL_ARGUMENT;
  if (image->width < 1 || image->height < 1 || nFaces < 0 || nFaces > N3DS_MAX_FACES) {
    return N3DS_BAD_VALUE;
  }
  TrackingContext* context = ContextOf(core);
  if (nFaces == 0) {
    ResetTracks(context);
    return N3DS_OK;
  }
  MRESULT result = CheckFrame(*context, faces, nFaces);
  if (result != N3DS_OK) return result;

  const auto face_count = static_cast<uint32_t>(nFaces);
  if (context->landmarkNum == 0) context->landmarkNum = faces[0].count;
  const size_t history_size = 2 * static_cast<size_t>(kSlotCount) * context->landmarkNum;
  if (context->landmarkHistory == nullptr) {
    context->landmarkHistory =
        static_cast<int32_t*>(MMemAlloc(context->memory, history_size * sizeof(int32_t)));
    if (context->landmarkHistory == nullptr) return N3DS_NO_MEMORY;
    MMemSet(context->landmarkHistory, 0, history_size * sizeof(int32_t));
  }

  const ScratchArray<int32_t> landmarks(context->memory, history_size);
  const ScratchArray<int32_t> previous(context->memory, history_size);
  const ScratchArray<float> mean_shape(context->memory, kShapeSize);
  if (!landmarks || !previous || !mean_shape) return N3DS_NO_MEMORY;
  CollectLandmarks(faces, face_count, context->landmarkNum, landmarks.get());
  MMemCpy(previous.get(), context->landmarkHistory, history_size * sizeof(int32_t));
  for (size_t i = 0; i < kShapeSize; i++) {
    mean_shape[i] = static_cast<float>(context->meanShape[i]) * kModelUnit;
  }
  SetCamera(*image, context->camera);

  FaceAssignment assignment;
  result = AssignFaces(landmarks.get(), face_count, previous.get(), context->faceNum,
                       context->landmarkNum, &assignment);
  if (result != N3DS_OK) return result;
  result = MoveTracks(assignment, face_count, context, previous.get());
  if (result != N3DS_OK) return result;
  MMemCpy(context->landmarkHistory, landmarks.get(), history_size * sizeof(int32_t));
  context->faceNum = face_count;

  return RunWorkers<Mode>(context, {*image, faces, face_count, mean_shape.get(), previous.get()});
}

}  // namespace

}  // namespace n3ds

MRESULT N3DS_Build3DFaceForVideo_Rigid(void* core, const NSVL_OFFSCREEN* image,
                                       N3DS_LANDMARK* faces, int32_t nFaces) {
  return n3ds::BuildFaces<n3ds::RigidMode>(core, image, faces, nFaces);
}

MRESULT N3DS_Build3DFaceForVideo_Mask(void* core, const NSVL_OFFSCREEN* image, N3DS_LANDMARK* faces,
                                      int32_t nFaces) {
  return n3ds::BuildFaces<n3ds::MaskMode>(core, image, faces, nFaces);
}
