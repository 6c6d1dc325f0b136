// SPDX-License-Identifier: MIT
// The pose solver written down plainly, element by element, to hold the engine's against. Nothing
// is shared with it but the linear solver, which has tests of its own.
//
// The residuals are a template over the number type: in float they are the definition, bit for bit;
// in double they serve to differentiate numerically.
#pragma once

#include <array>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "support/pose_scene.h"

namespace n3ds::testing {

struct PoseCase {
  std::vector<float> landmarks;
  std::vector<float> model;
  std::array<float, 9> camera{};
  float contour_weight = 1;
  float range_weight = 1;
  int64_t mode = 0;
  float inner_weight = 1;

  int count() const { return static_cast<int>(landmarks.size() / 2); }
};

// A head whose landmarks lie exactly where `pose` puts them.
inline PoseCase ExactCase(const Pose& pose) {
  PoseCase c;
  c.model = MakeHead();
  c.camera = MakeCamera(1280, 720);
  c.landmarks = Project(c.model, c.camera, pose);
  return c;
}

// What the outline rule did with a landmark.
enum class OutlineRule { kNotOutline, kKept, kVertical, kHorizontal, kOblique };

// Plain casts, for landmarks well inside the range of integers.
struct ReferenceLine {
  int ax, ay, bx, by;
};
inline ReferenceLine ReferenceMiddleLine(const PoseCase& c) {
  const auto x = [&](int i) { return c.landmarks[2 * i]; };
  const auto y = [&](int i) { return c.landmarks[2 * i + 1]; };
  return {static_cast<int>(x(9)), static_cast<int>(y(9)), static_cast<int>(x(51) + x(45)) / 2,
          static_cast<int>(x(51) + y(45) + 1.0f) / 2};
}

template <typename T>
struct PointTerms {
  T r[2];
  T j[2][7];
  OutlineRule rule;
  T depth;
};

template <typename T>
PointTerms<T> ReferencePoint(const PoseCase& c, const T* pose, int i) {
  const T w = pose[0], x = pose[1], y = pose[2], z = pose[3];
  const T X = c.model[3 * i], Y = c.model[3 * i + 1], Z = c.model[3 * i + 2];
  const T fx = c.camera[0], cx = c.camera[2], fy = c.camera[4], cy = c.camera[5];
  const T ox = c.landmarks[2 * i], oy = c.landmarks[2 * i + 1];

  const T row0[3] = {w * w + x * x - y * y - z * z, 2 * (x * y - w * z), 2 * (x * z + w * y)};
  const T row1[3] = {2 * (x * y + w * z), w * w - x * x + y * y - z * z, 2 * (y * z - w * x)};
  const T row2[3] = {2 * (x * z - w * y), 2 * (y * z + w * x), w * w - x * x - y * y + z * z};
  const T xc = row0[0] * X + row0[1] * Y + row0[2] * Z + pose[4];
  const T yc = row1[0] * X + row1[1] * Y + row1[2] * Z + pose[5];
  const T zc = row2[0] * X + row2[1] * Y + row2[2] * Z + pose[6];
  const T u = fx * xc / zc + cx;
  const T v = fy * yc / zc + cy;

  PointTerms<T> p;
  p.depth = zc;
  p.r[0] = u - ox;
  p.r[1] = v - oy;

  const T dxc[7] = {2 * (w * X - z * Y + y * Z),
                    2 * (x * X + y * Y + z * Z),
                    2 * (x * Y - y * X + w * Z),
                    2 * (x * Z - w * Y - z * X),
                    1,
                    0,
                    0};
  const T dyc[7] = {2 * (z * X + w * Y - x * Z),
                    2 * (y * X - x * Y - w * Z),
                    2 * (x * X + y * Y + z * Z),
                    2 * (w * X - z * Y + y * Z),
                    0,
                    1,
                    0};
  const T dzc[7] = {2 * (x * Y - y * X + w * Z),
                    2 * (z * X + w * Y - x * Z),
                    2 * (z * Y - w * X - y * Z),
                    2 * (x * X + y * Y + z * Z),
                    0,
                    0,
                    1};
  for (int k = 0; k < 4; ++k) {
    // A power of two moves through products without a change of bits.
    p.j[0][k] = fx * (dxc[k] * zc - xc * dzc[k]) / (zc * zc);
    p.j[1][k] = fy * (dyc[k] * zc - yc * dzc[k]) / (zc * zc);
  }
  p.j[0][4] = fx / zc;
  p.j[1][4] = 0;
  p.j[0][5] = 0;
  p.j[1][5] = fy / zc;
  p.j[0][6] = -fx * xc / (zc * zc);
  p.j[1][6] = -fy * yc / (zc * zc);

  const auto multiply = [&](T factor) {
    for (int row = 0; row < 2; ++row) {
      p.r[row] *= factor;
      for (T& value : p.j[row]) value *= factor;
    }
  };
  if (c.mode != 0) {
    if (i == 39 || i == 45 || i == 51 || i == 57) {
      multiply(1);
    } else if (i == 63 || i == 64 || i == 65 || i == 68) {
      multiply(c.inner_weight < 1 ? c.inner_weight : 1);
    } else if (i == 69 || i == 72 || i == 73 || i == 74) {
      multiply(c.inner_weight >= 1 ? 1.0f / c.inner_weight : 1);
    } else {
      multiply(0.1f);
    }
  }
  if ((i >= 5 && i <= 13) || i == 75 || i == 76 || (i >= 80 && i <= 88) || (i >= 90 && i <= 94)) {
    multiply(c.range_weight);
  }

  p.rule = OutlineRule::kNotOutline;
  // Without the landmarks that define the line there is no outline rule.
  if (c.count() > 51 && (i <= 3 || (i >= 15 && i <= 18))) {
    const ReferenceLine line = ReferenceMiddleLine(c);
    const T weight = c.contour_weight;
    p.rule = OutlineRule::kKept;
    if (line.bx == line.ax) {
      const T at = static_cast<T>(line.bx);
      if (std::abs(u - at) > std::abs(ox - at)) {
        p.rule = OutlineRule::kVertical;
        p.r[0] = p.r[1] = weight * p.r[0];
        for (int k = 0; k < 7; ++k) p.j[0][k] = p.j[1][k] = weight * p.j[0][k];
      }
    } else if (line.by == line.ay) {
      const T at = static_cast<T>(line.by);
      if (std::abs(oy - at) < std::abs(v - at)) {
        p.rule = OutlineRule::kHorizontal;
        p.r[0] = p.r[1] = weight * p.r[1];
        for (int k = 0; k < 7; ++k) p.j[0][k] = p.j[1][k] = weight * p.j[1][k];
      }
    } else {
      const T run = static_cast<T>(line.bx - line.ax);
      const T k_line = static_cast<T>(line.by - line.ay) / run;
      const T c_line = static_cast<T>(line.bx * line.ay - line.by * line.ax) / run;
      if (std::abs(k_line * ox - oy + c_line) < std::abs(k_line * u - v + c_line)) {
        p.rule = OutlineRule::kOblique;
        const T n = -1 / k_line;
        const T s = n * n + 1;
        p.r[0] = (p.r[0] + n * p.r[1]) * weight / s;
        p.r[1] = n * p.r[0];
        for (int k = 0; k < 7; ++k) {
          p.j[0][k] = (p.j[0][k] + n * p.j[1][k]) * weight / s;
          p.j[1][k] = n * p.j[0][k];
        }
      }
    }
  }
  return p;
}

struct ReferenceEvaluation {
  MRESULT status = 0;
  std::vector<float> r, J, JtJ, g;
};

inline ReferenceEvaluation ReferenceEvaluate(const PoseCase& c, const float* pose) {
  ReferenceEvaluation e;
  for (int i = 0; i < c.count(); ++i) {
    const PointTerms<float> p = ReferencePoint<float>(c, pose, i);
    if (std::fabs(static_cast<double>(p.depth)) <= 1e-6) {
      e.status = -100;
      return e;
    }
    for (int row = 0; row < 2; ++row) {
      e.r.push_back(p.r[row]);
      e.J.insert(e.J.end(), p.j[row], p.j[row] + 7);
    }
  }
  e.JtJ.assign(49, 0);
  e.g.assign(7, 0);
  for (size_t row = 0; row < e.r.size(); ++row) {
    for (int a = 0; a < 7; ++a) {
      e.g[a] += e.J[row * 7 + a] * e.r[row];
      for (int b = 0; b < 7; ++b) {
        e.JtJ[a * 7 + b] = std::fma(e.J[row * 7 + a], e.J[row * 7 + b], e.JtJ[a * 7 + b]);
      }
    }
  }
  return e;
}

// One pass of the loop.
struct ReferencePass {
  float damping;  // before the pass
  float ratio;
  bool accepted;
};

struct ReferenceSolve {
  MRESULT status = 0;
  bool converged = false;
  std::array<float, 7> pose{};
  std::vector<ReferencePass> passes;  // those that came to a gain ratio
  int iterations = 0;
  int rejected_before_accepted = 0;  // rejections that a later pass of the solve followed
};

// With flip_after_rejection false the gradient keeps its sign when a step was rejected: what the
// solver would do without its peculiarity, to show that a case tells the two apart.
inline ReferenceSolve ReferenceSolvePose(const PoseCase& c, std::array<float, 7> pose,
                                         bool flip_after_rejection = true) {
  ReferenceSolve out;
  out.pose = pose;
  ReferenceEvaluation e = ReferenceEvaluate(c, pose.data());
  out.status = e.status;
  if (out.status != 0) return out;

  const auto largest_gradient = [&] {
    float largest = 0;
    for (const float v : e.g) largest = std::fabs(v) > largest ? std::fabs(v) : largest;
    return largest;
  };
  float mu = 0;
  for (int j = 0; j < 7; ++j) mu = e.JtJ[j * 7 + j] > mu ? e.JtJ[j * 7 + j] : mu;
  mu = 0.001f * mu;
  out.converged = largest_gradient() <= 1e-5f;
  int nu = 2;
  bool after_rejection = false;
  while (!out.converged && out.iterations < 20) {
    ++out.iterations;
    std::vector<float> A = e.JtJ;
    std::array<float, 7> h{};
    for (int j = 0; j < 7; ++j) {
      A[j * 7 + j] += mu;
      if (flip_after_rejection || !after_rejection) e.g[j] = -e.g[j];
    }
    out.status = SolveLinearAxb(nullptr, A.data(), 7, 7, h.data(), e.g.data());
    if (out.status != 0) return out;
    float hh = 0, pp = 0;
    for (int j = 0; j < 7; ++j) {
      hh += h[j] * h[j];
      pp += out.pose[j] * out.pose[j];
    }
    if (std::sqrt(hh) <= 1e-5f * (std::sqrt(pp) + 1e-5f)) {
      out.converged = true;
      break;
    }
    std::array<float, 7> next;
    for (int j = 0; j < 7; ++j) next[j] = out.pose[j] + h[j];
    const ReferenceEvaluation moved = ReferenceEvaluate(c, next.data());
    out.status = moved.status;
    if (out.status != 0) return out;
    float gain = 0, promised = 0;
    for (size_t k = 0; k < e.r.size(); ++k) {
      gain += e.r[k] * e.r[k] - moved.r[k] * moved.r[k];
    }
    for (int j = 0; j < 7; ++j) promised += h[j] * (mu * h[j] + e.g[j]);
    const float rho = gain / promised;
    out.passes.push_back({mu, rho, rho > 0});
    if (!(rho > 0)) {
      mu = mu * static_cast<float>(nu);
      nu = 2 * nu;
      after_rejection = true;
      continue;
    }
    if (after_rejection) ++out.rejected_before_accepted;
    after_rejection = false;
    out.pose = next;
    e = moved;
    out.converged = largest_gradient() <= 1e-5f;
    const float t = 2 * rho - 1;
    float f = 1 - t * t * t;
    if (!(static_cast<double>(f) > 0.333)) f = 0.333f;
    mu = mu * f;
    nu = 2;
  }
  return out;
}

}  // namespace n3ds::testing
