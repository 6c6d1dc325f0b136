// SPDX-License-Identifier: MIT
// The mask warp written down once more, as slowly and plainly as it can be: every span of a
// triangle is listed first, then every pixel of the image is asked whether it lies in one.
#pragma once

#include <cmath>
#include <cstdint>
#include <vector>

#include "mask/test_image.h"

namespace n3ds::testing {

struct ReferenceCamera {
  float K[9], R[9], t[3];
};

// Integer part, as the engine converts everywhere: saturating, 0 for NaN.
inline int64_t Whole(float value) {
  if (std::isnan(value)) return 0;
  if (value >= 2147483648.0f) return INT32_MAX;
  if (value <= -2147483648.0f) return INT32_MIN;
  return static_cast<int64_t>(std::trunc(value));
}

struct ReferenceSpan {
  int64_t row, left, right;
};

struct ReferenceCorner {
  float x, y;
  int64_t ix, iy;
};

inline std::vector<ReferenceSpan> ReferenceSpans(const float (*image)[2], int height) {
  ReferenceCorner c[3];
  for (int i = 0; i < 3; ++i) {
    c[i] = {image[i][0], image[i][1], Whole(image[i][0] + 0.5f), Whole(image[i][1] + 0.5f)};
  }
  const auto key = [](const ReferenceCorner& p) { return (p.iy << 32) + p.ix; };
  int first = 0;
  for (int i = 1; i < 3; ++i) {
    if (key(c[i]) < key(c[first])) first = i;
  }
  const ReferenceCorner swapped = c[0];
  c[0] = c[first];
  c[first] = swapped;
  if (key(c[2]) < key(c[1])) {
    const ReferenceCorner other = c[1];
    c[1] = c[2];
    c[2] = other;
  }
  const auto &T = c[0], &M = c[1], &B = c[2];

  std::vector<ReferenceSpan> spans;
  if (T.iy == M.iy) {
    spans.push_back({M.iy, T.ix - (B.x < T.x ? 1 : 0), M.ix + (M.x < B.x ? 1 : 0)});
    if (M.iy == B.iy) {
      spans.push_back({M.iy, M.ix, B.ix});
      return spans;
    }
  } else {
    float smaller = (M.x - T.x) / (M.y - T.y), larger = (B.x - T.x) / (B.y - T.y);
    if (smaller > larger) {
      const float s = smaller;
      smaller = larger;
      larger = s;
    }
    const float d = static_cast<float>(T.iy) + 0.5f - T.y;
    float left = T.x + smaller * d, right = T.x + larger * d;
    for (int64_t r = T.iy; r < M.iy && r < height; ++r) {
      spans.push_back({r, Whole(left + 0.5f), Whole(right + 0.5f)});
      left = left + smaller;
      right = right + larger;
    }
    if (M.iy == B.iy) return spans;
  }
  float larger = (B.x - M.x) / (B.y - M.y), smaller = (B.x - T.x) / (B.y - T.y);
  if (larger < smaller) {
    const float s = smaller;
    smaller = larger;
    larger = s;
  }
  const float d = static_cast<float>(B.iy - 1) + 0.5f - B.y;
  float left = B.x + larger * d, right = B.x + smaller * d;
  for (int64_t r = B.iy - 1; r >= M.iy && r >= 0; --r) {
    spans.push_back({r, Whole(left + 0.5f), Whole(right + 0.5f)});
    left = left - larger;
    right = right - smaller;
  }
  return spans;
}

// `coordinates` run v upwards.
inline void WarpReference(const float* vertices, const uint16_t* mesh, const float* coordinates,
                          const uint16_t* layout, const ReferenceCamera& camera, TestImage& texture,
                          TestImage& output) {
  const float *K = camera.K, *R = camera.R, *t = camera.t;
  const int W = output.width(), H = output.height(), TW = texture.width(), TH = texture.height();
  for (int k = 0; k < 3456; ++k) {
    float s[3][2], p[3][2];
    bool valid = true;
    for (int c = 0; c < 3; ++c) {
      const float* uv = coordinates + 2 * layout[3 * k + c];
      s[c][0] = static_cast<float>(TW) * uv[0];
      s[c][1] = (1.0f - uv[1]) * static_cast<float>(TH);
      for (int axis = 0; axis < 2; ++axis) {
        const float size = static_cast<float>(axis == 0 ? TW : TH);
        if (s[c][axis] < 0) s[c][axis] = 0;
        if (s[c][axis] >= size - 2) s[c][axis] = size - 3;
      }
      const float* P = vertices + 3 * mesh[3 * k + c];
      const float xc = R[0] * P[0] + R[1] * P[1] + R[2] * P[2] + t[0];
      const float yc = R[3] * P[0] + R[4] * P[1] + R[5] * P[2] + t[1];
      const float zc = R[6] * P[0] + R[7] * P[1] + R[8] * P[2] + t[2];
      p[c][0] = p[c][1] = 0;
      if (zc != 0) {
        p[c][0] = K[0] * (xc / zc) + K[1] * (yc / zc) + K[2];
        p[c][1] = K[3] * (xc / zc) + K[4] * (yc / zc) + K[5];
      }
      for (int axis = 0; axis < 2; ++axis) {
        const float last = static_cast<float>(axis == 0 ? W : H) - 1;
        if (p[c][axis] < 0) p[c][axis] = 0;
        if (p[c][axis] > last) p[c][axis] = last;
        valid = valid && p[c][axis] >= 0 && p[c][axis] < last + 1;
      }
    }
    if (!valid) continue;
    const float x0 = p[0][0], y0 = p[0][1], x1 = p[1][0], y1 = p[1][1], x2 = p[2][0], y2 = p[2][1];
    const float D = x1 * y0 - x1 * y2 + x0 * y2 - x0 * y1 + x2 * y1 - x2 * y0;
    if (D == 0) continue;
    const float b1x = (y0 - y2) / D, b1y = (x2 - x0) / D, b1c = (y2 * x0 - y0 * x2) / D;
    const float b2x = (y1 - y0) / D, b2y = (x0 - x1) / D, b2c = (x1 * y0 - y1 * x0) / D;

    for (const ReferenceSpan& span : ReferenceSpans(p, H)) {
      if (span.row < 0 || span.row >= H) continue;
      for (int x = 0; x < W; ++x) {
        if (x < span.left || x > span.right) continue;
        const float px = static_cast<float>(x) + 0.5f, py = static_cast<float>(span.row) + 0.5f;
        const float b1 = b1x * px + b1y * py + b1c, b2 = b2x * px + b2y * py + b2c;
        const bool end = x == span.left || x == span.right;
        if (end && (b1 < -0.0001f || b1 > 1.0001f || b2 < -0.0001f || b2 > 1.0001f)) continue;
        const float b0 = 1.0f - b1 - b2;
        const float tx = b0 * s[0][0] + b1 * s[1][0] + b2 * s[2][0];
        const float ty = b0 * s[0][1] + b1 * s[1][1] + b2 * s[2][1];
        const int64_t itx = Whole(tx), ity = Whole(ty);
        if (itx < 0 || itx >= TW - 1 || ity < 0 || ity >= TH - 1) continue;
        const float fx = tx - static_cast<float>(itx), fy = ty - static_cast<float>(ity);
        const int ix = static_cast<int>(itx), iy = static_cast<int>(ity);
        for (int b = 0; b < 4; ++b) {
          const float top = static_cast<float>(texture.Pixel(ix, iy)[b]) * (1.0f - fx) +
                            static_cast<float>(texture.Pixel(ix + 1, iy)[b]) * fx;
          const float bottom = static_cast<float>(texture.Pixel(ix, iy + 1)[b]) * (1.0f - fx) +
                               static_cast<float>(texture.Pixel(ix + 1, iy + 1)[b]) * fx;
          const int64_t value = Whole(top * (1.0f - fy) + bottom * fy);
          output.Pixel(x, static_cast<int>(span.row))[b] =
              static_cast<uint8_t>(value < 0     ? 0
                                   : value > 255 ? 255
                                                 : value);
        }
      }
    }
  }
}

}  // namespace n3ds::testing
