// SPDX-License-Identifier: MIT
#include "steady/measurements.h"

#include <algorithm>
#include <array>

namespace n3ds::steady {

const Middle kMiddles[kMiddleCount] = {
    // outline
    {0, 1},
    {1, 2},
    {2, 3},
    {3, 4},
    {4, 5},
    {5, 6},
    {6, 7},
    {7, 8},
    {8, 9},
    {9, 10},
    {10, 11},
    {11, 12},
    {12, 13},
    {13, 14},
    {14, 15},
    {15, 16},
    {16, 17},
    {17, 18},
    // eye at image left
    {39, 40},
    {40, 41},
    {41, 42},
    {42, 43},
    {43, 44},
    {44, 45},
    {45, 46},
    {46, 47},
    {47, 48},
    {48, 49},
    {49, 50},
    {50, 39},
    // eye at image right
    {51, 52},
    {52, 53},
    {53, 54},
    {54, 55},
    {55, 56},
    {56, 57},
    {57, 58},
    {58, 59},
    {59, 60},
    {60, 61},
    {61, 62},
    {62, 51},
    // outer lip
    {75, 76},
    {76, 77},
    {77, 78},
    {78, 79},
    {79, 80},
    {80, 81},
    {81, 82},
    {82, 83},
    {83, 84},
    {84, 85},
    {85, 86},
    {86, 75},
    // inner lip
    {87, 88},
    {88, 89},
    {89, 90},
    {90, 91},
    {91, 92},
    {92, 93},
    {93, 94},
    {94, 87},
};

namespace {

constexpr int kFirstMiddleLandmark = 103;
constexpr int kPupils[2] = {95, 96};
constexpr int kFarthestPixel = 1 << 20;

using Mask = std::array<float, kMeasurementStride>;

constexpr Mask MakeMask(bool has_middles) {
  Mask mask{};
  for (int i = 0; i < kLandmarkCount; i++) mask[static_cast<std::size_t>(i)] = 1;
  for (const int pupil : kPupils) mask[static_cast<std::size_t>(pupil)] = 0;
  constexpr std::size_t kFirst = kLandmarkStride;
  for (std::size_t i = 0; has_middles && i < kMiddleCount; i++) mask[kFirst + i] = 1;
  return mask;
}

alignas(32) constexpr Mask kActive[2] = {MakeMask(false), MakeMask(true)};

float Pixel(int coordinate) {
  return static_cast<float>(std::clamp(coordinate, -kFarthestPixel, kFarthestPixel));
}

}  // namespace

const float* ActiveMeasurements(bool has_middles) { return kActive[has_middles ? 1 : 0].data(); }

int ActiveCount(bool has_middles) { return kLandmarkCount - 2 + (has_middles ? kMiddleCount : 0); }

void FillMeasurements(const int* landmarks, int count, float* u, float* v) {
  std::fill_n(u, kMeasurementStride, 0.0f);
  std::fill_n(v, kMeasurementStride, 0.0f);
  for (int i = 0; i < kLandmarkCount; i++) {
    u[i] = Pixel(landmarks[2 * i]);
    v[i] = Pixel(landmarks[2 * i + 1]);
  }
  if (count <= kLandmarkCount) return;
  for (int i = 0; i < kMiddleCount; i++) {
    const int* point = landmarks + 2 * (kFirstMiddleLandmark + i);
    u[kLandmarkStride + i] = Pixel(point[0]);
    v[kLandmarkStride + i] = Pixel(point[1]);
  }
}

}  // namespace n3ds::steady
