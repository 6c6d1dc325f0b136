// SPDX-License-Identifier: MIT
#include "tiny_solver.h"

#include <ceres/tiny_solver.h>
#include <ceres/tiny_solver_autodiff_function.h>

namespace n3ds::bench {
namespace {

template <typename Function>
int Solve(const Function& function, float* pose) {
  ceres::TinySolver<Function> solver;
  // The library's defaults are for doubles.
  solver.options.max_num_iterations = 20;
  solver.options.gradient_tolerance = 1e-5f;
  solver.options.parameter_tolerance = 1e-5f;
  Eigen::Matrix<float, 7, 1> x = Eigen::Map<const Eigen::Matrix<float, 7, 1>>(pose);
  solver.Solve(function, &x);
  Eigen::Map<Eigen::Matrix<float, 7, 1>>{pose} = x;
  return solver.summary.iterations;
}

struct EngineFunction {
  using Scalar = float;
  enum { NUM_RESIDUALS = kTinyResiduals, NUM_PARAMETERS = kPoseSize };
  PoseResiduals residuals;

  bool operator()(const float* pose, float* r, float* jacobian) const {
    if (jacobian == nullptr) return residuals.Evaluate(pose, r) == N3DS_OK;
    // The engine's transpose is the column-major matrix that is wanted.
    float rows[kTinyResiduals * kPoseSize];
    return residuals.Linearise(pose, r, rows, jacobian) == N3DS_OK;
  }
};

struct ReprojectionError {
  const PoseProblem& problem;

  template <typename T>
  bool operator()(const T* pose, T* r) const {
    const T &w = pose[0], &x = pose[1], &y = pose[2], &z = pose[3];
    const T R[9] = {w * w + x * x - y * y - z * z, 2.0f * (x * y - w * z),
                    2.0f * (x * z + w * y),        2.0f * (x * y + w * z),
                    w * w - x * x + y * y - z * z, 2.0f * (y * z - w * x),
                    2.0f * (x * z - w * y),        2.0f * (y * z + w * x),
                    w * w - x * x - y * y + z * z};
    const float* camera = problem.camera;
    for (int i = 0; i < kTinyPoints; ++i) {
      const float* p = problem.model_points + 3 * i;
      const float* observed = problem.landmarks + 2 * i;
      const T xc = R[0] * p[0] + R[1] * p[1] + R[2] * p[2] + pose[4];
      const T yc = R[3] * p[0] + R[4] * p[1] + R[5] * p[2] + pose[5];
      const T zc = R[6] * p[0] + R[7] * p[1] + R[8] * p[2] + pose[6];
      r[2 * i] = camera[0] * xc / zc + camera[2] - observed[0];
      r[2 * i + 1] = camera[4] * yc / zc + camera[5] - observed[1];
    }
    return true;
  }
};

}  // namespace

int SolveTinyOnEngineResiduals(const PoseProblem& problem, float* pose) {
  return Solve(EngineFunction{PoseResiduals(problem)}, pose);
}

int SolveTinyOnReprojectionError(const PoseProblem& problem, float* pose) {
  using Function =
      ceres::TinySolverAutoDiffFunction<ReprojectionError, kTinyResiduals, kPoseSize, float>;
  const ReprojectionError error{problem};
  return Solve(Function(error), pose);
}

}  // namespace n3ds::bench
