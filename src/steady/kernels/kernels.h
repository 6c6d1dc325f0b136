// SPDX-License-Identifier: MIT
// The steps of an update that cost time. They are compiled once for every processor and, on x86-64,
// once more for AVX2; results are the same bits.
#pragma once

#include "steady/face.h"
#include "steady/model.h"
#include "steady/time_step.h"
#include "steady/workspace.h"

namespace n3ds::steady {

struct Kernels {
  void (*make_personal)(const Model& model, Face* face);
  void (*face_points)(const Model& model, bool with_vectors, Face* face, Workspace* work);
  void (*residuals)(const Model& model, const Observation& seen, float noise, float inflation,
                    bool robust, Face* face, Workspace* work);
  void (*linear_rows)(const Observation& seen, const Face& face, Workspace* work);
  bool (*factor_covariance)(Workspace* work);
  bool (*solve_step)(Workspace* work);
  void (*posterior)(const Workspace& work, Face* face);
  void (*predict_covariance)(const TimeStep& time, Face* face);
  void (*update_offsets)(const Model& model, const TimeStep& time, float noise, Face* face,
                         Workspace* work);
};

// Those every processor can run, and the fastest this one can.
const Kernels& BaseKernels();
const Kernels& BestKernels();

}  // namespace n3ds::steady
