// SPDX-License-Identifier: MIT
// The geometric checks of a face model, a section each.
#pragma once

#include "model/check_report.h"
#include "model/face_model_file.h"

namespace n3ds::tool {

// Counts, borders and first rows of the mesh; number format of the mean.
void CheckForm(const FaceModelFile& model, CheckReport& report);

// Mean, modes, expressions and interaction against their mirror images, number by number.
void CheckSymmetry(const FaceModelFile& model, CheckReport& report);

// Angles, and folds in the mean face, random people, expressions and combinations.
void CheckShape(const FaceModelFile& model, double identity_unit, CheckReport& report);

// Products that the dense mesh's 16 bits cannot hold, and blocks that nothing reads.
void CheckInteraction(const FaceModelFile& model, double identity_unit, CheckReport& report);

// Overlaps, extremes and stretch of the texture layout.
void CheckTexture(const FaceModelFile& model, CheckReport& report);

// All of them. `identity_unit`: standard deviations of the population at identity coefficient 1.
CheckReport CheckModel(const FaceModelFile& model, double identity_unit);

}  // namespace n3ds::tool
