// SPDX-License-Identifier: MIT
// How the landmarks moved since the last frame, and how much they are held back for it.
#pragma once

#include <cstdint>

namespace n3ds {

// Distance between the two ends of the outline (landmarks 0 and 18), pixels.
float OutlineWidth(const int32_t* landmarks);

// Sums of the signed moves of some landmarks: noise cancels, common motion adds up.
struct MotionSum {
  float x = 0.0f;
  float y = 0.0f;
  float Size() const;  // |x| + |y|

  // Adds the moves of landmarks first to last, both included.
  void Add(const int32_t* landmarks, const int32_t* previous, int first, int last);
};

// Motion of eight steady points of eyes and nose: the size of the sum of their moves, in percent of
// the outline width. Infinite or NaN for a width of 0.
float SteadyPointMotion(const int32_t* landmarks, const int32_t* previous, float outline_width);

struct BlendWeights {
  float previous;
  float current;
};

// The previous frame's weight falls linearly with the motion, 0.7 - slope * motion, below the limit;
// it is 0.1 from there on and for a NaN motion.
BlendWeights SmoothingWeights(float motion, double slope, float limit);

// Blends the first 95 landmarks with the previous frame's, in place, truncated to integer pixels.
void BlendLandmarks(const BlendWeights& weights, const int32_t* previous, int32_t* landmarks);

}  // namespace n3ds
