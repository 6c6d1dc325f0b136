// SPDX-License-Identifier: MIT
// Who is who: faces are followed from frame to frame, those that leave are remembered for a while,
// and another person at the same place is noticed.
#pragma once

#include <cstdint>

#include "steady/face_update.h"
#include "steady/start.h"

namespace n3ds::steady {

// For this long, s, a face that has left is remembered.
constexpr double kMemory = 2.1;

// True when the landmarks may be those of the face a frame later; then *distance tells how near they
// are.
bool MayContinue(const Face& face, const Observation& seen, float* distance);

// Takes the landmarks as those the next frame is compared with.
void RememberLandmarks(const Observation& seen, Face* face);

// Starts a face in `face`: as one of the resting faces where their person fits clearly better than
// anybody would, otherwise as a new one. Returns the index of the resting face it was, -1 for a new
// one. `face` is not valid when the landmarks are those of no face.
int StartPerson(const Tools& tools, const Observation& seen, Face* const* resting,
                int resting_count, StartScratch* scratch, Face* candidate, Face* face);

// Follows the misfit of a tracked face, after its update. Where it stays, the face is compared with
// a new start; true when that is somebody else, who then is in `face`.
bool NoticeChange(const Tools& tools, const Observation& seen, const TimeStep& time,
                  StartScratch* scratch, Face* candidate, Face* face);

}  // namespace n3ds::steady
