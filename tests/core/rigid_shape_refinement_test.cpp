// SPDX-License-Identifier: MIT
#include "core/rigid_shape_refinement.h"

#include <algorithm>
#include <cmath>

#include "support/bits.h"
#include "support/fit_scene.h"
#include "support/memory_pool.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

using Vector = std::vector<float>;
using Pixels = std::vector<int32_t>;

struct Refit {
  const FitModel& model = FitModel::Get();
  FitView view;
  float scale = 1;

  explicit Refit(uint64_t seed) : view(seed) {}

  void Identity(MHandle memory, const Pixels& pixels, Vector* coef) const {
    RefitIdentityRigid(memory, ViewOf(pixels, model.mean.data()), model.identity.data(),
                       coef->data());
  }
  void Expression(MHandle memory, const Pixels& pixels, Vector* coef) const {
    RefitExpressionRigid(memory, ViewOf(pixels, model.mean.data()), model.expression.data(),
                         coef->data());
  }
  RefitView ViewOf(const Pixels& pixels, const int16_t* mean) const {
    return {pixels.data(),
            mean,
            view.camera.data(),
            view.rotation.data(),
            view.translation.data(),
            view.vertices.data(),
            scale};
  }
};

// The least-squares system as it is defined, with model values in mm.
Vector ReferenceSolution(const Refit& refit, const Pixels& pixels,
                         const std::vector<int>& landmarks, const std::vector<int16_t>& basis,
                         int columns, float prior) {
  const FitView& view = refit.view;
  const int landmark_rows = 2 * static_cast<int>(landmarks.size());
  const int rows = landmark_rows + columns;
  Vector A(static_cast<size_t>(rows) * columns, 0.0f), b(rows, 0.0f), x(columns, 0.0f);
  const auto along = [](const float* direction, const int16_t* v) {
    return direction[0] * (v[0] * 0.00390625f) + direction[1] * (v[1] * 0.00390625f) +
           direction[2] * (v[2] * 0.00390625f);
  };
  for (size_t i = 0; i < landmarks.size(); ++i) {
    const int landmark = landmarks[i];
    const ReferenceEquations e = EquationsAt(view, static_cast<float>(pixels[2 * landmark]),
                                             static_cast<float>(pixels[2 * landmark + 1]));
    const size_t at = 3 * static_cast<size_t>(view.vertices[landmark]);
    for (size_t row = 0; row < 2; ++row) {
      for (int k = 0; k < columns; ++k) {
        A[(2 * i + row) * columns + k] = along(e.direction[row], &basis[k * kShapeSize + at]);
      }
      b[2 * i + row] = -along(e.direction[row], &refit.model.mean[at]) - e.constant[row];
    }
  }
  for (int k = 0; k < columns; ++k) A[(landmark_rows + k) * columns + k] = prior;
  EXPECT_EQ(SolveLinearAxb(nullptr, A.data(), rows, columns, x.data(), b.data()), N3DS_OK);
  return x;
}

std::vector<int> OutlineLandmarks() {
  std::vector<int> landmarks;
  for (int i = 0; i <= 18; ++i) landmarks.push_back(i);
  return landmarks;
}

std::vector<int> ExpressionLandmarks() {
  std::vector<int> landmarks = {19, 24, 29, 34};
  for (int i = 39; i <= 94; ++i) landmarks.push_back(i);
  return landmarks;
}

Vector Blend(const Vector& previous, const Vector& solution) {
  Vector out;
  for (size_t k = 0; k < previous.size(); ++k) {
    out.push_back(static_cast<float>(0.6 * previous[k] + 0.4 * solution[k]));
  }
  return out;
}

TEST(RefitIdentityRigid, BlendsTheSolutionOfTheOutlineBitForBit) {
  Random random = TestRandom();
  for (int run = 0; run < 30; ++run) {
    Refit refit(random.Next());
    refit.scale = static_cast<float>(random.In(0.25, 3.0));
    Pixels pixels = refit.view.Pixels(RandomCoefficients(&random, 16, 0.5), {});
    for (int32_t& v : pixels) v += random.Int(-3, 3);
    const Vector previous = RandomCoefficients(&random, 16, 1.0);
    Vector coef = previous;
    refit.Identity(nullptr, pixels, &coef);
    const Vector solution = ReferenceSolution(refit, pixels, OutlineLandmarks(),
                                              refit.model.identity, 16, 20000.0f * refit.scale);
    ASSERT_TRUE(SameBits(coef, Blend(previous, solution)));
  }
}

TEST(RefitIdentityRigid, RepeatedRefitsCloseInOnTheSolution) {
  Random random = TestRandom();
  const Refit refit(random.Next());
  const Pixels pixels = refit.view.Pixels(RandomCoefficients(&random, 16, 0.5), {});
  const Vector solution =
      ReferenceSolution(refit, pixels, OutlineLandmarks(), refit.model.identity, 16, 20000.0f);
  Vector coef(16, 0.0f);
  for (int frame = 0; frame < 40; ++frame) refit.Identity(nullptr, pixels, &coef);
  for (int k = 0; k < 16; ++k) EXPECT_NEAR(coef[k], solution[k], 1e-5);
}

TEST(RefitIdentityRigid, InnerLandmarksPlayNoPart) {
  Random random = TestRandom();
  const Refit refit(random.Next());
  Pixels pixels = refit.view.Pixels({}, {});
  Vector before(16, 1.0f), after(16, 1.0f);
  refit.Identity(nullptr, pixels, &before);
  for (int i = 19; i < 95; ++i) pixels[2 * i] += 50;
  refit.Identity(nullptr, pixels, &after);
  EXPECT_TRUE(SameBits(before, after));
  pixels[2 * 18] += 5;
  refit.Identity(nullptr, pixels, &after);
  EXPECT_FALSE(SameBits(before, after));
}

TEST(RefitIdentityRigid, WithoutASolutionTheCoefficientsFade) {
  Refit refit(TestSeed());
  const Pixels pixels = refit.view.Pixels({}, {});
  const Vector previous = {1, -2, 3, 0.1f, 0.7f, 0, 5, 6, 7, 8, 9, 10, 11, 12, 13, 1e-20f};
  const Vector faded = Blend(previous, Vector(16, 0.0f));

  const MemoryPool pool(64);
  Vector coef = previous;
  refit.Identity(pool.handle(), pixels, &coef);
  EXPECT_TRUE(SameBits(coef, faded));

  // A basis that moves nothing and no prior: the system is singular.
  const std::vector<int16_t> flat(16 * kShapeSize, 0);
  coef = previous;
  ::testing::internal::CaptureStdout();
  RefitView view = refit.ViewOf(pixels, refit.model.mean.data());
  view.scale = 0;
  RefitIdentityRigid(nullptr, view, flat.data(), coef.data());
  EXPECT_EQ(::testing::internal::GetCapturedStdout(), "zero in LU\n");
  EXPECT_TRUE(SameBits(coef, faded));
}

TEST(RefitExpressionRigid, WritesTheSolutionBitForBit) {
  Random random = TestRandom();
  for (int run = 0; run < 30; ++run) {
    Refit refit(random.Next());
    refit.scale = static_cast<float>(random.In(0.25, 3.0));
    Pixels pixels = refit.view.Pixels({}, RandomCoefficients(&random, 20, 0.5));
    for (int32_t& v : pixels) v += random.Int(-3, 3);
    Vector coef(20, 7.0f);
    refit.Expression(nullptr, pixels, &coef);
    ASSERT_TRUE(
        SameBits(coef, ReferenceSolution(refit, pixels, ExpressionLandmarks(),
                                         refit.model.expression, 20, 5000.0f * refit.scale)));
  }
}

TEST(RefitExpressionRigid, RecoversAKnownExpression) {
  Random random = TestRandom();
  for (int run = 0; run < 20; ++run) {
    Refit refit(random.Next());
    refit.scale = 0.01f;  // nearly without the pull toward zero
    const Vector truth = RandomCoefficients(&random, 20, 0.5);
    Vector coef(20, 7.0f);
    refit.Expression(nullptr, refit.view.Pixels({}, truth), &coef);
    for (int j = 0; j < 20; ++j) EXPECT_NEAR(coef[j], truth[j], 0.05);
  }
}

TEST(RefitExpressionRigid, OnlyTheSixtyLandmarksCount) {
  const Refit refit(TestSeed());
  const std::vector<int> used = ExpressionLandmarks();
  ASSERT_EQ(used.size(), 60u);
  const Pixels pixels = refit.view.Pixels({}, {});
  Vector before(20);
  refit.Expression(nullptr, pixels, &before);
  for (int i = 0; i < kFitLandmarkCount; ++i) {
    Pixels moved = pixels;
    moved[2 * i] += 5;
    Vector after(20);
    refit.Expression(nullptr, moved, &after);
    const bool counts = std::find(used.begin(), used.end(), i) != used.end();
    EXPECT_EQ(!SameBits(before, after), counts) << "landmark " << i;
  }
}

TEST(RefitExpressionRigid, WithoutASolutionTheCoefficientsStay) {
  const Refit refit(TestSeed());
  const Pixels pixels = refit.view.Pixels({}, {});
  const std::vector<int16_t> flat(20 * kShapeSize, 0);
  Vector coef(20, 7.0f);
  ::testing::internal::CaptureStdout();
  RefitView view = refit.ViewOf(pixels, refit.model.mean.data());
  view.scale = 0;
  RefitExpressionRigid(nullptr, view, flat.data(), coef.data());
  EXPECT_EQ(::testing::internal::GetCapturedStdout(), "zero in LU\n");
  EXPECT_EQ(coef, Vector(20, 7.0f));
}

TEST(RefitExpressionRigid, IsSkippedWithoutMeanShapeBasisOrCoefficients) {
  const Refit refit(TestSeed());
  const Pixels pixels = refit.view.Pixels({}, Vector(20, 0.3f));
  Vector coef(20, 7.0f);
  const auto call = [&](const int16_t* mean, const int16_t* basis, float* out) {
    RefitExpressionRigid(nullptr, refit.ViewOf(pixels, mean), basis, out);
  };
  call(nullptr, refit.model.expression.data(), coef.data());
  call(refit.model.mean.data(), nullptr, coef.data());
  call(refit.model.mean.data(), refit.model.expression.data(), nullptr);
  EXPECT_EQ(coef, Vector(20, 7.0f));
}

// Pools from too small for anything to big enough: the fallback until the whole refit fits.
template <typename Refitting>
void ExpectFallbackOfEveryAllocation(const Vector& previous, const Vector& fallback,
                                     Refitting refitting) {
  Vector expected = previous;
  refitting(nullptr, &expected);
  ASSERT_FALSE(SameBits(expected, fallback));
  int failures = 0;
  for (size_t length = 256;; length += 64) {
    ASSERT_LT(length, 200000u);
    const MemoryPool pool(length);
    Vector coef = previous;
    refitting(pool.handle(), &coef);
    ASSERT_TRUE(pool.Untouched()) << "scratch not released with a pool of " << length;
    if (SameBits(coef, expected)) break;
    ++failures;
    ASSERT_TRUE(SameBits(coef, fallback));
  }
  EXPECT_GT(failures, 50);
}

TEST(RefitIdentityRigid, EveryFailedAllocationFadesTheCoefficients) {
  const Refit refit(TestSeed());
  const Pixels pixels = refit.view.Pixels(Vector(16, 0.4f), {});
  const Vector previous(16, 1.0f);
  ExpectFallbackOfEveryAllocation(
      previous, Blend(previous, Vector(16, 0.0f)),
      [&](MHandle memory, Vector* coef) { refit.Identity(memory, pixels, coef); });
}

TEST(RefitExpressionRigid, EveryFailedAllocationKeepsTheCoefficients) {
  const Refit refit(TestSeed());
  const Pixels pixels = refit.view.Pixels({}, Vector(20, 0.4f));
  const Vector previous(20, 1.0f);
  ExpectFallbackOfEveryAllocation(previous, previous, [&](MHandle memory, Vector* coef) {
    refit.Expression(memory, pixels, coef);
  });
}

}  // namespace
}  // namespace n3ds::testing
