// SPDX-License-Identifier: MIT
// Mask frames through the exported engine functions.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <memory>
#include <vector>

#include "core/model_tables.h"
#include "norvale_3d_sticker_core.h"
#include "norvale_3d_sticker_engine.h"
#include "support/bits.h"
#include "support/core_context.h"
#include "support/face_scene.h"
namespace n3ds::testing {

namespace {

constexpr int kWidth = 1280, kHeight = 720;

// An engine, its output records with landmark buffers of exactly the promised size, and one
// image.
class MaskFrame : public ::testing::Test {
 protected:
  MaskFrame() : engine_(Norvale_3DSticker_CreateEngine()), image_(ImageOf(kWidth, kHeight)) {
    MakeBuffers(101);
  }
  ~MaskFrame() override { Norvale_3DSticker_DestroyEngine(engine_); }

  void Initialize(uint32_t degree = 0, uint32_t mirror = 0) {
    ASSERT_EQ(Norvale_3DSticker_Initialize(engine_, ModelPath().c_str(), degree, mirror), N3DS_OK);
  }

  void MakeBuffers(size_t landmarks) {
    buffers_.assign(N3DS_MAX_FACES, {});
    matrices_ = {};
    models_ = {};
    for (size_t k = 0; k < N3DS_MAX_FACES; k++) {
      buffers_[k].assign(3 * landmarks, -7.0f);
      matrices_.faces[k].landmarks3D = buffers_[k].data();
    }
    matrices_.faceNum = models_.modelNum = 99;
  }

  // Faces side by side, looking into the camera.
  std::vector<__tag_point> Points(int faces, int landmarks = 101, double offset = 0) {
    std::vector<__tag_point> points;
    for (int k = 0; k < faces; k++) {
      HeadPlace place;
      place.x = 150.0 * (k - faces / 2) + offset;
      const auto seen = DetectLandmarks(ModelShape(), place, kWidth, kHeight, landmarks);
      for (size_t i = 0; i < seen.size(); i += 2) points.push_back({seen[i], seen[i + 1]});
    }
    return points;
  }

  MRESULT Process(std::vector<__tag_point> points, uint32_t faces, uint32_t landmarks = 101) {
    return Norvale_3DSticker_Process_FaceMask(engine_, &image_, faces, landmarks,
                                              points.empty() ? nullptr : points.data(), nullptr,
                                              nullptr, &matrices_, &models_);
  }

  void ExpectUntouched() {
    EXPECT_EQ(matrices_.faceNum, 99u);
    EXPECT_EQ(models_.modelNum, 99u);
    for (const auto& buffer : buffers_) {
      for (const float value : buffer) ASSERT_EQ(value, -7.0f);
    }
  }

  void* engine_;
  NSVL_OFFSCREEN image_;
  std::vector<std::vector<float>> buffers_;
  Norvale_3DSticker_Matrix_Array matrices_ = {};
  Norvale_3DSticker_ModelInfo_Array models_ = {};
};

TEST_F(MaskFrame, NullEngineIsItsOwnResult) {
  EXPECT_EQ(Norvale_3DSticker_Process_FaceMask(nullptr, &image_, 0, 101, nullptr, nullptr, nullptr,
                                               &matrices_, &models_),
            N3DS_NULL_ENGINE);
}

TEST_F(MaskFrame, BeforeInitialisationItIsRefused) {
  EXPECT_EQ(Process(Points(1), 1), N3DS_NOT_INITIALIZED);
  EXPECT_EQ(Process({}, 0), N3DS_NOT_INITIALIZED);
  Initialize();
  EXPECT_EQ(Process(Points(1), 1), N3DS_OK);
  MakeBuffers(101);
  Norvale_3DSticker_Uninitialize(engine_);
  EXPECT_EQ(Process(Points(1), 1), N3DS_NOT_INITIALIZED);
  ExpectUntouched();
}

TEST_F(MaskFrame, MissingOutputRecordsAreRefused) {
  Initialize();
  auto points = Points(1);
  EXPECT_EQ(Norvale_3DSticker_Process_FaceMask(engine_, &image_, 1, 101, points.data(), nullptr,
                                               nullptr, nullptr, &models_),
            N3DS_NOT_INITIALIZED);
  EXPECT_EQ(Norvale_3DSticker_Process_FaceMask(engine_, &image_, 1, 101, points.data(), nullptr,
                                               nullptr, &matrices_, nullptr),
            N3DS_NOT_INITIALIZED);
  ExpectUntouched();
}

TEST_F(MaskFrame, BadFramesFailAndLeaveTheOutputsAlone) {
  Initialize();
  EXPECT_EQ(Process(Points(6), 6), N3DS_FAILED);
  EXPECT_EQ(Process(Points(1), 1, 100), N3DS_FAILED);
  EXPECT_EQ(Process(Points(1), 1, 0), N3DS_FAILED);
  EXPECT_EQ(Process({}, 1), N3DS_FAILED) << "no points";
  auto points = Points(1);
  EXPECT_EQ(Norvale_3DSticker_Process_FaceMask(engine_, nullptr, 1, 101, points.data(), nullptr,
                                               nullptr, &matrices_, &models_),
            N3DS_FAILED);
  image_.width = 0;
  EXPECT_EQ(Process(Points(1), 1), N3DS_FAILED);
  image_.width = kWidth;
  image_.height = -1;
  EXPECT_EQ(Process(Points(1), 1), N3DS_FAILED);
  ExpectUntouched();
}

TEST_F(MaskFrame, FrameWithoutFacesEndsTheTracksAndCountsNone) {
  Initialize();
  ASSERT_EQ(Process(Points(2), 2), N3DS_OK);
  const std::vector<float> first(models_.models[0].vertices, models_.models[0].vertices + 31104);
  ASSERT_EQ(Process(Points(2, 101, 30), 2), N3DS_OK);
  EXPECT_EQ(Process({}, 0), N3DS_OK);
  EXPECT_EQ(matrices_.faceNum, 0u);
  EXPECT_EQ(models_.modelNum, 0u);
  ASSERT_EQ(Process(Points(2), 2), N3DS_OK);
  const std::vector<float> again(models_.models[0].vertices, models_.models[0].vertices + 31104);
  EXPECT_EQ(Bits(again), Bits(first)) << "the faces are new";
}

TEST_F(MaskFrame, FrameWithoutFacesIsNoErrorAtTheStart) {
  Initialize();
  EXPECT_EQ(Process({}, 0), N3DS_OK);
  EXPECT_EQ(matrices_.faceNum, 0u);
  EXPECT_EQ(models_.modelNum, 0u);
}

TEST_F(MaskFrame, CountsOfTheMeshAreFixed) {
  Initialize();
  ASSERT_EQ(Process(Points(3), 3), N3DS_OK);
  EXPECT_EQ(matrices_.faceNum, 3u);
  EXPECT_EQ(models_.modelNum, 3u);
  for (int k = 0; k < 3; k++) {
    EXPECT_EQ(models_.models[k].vertexNum, 10368);
    EXPECT_EQ(models_.models[k].texCoordNum, 10368);
  }
  EXPECT_EQ(models_.models[3].vertices, nullptr);
}

TEST_F(MaskFrame, FacesHaveMeshesOfTheirOwnAndOneTextureTable) {
  Initialize();
  ASSERT_EQ(Process(Points(2), 2), N3DS_OK);
  const float *a = models_.models[0].vertices, *b = models_.models[1].vertices;
  EXPECT_GE(std::abs(b - a), 31104);
  EXPECT_EQ(models_.models[0].texCoords, models_.models[1].texCoords);
  for (int i = 0; i < 10368; i++) {
    const uint16_t vertex = kTriangles[i / 3][i % 3];
    ASSERT_EQ(models_.models[0].texCoords[2 * i], kTextureCoordinates[vertex][0]) << i;
    ASSERT_EQ(models_.models[0].texCoords[2 * i + 1], kTextureCoordinates[vertex][1]) << i;
  }
}

// The same frames through the core: the engine reports what the core reports, the mesh unrolled by
// triangle corner and the matrices in reverse order.
TEST_F(MaskFrame, ReportsWhatTheCoreReports) {
  for (const uint32_t count : {101u, 165u}) {
    Initialize();
    MakeBuffers(count);
    const auto core = Core::Ready();
    for (int frame = 0; frame < 4; frame++) {
      const auto points = Points(2, static_cast<int>(count), 3 * frame);
      ASSERT_EQ(Process(points, 2, count), N3DS_OK);

      std::vector<std::vector<int32_t>> faces(2);
      for (size_t i = 0; i < points.size(); i++) {
        faces[i / count].push_back(points[i].x);
        faces[i / count].push_back(points[i].y);
      }
      FaceRecords records(faces);
      ASSERT_EQ(N3DS_Build3DFaceForVideo_Mask(core->handle(), &image_, records.get(), 2), N3DS_OK);
      N3DS_3D_MODEL models[2];
      N3DS_RIGID_MATRIX matrices[2];
      std::vector<float> landmarks[2];
      for (int k = 0; k < 2; k++) {
        landmarks[k].resize(3 * count);
        matrices[k].landmarks3D = landmarks[k].data();
      }
      ASSERT_EQ(N3DS_GetFace3DModel(core->handle(), models, matrices, 2), N3DS_OK);
      for (size_t k = 0; k < 2; k++) {
        const Norvale_3DSticker_Face_Matrix& face = matrices_.faces[k];
        EXPECT_EQ(Bits(face.modelMatrix), Bits(matrices[k].modelMatrix));
        EXPECT_EQ(Bits(face.viewMatrix), Bits(matrices[k].viewMatrix));
        EXPECT_EQ(Bits(face.projectionMatrix), Bits(matrices[k].projectionMatrix));
        EXPECT_EQ(face.landmarks3D, buffers_[k].data());
        EXPECT_EQ(Bits(buffers_[k]), Bits(landmarks[k]));
        for (int i = 0; i < 10368; i++) {
          const float* vertex = models[k].vertices + 3 * models[k].triangles[i];
          ASSERT_EQ(std::memcmp(models_.models[k].vertices + 3 * i, vertex, 12), 0) << i;
        }
      }
    }
    Norvale_3DSticker_Uninitialize(engine_);
  }
}

TEST_F(MaskFrame, MeshStaysUntilTheNextFrame) {
  Initialize();
  ASSERT_EQ(Process(Points(1), 1), N3DS_OK);
  const Norvale_3DSticker_Face_Model model = models_.models[0];
  const std::vector<float> before(model.vertices, model.vertices + 31104);
  Norvale_3DSticker_SetDegreeAndMirror(engine_, 90, 1);
  Norvale_3DSticker_GetVersion();
  EXPECT_EQ(Process(Points(1), 1, 100), N3DS_FAILED);
  const std::vector<float> after(model.vertices, model.vertices + 31104);
  EXPECT_EQ(Bits(after), Bits(before));
}

TEST_F(MaskFrame, PointsAreOnlyRead) {
  Initialize();
  auto points = Points(1);
  for (int frame = 0; frame < 3; frame++) {
    auto given = points;
    ASSERT_EQ(Norvale_3DSticker_Process_FaceMask(engine_, &image_, 1, 101, given.data(), nullptr,
                                                 nullptr, &matrices_, &models_),
              N3DS_OK);
    for (size_t i = 0; i < points.size(); i++) {
      ASSERT_EQ(given[i].x, points[i].x) << i;
      ASSERT_EQ(given[i].y, points[i].y) << i;
    }
  }
}

// A turned or mirrored image of the same face gives the same mesh.
TEST_F(MaskFrame, OrientationIsTakenOut) {
  const auto upright = Points(1);
  std::vector<float> expected;
  for (const uint32_t degree : {0u, 90u, 180u, 270u}) {
    Initialize(degree);
    std::vector<__tag_point> delivered;
    for (const __tag_point& p : upright) {
      switch (degree) {
        case 0:
          delivered.push_back(p);
          break;
        case 90:
          delivered.push_back({p.y, kWidth - p.x});
          break;
        case 180:
          delivered.push_back({kWidth - p.x, kHeight - p.y});
          break;
        default:
          delivered.push_back({kHeight - p.y, p.x});
          break;
      }
    }
    const bool turned = degree == 90 || degree == 270;
    image_.width = turned ? kHeight : kWidth;
    image_.height = turned ? kWidth : kHeight;
    ASSERT_EQ(Process(delivered, 1), N3DS_OK);
    const std::vector<float> mesh(models_.models[0].vertices, models_.models[0].vertices + 31104);
    if (degree == 0) expected = mesh;
    EXPECT_EQ(Bits(mesh), Bits(expected)) << degree;
    Norvale_3DSticker_Uninitialize(engine_);
  }
}

// View times model takes the mesh to where the landmarks are seen.
TEST_F(MaskFrame, MatricesPutTheMeshOnTheFace) {
  Initialize();
  const auto points = Points(1);
  for (int frame = 0; frame < 3; frame++) {
    ASSERT_EQ(Process(points, 1), N3DS_OK);
  }
  const Norvale_3DSticker_Face_Matrix& face = matrices_.faces[0];
  const auto apply = [](const float* m, const double* in, double* out) {
    for (int row = 0; row < 4; row++) {
      out[row] = 0;
      for (int column = 0; column < 4; column++) out[row] += m[4 * column + row] * in[column];
    }
  };
  // The corners of the mesh that are landmark vertices, found through the triangle list.
  for (int i = 0; i < kInnerLandmarkCount; i++) {
    const uint16_t* corners = &kTriangles[0][0];
    const auto corner = std::find(corners, corners + 10368, kInnerLandmarkVertexIndices[i]);
    ASSERT_NE(corner, corners + 10368);
    const float* v = models_.models[0].vertices + 3 * (corner - corners);
    const double world[4] = {v[0], v[1], v[2], 1};
    double placed[4], eye[4], clip[4];
    apply(face.modelMatrix, world, placed);
    apply(face.viewMatrix, placed, eye);
    apply(face.projectionMatrix, eye, clip);
    EXPECT_NEAR((clip[0] / clip[3] + 1) / 2 * kWidth, points[static_cast<size_t>(19 + i)].x, 4)
        << i;
    EXPECT_NEAR((1 - clip[1] / clip[3]) / 2 * kHeight, points[static_cast<size_t>(19 + i)].y, 4)
        << i;
  }
}

}  // namespace
}  // namespace n3ds::testing
