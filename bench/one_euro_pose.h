// SPDX-License-Identifier: MIT
// A one-euro filter on a head pose: Casiez, Roussel and Vogel, "1 euro filter: a simple speed-based
// low-pass filter for noisy input in interactive systems" (2012). Slow movements are smoothed
// strongly, fast ones hardly.
#pragma once

#include <array>
#include <cstddef>

#include "eval/metrics.h"

namespace n3ds::tool {

struct OneEuroSettings {
  double min_cutoff;        // Hz, at rest
  double slope;             // Hz more for each unit a second
  double speed_cutoff = 1;  // Hz, of the speed's own filter
};

class OneEuroFilter {
 public:
  explicit OneEuroFilter(const OneEuroSettings& settings) : settings_(settings) {}
  double Filter(double value, double seconds);

 private:
  OneEuroSettings settings_;
  bool started_ = false;
  double value_ = 0;
  double speed_ = 0;
};

// Filters the three translations (mm) and the four numbers of the quaternion each by itself.
class OneEuroPose {
 public:
  OneEuroPose();
  PoseEstimate Filter(const PoseEstimate& pose, double seconds);

 private:
  std::array<OneEuroFilter, 3> translation_;
  std::array<OneEuroFilter, 4> rotation_;
  std::array<double, 4> last_{};
};

// The track's poses with a filter for each person, started anew after a gap.
TrackPoses Filtered(const Track& track, const TrackPoses& poses);

}  // namespace n3ds::tool
