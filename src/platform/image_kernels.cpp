// SPDX-License-Identifier: MIT
// Kernels on 8-bit images: halving, OR, YUYV splitting and motion masks.
#include <algorithm>
#include <cstddef>
#include <cstdint>

#include "norvale_3d_sticker_core.h"

namespace {

// Motion is a difference of more levels than camera noise makes.
constexpr int kMotionThreshold = 16;

int64_t RoundUp4(int64_t bytes) { return (bytes + 3) & ~int64_t{3}; }

int Difference(uint8_t a, uint8_t b) { return a > b ? a - b : b - a; }

bool IsComplete(const mcvMotionRecord* record) {
  if (record == nullptr) return false;
  for (const mcvMotionPlane* plane : record->plane) {
    if (plane == nullptr || plane->pixels == nullptr) return false;
  }
  return true;
}

bool SameSize(const mcvMotionPlane& a, const mcvMotionPlane& b) {
  return a.width == b.width && a.height == b.height;
}

}  // namespace

int32_t mcvScaleDownBy2u8(const uint8_t* src, int32_t width, int32_t height, uint8_t* dst) {
  if (src == nullptr || dst == nullptr) return N3DS_NULL_ARGUMENT;
  if (width < 4 || height < 4) return N3DS_BAD_VALUE;
  const ptrdiff_t dst_width = width / 2;
  for (int32_t y = 0; y < height / 2; ++y) {
    const uint8_t* upper = src;
    const uint8_t* lower = src + width;
    for (ptrdiff_t x = 0; x < dst_width; ++x) {
      const int sum = upper[2 * x] + upper[2 * x + 1] + lower[2 * x] + lower[2 * x + 1];
      dst[x] = static_cast<uint8_t>(sum >> 2);
    }
    src += 2 * ptrdiff_t{width};
    dst += dst_width;
  }
  return N3DS_OK;
}

int32_t mcvBitwiseOru8(const uint8_t* a, const uint8_t* b, uint8_t* dst, int32_t width,
                       int32_t height, int32_t pitchA, int32_t pitchB, int32_t pitchDst) {
  if (a == nullptr || b == nullptr || dst == nullptr) return N3DS_NULL_ARGUMENT;
  for (int32_t y = 0; y < height; ++y) {
    const uint8_t* row_a = a + ptrdiff_t{y} * pitchA;
    const uint8_t* row_b = b + ptrdiff_t{y} * pitchB;
    uint8_t* row = dst + ptrdiff_t{y} * pitchDst;
    for (int32_t x = 0; x < width; ++x) row[x] = static_cast<uint8_t>(row_a[x] | row_b[x]);
  }
  return N3DS_OK;
}

int32_t mcvYUYVToOrgData(const uint8_t* src, int32_t width, int32_t height, uint8_t* lumaDst,
                         uint8_t* chromaDst) {
  if (src == nullptr || lumaDst == nullptr || chromaDst == nullptr) return N3DS_NULL_ARGUMENT;
  const ptrdiff_t src_pitch = RoundUp4(2 * int64_t{width});
  const ptrdiff_t dst_pitch = RoundUp4(width);
  // An odd width has half a pair in its last column. The pair is whole in the source row, and both
  // destination rows have at least a byte of padding for its second half.
  const ptrdiff_t pairs = (ptrdiff_t{width} + 1) / 2;
  for (int32_t y = 0; y < height; ++y) {
    for (ptrdiff_t i = 0; i < pairs; ++i) {
      lumaDst[2 * i] = src[4 * i];
      chromaDst[2 * i] = src[4 * i + 1];
      lumaDst[2 * i + 1] = src[4 * i + 2];
      chromaDst[2 * i + 1] = src[4 * i + 3];
    }
    src += src_pitch;
    lumaDst += dst_pitch;
    chromaDst += dst_pitch;
  }
  return N3DS_OK;
}

int32_t mcvDetectMotion(const mcvMotionRecord* previous, const mcvMotionRecord* current,
                        const mcvMotionRecord* next, mcvMotionRecord* result) {
  if (!IsComplete(previous) || !IsComplete(current) || !IsComplete(next) || !IsComplete(result)) {
    return N3DS_NULL_ARGUMENT;
  }
  for (int i = 0; i < 3; ++i) {
    const mcvMotionPlane& size = *current->plane[i];
    if (size.width < 1 || size.height < 1 || size.width > INT64_MAX / size.height ||
        !SameSize(*previous->plane[i], size) || !SameSize(*next->plane[i], size) ||
        !SameSize(*result->plane[i], size)) {
      return N3DS_BAD_VALUE;
    }
  }
  for (int i = 0; i < 3; ++i) {
    const uint8_t* before = previous->plane[i]->pixels;
    const uint8_t* now = current->plane[i]->pixels;
    const uint8_t* after = next->plane[i]->pixels;
    uint8_t* mask = result->plane[i]->pixels;
    const int64_t pixels = current->plane[i]->width * current->plane[i]->height;
    // A change against one neighbour alone is where something was or will be, not where it is.
    for (int64_t p = 0; p < pixels; ++p) {
      const int change = std::min(Difference(now[p], before[p]), Difference(now[p], after[p]));
      mask[p] = change > kMotionThreshold ? 255 : 0;
    }
  }
  return N3DS_OK;
}
