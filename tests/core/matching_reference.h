// SPDX-License-Identifier: MIT
// The matching of faces to tracks written down once more, as plainly as it can be, to compare with.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace n3ds::testing {

// The track that each face continues; -1 for a new face.
inline std::vector<int32_t> ReferenceAssignment(const std::vector<int32_t>& faces,
                                                size_t face_count,
                                                const std::vector<int32_t>& previous,
                                                size_t previous_count, size_t landmark_num) {
  const auto distance = [&](size_t j, size_t p) {
    uint32_t sum = 0;
    for (const int k : {39, 45, 51, 57, 66, 67, 68, 69, 70, 71}) {
      for (size_t axis = 0; axis < 2; axis++) {
        const size_t at = 2 * static_cast<size_t>(k) + axis;
        const int64_t d =
            int64_t{faces[2 * landmark_num * j + at]} - previous[2 * landmark_num * p + at];
        sum += static_cast<uint32_t>(d < 0 ? -d : d);
      }
    }
    return static_cast<int32_t>(sum);
  };
  std::vector<int32_t> assigned(face_count, -1);
  if (face_count > previous_count) {
    for (size_t p = 0; p < previous_count; p++) {
      int64_t nearest = INT64_MAX;
      size_t candidate = face_count;
      for (size_t j = 0; j < face_count; j++) {
        if (distance(j, p) >= nearest) continue;
        nearest = distance(j, p);
        if (candidate < face_count) assigned[candidate] = -1;
        candidate = j;
        assigned[j] = static_cast<int32_t>(p);
      }
    }
  } else {
    for (size_t j = 0; j < face_count; j++) {
      for (size_t p = 0; p < previous_count; p++) {
        if (p == 0 || distance(j, p) < distance(j, static_cast<size_t>(assigned[j]))) {
          assigned[j] = static_cast<int32_t>(p);
        }
      }
    }
  }
  return assigned;
}

}  // namespace n3ds::testing
