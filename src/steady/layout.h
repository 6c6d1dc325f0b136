// SPDX-License-Identifier: MIT
// Sizes and orders of the steady tracker's arrays.
//
// Arrays over landmarks hold one coordinate of all landmarks after the other and are padded to whole
// groups of eight, so that a kernel works on eight landmarks at once.
#pragma once

#include "core/model_tables.h"

namespace n3ds::steady {

constexpr int kLanes = 8;  // floats a kernel works on at once

// The state vector: a turn of the head (3), its place (3), identity and expression, all of which
// the landmarks measure, and the speed and acceleration of turn and place, which they do not.
constexpr int kMotionSize = 6;
constexpr int kIdentityAt = kMotionSize;
constexpr int kExpressionAt = kIdentityAt + kIdentityCount;
constexpr int kMeasuredSize = kExpressionAt + kExpressionCount;  // 42
constexpr int kSpeedAt = kMeasuredSize;
constexpr int kAccelerationAt = kSpeedAt + kMotionSize;
constexpr int kStateSize = kAccelerationAt + kMotionSize;  // 54
constexpr int kStateStride = 56;
constexpr int kMeasuredStride = 48;

// Landmarks 0 to 100; the repeated and the intermediate ones of the 165-point layout are measured,
// but have no place of their own on the model.
constexpr int kLandmarkCount = 101;
constexpr int kLandmarkStride = 104;

// Measurement i below kLandmarkStride is landmark i. After them follow the intermediate landmarks
// of the 165-point layout: 18 of the outline, 44 of the rings.
constexpr int kMiddleCount = 62;
constexpr int kMeasurementStride = 168;

// Outline landmark L slides along kRowPlaces places of the skin, numbers kRowPlaces * L and on.
constexpr int kRowPlaces = 17;
constexpr int kPlaceCount = kOutlineLandmarkCount * kRowPlaces;
constexpr int kPlaceStride = 328;
// Identity and expression vectors of one place, x, y, z each: 48 + 60, padded.
constexpr int kPlaceVectorStride = 112;
constexpr int kPlaceExpressionAt = 3 * kIdentityCount;

// Columns of the linearised measurements: the measured state, the residual and a column of zeros.
constexpr int kResidualColumn = kMeasuredSize;
constexpr int kColumnCount = 44;

// What the landmarks' offsets must not do: seven motions and sizes, and the identity modes.
constexpr int kGaugeCount = 7 + kIdentityCount;
constexpr int kGaugeStride = 24;

static_assert(kStateSize <= kStateStride && kStateStride % kLanes == 0);
static_assert(kMeasuredSize <= kMeasuredStride && kMeasuredStride % kLanes == 0);
static_assert(kLandmarkCount <= kLandmarkStride && kLandmarkStride % kLanes == 0);
static_assert(kPlaceCount <= kPlaceStride && kPlaceStride % kLanes == 0);
static_assert(kLandmarkStride + kMiddleCount <= kMeasurementStride);
static_assert(kMeasurementStride % kLanes == 0 && kPlaceVectorStride % kLanes == 0);
static_assert(kColumnCount % 4 == 0 && kColumnCount > kResidualColumn);

}  // namespace n3ds::steady
