// SPDX-License-Identifier: MIT
#pragma once

namespace n3ds::steady {

// The value of rank `rank`, from 0, of `count` finite values, whose order is changed.
float SelectSmallest(float* values, int count, int rank);

}  // namespace n3ds::steady
