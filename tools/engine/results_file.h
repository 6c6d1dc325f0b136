// SPDX-License-Identifier: MIT
// Results of a tracked sequence as JSON lines.
//
// Line 1: {"format":"face-track-results","version":1,"width":W,"height":H,"landmarks":N,
// "mode":"rigid"} with the size of the upright image. Then a line a frame:
// {"frame":0,"ok":true,"faces":[{"id":0,"projection":[16],"view":[16],"model":[16],
// "landmarks3d":[3 N]}]}, matrices column-major, landmarks x, y, z in mm in the model frame. Floats
// are written in the shortest form that reads back to the same bits; a non-finite value is
// null.
#pragma once

#include <ostream>
#include <string>

#include "engine/face_results.h"
#include "tracks/track_file.h"

namespace n3ds::tool {

void WriteResultsHeader(std::ostream& out, const TrackHeader& header, const std::string& mode);
void WriteResultsFrame(std::ostream& out, const FrameResult& frame);

}  // namespace n3ds::tool
