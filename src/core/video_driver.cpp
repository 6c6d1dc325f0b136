// SPDX-License-Identifier: MIT
#include "core/video_driver.h"

#include <algorithm>
#include <cstring>

#include "core/face_matching.h"
#include "core/face_workers.h"
#include "platform/scratch_array.h"

namespace n3ds {

namespace {

constexpr int32_t kFastWorkerFaces = 4;  // from this many faces on, rigid mode uses the fast worker

constexpr float kReferenceSize = 640.0f;  // image size at which the tasks' scale is 1

// The frame's landmarks and data that the workers may use; lives for this frame.
struct Frame {
  const NSVL_OFFSCREEN& image;
  N3DS_LANDMARK* faces;
  uint32_t face_count;
  const float* mean_shape;
  const int32_t* previous_landmarks;  // face k's from 2 * landmarkNum * k on
};

void ResetTracks(TrackingContext* context) {
  context->faceNum = 0;
  std::memset(context->identityCoef, 0, sizeof(context->identityCoef));
  std::memset(context->expressionCoef, 0, sizeof(context->expressionCoef));
  std::memset(context->trackState, 0, sizeof(context->trackState));
  std::memset(context->trackFlag, 0, sizeof(context->trackFlag));
}

// Coordinates of kSlotCount faces with the latched number of landmarks.
size_t HistorySize(const TrackingContext& context) {
  return 2 * static_cast<size_t>(kSlotCount) * context.landmarkNum;
}

// The frame's landmarks as landmark_num pairs a face: a frame of another count is cut or filled with
// zeros, so that nothing outside the caller's buffers is touched.
void CollectLandmarks(const N3DS_LANDMARK* faces, uint32_t face_count, uint32_t landmark_num,
                      int32_t* landmarks) {
  const size_t stride = 2 * static_cast<size_t>(landmark_num);
  std::memset(landmarks, 0, kSlotCount * stride * sizeof(int32_t));
  for (uint32_t k = 0; k < face_count; ++k) {
    const size_t used = 2 * static_cast<size_t>(std::min(faces[k].count, landmark_num));
    std::memcpy(landmarks + k * stride, faces[k].points, used * sizeof(int32_t));
  }
}

void FillOwn(TrackingContext* context, uint32_t k, RigidFaceTask* task) {
  task->trackState = context->trackState[k];
  task->contourState = context->contourState[k];
  task->refitLimit = context->refitLimit;
  task->fitGivenUp = &context->fitGivenUp[k];
}

void FillOwn(TrackingContext* context, uint32_t k, MaskFaceTask* task) {
  task->maskPose = context->maskPose[k];
}

template <typename Task>
void FillTask(TrackingContext* context, const Frame& frame, uint32_t k, Task* task) {
  const size_t stride = 2 * static_cast<size_t>(context->landmarkNum);
  const int32_t size = std::max(frame.image.width, frame.image.height);
  task->memory = context->memory;
  task->meanShapeF = frame.mean_shape;
  task->landmarks = frame.faces[k].points;
  task->prevLandmarks = frame.previous_landmarks + k * stride;
  task->camera = context->camera;
  task->scale = static_cast<float>(size) / kReferenceSize;
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
  FillOwn(context, k, task);
}

template <typename Task>
MRESULT RunTasks(TrackingContext* context, const Frame& frame, mcvTaskFunction worker, void* pool) {
  const ScratchArray<Task> tasks(context->memory, frame.face_count);
  if (!tasks) return N3DS_NO_MEMORY;
  int32_t ids[kSlotCount];
  for (uint32_t k = 0; k < frame.face_count; ++k) {
    FillTask(context, frame, k, &tasks[k]);
    ids[k] = mcvAddTask(pool, worker, &tasks[k]);
  }
  MRESULT result = N3DS_OK;
  // Waits for all tasks even after a failure: the others still use their records.
  for (uint32_t k = 0; k < frame.face_count; ++k) {
    if (ids[k] < 0 || mcvWaitTask(pool, ids[k]) != 0) result = N3DS_NUMERICAL;
  }
  return result;
}

template <typename Task>
MRESULT RunWorkers(TrackingContext* context, const Frame& frame, mcvTaskFunction worker) {
  void* pool = mcvParallelInit(context->memory, frame.face_count);
  if (pool == nullptr) return N3DS_NUMERICAL;
  const MRESULT result = RunTasks<Task>(context, frame, worker, pool);
  return mcvParallelUninit(pool) == 0 ? result : N3DS_NUMERICAL;
}

// Where a frame's landmarks are, each copy with a reason of its own:
//   caller's points -> faces[k].points   upright; the workers smooth them in place
//                   -> landmarks         as they arrived, landmarkNum pairs a face, for matching
//                   -> landmarkHistory   the same, kept for the next frame and the 3-D landmarks
//   last frame's landmarkHistory
//                   -> previous          reordered by the matching, for the workers' smoothing
template <typename Task>
MRESULT BuildFaces(TrackingContext* context, const NSVL_OFFSCREEN& image, N3DS_LANDMARK* faces,
                   int32_t nFaces, mcvTaskFunction worker) {
  MRESULT result = CheckFrame(*context, image, faces, nFaces);
  if (result != N3DS_OK) return result;
  if (nFaces == 0) {
    ResetTracks(context);
    return N3DS_OK;
  }
  result = PrepareHistory(context, faces[0].count);
  if (result != N3DS_OK) return result;

  const auto face_count = static_cast<uint32_t>(nFaces);
  const size_t history_size = HistorySize(*context);
  const ScratchArray<int32_t> landmarks(context->memory, history_size);
  const ScratchArray<int32_t> previous(context->memory, history_size);
  const ScratchArray<float> mean_shape(context->memory, kShapeSize);
  if (!landmarks || !previous || !mean_shape) return N3DS_NO_MEMORY;
  CollectLandmarks(faces, face_count, context->landmarkNum, landmarks.get());
  MMemCpy(previous.get(), context->landmarkHistory, history_size * sizeof(int32_t));
  for (size_t i = 0; i < kShapeSize; ++i) {
    mean_shape[i] = static_cast<float>(context->meanShape[i]) * kModelUnit;
  }
  SetCamera(image, context->focalLength, context->camera);

  FaceAssignment assignment;
  result = AssignFaces(landmarks.get(), face_count, previous.get(), context->faceNum,
                       context->landmarkNum, &assignment);
  if (result != N3DS_OK) return result;
  result = MoveTracks(assignment, face_count, context, previous.get());
  if (result != N3DS_OK) return result;
  MMemCpy(context->landmarkHistory, landmarks.get(), history_size * sizeof(int32_t));
  context->faceNum = face_count;
  std::memcpy(context->previousSlot, assignment.previous, sizeof(context->previousSlot));

  const Frame frame = {image, faces, face_count, mean_shape.get(), previous.get()};
  return RunWorkers<Task>(context, frame, worker);
}

}  // namespace

MRESULT CheckFrame(const TrackingContext& context, const NSVL_OFFSCREEN& image,
                   const N3DS_LANDMARK* faces, int32_t face_count) {
  if (image.width < 1 || image.height < 1 || face_count < 0 || face_count > N3DS_MAX_FACES) {
    return N3DS_BAD_VALUE;
  }
  if (face_count == 0) return N3DS_OK;
  if (faces == nullptr || !HasModel(context)) return N3DS_NULL_ARGUMENT;
  for (int32_t k = 0; k < face_count; ++k) {
    if (faces[k].points == nullptr) return N3DS_NULL_ARGUMENT;
    const uint32_t count = faces[k].count;
    if (count != N3DS_LANDMARKS_101 && count != N3DS_LANDMARKS_165) return N3DS_BAD_VALUE;
    if (count != faces[0].count) return N3DS_BAD_VALUE;
  }
  return N3DS_OK;
}

// A pinhole camera in the middle of the image with a focal length between width and height: close
// enough for phones. A wrong focal length shows mostly as a wrong distance; a factor of 0.8 or 1.4
// turns the head by 2 to 3 degrees as well.
void SetCamera(const NSVL_OFFSCREEN& image, float focal_length, float* camera) {
  const auto width = static_cast<float>(image.width);
  const auto height = static_cast<float>(image.height);
  const float focal = focal_length > 0 ? focal_length : (width + height) / 2.0f;
  const float matrix[9] = {focal, 0, width / 2.0f, 0, focal, height / 2.0f, 0, 0, 1};
  std::memcpy(camera, matrix, sizeof(matrix));
}

MRESULT PrepareHistory(TrackingContext* context, uint32_t landmark_count) {
  if (context->landmarkNum == 0) context->landmarkNum = landmark_count;
  if (context->landmarkHistory != nullptr) return N3DS_OK;
  const size_t bytes = HistorySize(*context) * sizeof(int32_t);
  context->landmarkHistory = static_cast<int32_t*>(MMemAlloc(context->memory, bytes));
  if (context->landmarkHistory == nullptr) return N3DS_NO_MEMORY;
  MMemSet(context->landmarkHistory, 0, bytes);
  return N3DS_OK;
}

MRESULT BuildRigidFaces(TrackingContext* context, const NSVL_OFFSCREEN& image, N3DS_LANDMARK* faces,
                        int32_t face_count) {
  const bool many = face_count >= kFastWorkerFaces;
  return BuildFaces<RigidFaceTask>(
      context, image, faces, face_count,
      many ? _Build3DFaceForVideo_Rigid_Thread_Acce : _Build3DFaceForVideo_Rigid_Thread);
}

MRESULT BuildMaskFaces(TrackingContext* context, const NSVL_OFFSCREEN& image, N3DS_LANDMARK* faces,
                       int32_t face_count) {
  return BuildFaces<MaskFaceTask>(context, image, faces, face_count,
                                  _Build3DFaceForVideo_Mask_Thread);
}

}  // namespace n3ds
