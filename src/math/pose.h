// SPDX-License-Identifier: MIT
// The form of a pose.
#pragma once

#include <cstdint>

namespace n3ds {

// A pose is a quaternion w, x, y, z, used at whatever length it has, and a translation. It is
// always seven floats, also when a solver is asked for fewer or more parameters.
constexpr int32_t kPoseSize = 7;

}  // namespace n3ds
