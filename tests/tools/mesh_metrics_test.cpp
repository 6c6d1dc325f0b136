// SPDX-License-Identifier: MIT
// Mesh scores on the mean face, whose landmarks are put exactly where they should be or off by a
// known distance.
#include "eval/mesh_metrics.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "engine/engine_session.h"
#include "mesh/face_tables.h"
#include "support/data_files.h"
#include "support/statistics.h"

namespace n3ds::tool {
namespace {

using ::testing::DoubleNear;
using ::testing::Each;
using ::testing::IsEmpty;
using ::testing::Le;
using ::testing::SizeIs;

constexpr double kPupilDistance = 100;  // pixels

class MeshMetrics : public ::testing::Test {
 protected:
  MeshMetrics() : model_(ReadFaceModelFile(DefaultModelPath())), judge_(model_) {
    header_.width = 1280;
    header_.height = 960;
    header_.fps = 30;
    header_.landmarks = 101;
    for (std::size_t i = 0; i < model_.mean.size(); i += 3) {
      const std::int16_t* p = &model_.mean[i];
      mean_.push_back({p[0] / 256.0, p[1] / 256.0, p[2] / 256.0});
    }
    SetMesh(mean_);
    Turn(0);
  }

  void SetMesh(const Points& vertices) {
    face_.corners.clear();
    for (const Triangle& triangle : FaceTriangles()) {
      for (const std::size_t v : triangle) {
        for (const double x : vertices[v]) face_.corners.push_back(static_cast<float>(x));
      }
    }
  }

  // The head 700 mm before the camera, turned about the vertical axis.
  void Turn(double yaw) {
    constexpr float kCos = 0.9397F;
    constexpr float kSin = 0.342F;
    const auto c = static_cast<float>(std::cos(yaw / 57.29577951));
    const auto s = static_cast<float>(std::sin(yaw / 57.29577951));
    const float focal = 1120;
    face_.projection = {
        2 * focal / 1280, 0, 0, 0, 0, 2 * focal / 960, 0, 0, 0, 0, -5001.0F / 4999, -1, 0, 0,
        -10000.0F / 4999, 0};
    face_.view = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, -500, 1};
    // The turn times the upright head's axes in those of the model file.
    face_.model = {c,        0,     -s,       0, s * kSin, kCos, c * kSin, 0,
                   s * kCos, -kSin, c * kCos, 0, 0,        0,    -200,     1};
    face_.pitched = true;
  }

  PixelPoint Drawn(std::size_t landmark) const {
    const Vector3 v = VerticesOfCorners(face_.corners)[LandmarkVertices()[landmark]];
    return ProjectToImage(face_, header_, v[0], v[1], v[2]);
  }

  // Landmarks where the mesh of now is drawn, rounded to pixels; pupils at a known distance.
  void SeeTheMesh() {
    seen_ = TrackFace{};
    seen_.points.assign(202, 0);
    for (std::size_t k = kFirstInnerLandmark; k <= kLastInnerLandmark; ++k) {
      const PixelPoint p = Drawn(k);
      seen_.points[2 * k] = static_cast<std::int32_t>(std::lround(p.x));
      seen_.points[2 * k + 1] = static_cast<std::int32_t>(std::lround(p.y));
    }
    seen_.points[190] = 600;
    seen_.points[192] = 600 + static_cast<std::int32_t>(kPupilDistance);
  }

  MeshScore Judge() const {
    TrackFrame frame;
    frame.faces = {seen_};
    FrameResult result;
    result.ok = true;
    result.faces = {face_};
    MeshScore score;
    judge_.AddFrame(header_, frame, result, score);
    return score;
  }

  FaceModelFile model_;
  MeshJudge judge_;
  TrackHeader header_;
  Points mean_;
  FaceResult face_;
  TrackFace seen_;
};

// Rounding to pixels is at most 0.71 pixels.
TEST_F(MeshMetrics, AMeshOnItsLandmarksHasNoDistance) {
  SeeTheMesh();
  const MeshScore score = Judge();
  EXPECT_EQ(score.faces, 1u);
  EXPECT_EQ(score.not_finite + score.folded, 0u);
  EXPECT_THAT(score.distances, SizeIs(76));
  EXPECT_THAT(score.distances, Each(Le(0.71)));
}

TEST_F(MeshMetrics, DistancesAreInPercentOfThePupils) {
  SeeTheMesh();
  for (std::size_t k = kFirstInnerLandmark; k <= kLastInnerLandmark; ++k) {
    seen_.points[2 * k] += 30;
    seen_.points[2 * k + 1] -= 40;
  }
  EXPECT_NEAR(Percentile(Judge().distances, 0.5), 50, 0.71);
  seen_.points[192] += 100;
  EXPECT_NEAR(Percentile(Judge().distances, 0.5), 25, 0.36);
}

TEST_F(MeshMetrics, TrueDistancesAreFromWhereTheLandmarksTrulyAre) {
  SeeTheMesh();
  EXPECT_THAT(Judge().true_distances, IsEmpty());
  header_.focal = 1000;
  seen_.truth = TrackTruth{};
  seen_.truth->rotation = {1, 0, 0, 0, -1, 0, 0, 0, -1};
  seen_.truth->points3d.assign(303, 500);
  for (std::size_t k = kFirstInnerLandmark; k <= kLastInnerLandmark; ++k) {
    // 12 pixels right of and 5 above where the mesh is drawn.
    seen_.truth->points3d[3 * k] = (Drawn(k).x + 12 - 640) / 2;
    seen_.truth->points3d[3 * k + 1] = (Drawn(k).y - 5 - 480) / 2;
  }
  const MeshScore score = Judge();
  EXPECT_THAT(score.true_distances, SizeIs(76));
  EXPECT_THAT(score.true_distances, Each(DoubleNear(13, 1e-9)));
}

TEST_F(MeshMetrics, HeadsTurnedTooFarAreOnlyCounted) {
  for (const double yaw : {-39.0, 39.0}) {
    Turn(yaw);
    SeeTheMesh();
    EXPECT_THAT(Judge().distances, SizeIs(76)) << yaw;
  }
  for (const double yaw : {-41.0, 41.0}) {
    Turn(yaw);
    SeeTheMesh();
    const MeshScore score = Judge();
    EXPECT_EQ(score.faces, 1u) << yaw;
    EXPECT_THAT(score.distances, IsEmpty()) << yaw;
  }
}

TEST_F(MeshMetrics, TheTrueYawCountsWhereItIsKnown) {
  Turn(41);
  SeeTheMesh();
  seen_.truth = TrackTruth{{1, 0, 0, 0, -1, 0, 0, 0, -1}, {0, 0, 700}, {}};
  EXPECT_THAT(Judge().distances, SizeIs(76));
}

TEST_F(MeshMetrics, CountsNonFiniteValues) {
  SeeTheMesh();
  face_.corners[777] = std::numeric_limits<float>::quiet_NaN();
  const MeshScore score = Judge();
  EXPECT_EQ(score.not_finite, 1u);
  EXPECT_EQ(score.faces, 0u);
  EXPECT_THAT(score.distances, IsEmpty());
}

TEST_F(MeshMetrics, TheMeanFaceIsNotFolded) { EXPECT_FALSE(judge_.IsFolded(mean_)); }

// The inner end of a brow is pulled 40 mm to the side, over its neighbours.
TEST_F(MeshMetrics, AVertexPulledAcrossItsNeighboursFolds) {
  Points vertices = mean_;
  vertices[LandmarkVertices()[24]][0] -= 40;
  EXPECT_TRUE(judge_.IsFolded(vertices));
}

// Neighbours agree with each other in a face that is inside out; the mean face tells.
TEST_F(MeshMetrics, AFaceInsideOutIsFolded) {
  Points vertices = mean_;
  for (Vector3& p : vertices) p[0] = -p[0];
  EXPECT_TRUE(judge_.IsFolded(vertices));
}

TEST_F(MeshMetrics, TheMouthIsMeasuredInBoth) {
  MeshScore all;
  for (const double opened : {0.0, 10.0, 25.0}) {
    SetMesh(mean_);
    SeeTheMesh();
    // The landmark of the lower lip moves by `opened` pixels, the mesh follows half of it.
    const PixelPoint closed = Drawn(93);
    Points vertices = mean_;
    vertices[LandmarkVertices()[93]][1] -= 2;
    SetMesh(vertices);
    const double pixels_per_mm = (Drawn(93).y - closed.y) / 2;
    vertices = mean_;
    vertices[LandmarkVertices()[93]][1] -= opened / 2 / pixels_per_mm;
    SetMesh(vertices);
    seen_.points[2 * 93 + 1] += static_cast<std::int32_t>(opened);
    all.Add(Judge());
  }
  ASSERT_THAT(all.mouth_seen, SizeIs(3));
  EXPECT_NEAR(all.mouth_seen[2] - all.mouth_seen[0], 25, 0.2);
  EXPECT_NEAR(all.mouth_of_mesh[2] - all.mouth_of_mesh[0], 12.5, 0.5);
  EXPECT_NEAR(all.MouthGain(), 0.5, 0.02);
  EXPECT_EQ(MeshScore().MouthGain(), 0);
}

TEST(HeadModel, TakesBackThePitchOfTheModelFile) {
  FaceResult face;
  face.model = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 10, 20, 30, 1};
  EXPECT_EQ(HeadModel(face), face.model);
  face.pitched = true;
  const Matrix4 head = HeadModel(face);
  // "Up" of the upright head is up and a little back to the model file's.
  EXPECT_FLOAT_EQ(head[5], 0.9397F);
  EXPECT_FLOAT_EQ(head[6], -0.342F);
  EXPECT_FLOAT_EQ(head[12], 10);
  // The mean face of the file, pitched, is the upright one of the head frame, pitched back.
  const FaceModelFile model = ReadFaceModelFile(DefaultModelPath());
  const Points upright = MeanFace(model);
  for (std::size_t v = 0; v < upright.size(); v += 100) {
    for (std::size_t k = 0; k < 3; ++k) {
      const double file = model.mean[3 * v + k] / 256.0 + double{face.model[12 + k]};
      const double mapped = double{head[k]} * upright[v][0] + double{head[4 + k]} * upright[v][1] +
                            double{head[8 + k]} * upright[v][2] + double{head[12 + k]};
      EXPECT_NEAR(mapped, file, 1e-3);
    }
  }
}

TEST(MaskSession, GivesMeshesAndOneTextureTable) {
  const Track track = ReadTrackFile(N3DS_SOURCE_DIR "/examples/tracks/synthetic_three.track.jsonl");
  EngineSession session(DefaultModelPath(), track.header, TrackMode::kMask);
  EXPECT_THAT(session.texture_coordinates(), IsEmpty());
  const FrameResult result = session.Process(track.frames[0]);
  ASSERT_TRUE(result.ok);
  EXPECT_THAT(session.texture_coordinates(), SizeIs(2 * kMeshCorners));
  for (const FaceResult& face : result.faces) {
    EXPECT_THAT(face.corners, SizeIs(3 * kMeshCorners));
    EXPECT_TRUE(face.pitched);
  }
  std::size_t frames = 0;
  const auto results = RunTrack(track, DefaultModelPath(), TrackMode::kMask,
                                [&](std::size_t f, const FrameResult& frame) {
                                  EXPECT_EQ(f, frames++);
                                  EXPECT_THAT(frame.faces[0].corners, SizeIs(3 * kMeshCorners));
                                });
  EXPECT_EQ(frames, track.frames.size());
  EXPECT_THAT(results[5].faces[0].corners, IsEmpty());
}

}  // namespace
}  // namespace n3ds::tool
