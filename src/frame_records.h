// SPDX-License-Identifier: MIT
// What rigid and mask frames share on their way through the engine object.
#pragma once

#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace n3ds {

// Landmark records and core output records of one frame call. About 28 kB, on the caller's stack: a
// frame call of the engine object allocates nothing.
struct FrameRecords {
  static constexpr uint32_t kLandmarkCapacity = N3DS_LANDMARKS_165;

  int32_t points[N3DS_MAX_FACES][2 * kLandmarkCapacity];
  N3DS_LANDMARK landmarks[N3DS_MAX_FACES];
  float landmarks_3d[N3DS_FACE_CAPACITY][3 * kLandmarkCapacity];
  N3DS_RIGID_MATRIX matrices[N3DS_FACE_CAPACITY];

  // Ties the records to their buffers, whose contents stay unset: a frame uses only some of them.
  FrameRecords();
  FrameRecords(const FrameRecords&) = delete;  // the records point into the object
  FrameRecords& operator=(const FrameRecords&) = delete;

  // Whether a face's buffers have room for so many landmarks.
  static constexpr bool Holds(uint32_t landmark_count) {
    return landmark_count <= kLandmarkCapacity;
  }
  // The record of face k, for landmark_count landmarks to be written to. Its 3-D landmarks start as
  // zeros: a core latched on fewer landmarks writes no others.
  N3DS_LANDMARK& PrepareFace(uint32_t k, uint32_t landmark_count);
};

// The descriptor of the upright image: width and height change places for a quarter turn.
NSVL_OFFSCREEN UprightImage(const NSVL_OFFSCREEN& image, uint32_t degree);

// Fills the public entries from the core's records, in the order of the faces. The public order of
// the three matrices is the reverse of the core's.
void ReportMatrices(const FrameRecords& records, uint32_t face_count, uint32_t landmark_count,
                    Norvale_3DSticker_Matrix_Array* out);

}  // namespace n3ds
