// SPDX-License-Identifier: MIT
#include <array>
#include <cmath>
#include <limits>

#include "support/face_scene.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

using Quat = std::array<float, 4>;
using Mat3 = std::array<float, 9>;
using Vec3 = std::array<float, 3>;

constexpr double kPi = 3.14159265358979323846;
constexpr float kNan = std::numeric_limits<float>::quiet_NaN();
constexpr float kUnwritten = -123.25f;

Mat3 MatrixOf(const Quat& q) {
  Mat3 m;
  m.fill(kUnwritten);
  EXPECT_EQ(QuatToRotationMatrix(q.data(), m.data()), N3DS_OK);
  return m;
}
Quat QuatOf(const Mat3& m) {
  Quat q;
  q.fill(kUnwritten);
  EXPECT_EQ(RotationMatrixToQuat(m.data(), q.data()), N3DS_OK);
  return q;
}
Vec3 EulerOf(const Quat& q) {
  Vec3 e;
  e.fill(kUnwritten);
  EXPECT_EQ(QuatToEuler(q.data(), e.data()), N3DS_OK);
  return e;
}
Quat QuatFromEuler(const Vec3& e) {
  Quat q;
  q.fill(kUnwritten);
  EXPECT_EQ(EulerToQuat(e.data(), q.data()), N3DS_OK);
  return q;
}

Quat RandomUnitQuat(Random& random) {
  while (true) {
    const Quat q = {random.Float(-1, 1), random.Float(-1, 1), random.Float(-1, 1),
                    random.Float(-1, 1)};
    const float n = q[0] * q[0] + q[1] * q[1] + q[2] * q[2] + q[3] * q[3];
    if (n > 1.0f || n < 0.01f) continue;
    const float s = 1.0f / std::sqrt(n);
    return {q[0] * s, q[1] * s, q[2] * s, q[3] * s};
  }
}

// v turned by q through the vector formula v + 2 w (a x v) + 2 a x (a x v), in double: shares
// nothing with the matrix formula.
std::array<double, 3> Turn(const Quat& q, const std::array<double, 3>& v) {
  const double w = q[0], a[3] = {q[1], q[2], q[3]};
  const auto cross = [&](const std::array<double, 3>& b) {
    return std::array<double, 3>{a[1] * b[2] - a[2] * b[1], a[2] * b[0] - a[0] * b[2],
                                 a[0] * b[1] - a[1] * b[0]};
  };
  const auto once = cross(v), twice = cross(once);
  std::array<double, 3> out;
  for (int i = 0; i < 3; ++i) out[i] = v[i] + 2 * w * once[i] + 2 * twice[i];
  return out;
}

// Rz Ry Rx in double.
std::array<double, 9> MatrixOfEuler(double roll, double pitch, double yaw) {
  const double cr = std::cos(roll), sr = std::sin(roll), cp = std::cos(pitch), sp = std::sin(pitch),
               cy = std::cos(yaw), sy = std::sin(yaw);
  return {cy * cp,
          cy * sp * sr - sy * cr,
          cy * sp * cr + sy * sr,
          sy * cp,
          sy * sp * sr + cy * cr,
          sy * sp * cr - cy * sr,
          -sp,
          cp * sr,
          cp * cr};
}

TEST(QuatToRotationMatrix, IdentityGivesIdentity) {
  EXPECT_EQ(MatrixOf({1, 0, 0, 0}), (Mat3{1, 0, 0, 0, 1, 0, 0, 0, 1}));
}

TEST(QuatToRotationMatrix, QuaternionOfLengthTwoScalesByFour) {
  EXPECT_EQ(MatrixOf({2, 0, 0, 0}), (Mat3{4, 0, 0, 0, 4, 0, 0, 0, 4}));
}

TEST(QuatToRotationMatrix, ZeroQuaternionGivesZeroMatrix) {
  EXPECT_EQ(MatrixOf({0, 0, 0, 0}), (Mat3{}));
}

TEST(QuatToRotationMatrix, TurnsColumnVectorsAsTheQuaternionDoes) {
  Random random = TestRandom();
  for (int run = 0; run < 200; ++run) {
    const Quat q = RandomUnitQuat(random);
    const Mat3 m = MatrixOf(q);
    for (int axis = 0; axis < 3; ++axis) {
      std::array<double, 3> v{};
      v[axis] = 1;
      const auto turned = Turn(q, v);
      for (int row = 0; row < 3; ++row) ASSERT_NEAR(m[3 * row + axis], turned[row], 1e-6);
    }
  }
}

TEST(QuatToRotationMatrix, AnyLengthScalesAllNineElementsByItsSquare) {
  Random random = TestRandom();
  for (int run = 0; run < 200; ++run) {
    const Quat q = RandomUnitQuat(random);
    const float length = random.Float(0.1f, 3.0f);
    const Mat3 unit = MatrixOf(q);
    const Mat3 scaled = MatrixOf({q[0] * length, q[1] * length, q[2] * length, q[3] * length});
    for (int i = 0; i < 9; ++i) ASSERT_NEAR(scaled[i], unit[i] * length * length, 1e-5);
  }
}

TEST(RotationMatrixToQuat, IdentityGivesIdentity) {
  EXPECT_EQ(QuatOf({1, 0, 0, 0, 1, 0, 0, 0, 1}), (Quat{1, 0, 0, 0}));
}

TEST(RotationMatrixToQuat, HalfTurnsGiveTheirAxis) {
  EXPECT_EQ(QuatOf({1, 0, 0, 0, -1, 0, 0, 0, -1}), (Quat{0, 1, 0, 0}));
  EXPECT_EQ(QuatOf({-1, 0, 0, 0, 1, 0, 0, 0, -1}), (Quat{0, 0, 1, 0}));
  EXPECT_EQ(QuatOf({-1, 0, 0, 0, -1, 0, 0, 0, 1}), (Quat{0, 0, 0, 1}));
}

TEST(RotationMatrixToQuat, TiesGoToTheEarlierComponent) {
  // A quarter turn about x: w and x are alike, and w^2 comes first. Had x been chosen, the signs
  // would be those of x > 0, so turn the other way, where w > 0 means x < 0.
  const Quat w_and_x = QuatOf({1, 0, 0, 0, 0, 1, 0, -1, 0});
  EXPECT_GT(w_and_x[0], 0);
  EXPECT_LT(w_and_x[1], 0);
  // A half turn about an axis between -x and y: x and y are alike, x is chosen and positive.
  const Quat x_and_y = QuatOf({0, -1, 0, -1, 0, 0, 0, 0, -1});
  EXPECT_GT(x_and_y[1], 0);
  EXPECT_LT(x_and_y[2], 0);
  // Likewise between -y and z.
  const Quat y_and_z = QuatOf({-1, 0, 0, 0, 0, -1, 0, -1, 0});
  EXPECT_GT(y_and_z[2], 0);
  EXPECT_LT(y_and_z[3], 0);
}

TEST(RotationMatrixToQuat, RoundTripsWithTheLargestComponentPositive) {
  Random random = TestRandom();
  int chosen[4] = {};
  for (int run = 0; run < 400; ++run) {
    Quat q = RandomUnitQuat(random);
    int largest = 0;
    for (int i = 1; i < 4; ++i) {
      if (std::fabs(q[i]) > std::fabs(q[largest])) largest = i;
    }
    if (q[largest] < 0) {
      for (float& c : q) c = -c;
    }
    ++chosen[largest];
    const Quat back = QuatOf(MatrixOf(q));
    for (int i = 0; i < 4; ++i) ASSERT_NEAR(back[i], q[i], 2e-6) << "component " << i;
  }
  for (const int count : chosen) EXPECT_GT(count, 20);
}

TEST(QuatToEuler, QuarterTurnAboutYIsPitchOfARightAngle) {
  const float c = static_cast<float>(std::cos(kPi / 4)), s = static_cast<float>(std::sin(kPi / 4));
  EXPECT_NEAR(EulerOf({c, 0, s, 0})[1], kPi / 2, 1e-3);
}

TEST(QuatToEuler, LongerQuaternionNearGimbalLockHasNoPitch) {
  const float c = static_cast<float>(std::cos(kPi / 4) * 1.001);
  const Vec3 euler = EulerOf({c, 0, c, 0});
  EXPECT_TRUE(std::isnan(euler[1]));
  EXPECT_FALSE(std::isnan(euler[0]));
  EXPECT_FALSE(std::isnan(euler[2]));
}

TEST(QuatToEuler, AnglesStandInTheOrderRollPitchYaw) {
  const float c = static_cast<float>(std::cos(0.1)), s = static_cast<float>(std::sin(0.1));
  for (int axis = 0; axis < 3; ++axis) {
    Quat q = {c, 0, 0, 0};
    q[1 + axis] = s;
    const Vec3 euler = EulerOf(q);
    for (int i = 0; i < 3; ++i) EXPECT_NEAR(euler[i], i == axis ? 0.2 : 0.0, 1e-6);
  }
}

TEST(EulerToQuat, BuildsRollThenPitchThenYaw) {
  Random random = TestRandom();
  for (int run = 0; run < 200; ++run) {
    const Vec3 e = {random.Float(-3.1f, 3.1f), random.Float(-3.1f, 3.1f),
                    random.Float(-3.1f, 3.1f)};
    const Mat3 m = MatrixOf(QuatFromEuler(e));
    const auto expected = MatrixOfEuler(e[0], e[1], e[2]);
    for (int i = 0; i < 9; ++i) ASSERT_NEAR(m[i], expected[i], 1e-6);
  }
}

TEST(EulerToQuat, RoundTripsThroughEulerForPitchInsideARightAngle) {
  Random random = TestRandom();
  for (int run = 0; run < 400; ++run) {
    const Vec3 e = {random.Float(-3.14f, 3.14f), random.Float(-1.5f, 1.5f),
                    random.Float(-3.14f, 3.14f)};
    const Vec3 back = EulerOf(QuatFromEuler(e));
    // The sine flattens toward the right angle, so the accuracy falls off with its cosine.
    const double tolerance = 2e-6 / std::cos(e[1]);
    for (int i = 0; i < 3; ++i) ASSERT_NEAR(back[i], e[i], tolerance) << "angle " << i;
  }
}

TEST(MatrixInverse3X3, DiagonalInvertsExactly) {
  const Mat3 m = {2, 0, 0, 0, 4, 0, 0, 0, 8};
  Mat3 inverse;
  ASSERT_EQ(MatrixInverse3X3(m.data(), inverse.data()), N3DS_OK);
  EXPECT_EQ(inverse, (Mat3{0.5f, 0, 0, 0, 0.25f, 0, 0, 0, 0.125f}));
}

TEST(MatrixInverse3X3, ZeroRowIsSingularAndWritesNothing) {
  const Mat3 m = {1, 2, 3, 0, 0, 0, 7, 8, 10};
  Mat3 inverse;
  inverse.fill(kUnwritten);
  EXPECT_EQ(MatrixInverse3X3(m.data(), inverse.data()), N3DS_NUMERICAL);
  for (const float v : inverse) EXPECT_EQ(v, kUnwritten);
}

TEST(MatrixInverse3X3, TinyDeterminantIsStillInverted) {
  const Mat3 m = {1e-12f, 0, 0, 0, 1e-12f, 0, 0, 0, 1e-12f};
  Mat3 inverse;
  ASSERT_EQ(MatrixInverse3X3(m.data(), inverse.data()), N3DS_OK);
  EXPECT_NEAR(inverse[0], 1e12f, 1e7f);
}

TEST(MatrixInverse3X3, ProductWithTheInverseIsTheIdentity) {
  Random random = TestRandom();
  for (int run = 0; run < 200; ++run) {
    // Diagonally dominant, so well conditioned.
    Mat3 m;
    for (int i = 0; i < 9; ++i) m[i] = random.Float(-1, 1) + (i % 4 == 0 ? 4.0f : 0.0f);
    Mat3 inverse;
    ASSERT_EQ(MatrixInverse3X3(m.data(), inverse.data()), N3DS_OK);
    for (int r = 0; r < 3; ++r) {
      for (int c = 0; c < 3; ++c) {
        double sum = 0;
        for (int k = 0; k < 3; ++k) sum += double{m[3 * r + k]} * inverse[3 * k + c];
        ASSERT_NEAR(sum, r == c, 1e-6);
      }
    }
  }
}

TEST(Rotations, NonFiniteInputPropagates) {
  EXPECT_TRUE(std::isnan(MatrixOf({kNan, 0, 0, 0})[0]));
  EXPECT_TRUE(std::isnan(QuatOf({kNan, 0, 0, 0, 1, 0, 0, 0, 1})[0]));
  EXPECT_TRUE(std::isnan(EulerOf({kNan, 0, 0, 0})[0]));
  EXPECT_TRUE(std::isnan(QuatFromEuler({kNan, 0, 0})[0]));
  const Mat3 m = {kNan, 0, 0, 0, 1, 0, 0, 0, 1};
  Mat3 inverse;
  EXPECT_EQ(MatrixInverse3X3(m.data(), inverse.data()), N3DS_OK);
  EXPECT_TRUE(std::isnan(inverse[0]));
}

TEST(Rotations, InputAndOutputMayBeTheSameArray) {
  const Quat q = {0.9f, 0.1f, -0.3f, 0.2f};
  Mat3 shared = {q[0], q[1], q[2], q[3]};
  QuatToRotationMatrix(shared.data(), shared.data());
  EXPECT_EQ(shared, MatrixOf(q));

  const Mat3 rotation = MatrixOf(q);
  shared = rotation;
  RotationMatrixToQuat(shared.data(), shared.data());
  EXPECT_EQ((Quat{shared[0], shared[1], shared[2], shared[3]}), QuatOf(rotation));

  Quat angles = q;
  QuatToEuler(angles.data(), angles.data());
  EXPECT_EQ((Vec3{angles[0], angles[1], angles[2]}), EulerOf(q));

  const Vec3 euler = {0.1f, 0.2f, 0.3f};
  Quat from = {euler[0], euler[1], euler[2]};
  EulerToQuat(from.data(), from.data());
  EXPECT_EQ(from, QuatFromEuler(euler));

  const Mat3 matrix = {3, 1, 0, 1, 4, 1, 0, 1, 5};
  Mat3 apart;
  MatrixInverse3X3(matrix.data(), apart.data());
  shared = matrix;
  MatrixInverse3X3(shared.data(), shared.data());
  EXPECT_EQ(shared, apart);
}

TEST(Rotations, NullPointersAreRefusedAndNothingIsWritten) {
  const Mat3 in = {1, 0, 0, 0, 1, 0, 0, 0, 1};
  using Function = MRESULT (*)(const float*, float*);
  for (const Function function :
       {QuatToRotationMatrix, RotationMatrixToQuat, QuatToEuler, EulerToQuat, MatrixInverse3X3}) {
    Mat3 out;
    out.fill(kUnwritten);
    EXPECT_EQ(function(nullptr, out.data()), N3DS_NULL_ARGUMENT);
    EXPECT_EQ(function(in.data(), nullptr), N3DS_NULL_ARGUMENT);
    EXPECT_EQ(function(nullptr, nullptr), N3DS_NULL_ARGUMENT);
    for (const float v : out) EXPECT_EQ(v, kUnwritten);
  }
}

}  // namespace
}  // namespace n3ds::testing
