// SPDX-License-Identifier: MIT
// The constants the steady tracker was tuned to. Lengths are mm, turns rad, places x / z, y / z and
// log z, identity standard deviations of the population; rates are for steps of 1/30 s, the time in
// which all formulas count.
#pragma once

namespace n3ds::steady {

// --- Movement. The acceleration dies away, its noise is per step.
constexpr double kAccelerationDecay = 0.1625;  // time constant 0.2 s; faster costs accuracy
constexpr float kTurnNoise = 0.0003f;
constexpr float kPlaceNoise = 0.00015f;
constexpr float kDepthNoise = 0.0004f;

// --- Shape. Expressions return to a slight rest; blinks are too quick to be predicted.
constexpr double kExpressionDecay = 0.10536;
constexpr float kExpressionNoise = 0.03f;  // more jitters, less lags behind the mouth
constexpr float kBlinkNoise = 0.25f;
constexpr float kIdentityNoise = 0.002f;
constexpr float kExpressionRest = 0.08f;    // people rarely look quite neutral
constexpr float kExpressionSpread = 0.3f;   // about the rest, for a new face
constexpr float kExpressionBarrier = 0.1f;  // softness of the limits below
constexpr float kLowestExpression = 0.0f;   // no muscle works backwards
constexpr float kLowestBlink = -0.25f;      // but eyes may be wider than the model's
constexpr float kHighestExpression = 1.1f;

// --- Noise of a landmark.
constexpr float kOffsetSpread = 0.9f;         // of a person's landmark about the fitted model
constexpr float kOffsetNoise = 1e-5f;         // mm^2 a step
constexpr float kModelNoise = 0.35f;          // what the model cannot follow from frame to frame
constexpr float kOutlineNormal = 1.5f;        // of an outline landmark, across the outline
constexpr float kOutlineAlong = 1.5f;         // and along it
constexpr float kOutlineTurned = 8.0f;        // more across it on a turned head, per sine beyond
constexpr float kOutlineTurnedFrom = 0.2f;    // this
constexpr float kRounding = 1.0f / 12.0f;     // variance of rounding to integer pixels
constexpr float kLeastNoise = 0.35f * 0.35f;  // px^2
constexpr float kFirstNoise = 0.5f;           // px^2, of a new face
constexpr float kNoiseInflation = 2.0f;       // landmark noise is correlated in time
constexpr float kOffsetInflation = 10.0f;     // so offsets learn slowly
constexpr double kNoiseMemory = 0.95;         // kept of the noise estimate a step
constexpr int kNoiseWarmUp = 20;              // frames in which it is a plain mean

// The outline landmark is a soft maximum over its row with this softness; places further in than
// kOutlineReach have no weight a float would show.
constexpr float kOutlineSoftness = 0.4f;
constexpr float kOutlineReach = 6.9f;  // in units of the softness

// --- Robustness: Student-t weights of 4 degrees of freedom, relative to how well the face fits as
// a whole, and a steeper gate for points that are clearly wrong.
constexpr float kFreedom = 4.0f;
constexpr float kHighestWeight = 1.2f;
constexpr float kGate = 12.0f;  // mm; 20 loses half-hidden faces
constexpr float kGateNoise = 9.0f;
constexpr float kQuantile = 0.3f;           // holds with up to 60 % of the points wrong
constexpr float kQuantileOfTwo = 0.71335f;  // of chi^2 with 2 degrees of freedom
constexpr float kQuantileOfOne = 0.1485f;   // of chi^2 with 1
constexpr float kTrusted = 0.15f;           // weight of a landmark that takes part in estimates
constexpr float kOffsetTrusted = 0.3f;      // weight below which its offset learns less

// --- Surprise: a pose change this many times as large as predicted (mean square) widens the
// prediction and is solved again.
constexpr float kSurprise = 2.0f;
constexpr float kMostSurprise = 1e4f;
constexpr int kMostSolves = 3;

// --- Confidence. A face whose 30 % best landmarks are off by more than three times their noise is not
// explained; nor is one of hardly three pixels, one that all but touches the camera, or one that
// nobody has.
constexpr float kMostMisfit = 12.0f;
constexpr float kNearestFace = 80.0f;     // mm
constexpr float kUnlikeAnybody = 300.0f;  // squared identity; people have 16, some 40
constexpr float kUsualMisfit = 3.0f;
constexpr float kSmallestFace = 0.02f;  // px per mm
constexpr float kFarthestLog = 20.0f;   // log z of no face

// Personal expressions are made again when an identity value has moved by this much.
constexpr float kIdentityStep = 0.15f;

// --- A new face.
constexpr float kNoseDepth = 38.0f;  // of the tip before the line from the eyes to the mouth
constexpr float kPoorStart = 2.0f;   // robust cost a measurement, from which other turns are tried
constexpr float kWideNoise = 25.0f;  // px^2, of the first two steps
constexpr int kPoseSteps = 2;        // of the pose alone, at first
constexpr int kFirstSteps = 10;
constexpr int kLastSteps = 5;
constexpr float kLongestTurn = 0.5f;      // of one step
constexpr float kSmallTurn = 0.002f;      // ends the steps
constexpr float kFirstTurnSpeed = 4e-4f;  // variances
constexpr float kFirstPlaceSpeed = 1e-4f;
constexpr float kFirstTurnAcceleration = 1e-5f;
constexpr float kFirstPlaceAcceleration = 2e-6f;

// --- Time steps, in 1/30 s.
constexpr double kShortestStep = 0.1;
constexpr double kLongestStep = 60.0;

}  // namespace n3ds::steady
