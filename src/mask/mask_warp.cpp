// SPDX-License-Identifier: MIT
// The exported mask warp: checks, the output image, and the tracked face's pose and camera.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <limits>

#include "core/tracking_context.h"
#include "mask/warp_face.h"
#include "norvale_3d_sticker_core.h"
#include "platform/integer_arithmetic.h"

namespace {

using n3ds::TrackingContext;

// Gives an output without a buffer the given size and a buffer of the core's memory. The fields are
// set even if the allocation fails.
bool SetUpOutput(MHandle memory, int32_t width, int32_t height, NSVL_OFFSCREEN* output) {
  output->pixelFormat = N3DS_FORMAT_BGRA32;
  output->width = width;
  output->height = height;
  output->pitch[0] = n3ds::WrapMultiply(width, 4);
  if (width > std::numeric_limits<int32_t>::max() / 4) return false;

  // A pool reads sizes as 32 bits and would hand out a smaller block.
  const uint64_t bytes = uint64_t{4} * static_cast<uint64_t>(width) * static_cast<uint64_t>(height);
  if (memory != nullptr && bytes > std::numeric_limits<uint32_t>::max()) return false;
  output->plane[0] = static_cast<uint8_t*>(MMemAlloc(memory, bytes));
  return output->plane[0] != nullptr;
}

void Clear(const NSVL_OFFSCREEN& image) {
  if (image.pitch[0] <= 0 || image.height <= 0) return;
  MMemSet(image.plane[0], 0,
          static_cast<size_t>(image.pitch[0]) * static_cast<size_t>(image.height));
}

bool HasPixels(const NSVL_OFFSCREEN& image) {
  return image.plane[0] != nullptr && image.width > 0 && image.height > 0 && image.pitch[0] >= 0;
}

bool IndicesExist(const uint16_t* triangles) {
  return std::all_of(triangles, triangles + 3 * N3DS_TRIANGLE_COUNT,
                     [](uint16_t vertex) { return vertex < N3DS_VERTEX_COUNT; });
}

}  // namespace

MRESULT N3DS_WarpFaceMask(void* core, const N3DS_2D_TEXTURE_MASK* mask, NSVL_OFFSCREEN* output,
                          const N3DS_3D_MODEL* model, int32_t width, int32_t height,
                          int32_t faceIndex) {
  if (core == nullptr || mask == nullptr || output == nullptr || model == nullptr) {
    return N3DS_NULL_ARGUMENT;
  }
  const auto& context = *static_cast<const TrackingContext*>(core);
  if (width <= 0 || height <= 0 || !HasPixels(mask->image) ||
      mask->image.pixelFormat != N3DS_FORMAT_BGRA32 || faceIndex < 0 ||
      static_cast<uint32_t>(faceIndex) >= context.faceNum) {
    return N3DS_BAD_VALUE;
  }
  // A face that was never fitted has no mesh and no pose, and its image stays clear.
  const bool tracked = context.trackFlag[faceIndex] != 0;
  if (tracked) {
    if (model->vertices == nullptr || model->triangles == nullptr) return N3DS_NULL_ARGUMENT;
    if (!IndicesExist(model->triangles)) return N3DS_BAD_VALUE;
  }

  if (output->plane[0] == nullptr && !SetUpOutput(context.memory, width, height, output)) {
    return N3DS_NO_MEMORY;
  }
  Clear(*output);
  if (!tracked) return N3DS_OK;

  const float* p = context.maskPose[faceIndex];
  const float R[9] = {p[0], p[1], p[2], p[4], p[5], p[6], p[8], p[9], p[10]};
  const float t[3] = {p[3], p[7], p[11]};
  // Wrong counts in the texture record draw nothing, which is all the caller is told.
  n3ds::WarpFace(*model, *mask, context.camera, R, t, *output);
  return N3DS_OK;
}
