// SPDX-License-Identifier: MIT
// What the steady tracker's tests share: its tables for the shipped model, and observations of model
// faces.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <memory>
#include <vector>

#include "steady/kernels/kernels.h"
#include "steady/measurements.h"
#include "steady/model.h"
#include "steady/tracker.h"
#include "support/core_context.h"
#include "support/face_scene.h"
#include "support/test_random.h"

namespace n3ds::testing {

inline Core& SharedCore() {
  static const std::unique_ptr<Core> core = Core::Ready();
  return *core;
}

inline const steady::Model& SharedModel() {
  static const std::unique_ptr<steady::Model> model = [] {
    auto built = std::make_unique<steady::Model>();
    steady::BuildModel(SharedCore().context(), built.get());
    return built;
  }();
  return *model;
}

inline std::unique_ptr<steady::Workspace> MakeWorkspace() {
  auto work = std::make_unique<steady::Workspace>();
  std::memset(static_cast<void*>(work.get()), 0, sizeof(*work));
  std::memcpy(work->identity, SharedModel().identity, sizeof(work->identity));
  return work;
}

// A face's landmarks in an image of 1280 x 720 pixels.
class Seen {
 public:
  explicit Seen(const std::vector<int32_t>& landmarks) {
    const auto count = static_cast<int>(landmarks.size() / 2);
    steady::FillMeasurements(landmarks.data(), count, u_, v_);
    const bool middles = count > 101;
    observation_ = {u_,
                    v_,
                    steady::ActiveMeasurements(middles),
                    steady::ActiveCount(middles),
                    middles,
                    1000.0f,
                    640.0f,
                    360.0f};
  }
  Seen(const Seen&) = delete;
  Seen& operator=(const Seen&) = delete;
  const steady::Observation& get() const { return observation_; }

 private:
  alignas(32) float u_[steady::kMeasurementStride];
  alignas(32) float v_[steady::kMeasurementStride];
  steady::Observation observation_;
};

constexpr int kWidth = 1280;
constexpr int kHeight = 720;

inline std::vector<int32_t> Landmarks(const HeadPlace& place, int count = 101,
                                      const std::vector<double>& identity = {},
                                      const std::vector<double>& expression = {}) {
  return DetectLandmarks(ModelShape(identity, expression), place, kWidth, kHeight, count);
}

// The angle between two rotations, row by row, degrees.
template <typename A, typename B>
double DegreesBetween(const A* a, const B* b) {
  double trace = 0;
  for (int i = 0; i < 9; i++) trace += static_cast<double>(a[i]) * static_cast<double>(b[i]);
  return std::acos(std::clamp((trace - 1) / 2, -1.0, 1.0)) * 57.29577951308232;
}

}  // namespace n3ds::testing
