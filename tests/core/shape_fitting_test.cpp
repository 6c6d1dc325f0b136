// SPDX-License-Identifier: MIT
#include "core/shape_fitting.h"

#include <algorithm>
#include <cmath>

#include "support/bits.h"
#include "support/fit_scene.h"
#include "support/golden.h"
#include "support/memory_pool.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

using Vector = std::vector<float>;

constexpr int kSubstituted[][2] = {{20, 21}, {23, 22}, {25, 24}, {26, 24}, {27, 19}, {28, 19},
                                   {30, 31}, {33, 32}, {35, 34}, {36, 34}, {37, 29}, {38, 29}};

bool IsSubstituted(int landmark) {
  return std::any_of(std::begin(kSubstituted), std::end(kSubstituted),
                     [&](const int* s) { return s[0] == landmark; });
}

// Arguments of a fit; a member is read only where the fit has it.
struct Fit {
  const FitModel& model = FitModel::Get();
  FitView view;
  float scale = 1;
  MHandle memory = nullptr;

  explicit Fit(uint64_t seed) : view(seed) {}

  int32_t Identity(const Vector& points, Vector* coef) const {
    return SolveForIdentityCoef(memory, points.data(), model.mean.data(), model.identity.data(),
                                view.camera.data(), view.rotation.data(), view.translation.data(),
                                coef->data(), view.vertices.data(), scale);
  }
  int32_t Expression(const std::vector<int32_t>& pixels, const Vector& identity,
                     Vector* coef) const {
    return SolveForExpressionCoef(memory, pixels.data(), model.mean.data(), model.identity.data(),
                                  model.expression.data(), model.tensor.data(), view.camera.data(),
                                  view.rotation.data(), view.translation.data(), identity.data(),
                                  coef->data(), view.vertices.data(), scale);
  }
};

// The systems row by row as they are defined, every landmark first and then the substitution.
Vector ReferenceIdentity(const Fit& fit, const Vector& points) {
  const FitView& view = fit.view;
  Vector A(266 * 16, 0.0f), b(266, 0.0f), x(16, 0.0f);
  for (int i = 0; i < 95; ++i) {
    const ReferenceEquations e = EquationsAt(view, points[3 * i], points[3 * i + 1]);
    const size_t at = 3 * static_cast<size_t>(view.vertices[i]);
    for (int row = 0; row < 2; ++row) {
      for (int k = 0; k < 16; ++k) {
        A[(2 * i + row) * 16 + k] =
            Along(e.direction[row], &fit.model.identity[k * kShapeSize + at]) / 256;
      }
      b[2 * i + row] = -Along(e.direction[row], &fit.model.mean[at]) / 256 - e.constant[row];
    }
  }
  for (const auto& [target, source] : kSubstituted) {
    std::copy_n(&A[source * 32], 32, &A[target * 32]);
    std::copy_n(&b[source * 2], 2, &b[target * 2]);
  }
  const float w = 3000.0f * fit.scale;
  for (int q = 0; q < 76; ++q) {
    const size_t at = 3 * static_cast<size_t>(view.vertices[19 + q]);
    for (int k = 0; k < 16; ++k) {
      A[(190 + q) * 16 + k] =
          w * Along(&view.rotation[6], &fit.model.identity[k * kShapeSize + at]) / 256;
    }
    b[190 + q] = w * (points[3 * (19 + q) + 2] -
                      Along(&view.rotation[6], &fit.model.mean[at]) / 256 - view.translation[2]);
  }
  EXPECT_EQ(SolveLinearAxb(nullptr, A.data(), 266, 16, x.data(), b.data()), N3DS_OK);
  return x;
}

Vector ReferenceExpression(const Fit& fit, const std::vector<int32_t>& pixels,
                           const Vector& identity) {
  const FitView& view = fit.view;
  Vector A(210 * 20, 0.0f), b(210, 0.0f), x(20, 0.0f);
  for (int i = 0; i < 95; ++i) {
    const ReferenceEquations e =
        EquationsAt(view, static_cast<float>(pixels[2 * i]), static_cast<float>(pixels[2 * i + 1]));
    const size_t at = 3 * static_cast<size_t>(view.vertices[i]);
    for (int row = 0; row < 2; ++row) {
      const float* a = e.direction[row];
      for (int j = 0; j < 20; ++j) {
        float sum = Along(a, &fit.model.expression[j * kShapeSize + at]);
        for (int k = 0; k < 16; ++k) {
          if ((k + j) % 2 != 0) continue;
          sum += identity[k] * Along(a, &fit.model.tensor[(k * 20 + j) * kShapeSize + at]);
        }
        A[(2 * i + row) * 20 + j] = sum / 256;
      }
      float person = 0;
      for (int k = 0; k < 16; ++k) {
        person += identity[k] * Along(a, &fit.model.identity[k * kShapeSize + at]);
      }
      b[2 * i + row] = (-Along(a, &fit.model.mean[at]) - 256 * e.constant[row] - person) / 256;
    }
  }
  for (const auto& [target, source] : kSubstituted) {
    std::copy_n(&A[source * 40], 40, &A[target * 40]);
    std::copy_n(&b[source * 2], 2, &b[target * 2]);
  }
  for (int j = 0; j < 20; ++j) A[(190 + j) * 20 + j] = 10000.0f * fit.scale;
  EXPECT_EQ(SolveLinearAxb(nullptr, A.data(), 210, 20, x.data(), b.data()), N3DS_OK);
  return x;
}

double Length(const Vector& v) {
  double sum = 0;
  for (const float x : v) sum += double{x} * x;
  return std::sqrt(sum);
}

double Distance(const Vector& a, const Vector& b) {
  double sum = 0;
  for (size_t i = 0; i < a.size(); ++i) sum += (double{a[i]} - b[i]) * (double{a[i]} - b[i]);
  return std::sqrt(sum);
}

// --- The definition --------------------------------------------------------------------------

TEST(IdentityFit, EqualsTheRowwiseDefinitionBitForBit) {
  Random random = TestRandom();
  for (int run = 0; run < 30; ++run) {
    Fit fit(random.Next());
    fit.scale = static_cast<float>(random.In(0.25, 3.0));
    Vector points = fit.view.Points(RandomCoefficients(&random, 16, 0.5), {});
    for (float& v : points) v += static_cast<float>(random.In(-3, 3));
    Vector coef(16, 7.0f);
    ASSERT_EQ(fit.Identity(points, &coef), N3DS_OK);
    ASSERT_TRUE(SameBits(coef, ReferenceIdentity(fit, points)));
  }
}

TEST(ExpressionFit, EqualsTheRowwiseDefinitionBitForBit) {
  Random random = TestRandom();
  for (int run = 0; run < 30; ++run) {
    Fit fit(random.Next());
    fit.scale = static_cast<float>(random.In(0.25, 3.0));
    const Vector identity = RandomCoefficients(&random, 16, 0.5);
    std::vector<int32_t> pixels = fit.view.Pixels(identity, RandomCoefficients(&random, 20, 0.5));
    for (int32_t& v : pixels) v += random.Int(-3, 3);
    Vector coef(20, 7.0f);
    ASSERT_EQ(fit.Expression(pixels, identity, &coef), N3DS_OK);
    ASSERT_TRUE(SameBits(coef, ReferenceExpression(fit, pixels, identity)));
  }
}

// --- Known shapes ----------------------------------------------------------------------------

TEST(IdentityFit, RecoversAKnownIdentityWhoseDepthsAreKnown) {
  Random random = TestRandom();
  for (int run = 0; run < 20; ++run) {
    const Fit fit(random.Next());
    const Vector truth = RandomCoefficients(&random, 16, 0.5);
    Vector coef(16, 7.0f);
    ASSERT_EQ(fit.Identity(fit.view.Points(truth, {}), &coef), N3DS_OK);
    for (int k = 0; k < 16; ++k) EXPECT_NEAR(coef[k], truth[k], 2e-3) << "identity " << k;
  }
}

TEST(ExpressionFit, RecoversAKnownExpressionOfAKnownPerson) {
  Random random = TestRandom();
  for (int run = 0; run < 20; ++run) {
    Fit fit(random.Next());
    fit.scale = 0.01f;  // nearly without the pull toward zero
    const Vector person = RandomCoefficients(&random, 16, 0.5);
    const Vector truth = RandomCoefficients(&random, 20, 0.5);
    Vector coef(20, 7.0f);
    ASSERT_EQ(fit.Expression(fit.view.Pixels(person, truth), person, &coef), N3DS_OK);
    // Integer pixels are about half a mm here; a coefficient of 1 moves a vertex by several.
    for (int j = 0; j < 20; ++j) EXPECT_NEAR(coef[j], truth[j], 0.05) << "expression " << j;
  }
}

TEST(IdentityFit, MeanShapeHasNoCoefficients) {
  const Fit fit(TestSeed());
  Vector coef(16, 7.0f);
  ASSERT_EQ(fit.Identity(fit.view.Points({}, {}), &coef), N3DS_OK);
  for (const float c : coef) EXPECT_NEAR(c, 0, 1e-3);
}

TEST(ExpressionFit, MeanShapeHasNoCoefficients) {
  const Fit fit(TestSeed());
  Vector coef(20, 7.0f);
  ASSERT_EQ(fit.Expression(fit.view.Pixels({}, {}), Vector(16, 0.0f), &coef), N3DS_OK);
  // Up to the rounding to pixels.
  for (const float c : coef) EXPECT_NEAR(c, 0, 0.05);
}

TEST(ExpressionFit, TensorHasNoEffectOnAPersonWithoutCoefficients) {
  Random random = TestRandom();
  const Fit fit(random.Next());
  const std::vector<int32_t> pixels = fit.view.Pixels({}, RandomCoefficients(&random, 20, 0.5));
  const Vector nobody(16, 0.0f);
  Vector coef(20), without(20);
  ASSERT_EQ(fit.Expression(pixels, nobody, &coef), N3DS_OK);
  const std::vector<int16_t> empty(fit.model.tensor.size(), 0);
  ASSERT_EQ(SolveForExpressionCoef(nullptr, pixels.data(), fit.model.mean.data(),
                                   fit.model.identity.data(), fit.model.expression.data(),
                                   empty.data(), fit.view.camera.data(), fit.view.rotation.data(),
                                   fit.view.translation.data(), nobody.data(), without.data(),
                                   fit.view.vertices.data(), 1),
            N3DS_OK);
  EXPECT_TRUE(SameBits(coef, without));
}

TEST(ExpressionFit, PairsWithAnOddSumOfIndicesPlayNoPart) {
  Random random = TestRandom();
  const Fit fit(random.Next());
  const Vector person = RandomCoefficients(&random, 16, 0.5);
  const std::vector<int32_t> pixels = fit.view.Pixels(person, RandomCoefficients(&random, 20, 0.5));
  std::vector<int16_t> odd = fit.model.tensor, even = fit.model.tensor;
  for (int k = 0; k < 16; ++k) {
    for (int j = 0; j < 20; ++j) {
      int16_t* block = ((k + j) % 2 != 0 ? odd : even).data() + (k * 20 + j) * kShapeSize;
      std::fill_n(block, kShapeSize, static_cast<int16_t>(321));
    }
  }
  const auto solve = [&](const std::vector<int16_t>& tensor) {
    Vector coef(20);
    EXPECT_EQ(SolveForExpressionCoef(nullptr, pixels.data(), fit.model.mean.data(),
                                     fit.model.identity.data(), fit.model.expression.data(),
                                     tensor.data(), fit.view.camera.data(),
                                     fit.view.rotation.data(), fit.view.translation.data(),
                                     person.data(), coef.data(), fit.view.vertices.data(), 1),
              N3DS_OK);
    return coef;
  };
  EXPECT_TRUE(SameBits(solve(odd), solve(fit.model.tensor)));
  EXPECT_FALSE(SameBits(solve(even), solve(fit.model.tensor)));
}

// --- Substituted landmarks -------------------------------------------------------------------

TEST(ShapeFitSubstitution, ObservationsOfSubstitutedLandmarksChangeNothing) {
  Random random = TestRandom();
  const Fit fit(random.Next());
  const Vector person = RandomCoefficients(&random, 16, 0.5);
  const Vector points = fit.view.Points(person, {});
  const std::vector<int32_t> pixels = fit.view.Pixels(person, RandomCoefficients(&random, 20, 0.5));
  Vector identity(16), expression(20);
  fit.Identity(points, &identity);
  fit.Expression(pixels, person, &expression);
  for (int i = 0; i < kFitLandmarkCount; ++i) {
    Vector moved_points = points;
    moved_points[3 * i] += 5;
    moved_points[3 * i + 1] -= 5;
    Vector coef(16);
    fit.Identity(moved_points, &coef);
    EXPECT_EQ(SameBits(coef, identity), IsSubstituted(i)) << "landmark " << i;

    std::vector<int32_t> moved_pixels = pixels;
    moved_pixels[2 * i] += 5;
    moved_pixels[2 * i + 1] -= 5;
    coef.resize(20);
    fit.Expression(moved_pixels, person, &coef);
    EXPECT_EQ(SameBits(coef, expression), IsSubstituted(i)) << "landmark " << i;
  }
}

TEST(ShapeFitSubstitution, DepthOfASubstitutedLandmarkCountsAllTheSame) {
  const Fit fit(TestSeed());
  Vector points = fit.view.Points({}, {});
  Vector before(16), after(16);
  fit.Identity(points, &before);
  points[3 * 20 + 2] += 3;
  fit.Identity(points, &after);
  EXPECT_GT(Distance(before, after), 1e-3);
}

TEST(ShapeFitSubstitution, StandInMovesTheResultAsOftenAsItStands) {
  // Landmark 40 stands once; put it and a stand-in on the same vertex, and compare their pull.
  Random random = TestRandom();
  const struct {
    int landmark;
    double times;
  } stand_ins[] = {{19, 3}, {21, 2}, {22, 2}, {24, 3}, {29, 3}, {31, 2}, {32, 2}, {34, 3}};
  for (const auto& [landmark, times] : stand_ins) {
    Fit fit(random.Next());
    fit.view.vertices[40] = fit.view.vertices[landmark];
    const Vector points = fit.view.Points({}, {});
    Vector before(16), by_single(16), by_stand_in(16);
    fit.Identity(points, &before);
    Vector moved = points;
    moved[3 * 40] += 2;
    fit.Identity(moved, &by_single);
    moved = points;
    moved[3 * landmark] += 2;
    fit.Identity(moved, &by_stand_in);
    EXPECT_NEAR(Distance(by_stand_in, before) / Distance(by_single, before), times, 0.1)
        << "landmark " << landmark;
  }
}

// --- Priors ----------------------------------------------------------------------------------

TEST(IdentityFit, LargerImagesHoldTheDepthMoreFirmly) {
  Random random = TestRandom();
  Fit fit(random.Next());
  const Vector truth = RandomCoefficients(&random, 16, 0.5);
  Vector points = fit.view.Points(truth, {});
  // Depths of the mean shape: an identity that moves vertices in depth has to pay.
  const Vector mean = fit.view.Points({}, {});
  for (int i = 19; i < 95; ++i) points[3 * i + 2] = mean[3 * i + 2];
  double last = 1e9;
  for (const float scale : {0.01f, 0.1f, 1.0f, 10.0f}) {
    fit.scale = scale;
    Vector coef(16);
    ASSERT_EQ(fit.Identity(points, &coef), N3DS_OK);
    double moved = 0;
    for (int i = 19; i < 95; ++i) {
      const double z = fit.view.ToCamera(fit.model.Vertex(fit.view.vertices[i], coef, {})).z;
      moved += std::fabs(z - mean[3 * i + 2]);
    }
    EXPECT_LT(moved, last) << "scale " << scale;
    last = moved;
  }
}

TEST(ExpressionFit, LargerImagesPullHarderTowardZero) {
  Random random = TestRandom();
  Fit fit(random.Next());
  const std::vector<int32_t> pixels = fit.view.Pixels({}, RandomCoefficients(&random, 20, 0.5));
  double last = 1e9;
  for (const float scale : {0.1f, 1.0f, 3.0f, 10.0f}) {
    fit.scale = scale;
    Vector coef(20);
    ASSERT_EQ(fit.Expression(pixels, Vector(16, 0.0f), &coef), N3DS_OK);
    EXPECT_LT(Length(coef), last) << "scale " << scale;
    last = Length(coef);
  }
  EXPECT_LT(last, 0.5);
}

// --- Failures --------------------------------------------------------------------------------

TEST(IdentityFit, SingularSystemReturnsZeroAndKeepsTheCoefficients) {
  const Fit fit(TestSeed());
  const std::vector<int16_t> flat(16 * kShapeSize, 0);  // no identity moves anything
  const Vector points = fit.view.Points({}, {});
  Vector coef(16, 7.0f);
  ::testing::internal::CaptureStdout();
  EXPECT_EQ(
      SolveForIdentityCoef(nullptr, points.data(), fit.model.mean.data(), flat.data(),
                           fit.view.camera.data(), fit.view.rotation.data(),
                           fit.view.translation.data(), coef.data(), fit.view.vertices.data(), 1),
      N3DS_OK);
  EXPECT_EQ(::testing::internal::GetCapturedStdout(), "zero in LU\n");
  EXPECT_EQ(coef, Vector(16, 7.0f));
}

TEST(ExpressionFit, SingularSystemReturnsZeroAndKeepsTheCoefficients) {
  Fit fit(TestSeed());
  const std::vector<int16_t> flat(20 * kShapeSize, 0);
  const std::vector<int32_t> pixels(190, 100);
  const Vector nobody(16, 0.0f);
  Vector coef(20, 7.0f);
  ::testing::internal::CaptureStdout();
  EXPECT_EQ(SolveForExpressionCoef(nullptr, pixels.data(), fit.model.mean.data(),
                                   fit.model.identity.data(), flat.data(), fit.model.tensor.data(),
                                   fit.view.camera.data(), fit.view.rotation.data(),
                                   fit.view.translation.data(), nobody.data(), coef.data(),
                                   fit.view.vertices.data(), 0),
            N3DS_OK);
  EXPECT_EQ(::testing::internal::GetCapturedStdout(), "zero in LU\n");
  EXPECT_EQ(coef, Vector(20, 7.0f));
}

TEST(ShapeFit, LandmarksAtOnePixelDoNoHarm) {
  const Fit fit(TestSeed());
  Vector points;
  for (int i = 0; i < 95; ++i) points.insert(points.end(), {640, 360, 600});
  Vector identity(16, 7.0f), expression(20, 7.0f);
  EXPECT_EQ(fit.Identity(points, &identity), N3DS_OK);
  EXPECT_EQ(fit.Expression(std::vector<int32_t>(190, 640), Vector(16, 0.0f), &expression), N3DS_OK);
  for (const float c : identity) EXPECT_TRUE(std::isfinite(c));
  for (const float c : expression) EXPECT_TRUE(std::isfinite(c));
}

TEST(IdentityFit, NullPointersAreRefusedAndNothingIsWritten) {
  const Fit fit(TestSeed());
  const Vector points = fit.view.Points({}, {});
  const MemoryPool pool(64);  // an allocation would give -201
  for (int null = 0; null < 8; ++null) {
    Vector coef(16, 7.0f);
    const auto unless = [&](int bit, auto* pointer) { return null == bit ? nullptr : pointer; };
    EXPECT_EQ(SolveForIdentityCoef(
                  pool.handle(), unless(0, points.data()), unless(1, fit.model.mean.data()),
                  unless(2, fit.model.identity.data()), unless(3, fit.view.camera.data()),
                  unless(4, fit.view.rotation.data()), unless(5, fit.view.translation.data()),
                  unless(6, coef.data()), unless(7, fit.view.vertices.data()), 1),
              N3DS_NULL_ARGUMENT)
        << null;
    EXPECT_EQ(coef, Vector(16, 7.0f));
  }
}

TEST(ExpressionFit, NullPointersAreRefusedAndNothingIsWritten) {
  const Fit fit(TestSeed());
  const std::vector<int32_t> pixels = fit.view.Pixels({}, {});
  const Vector person(16, 0.0f);
  const MemoryPool pool(64);
  for (int null = 0; null < 11; ++null) {
    Vector coef(20, 7.0f);
    const auto unless = [&](int bit, auto* pointer) { return null == bit ? nullptr : pointer; };
    EXPECT_EQ(SolveForExpressionCoef(
                  pool.handle(), unless(0, pixels.data()), unless(1, fit.model.mean.data()),
                  unless(2, fit.model.identity.data()), unless(3, fit.model.expression.data()),
                  unless(4, fit.model.tensor.data()), unless(5, fit.view.camera.data()),
                  unless(6, fit.view.rotation.data()), unless(7, fit.view.translation.data()),
                  unless(8, person.data()), unless(9, coef.data()),
                  unless(10, fit.view.vertices.data()), 1),
              N3DS_NULL_ARGUMENT)
        << null;
    EXPECT_EQ(coef, Vector(20, 7.0f));
  }
}

// Pools from too small for anything to big enough: first the system itself cannot be allocated (-201),
// then the solver's scratch (0, and the coefficients stay), then the fit succeeds.
template <typename Solve>
void ExpectCleanFailureOfEveryAllocation(size_t system_floats, int count, Solve solve) {
  Vector expected(count, 7.0f);
  ASSERT_EQ(solve(nullptr, &expected), N3DS_OK);
  int no_system = 0, no_scratch = 0;
  for (size_t length = 256;; length += 64) {
    ASSERT_LT(length, 200000u);
    const MemoryPool pool(length);
    Vector coef(count, 7.0f);
    const int32_t status = solve(pool.handle(), &coef);
    ASSERT_TRUE(pool.Untouched()) << "scratch not released with a pool of " << length;
    if (status == N3DS_NO_MEMORY) {
      ++no_system;
      ASSERT_EQ(no_scratch, 0);
      ASSERT_EQ(coef, Vector(count, 7.0f));
      ASSERT_LT(length, 4 * system_floats + 128);
      continue;
    }
    ASSERT_EQ(status, N3DS_OK);
    if (SameBits(coef, expected)) break;
    ++no_scratch;
    ASSERT_EQ(coef, Vector(count, 7.0f));
  }
  EXPECT_GT(no_system, 10);
  EXPECT_GT(no_scratch, 10);
}

TEST(IdentityFit, EveryFailedAllocationIsReportedOrLeavesTheCoefficients) {
  Fit fit(TestSeed());
  const Vector points = fit.view.Points(Vector(16, 0.2f), {});
  ExpectCleanFailureOfEveryAllocation(266 * 17, 16, [&](MHandle memory, Vector* coef) {
    fit.memory = memory;
    return fit.Identity(points, coef);
  });
}

TEST(ExpressionFit, EveryFailedAllocationIsReportedOrLeavesTheCoefficients) {
  Fit fit(TestSeed());
  const std::vector<int32_t> pixels = fit.view.Pixels({}, Vector(20, 0.2f));
  ExpectCleanFailureOfEveryAllocation(210 * 21, 20, [&](MHandle memory, Vector* coef) {
    fit.memory = memory;
    return fit.Expression(pixels, Vector(16, 0.1f), coef);
  });
}

TEST(ShapeFit, GoldenCoefficientsOnEveryMachine) {
  Random random(7);
  uint32_t hash = 2166136261u;
  for (int run = 0; run < 20; ++run) {
    const Fit fit(random.Next());
    const Vector person = RandomCoefficients(&random, 16, 0.5);
    Vector identity(16), expression(20);
    fit.Identity(fit.view.Points(person, {}), &identity);
    fit.Expression(fit.view.Pixels(person, RandomCoefficients(&random, 20, 0.5)), identity,
                   &expression);
    for (const Vector& values : {identity, expression}) {
      for (const float v : values) hash = (hash ^ Bits(v)) * 16777619u;
    }
  }
  const Golden found = {"step_shape_fitting", hash, 0};
  Report(found);
  EXPECT_EQ(found, GoldenOf(found.name));
}

}  // namespace
}  // namespace n3ds::testing
