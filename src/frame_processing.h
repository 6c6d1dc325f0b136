// SPDX-License-Identifier: MIT
// What rigid and mask frames share on their way through the engine object.
#pragma once

#include "norvale_3d_sticker_core.h"

namespace n3ds {

constexpr uint32_t kMaxLandmarkCount = N3DS_LANDMARKS_165;

// Landmark records and core output records of one frame call. About 30 kB, on the caller's stack: a
// frame call of the engine object allocates nothing.
struct FrameRecords {
  int32_t points[N3DS_MAX_FACES][2 * kMaxLandmarkCount];
  N3DS_LANDMARK landmarks[N3DS_MAX_FACES];
  float landmarks_3d[N3DS_FACE_CAPACITY][3 * kMaxLandmarkCount];
  N3DS_RIGID_MATRIX matrices[N3DS_FACE_CAPACITY];

  FrameRecords();
};

// The descriptor of the upright picture: width and height change places for a quarter turn.
NSVL_OFFSCREEN UprightImage(const NSVL_OFFSCREEN& image, uint32_t degree);

// Fills the public entries from the core's records, in the order of the faces. The public order of
// the three matrices is the reverse of the core's.
void ReportMatrices(const FrameRecords& records, uint32_t face_count, uint32_t landmark_count,
                    Norvale_3DSticker_Matrix_Array* out);

}  // namespace n3ds
