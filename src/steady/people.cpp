// SPDX-License-Identifier: MIT
#include "steady/people.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "steady/dense_solver.h"
#include "steady/tuning.h"

namespace n3ds::steady {

namespace {

// Eye corners and the lower nose: they hardly move with the expression.
constexpr int kKeyLandmarks[] = {39, 45, 51, 57, 66, 67, 68, 69, 70, 71};

// All costs are -2 log likelihoods.
constexpr float kSamePerson = 70;    // by which the known person must fit better than anybody
constexpr float kOtherPerson = 40;   // by which another must fit better than the one at this place
constexpr float kUnlikePeople = 40;  // squared identity of a start that is hardly a face
constexpr double kIdentitySlack = 0.1;  // sd added to what was learnt

// A face changes when its misfit is this much over its usual one, or its identity moves by this
// much more than it is known to, for kChangeTime in a row.
constexpr float kMisfitRise = 1.3f;
constexpr float kMisfitMargin = 0.1f;
constexpr float kIdentityJump = 3;
constexpr double kChangeTime = 0.1;    // s
constexpr double kMisfitMemory = 1.0;  // s
constexpr int kSettledAge = 8;         // frames before which a face's misfit is not judged
constexpr float kOccluded = 0.1f;      // share of untrusted landmarks, from which it is occluded

float Distance(float ax, float ay, float bx, float by) {
  return std::sqrt((ax - bx) * (ax - bx) + (ay - by) * (ay - by));
}

// Width at the ears and half the distance from the chin to an eye, which no turn shortens both.
float FaceSize(const float* u, const float* v) {
  return Distance(u[0], v[0], u[18], v[18]) + 0.5f * Distance(u[9], v[9], u[42], v[42]);
}

bool MakeKnownPerson(const Face& face, KnownPerson* known) {
  double covariance[kIdentityCount * kIdentityCount];
  for (int i = 0; i < kIdentityCount; i++) {
    for (int j = 0; j < kIdentityCount; j++) {
      covariance[i * kIdentityCount + j] =
          static_cast<double>(face.covariance[kIdentityAt + i][kIdentityAt + j]) +
          (i == j ? kIdentitySlack * kIdentitySlack : 0);
    }
  }
  known->face = &face;
  if (!FactorSymmetric(covariance, kIdentityCount)) return false;
  InvertFactored(covariance, kIdentityCount, known->information);
  return true;
}

float DistanceFromKnown(const KnownPerson& known, const StateMean& mean) {
  double sum = 0;
  for (int i = 0; i < kIdentityCount; i++) {
    for (int j = 0; j < kIdentityCount; j++) {
      const float a = mean.identity[i] - known.face->mean.identity[i];
      const float b = mean.identity[j] - known.face->mean.identity[j];
      sum += known.information[i * kIdentityCount + j] * static_cast<double>(a) *
             static_cast<double>(b);
    }
  }
  return static_cast<float>(sum);
}

}  // namespace

bool MayContinue(const Face& face, const Observation& seen, float* distance) {
  float sum = 0;
  for (const int k : kKeyLandmarks) {
    sum += Distance(face.last_u[k], face.last_v[k], seen.u[k], seen.v[k]);
  }
  *distance = sum / 10;
  const float size = FaceSize(seen.u, seen.v) + 1;
  const float last = FaceSize(face.last_u, face.last_v) + 1;
  return *distance < std::max(size, last) && size < 2 * last && last < 2 * size;
}

void RememberLandmarks(const Observation& seen, Face* face) {
  std::memcpy(face->last_u, seen.u, sizeof(face->last_u));
  std::memcpy(face->last_v, seen.v, sizeof(face->last_v));
}

int StartPerson(const Tools& tools, const Observation& seen, Face* const* resting,
                int resting_count, StartScratch* scratch, Face* candidate, Face* face) {
  float best = StartFace(tools, seen, nullptr, scratch, face);
  if (best < kNoFit) best = FitCost(tools, seen, face) + SquaredIdentity(face->mean) - kSamePerson;
  int found = -1;
  for (int i = 0; i < resting_count; i++) {
    if (resting[i] == nullptr) continue;
    KnownPerson known;
    if (!MakeKnownPerson(*resting[i], &known)) continue;
    if (!(StartFace(tools, seen, &known, scratch, candidate) < kNoFit)) continue;
    const float cost = FitCost(tools, seen, candidate) + DistanceFromKnown(known, candidate->mean);
    if (!(cost < best)) continue;
    best = cost;
    found = i;
    *face = *candidate;
    face->id = resting[i]->id;
    face->usual_misfit = resting[i]->usual_misfit;
  }
  return found;
}

bool NoticeChange(const Tools& tools, const Observation& seen, const TimeStep& time,
                  StartScratch* scratch, Face* candidate, Face* face) {
  const double seconds = time.steps / 30;
  if (face->age < kSettledAge) {
    const bool first = face->age < 2;
    face->usual_misfit =
        first ? face->misfit_ratio
              : face->usual_misfit + (face->misfit_ratio - face->usual_misfit) * 0.3f;
    face->bad_frames = 0;
    return false;
  }
  int inner = 0;
  int untrusted = 0;
  for (int i = kOutlineLandmarkCount; i < kLandmarkCount; i++) {
    if (tools.model.has_offset[i] == 0) continue;  // not measured
    inner++;
    if (!(seen.active[i] > 0) || tools.work->weight[i] < kTrusted) untrusted++;
  }
  if (static_cast<float>(untrusted) > kOccluded * static_cast<float>(inner)) {
    face->bad_frames = 0;
    return false;
  }
  const bool bad = face->misfit_ratio > kMisfitRise * face->usual_misfit + kMisfitMargin ||
                   face->identity_surprise > kIdentityJump;
  if (!bad) {
    face->usual_misfit += (face->misfit_ratio - face->usual_misfit) *
                          static_cast<float>(std::min(0.5, seconds / kMisfitMemory));
    face->bad_frames = 0;
    return false;
  }
  face->bad_frames++;
  if (face->bad_frames * seconds < kChangeTime) return false;
  face->bad_frames = 0;

  const bool started = StartFace(tools, seen, nullptr, scratch, candidate) < kNoFit;
  const float their_identity = SquaredIdentity(candidate->mean);
  const float theirs = started ? FitCost(tools, seen, candidate) + their_identity : kNoFit;
  scratch->trial = *face;  // the comparison must not touch the face
  const float ours = FitCost(tools, seen, &scratch->trial) + SquaredIdentity(face->mean);
  if (!(theirs < ours - kOtherPerson) || !(their_identity < kUnlikePeople)) {
    face->usual_misfit += (face->misfit_ratio - face->usual_misfit) * 0.5f;
    return false;
  }
  *face = *candidate;
  return UpdateFace(tools, seen, time, face) == Outcome::kUpdated;
}

}  // namespace n3ds::steady
