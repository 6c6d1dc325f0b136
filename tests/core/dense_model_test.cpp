// SPDX-License-Identifier: MIT
#include "core/dense_model.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <memory>
#include <vector>

#include "core/model_tables.h"
#include "core/tracking_context.h"
#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/core_context.h"
#include "support/fit_scene.h"
#include "support/test_random.h"
namespace n3ds::testing {

namespace {

// ---- The product table

int16_t ProductOf(float identity, float expression) {
  float alpha[kIdentityCount] = {};
  float beta[kExpressionCount] = {};
  alpha[3] = identity;
  beta[7] = expression;
  int16_t products[kProductCount];
  BuildProductTable(alpha, beta, products);
  for (int i = 0; i < kProductCount; i++) {
    if (i != 3 * kExpressionCount + 7) {
      EXPECT_EQ(products[i], 0) << i;
    }
  }
  return products[3 * kExpressionCount + 7];
}

TEST(ProductTable, HoldsProductsWithFifteenFractionalBitsTruncated) {
  EXPECT_EQ(ProductOf(0.5f, 0.5f), 8192);
  EXPECT_EQ(ProductOf(-0.5f, 0.5f), -8192);
  EXPECT_EQ(ProductOf(1.9f / 32768.0f, 1.0f), 1);
  EXPECT_EQ(ProductOf(-1.9f / 32768.0f, 1.0f), -1);
  EXPECT_EQ(ProductOf(0.99997f, 1.0f), 32767);
}

TEST(ProductTable, WrapsOutsideSixteenBits) {
  EXPECT_EQ(ProductOf(1.5f, 1.0f), static_cast<int16_t>(49152 - 65536));
  EXPECT_EQ(ProductOf(-1.5f, 1.0f), 65536 - 49152);
  EXPECT_EQ(ProductOf(2.0f, 1.0f), 0);
  EXPECT_EQ(ProductOf(3.0f, 1.25f), static_cast<int16_t>(122880 - 2 * 65536));
}

TEST(ProductTable, LowestValueIsReplacedByTheNext) {
  EXPECT_EQ(ProductOf(1.0f, 1.0f), -32767) << "32768 wraps to -32768";
  EXPECT_EQ(ProductOf(-1.0f, 1.0f), -32767);
  EXPECT_EQ(ProductOf(3.0f, 1.0f), -32767) << "98304 wraps to -32768";
}

TEST(ProductTable, ConvertsHugeAndUndefinedProductsAsEverywhere) {
  EXPECT_EQ(ProductOf(1e9f, 1e9f), -1) << "saturates at 2^31 - 1, of which the low bits are kept";
  EXPECT_EQ(ProductOf(-1e9f, 1e9f), 0) << "saturates at -2^31";
  EXPECT_EQ(ProductOf(std::numeric_limits<float>::infinity(), 1.0f), -1);
  float alpha[kIdentityCount] = {std::numeric_limits<float>::quiet_NaN()};
  const float beta[kExpressionCount] = {1.0f};
  int16_t products[kProductCount];
  BuildProductTable(alpha, beta, products);
  EXPECT_EQ(products[0], 0);
}

// (alpha * beta) * 32768 in single precision: the product is rounded before it is scaled and
// truncated.
TEST(ProductTable, RoundsTheProductToFloatFirst) {
  Random random = TestRandom();
  float alpha[kIdentityCount];
  float beta[kExpressionCount];
  for (int run = 0; run < 100; run++) {
    for (float& a : alpha) a = static_cast<float>(random.In(-2, 2));
    for (float& b : beta) b = static_cast<float>(random.In(-2, 2));
    int16_t products[kProductCount];
    BuildProductTable(alpha, beta, products);
    for (int k = 0; k < kIdentityCount; k++) {
      for (int j = 0; j < kExpressionCount; j++) {
        const float product = alpha[k] * beta[j];
        int whole = static_cast<int>(std::trunc(static_cast<double>(product) * 32768.0));
        whole = ((whole + 32768) % 65536 + 65536) % 65536 - 32768;
        ASSERT_EQ(products[k * kExpressionCount + j], std::max(whole, -32767));
      }
    }
  }
}

// ---- One mesh task

// A model of random numbers. The tensor's values are multiples of 40, as the loader makes them.
struct RandomModel {
  std::vector<int16_t> mean, identity, expression, tensor;
  float alpha[kIdentityCount] = {};
  float beta[kExpressionCount] = {};
  int16_t products[kProductCount] = {};

  explicit RandomModel(Random* random)
      : mean(kShapeSize),
        identity(static_cast<size_t>(kIdentityCount) * kShapeSize),
        expression(static_cast<size_t>(kExpressionCount) * kShapeSize),
        tensor(static_cast<size_t>(kProductCount) * kShapeSize) {
    for (int16_t& x : mean) x = static_cast<int16_t>(random->Int(-32768, 32767));
    for (int16_t& x : identity) x = static_cast<int16_t>(random->Int(-3000, 3000));
    for (int16_t& x : expression) x = static_cast<int16_t>(random->Int(-3000, 3000));
    for (int16_t& x : tensor) x = static_cast<int16_t>(40 * random->Int(-128, 127));
  }

  void RandomCoefficients(Random* random, double range) {
    for (float& a : alpha) a = static_cast<float>(random->In(-range, range));
    for (float& b : beta) b = static_cast<float>(random->In(-range, range));
    BuildProductTable(alpha, beta, products);
  }

  FaceMeshTask Task(uint32_t first, int32_t end, float* shape) const {
    return {mean.data(),   identity.data(), expression.data(),
            tensor.data(), alpha,           beta,
            products,      first,           end,
            shape};
  }

  std::vector<float> Mesh() const {
    std::vector<float> shape(kShapeSize);
    FaceMeshTask task = Task(0, kVertexCount, shape.data());
    EXPECT_EQ(n3ds::_GetFace3DModel_Thread(&task), nullptr);
    return shape;
  }

  // One coordinate, written down as its definition.
  float Coordinate(size_t c) const {
    float identity_sum = 0.0f;
    for (size_t k = 0; k < kIdentityCount; k++) {
      const float term = alpha[k] * static_cast<float>(identity[k * kShapeSize + c]);
      identity_sum = identity_sum + term;
    }
    float expression_sum = 0.0f;
    for (size_t j = 0; j < kExpressionCount; j++) {
      const float term = beta[j] * static_cast<float>(expression[j * kShapeSize + c]);
      expression_sum = expression_sum + term;
    }
    int64_t product_sum = 0;
    for (size_t k = 0; k < kIdentityCount; k++) {
      for (size_t j = 0; j < kExpressionCount; j++) {
        if (k != 15 && (k + j) % 2 != 0) continue;
        const size_t pair = k * kExpressionCount + j;
        product_sum += int64_t{products[pair]} * tensor[pair * kShapeSize + c];
      }
    }
    const auto wrapped = static_cast<int32_t>(static_cast<uint32_t>(product_sum));
    const float interaction = static_cast<float>(wrapped / 32768.0);
    float sum = static_cast<float>(mean[c]) + identity_sum;
    sum = sum + expression_sum;
    sum = sum + interaction;
    return sum * 0.00390625f;
  }
};

TEST(DenseMesh, MatchesItsDefinitionInEveryBit) {
  Random random = TestRandom();
  RandomModel model(&random);
  for (const double range : {0.3, 1.0, 4.0}) {
    model.RandomCoefficients(&random, range);
    std::vector<float> expected(kShapeSize);
    for (size_t c = 0; c < expected.size(); c++) expected[c] = model.Coordinate(c);
    ASSERT_EQ(Bits(model.Mesh()), Bits(expected)) << range;
  }
}

TEST(DenseMesh, InteractionSumWrapsAt32Bits) {
  Random random = TestRandom();
  RandomModel model(&random);
  std::fill(model.tensor.begin(), model.tensor.end(), static_cast<int16_t>(-5120));
  std::fill(std::begin(model.products), std::end(model.products), static_cast<int16_t>(-32767));
  // 170 * 5120 * 32767 is more than 2^32.
  std::vector<float> expected(kShapeSize);
  for (size_t c = 0; c < expected.size(); c++) expected[c] = model.Coordinate(c);
  EXPECT_EQ(Bits(model.Mesh()), Bits(expected));
}

TEST(DenseMesh, TasksWriteTheirOwnVerticesOnly) {
  Random random = TestRandom();
  RandomModel model(&random);
  model.RandomCoefficients(&random, 1.0);
  const std::vector<float> whole = model.Mesh();
  for (const auto& [first, end] : {std::pair(0, 453),
                                   {453, 906},
                                   {906, 1359},
                                   {1359, 1812},
                                   {7, 8},
                                   {100, 100},
                                   {0, 1000},
                                   {811, 1812}}) {
    std::vector<float> shape(kShapeSize, -1.0f);
    FaceMeshTask task = model.Task(static_cast<uint32_t>(first), end, shape.data());
    n3ds::_GetFace3DModel_Thread(&task);
    for (int c = 0; c < kShapeSize; c++) {
      const bool inside = c >= 3 * first && c < 3 * end;
      ASSERT_EQ(shape[static_cast<size_t>(c)], inside ? whole[static_cast<size_t>(c)] : -1.0f)
          << c << " of " << first << " to " << end;
    }
  }
}

TEST(DenseMesh, WithoutCoefficientsItIsTheMeanShape) {
  Random random = TestRandom();
  const RandomModel model(&random);
  const std::vector<float> mesh = model.Mesh();
  for (size_t c = 0; c < mesh.size(); c++) {
    ASSERT_EQ(mesh[c], static_cast<float>(model.mean[c]) / 256.0f) << c;
  }
}

TEST(DenseMesh, WithoutIdentityThereIsNoInteraction) {
  Random random = TestRandom();
  RandomModel model(&random);
  model.RandomCoefficients(&random, 1.0);
  std::fill(std::begin(model.alpha), std::end(model.alpha), 0.0f);
  BuildProductTable(model.alpha, model.beta, model.products);
  const std::vector<float> mesh = model.Mesh();
  std::fill(model.tensor.begin(), model.tensor.end(), static_cast<int16_t>(5080));
  EXPECT_EQ(Bits(model.Mesh()), Bits(mesh));
}

// Which of the 320 tensor vectors reach the mesh: those of even index sum, and all of the last
// identity.
TEST(DenseMesh, TakesTheCheckerboardAndTheWholeLastIdentity) {
  Random random = TestRandom();
  RandomModel model(&random);
  for (int k = 0; k < kIdentityCount; k++) {
    for (int j = 0; j < kExpressionCount; j++) {
      std::fill(std::begin(model.products), std::end(model.products), static_cast<int16_t>(0));
      model.products[k * kExpressionCount + j] = 16384;
      std::vector<float> shape(kShapeSize);
      FaceMeshTask task = model.Task(0, 3, shape.data());
      n3ds::_GetFace3DModel_Thread(&task);
      const bool expected = k == 15 || (k + j) % 2 == 0;
      for (size_t c = 0; c < 9; c++) {
        const size_t pair = static_cast<size_t>(k * kExpressionCount + j);
        const int term = expected ? model.tensor[pair * kShapeSize + c] / 2 : 0;
        ASSERT_EQ(shape[c], static_cast<float>(model.mean[c] + term) / 256.0f) << k << ", " << j;
      }
    }
  }
}

// ---- The exported function

struct Records {
  std::vector<std::vector<float>> landmarks;
  std::vector<N3DS_RIGID_MATRIX> matrices;
  std::vector<N3DS_3D_MODEL> models;

  // Landmark buffers of exactly the promised size.
  Records(size_t faces, uint32_t landmark_count) : matrices(faces), models(faces) {
    landmarks.assign(faces, std::vector<float>(3 * size_t{landmark_count}, -7.0f));
    for (size_t k = 0; k < faces; k++) matrices[k].landmarks3D = landmarks[k].data();
  }
};

// A context as a mask frame of `faces` faces leaves it, with random coefficients.
std::unique_ptr<Core> CoreAfterFrame(int faces, uint32_t landmark_count, Random* random,
                                     MHandle memory = nullptr) {
  auto core = Core::Ready(memory);
  TrackingContext& context = core->context();
  context.landmarkNum = landmark_count;
  context.faceNum = static_cast<uint32_t>(faces);
  const size_t history = 2 * size_t{kSlotCount} * landmark_count;
  context.landmarkHistory =
      static_cast<int32_t*>(MMemAlloc(context.memory, history * sizeof(int32_t)));
  if (context.landmarkHistory == nullptr) return core;
  const float camera[9] = {560, 0, 320, 0, 560, 240, 0, 0, 1};
  std::memcpy(context.camera, camera, sizeof(camera));
  for (size_t i = 0; i < history; i++) context.landmarkHistory[i] = random->Int(0, 600);
  for (int f = 0; f < faces; f++) {
    for (float& a : context.identityCoef[f]) a = static_cast<float>(random->In(-1, 1));
    for (float& b : context.expressionCoef[f]) b = static_cast<float>(random->In(-1, 1));
    const float pose[7] = {0.02f, 0.97f, 0.1f, -0.05f, 3, -8, 600};
    for (int i = 0; i < 7; i++) {
      context.pose[f][i] = pose[i] + static_cast<float>(random->In(-0.05, 0.05));
    }
    for (int i = 0; i < 16; i++) {
      context.rigidResult[f].modelMatrix[i] = static_cast<float>(random->In(-2, 2));
      context.rigidResult[f].projectionMatrix[i] = static_cast<float>(random->In(-2, 2));
    }
  }
  return core;
}

TEST(GetFace3DModel, FillsTheModelRecords) {
  Random random = TestRandom();
  const auto core = CoreAfterFrame(2, 101, &random);
  Records records(2, 101);
  ASSERT_EQ(N3DS_GetFace3DModel(core->handle(), records.models.data(), records.matrices.data(), 2),
            N3DS_OK);
  for (int f = 0; f < 2; f++) {
    const N3DS_3D_MODEL& model = records.models[static_cast<size_t>(f)];
    EXPECT_EQ(model.vertices, core->context().shape[f]);
    EXPECT_EQ(model.vertexCount, 1812);
    EXPECT_EQ(model.triangles, &kTriangles[0][0]);
    EXPECT_EQ(model.triangleCount, 3456);
  }
}

TEST(GetFace3DModel, BuildsEachFacesMesh) {
  Random random = TestRandom();
  for (int faces = 1; faces <= 5; faces++) {
    const auto core = CoreAfterFrame(faces, 101, &random);
    Records records(static_cast<size_t>(faces), 101);
    ASSERT_EQ(
        N3DS_GetFace3DModel(core->handle(), records.models.data(), records.matrices.data(), faces),
        N3DS_OK);
    TrackingContext& context = core->context();
    for (int f = 0; f < faces; f++) {
      int16_t products[kProductCount];
      BuildProductTable(context.identityCoef[f], context.expressionCoef[f], products);
      std::vector<float> expected(kShapeSize);
      FaceMeshTask task = {context.meanShape,
                           context.identityBasis,
                           context.expressionBasis,
                           context.tensor,
                           context.identityCoef[f],
                           context.expressionCoef[f],
                           products,
                           0,
                           kVertexCount,
                           expected.data()};
      n3ds::_GetFace3DModel_Thread(&task);
      ASSERT_EQ(Bits(context.shape[f]), Bits(expected)) << f << " of " << faces;
    }
  }
}

TEST(GetFace3DModel, ViewAndModelMatrixGiveTheModelView) {
  Random random = TestRandom();
  const auto core = CoreAfterFrame(1, 101, &random);
  Records records(1, 101);
  ASSERT_EQ(N3DS_GetFace3DModel(core->handle(), records.models.data(), records.matrices.data(), 1),
            N3DS_OK);
  const N3DS_RIGID_MATRIX& record = records.matrices[0];
  const N3DS_RIGID_MATRIX& stored = core->context().rigidResult[0];
  EXPECT_EQ(Bits(record.projectionMatrix), Bits(stored.projectionMatrix));
  for (int i = 0; i < 16; i++) {
    const float identity = i % 5 == 0 ? 1.0f : 0.0f;
    EXPECT_EQ(record.viewMatrix[i], i == 14 ? -500.0f : identity) << i;
    const float lifted = i % 4 == 2 ? 500.0f * stored.modelMatrix[i + 1] : 0.0f;
    EXPECT_EQ(record.modelMatrix[i], stored.modelMatrix[i] + lifted) << i;
  }
}

// Landmarks in double precision, by their rules one after the other.
struct Landmark {
  double x, y, z;
};
std::vector<Landmark> ReferenceLandmarks(const TrackingContext& context, int face) {
  const float* q = context.pose[face];
  const double w = q[0], x = q[1], y = q[2], z = q[3];
  const double r[9] = {
      w * w + x * x - y * y - z * z, 2 * (x * y - w * z),           2 * (x * z + w * y),
      2 * (x * y + w * z),           w * w - x * x + y * y - z * z, 2 * (y * z - w * x),
      2 * (x * z - w * y),           2 * (y * z + w * x),           w * w - x * x - y * y + z * z};
  const double n = w * w + x * x + y * y + z * z;
  const float* t = q + 4;
  // The inverse of n times a rotation is its transpose over n^2.
  const auto back = [&](int landmark, double depth) {
    const int32_t* p =
        context.landmarkHistory + 2 * (face * static_cast<int>(context.landmarkNum) + landmark);
    const float* k = context.camera;
    const double c[3] = {(p[0] + 0.5 - k[2]) * depth / k[0] - t[0],
                         (p[1] + 0.5 - k[5]) * depth / k[4] - t[1], depth - t[2]};
    return Landmark{(r[0] * c[0] + r[3] * c[1] + r[6] * c[2]) / (n * n),
                    (r[1] * c[0] + r[4] * c[1] + r[7] * c[2]) / (n * n),
                    (r[2] * c[0] + r[5] * c[1] + r[8] * c[2]) / (n * n)};
  };
  const auto vertex = [&](int index) {
    const float* v = context.shape[face] + 3 * index;
    return Landmark{v[0], v[1], v[2]};
  };
  const auto middle = [](const Landmark& a, const Landmark& b) {
    return Landmark{(a.x + b.x) / 2, (a.y + b.y) / 2, (a.z + b.z) / 2};
  };
  const auto depth_of = [&](const Landmark& v) {
    return r[6] * v.x + r[7] * v.y + r[8] * v.z + t[2];
  };
  const double shares[19] = {0,    0,   0,    0,    0, 0.15, 0.25, 0.4, 0.55, 0.7,
                             0.55, 0.4, 0.25, 0.15, 0, 0,    0,    0,   0};

  std::vector<Landmark> points;
  double depths[95];
  for (int i = 0; i <= 100; i++) {
    Landmark v = {};
    if (i <= 18) {
      v = vertex(kDefaultContourVertexIndices[i]);
    } else if (i <= 94) {
      v = vertex(kInnerLandmarkVertexIndices[i - 19]);
    } else if (i == 95) {
      v = middle(vertex(1054), vertex(1154));
    } else if (i == 96) {
      v = middle(vertex(979), vertex(893));
    } else {
      constexpr int kExtra[4] = {893, 979, 1335, 1366};
      v = vertex(kExtra[i - 97]);
    }
    const double depth = depth_of(v);
    if (i <= 94) depths[i] = depth;
    Landmark p = back(i, depth);
    if (i <= 18) {
      const double s = shares[i];
      p = {(1 - s) * v.x + s * p.x, (1 - s) * v.y + s * p.y, (1 - s) * v.z + s * p.z};
    }
    points.push_back(p);
  }
  if (context.landmarkNum == 101) return points;
  points.push_back(points[95]);
  points.push_back(points[96]);
  for (size_t i = 103; i <= 120; i++) points.push_back(middle(points[i - 103], points[i - 102]));
  const auto ring = [&](int first, int last) {
    for (int a = first; a <= last; a++) {
      const int b = a == last ? first : a + 1;
      points.push_back(back(static_cast<int>(points.size()), (depths[a] + depths[b]) / 2));
    }
  };
  ring(39, 50);
  ring(51, 62);
  ring(75, 86);
  ring(87, 94);
  return points;
}

TEST(GetFace3DModel, LandmarksAreBackProjectedToTheDepthOfTheMesh) {
  Random random = TestRandom();
  for (const uint32_t count : {101u, 165u}) {
    const auto core = CoreAfterFrame(3, count, &random);
    Records records(3, count);
    ASSERT_EQ(
        N3DS_GetFace3DModel(core->handle(), records.models.data(), records.matrices.data(), 3),
        N3DS_OK);
    for (int f = 0; f < 3; f++) {
      const auto expected = ReferenceLandmarks(core->context(), f);
      ASSERT_EQ(expected.size(), count);
      for (size_t i = 0; i < count; i++) {
        const float* p = &records.landmarks[static_cast<size_t>(f)][3 * i];
        EXPECT_NEAR(p[0], expected[i].x, 2e-3) << i << " of face " << f;
        EXPECT_NEAR(p[1], expected[i].y, 2e-3) << i << " of face " << f;
        EXPECT_NEAR(p[2], expected[i].z, 2e-3) << i << " of face " << f;
      }
    }
  }
}

TEST(GetFace3DModel, PupilsAreRepeatedAndOutlineMiddlesLieBetween) {
  Random random = TestRandom();
  const auto core = CoreAfterFrame(1, 165, &random);
  Records records(1, 165);
  ASSERT_EQ(N3DS_GetFace3DModel(core->handle(), records.models.data(), records.matrices.data(), 1),
            N3DS_OK);
  const float* p = records.landmarks[0].data();
  EXPECT_EQ(std::memcmp(p + 3 * 101, p + 3 * 95, 6 * sizeof(float)), 0);
  for (int i = 103; i <= 120; i++) {
    for (int axis = 0; axis < 3; axis++) {
      EXPECT_EQ(p[3 * i + axis], (p[3 * (i - 103) + axis] + p[3 * (i - 102) + axis]) * 0.5f) << i;
    }
  }
}

TEST(GetFace3DModel, IsTheSameOnEveryRun) {
  Random random = TestRandom();
  const auto core = CoreAfterFrame(5, 165, &random);
  Records first(5, 165);
  ASSERT_EQ(N3DS_GetFace3DModel(core->handle(), first.models.data(), first.matrices.data(), 5),
            N3DS_OK);
  const std::vector<float> shape(core->context().shape[4], core->context().shape[4] + kShapeSize);
  for (int run = 0; run < 20; run++) {
    Records again(5, 165);
    ASSERT_EQ(N3DS_GetFace3DModel(core->handle(), again.models.data(), again.matrices.data(), 5),
              N3DS_OK);
    for (size_t f = 0; f < 5; f++) {
      ASSERT_EQ(Bits(again.landmarks[f]), Bits(first.landmarks[f])) << run;
    }
    ASSERT_EQ(Bits(core->context().shape[4]), Bits(shape)) << run;
  }
}

TEST(GetFace3DModel, RejectsNullArguments) {
  Random random = TestRandom();
  const auto core = CoreAfterFrame(1, 101, &random);
  Records records(1, 101);
  N3DS_3D_MODEL* models = records.models.data();
  N3DS_RIGID_MATRIX* matrices = records.matrices.data();
  EXPECT_EQ(N3DS_GetFace3DModel(nullptr, models, matrices, 1), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(N3DS_GetFace3DModel(core->handle(), nullptr, matrices, 1), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(N3DS_GetFace3DModel(core->handle(), models, nullptr, 1), N3DS_NULL_ARGUMENT);
  EXPECT_EQ(models[0].vertices, nullptr);
}

TEST(GetFace3DModel, RejectsAnotherFaceCountBeforeAnythingIsWritten) {
  Random random = TestRandom();
  const auto core = CoreAfterFrame(2, 101, &random);
  const std::vector<float> shape(core->context().shape[0], core->context().shape[0] + kShapeSize);
  Records records(5, 101);
  for (const int32_t count : {0, 1, 3, 5, 6, -1, -2, INT32_MIN}) {
    EXPECT_EQ(
        N3DS_GetFace3DModel(core->handle(), records.models.data(), records.matrices.data(), count),
        N3DS_BAD_VALUE)
        << count;
  }
  for (const N3DS_3D_MODEL& model : records.models) EXPECT_EQ(model.vertices, nullptr);
  for (const auto& landmarks : records.landmarks) {
    for (const float value : landmarks) ASSERT_EQ(value, -7.0f);
  }
  EXPECT_EQ(Bits(core->context().shape[0]), Bits(shape));
}

TEST(GetFace3DModel, WithoutAModelIsANullArgumentAfterTheCountIsRight) {
  const Core core;
  core.context().faceNum = 1;
  Records records(2, 101);
  N3DS_3D_MODEL* models = records.models.data();
  EXPECT_EQ(N3DS_GetFace3DModel(core.handle(), models, records.matrices.data(), 2), N3DS_BAD_VALUE);
  EXPECT_EQ(N3DS_GetFace3DModel(core.handle(), models, records.matrices.data(), 1),
            N3DS_NULL_ARGUMENT);
}

TEST(GetFace3DModel, OfNoFacesDoesNothing) {
  const auto core = Core::Ready();
  Records records(1, 101);
  EXPECT_EQ(N3DS_GetFace3DModel(core->handle(), records.models.data(), records.matrices.data(), 0),
            N3DS_OK);
  EXPECT_EQ(records.models[0].vertices, nullptr);
}

TEST(GetFace3DModel, PoseThatCannotBeInvertedIsANumericalFailure) {
  Random random = TestRandom();
  const auto core = CoreAfterFrame(3, 101, &random);
  std::fill_n(core->context().pose[1], 4, 0.0f);
  Records records(3, 101);
  EXPECT_EQ(N3DS_GetFace3DModel(core->handle(), records.models.data(), records.matrices.data(), 3),
            N3DS_NUMERICAL);
  EXPECT_NE(records.landmarks[0][0], -7.0f) << "the face before it is reported";
  EXPECT_EQ(records.landmarks[1][0], -7.0f);
  EXPECT_EQ(records.landmarks[2][0], -7.0f);
  // The call goes on working once there is a pose.
  core->context().pose[1][1] = 1.0f;
  EXPECT_EQ(N3DS_GetFace3DModel(core->handle(), records.models.data(), records.matrices.data(), 3),
            N3DS_OK);
}

TEST(Get3DLandmarkNum, IsTheLatchedCount) {
  EXPECT_EQ(N3DS_Get3DLandmarkNum(nullptr), -1);
  const Core core;
  EXPECT_EQ(N3DS_Get3DLandmarkNum(core.handle()), 0);
  core.context().landmarkNum = 165;
  EXPECT_EQ(N3DS_Get3DLandmarkNum(core.handle()), 165);
}

}  // namespace
}  // namespace n3ds::testing
