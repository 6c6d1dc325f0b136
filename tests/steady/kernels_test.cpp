// SPDX-License-Identifier: MIT
// The kernels against the formulas they stand for, and every instruction set against the others.
#include "steady/kernels/kernels.h"

#include <gtest/gtest.h>

#include <cmath>
#include <memory>

#include "steady/dense_solver.h"
#include "steady/face_update.h"
#include "steady/start.h"
#include "steady/steady_testing.h"

namespace n3ds::testing {
namespace {

using namespace steady;

// A face fitted to a turned, talking person, ready for a frame.
struct Scene {
  Seen seen;
  std::unique_ptr<Workspace> work = MakeWorkspace();
  std::unique_ptr<Face> face = std::make_unique<Face>();

  explicit Scene(int landmarks, const Kernels& kernels = BaseKernels())
      : seen(Landmarks({0.15, 0.05, -0.1, 30, -20, 550}, landmarks, {0.1, -0.05, 0.1, 0.02},
                       {0.5, 0, 0.1, 0.2, 0.4})) {
    auto scratch = std::make_unique<StartScratch>();
    const Tools tools = {SharedModel(), kernels, work.get()};
    EXPECT_LT(StartFace(tools, seen.get(), nullptr, scratch.get(), face.get()), kNoFit);
  }
  void Linearise(const Kernels& kernels = BaseKernels()) {
    kernels.face_points(SharedModel(), true, face.get(), work.get());
    kernels.residuals(SharedModel(), seen.get(), face->noise, 2, true, face.get(), work.get());
    kernels.linear_rows(seen.get(), *face, work.get());
  }
};

// Moves each number of the state and compares the landmarks' motion with the columns.
TEST(SteadyKernels, ColumnsAreTheDerivativesOfTheProjection) {
  Scene scene(101);
  scene.Linearise();
  const auto column_u = std::make_unique<float[]>(kColumnCount * kLandmarkStride);
  const auto column_v = std::make_unique<float[]>(kColumnCount * kLandmarkStride);
  std::memcpy(column_u.get(), scene.work->column_u, sizeof(scene.work->column_u));
  std::memcpy(column_v.get(), scene.work->column_v, sizeof(scene.work->column_v));
  const StateMean at = scene.face->mean;
  for (int c = 0; c < kMeasuredSize; c++) {
    // Small for the curvature, large for the rounding of pixels in float.
    const float h = c < 3 ? 2e-3f : c < kMotionSize ? 1e-3f : c < kExpressionAt ? 0.1f : 0.02f;
    std::vector<float> moved[2][2];
    for (const int side : {0, 1}) {
      float step[kMeasuredSize] = {};
      step[c] = side == 0 ? -h : h;
      scene.face->mean = at;
      ApplyStep(step, &scene.face->mean);
      // The interaction is part of the derivative by expressions alone: identity moves the vectors
      // that are kept.
      BaseKernels().face_points(SharedModel(), false, scene.face.get(), scene.work.get());
      BaseKernels().residuals(SharedModel(), scene.seen.get(), 1, 2, true, scene.face.get(),
                              scene.work.get());
      moved[side][0].assign(scene.work->u, scene.work->u + kLandmarkCount);
      moved[side][1].assign(scene.work->v, scene.work->v + kLandmarkCount);
    }
    // The outline's places move too, which the derivatives leave out on purpose.
    for (size_t i = 19; i < 101; i++) {
      const float du = (moved[1][0][i] - moved[0][0][i]) / (2 * h);
      const float dv = (moved[1][1][i] - moved[0][1][i]) / (2 * h);
      const float u = column_u[static_cast<size_t>(c) * kLandmarkStride + i];
      const float v = column_v[static_cast<size_t>(c) * kLandmarkStride + i];
      const float tolerance = 0.01f * (std::fabs(u) + std::fabs(v)) + 2e-4f / h;
      EXPECT_NEAR(u, du, tolerance) << "column " << c << " landmark " << i;
      EXPECT_NEAR(v, dv, tolerance) << "column " << c << " landmark " << i;
    }
  }
}

TEST(SteadyKernels, ProductsAreThoseOfTheWhitenedColumns) {
  for (const int landmarks : {101, 165}) {
    Scene scene(landmarks);
    scene.Linearise();
    const int length = 2 * (landmarks == 165 ? kMeasurementStride : kLandmarkStride);
    for (int i = 0; i < kMeasuredSize; i++) {
      for (int j = 0; j <= i; j++) {
        double sum = 0;
        double size = 0;
        for (int m = 0; m < length; m++) {
          const double term = static_cast<double>(scene.work->white_column[i][m]) *
                              static_cast<double>(scene.work->white_column[j][m]);
          sum += term;
          size += std::fabs(term);
        }
        EXPECT_NEAR(scene.work->product[i][j], sum, 1e-5 * size + 1e-6);
        EXPECT_EQ(scene.work->product[i][j], scene.work->product[j][i]);
      }
    }
  }
}

// The factored update against inverses in double precision.
TEST(SteadyKernels, UpdateIsThatOfAKalmanFilter) {
  Scene scene(101);
  scene.Linearise();
  // After a step of time the motion is correlated with the pose.
  BaseKernels().predict_covariance(MakeTimeStep(1 / 30.0, 0.5f), scene.face.get());
  std::memcpy(scene.work->predicted, scene.face->covariance, sizeof(scene.work->predicted));
  std::memcpy(scene.work->factor, scene.work->predicted, sizeof(scene.work->factor));
  ASSERT_TRUE(BaseKernels().factor_covariance(scene.work.get()));
  ASSERT_TRUE(BaseKernels().solve_step(scene.work.get()));
  BaseKernels().posterior(*scene.work, scene.face.get());

  // C+ = (C^-1 + [H 0; 0 0])^-1, step = C+ [g; 0].
  constexpr int n = kStateSize;
  std::vector<double> c(n * n);
  std::vector<double> information(n * n);
  std::vector<double> posterior(n * n);
  for (int i = 0; i < n; i++) {
    for (int j = 0; j < n; j++) c[static_cast<size_t>(i * n + j)] = scene.work->predicted[i][j];
  }
  ASSERT_TRUE(FactorSymmetric(c.data(), n));
  InvertFactored(c.data(), n, information.data());
  for (int i = 0; i < kMeasuredSize; i++) {
    for (int j = 0; j < kMeasuredSize; j++) {
      information[static_cast<size_t>(i * n + j)] += scene.work->product[i][j];
    }
  }
  ASSERT_TRUE(FactorSymmetric(information.data(), n));
  InvertFactored(information.data(), n, posterior.data());
  const auto deviation = [&](int i) {
    return std::sqrt(posterior[static_cast<size_t>(i * n + i)]);
  };
  for (int i = 0; i < n; i++) {
    double step = 0;
    for (int j = 0; j < kMeasuredSize; j++) {
      step +=
          posterior[static_cast<size_t>(i * n + j)] * static_cast<double>(scene.work->gradient[j]);
    }
    EXPECT_NEAR(scene.work->step[i], step, 0.01 * deviation(i)) << i;
    for (int j = 0; j < n; j++) {
      EXPECT_NEAR(scene.face->covariance[i][j], posterior[static_cast<size_t>(i * n + j)],
                  0.005 * deviation(i) * deviation(j))
          << i << " " << j;
    }
  }
}

TEST(SteadyKernels, FactorRefusesAMatrixThatIsNotPositive) {
  Scene scene(101);
  std::memcpy(scene.work->factor, scene.face->covariance, sizeof(scene.work->factor));
  scene.work->factor[7][7] = -1;
  EXPECT_FALSE(BaseKernels().factor_covariance(scene.work.get()));
}

// Offsets in the directions of pose, size and identity must vanish, or they would turn the head.
TEST(SteadyKernels, OffsetsNeverDoWhatThePoseOrTheIdentityCould) {
  Scene scene(101);
  const Model& model = SharedModel();
  for (int i = 19; i < 101; i++) {
    if (model.has_offset[i] == 0) continue;
    for (int axis = 0; axis < 3; axis++) {
      scene.face->offset[axis][i] = 0.3f * model.identity[2][axis][i] + (axis == 0 ? 0.5f : 0);
    }
  }
  scene.Linearise();
  for (float& weight : scene.work->weight) weight = 0;  // nothing is learnt
  BaseKernels().update_offsets(model, MakeTimeStep(1 / 30.0, 0.5f), 1, scene.face.get(),
                               scene.work.get());
  for (int i = 19; i < 101; i++) {
    if (model.has_offset[i] == 0) continue;
    for (int axis = 0; axis < 3; axis++) EXPECT_NEAR(scene.face->offset[axis][i], 0, 0.06) << i;
  }
}

// A run of updates with the kernels of this processor, of which every bit must be that of the base
// set.
TEST(SteadyKernels, EveryInstructionSetGivesTheSameBits) {
  for (const int landmarks : {101, 165}) {
    std::unique_ptr<Face> faces[2];
    for (const int best : {0, 1}) {
      const Kernels& kernels = best != 0 ? BestKernels() : BaseKernels();
      Scene scene(landmarks, kernels);
      const Tools tools = {SharedModel(), kernels, scene.work.get()};
      const TimeStep time = MakeTimeStep(1 / 30.0, 0.5f);
      Person person(7);
      for (int frame = 0; frame < 20; frame++) {
        const Seen seen(person.Detect(frame, kWidth, kHeight, landmarks, 1));
        UpdateFace(tools, seen.get(), time, scene.face.get());
      }
      faces[best] = std::move(scene.face);
    }
    const auto bits = [&](int best) {
      const auto* first = reinterpret_cast<const uint32_t*>(faces[best]->covariance);
      return std::vector<uint32_t>(first, first + sizeof(faces[best]->covariance) / 4);
    };
    EXPECT_EQ(bits(0), bits(1));
    EXPECT_EQ(std::memcmp(&faces[0]->mean, &faces[1]->mean, sizeof(StateMean)), 0);
    EXPECT_EQ(std::memcmp(faces[0]->point, faces[1]->point, sizeof(faces[0]->point)), 0);
    EXPECT_EQ(std::memcmp(faces[0]->offset, faces[1]->offset, sizeof(faces[0]->offset)), 0);
  }
}

}  // namespace
}  // namespace n3ds::testing
