// SPDX-License-Identifier: MIT
// How the full rigid worker smooths the fitted pose over time.
#pragma once

#include <cstdint>

namespace n3ds {

// 1 to 2: how much more the previous pose counts because the eyes move more than the mouth and the
// jaw, and the head as a whole moves little.
//   outline_width  of this frame, before the landmarks were smoothed
float MotionFactor(const int32_t* landmarks, const int32_t* previous, float outline_width);

// Blends the fitted pose with the previous one, in place. The quaternion is not renormalised: its
// length stays near 1, and the output rotation takes it as it is.
void SmoothPose(const float* previous, float motion_factor, float* pose);

}  // namespace n3ds
