// SPDX-License-Identifier: MIT
#include "core/contour_correspondence.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "core/contour_reference.h"
#include "support/face_scene.h"
#include "support/null_arguments.h"
#include "support/test_random.h"

namespace n3ds::testing {
namespace {

using ::testing::Each;

constexpr int32_t kUntouched = -12345;

// Candidates put at chosen pixels: with this camera and pose a vertex (x, y, 0) projects to (x, y).
class Plane {
 public:
  // All candidates start at one pixel, inside of whatever hull the test makes.
  explicit Plane(int32_t x, int32_t y) : vertices_(kShapeSize, 0.0f), landmarks_(190, 0) {
    for (int32_t n = 0; n < kContourCandidateCount; n++) Put(n, x, y);
  }
  void Put(int32_t candidate, int32_t x, int32_t y) {
    float* v = &vertices_[static_cast<size_t>(3 * kContourCandidateVertexIndices[candidate])];
    v[0] = static_cast<float>(x);
    v[1] = static_cast<float>(y);
  }
  // The even outline landmarks at one pixel, the odd ones `spacing` further right: the mean spacing
  // is exactly that.
  void PutOutline(int32_t x, int32_t y, int32_t spacing) {
    for (size_t i = 0; i < 19; i++) {
      landmarks_[2 * i] = x + (i % 2 == 1 ? spacing : 0);
      landmarks_[2 * i + 1] = y;
    }
  }
  // Candidate numbers of the 19 landmarks.
  std::vector<int32_t> Update() const {
    int32_t correspondence[19];
    std::fill_n(correspondence, 19, kUntouched);
    EXPECT_EQ(UpdateContourCorrespondence(nullptr, landmarks_.data(), vertices_.data(), camera_,
                                          rotation_, translation_, correspondence),
              N3DS_OK);
    std::vector<int32_t> candidates;
    for (const int32_t vertex : correspondence) {
      const int32_t* end = kContourCandidateVertexIndices + kContourCandidateCount;
      const int32_t* at = std::find(kContourCandidateVertexIndices, end, vertex);
      candidates.push_back(vertex == kUntouched
                               ? kUntouched
                               : static_cast<int32_t>(at - kContourCandidateVertexIndices));
    }
    return candidates;
  }
  int32_t UpdateFirst() const { return Update()[0]; }
  ContourResult Reference() const {
    return ReferenceContour(landmarks_, vertices_, camera_, rotation_, translation_);
  }
  size_t ProbeCount() const { return Reference().probes.size(); }
  void SetDepth(float z) { translation_[2] = z; }
  void SetLandmark(size_t i, int32_t x, int32_t y) {
    landmarks_[2 * i] = x;
    landmarks_[2 * i + 1] = y;
  }

 private:
  float camera_[9] = {1, 0, 0, 0, 1, 0, 0, 0, 1};
  float rotation_[9] = {1, 0, 0, 0, 1, 0, 0, 0, 1};
  float translation_[3] = {0, 0, 1};
  std::vector<float> vertices_;
  std::vector<int32_t> landmarks_;
};

// A square with sides of 1000 whose walk is 10, 20, 30, 40; the edge from 40 back to 10 closes it.
// The candidates that a test does not place stand inside, far from every probe.
Plane Square() {
  Plane plane(1500, 1600);
  plane.Put(10, 1000, 1000);
  plane.Put(20, 2000, 1000);
  plane.Put(30, 2000, 2000);
  plane.Put(40, 1000, 2000);
  return plane;
}

TEST(ContourCorrespondence, EachLandmarkTakesTheNearestHullVertex) {
  Plane plane = Square();
  plane.PutOutline(1100, 900, 0);
  EXPECT_THAT(plane.Update(), Each(10));
  plane.PutOutline(1501, 1000, 0);
  EXPECT_THAT(plane.Update(), Each(20));
  plane.PutOutline(3000, 1501, 0);
  EXPECT_THAT(plane.Update(), Each(30));
  plane.PutOutline(1499, 1999, 0);
  EXPECT_THAT(plane.Update(), Each(40));
}

TEST(ContourCorrespondence, ALandmarkBetweenHullVerticesTakesTheFirstOfTheWalk) {
  Plane plane = Square();
  plane.PutOutline(1500, 1500, 0);
  EXPECT_THAT(plane.Update(), Each(10));
  plane.PutOutline(2000, 1500, 0);
  EXPECT_THAT(plane.Update(), Each(20));
}

TEST(ContourCorrespondence, OutlineAtOnePointMakesNoProbes) {
  Plane plane = Square();
  plane.Put(77, 1500, 1003);  // where a probe would find it
  plane.PutOutline(1500, 1003, 0);
  EXPECT_EQ(plane.ProbeCount(), 0u);
  EXPECT_THAT(plane.Update(), Each(10));
}

TEST(ContourCorrespondence, ProbesAreMadeForEdgesBetweenThreeTenthsAndEightSpacings) {
  struct Row {
    int32_t spacing;
    int32_t probes;  // on each edge of length 1000
  };
  for (const Row& row : {Row{125, 0},      // ratio 8
                         Row{126, 26},     // 7.94
                         Row{1000, 3},     // 1
                         Row{1111, 3},     // 0.90009: a little more than 3 times 0.3
                         Row{1112, 2},     // 0.8993
                         Row{3333, 1},     // 0.30003
                         Row{3334, 0}}) {  // 0.29994
    // A candidate just inside of where the first probe, the one nearest the edge's end, must be.
    Plane plane = Square();
    const int32_t whole = row.probes > 0 ? row.probes + 1 : 2;
    const int32_t x = 1000 / whole + 2000 * (whole - 1) / whole;
    plane.Put(77, x, 1003);
    plane.PutOutline(x, 1003, row.spacing);
    EXPECT_EQ(plane.UpdateFirst() == 77, row.probes > 0) << row.spacing;
    EXPECT_EQ(plane.ProbeCount(), static_cast<size_t>(3 * row.probes)) << row.spacing;
  }
}

TEST(ContourCorrespondence, ARatioOfThreeTenthsInSinglePrecisionGetsOneProbe) {
  // 3 / 10 in single precision lies above 0.3 in double.
  Plane plane(12, 11);
  plane.Put(10, 10, 10);
  plane.Put(20, 13, 10);  // an edge of length 3
  plane.Put(30, 13, 13);
  plane.Put(40, 10, 13);
  plane.PutOutline(12, 11, 10);
  EXPECT_EQ(plane.ProbeCount(), 3u);
  EXPECT_GT(plane.UpdateFirst(), 40);  // one of those inside, found by a probe
  plane.PutOutline(12, 11, 11);
  EXPECT_EQ(plane.UpdateFirst(), 20);
}

TEST(ContourCorrespondence, ClosingEdgeIsNeverProbed) {
  // Candidates at the middle of each edge, a little inside; one probe an edge.
  Plane plane = Square();
  plane.Put(101, 1500, 1003);
  plane.Put(102, 1997, 1500);
  plane.Put(103, 1500, 1997);
  plane.Put(104, 1003, 1500);
  plane.PutOutline(1500, 1003, 2000);
  EXPECT_EQ(plane.UpdateFirst(), 101);
  plane.PutOutline(1997, 1500, 2000);
  EXPECT_EQ(plane.UpdateFirst(), 102);
  plane.PutOutline(1500, 1997, 2000);
  EXPECT_EQ(plane.UpdateFirst(), 103);
  plane.PutOutline(1003, 1500, 2000);
  EXPECT_EQ(plane.UpdateFirst(), 10);
}

TEST(ContourCorrespondence, SharesOfAProbesEndsAreTruncatedApart) {
  // Two probes. The first lies at a third of A = (1001, 1000) and two thirds of B = (2000, 1000):
  // (333 + 1333, 333 + 666) = (1666, 999); truncated together it would be (1667, 1000).
  Plane plane = Square();
  plane.Put(10, 1001, 1000);
  plane.Put(100, 1664, 1002);  // nearest to (1666, 999)
  plane.Put(101, 1669, 1002);  // nearest to (1667, 1000)
  plane.Put(102, 1333, 1002);  // takes the second probe
  plane.PutOutline(1664, 1002, 1500);
  ASSERT_EQ(plane.ProbeCount(), 6u);
  EXPECT_EQ(plane.UpdateFirst(), 100);
}

// One probe an edge, that of the first at (1500, 1000); landmark 0 lies a little inside of it.
Plane OneProbe() {
  Plane plane = Square();
  plane.PutOutline(1500, 1010, 3000);
  return plane;
}

TEST(ContourCorrespondence, AmongEquallyNearCandidatesOfAClassTheLastWins) {
  Plane plane = OneProbe();
  plane.Put(100, 1494, 1008);
  EXPECT_EQ(plane.UpdateFirst(), 100);
  plane.Put(104, 1506, 1008);
  EXPECT_EQ(plane.UpdateFirst(), 104);
  plane.Put(108, 1500, 1010);
  EXPECT_EQ(plane.UpdateFirst(), 108);
}

TEST(ContourCorrespondence, AmongEquallyNearClassesTheFirstWins) {
  Plane plane = OneProbe();
  plane.Put(103, 1494, 1008);  // class 3
  EXPECT_EQ(plane.UpdateFirst(), 103);
  plane.Put(202, 1506, 1008);  // class 2
  EXPECT_EQ(plane.UpdateFirst(), 202);
  plane.Put(301, 1500, 1010);  // class 1
  EXPECT_EQ(plane.UpdateFirst(), 301);
  plane.Put(400, 1492, 1006);  // class 0
  EXPECT_EQ(plane.UpdateFirst(), 400);
  plane.Put(303, 1508, 1006);  // class 3 again
  EXPECT_EQ(plane.UpdateFirst(), 400);
}

TEST(ContourCorrespondence, ACandidateAsFarAsTheEdgesStartDoesNotReplaceIt) {
  Plane plane = OneProbe();  // the probe is 500 from its start
  plane.PutOutline(1500, 1490, 3000);
  plane.Put(100, 1500, 1500);
  EXPECT_NE(plane.UpdateFirst(), 100);
  plane.Put(100, 1500, 1499);
  EXPECT_EQ(plane.UpdateFirst(), 100);
}

TEST(ContourCorrespondence, TheLastTwoCandidatesMustBeStrictlyNearest) {
  for (const int32_t last : {532, 533}) {
    Plane plane = OneProbe();
    plane.Put(last, 1500, 1010);
    EXPECT_EQ(plane.UpdateFirst(), last);
    plane.Put(100, 1494, 1008);
    EXPECT_EQ(plane.UpdateFirst(), 100);
    plane.Put(last, 1500, 1009);
    EXPECT_EQ(plane.UpdateFirst(), last);
  }
}

TEST(ContourCorrespondence, TheLastTwoCandidatesAreTakenOnlyNearTheEdgesStart) {
  // A small hull shows the truncation of the reach: the first probe, (8, 4), is the root of 8 from
  // its start, so differences must stay below 2.
  for (const int32_t last : {532, 533}) {
    Plane plane(6, 7);
    plane.Put(10, 6, 2);
    plane.Put(20, 10, 6);
    plane.Put(30, 6, 10);
    plane.Put(40, 2, 6);
    plane.Put(last, 7, 5);
    plane.PutOutline(7, 5, 12);
    ASSERT_EQ(plane.ProbeCount(), 3u);
    EXPECT_EQ(plane.UpdateFirst(), last);
    plane.Put(last, 6, 5);  // its squared distance of 5 is below 8
    plane.PutOutline(6, 5, 12);
    EXPECT_NE(plane.UpdateFirst(), last);
    plane.Put(last, 7, 6);
    plane.PutOutline(7, 6, 12);
    EXPECT_NE(plane.UpdateFirst(), last);
    // Any other candidate is taken there.
    plane.Put(100, 7, 6);
    EXPECT_EQ(plane.UpdateFirst(), 100);
  }
}

TEST(ContourCorrespondence, TheLastCandidateIsComparedWithTheBestBeforeTheOneBeforeIt) {
  Plane plane = OneProbe();
  plane.Put(532, 1500, 1001);
  plane.Put(533, 1500, 1050);  // farther than 532, nearer than all others
  EXPECT_EQ(plane.UpdateFirst(), 533);
}

TEST(ContourCorrespondence, CandidatesAtDepthZeroTakePartUndivided) {
  Plane plane = Square();
  plane.PutOutline(1000, 1000, 0);
  plane.SetDepth(0);
  EXPECT_THAT(plane.Update(), Each(10));
  plane.SetDepth(2);  // half the size: now another corner lies there
  EXPECT_THAT(plane.Update(), Each(30));
}

TEST(ContourCorrespondence, EmptyHullLeavesTheCorrespondence) {
  Plane plane(5, 5);
  plane.Put(10, 0, 0);  // the topmost point lies at the origin
  plane.Put(20, 10, 5);
  plane.Put(30, 0, 10);
  EXPECT_THAT(plane.Update(), Each(kUntouched));
}

TEST(ContourCorrespondence, HullOfMoreThanFiveHundredThirtyThreeVerticesLeavesTheCorrespondence) {
  // All on one line: the walk finds no way back and repeats itself to the limit.
  Plane plane(2, 2);
  plane.Put(0, 1, 3);
  plane.Put(1, 3, 1);
  plane.Put(3, 1, 3);
  ASSERT_EQ(plane.Reference().hull.size(), 534u);
  EXPECT_THAT(plane.Update(), Each(kUntouched));
}

TEST(ContourCorrespondence, NullArgumentsAreRefused) {
  const std::vector<float> vertices = MeanShapeFloats();
  const std::vector<int32_t> landmarks(190, 0);
  const Camera camera(640, 480);
  const float r[9] = {1, 0, 0, 0, -1, 0, 0, 0, -1};
  const float t[3] = {0, 0, 500};
  int32_t out[19];
  std::fill_n(out, 19, kUntouched);
  const auto update = UpdateContourCorrespondence;
  const int32_t* l = landmarks.data();
  const float* v = vertices.data();
  ExpectEachNullRefused(N3DS_NULL_ARGUMENT, update, nullptr, l, v, camera.k, r, t, out);
  EXPECT_THAT(out, Each(kUntouched));
  EXPECT_EQ(update(nullptr, l, v, camera.k, r, t, out), N3DS_OK);
}

TEST(ContourCorrespondence, ReadsTheOutlineLandmarksOnly) {
  const std::vector<float> vertices = MeanShapeFloats();
  const Camera camera(640, 480);
  const RigidTransform pose = TransformOf(HeadPlace{});
  float r[9], t[3];
  std::copy_n(pose.r, 9, r);
  std::copy_n(pose.t, 3, t);
  const std::vector<int32_t> landmarks = DetectLandmarks(ModelShape(), HeadPlace{}, 640, 480);
  const std::unique_ptr<int32_t[]> outline(new int32_t[38]);
  std::copy_n(landmarks.begin(), 38, outline.get());
  int32_t out[19];
  EXPECT_EQ(
      UpdateContourCorrespondence(nullptr, outline.get(), vertices.data(), camera.k, r, t, out),
      N3DS_OK);
}

TEST(ContourCorrespondence, ExhaustedMemoryLeavesTheCorrespondenceAndLosesNothing) {
  const std::vector<float> vertices = MeanShapeFloats();
  const Camera camera(640, 480);
  const RigidTransform pose = TransformOf(HeadPlace{});
  float r[9], t[3];
  std::copy_n(pose.r, 9, r);
  std::copy_n(pose.t, 3, t);
  const std::vector<int32_t> landmarks = DetectLandmarks(ModelShape(), HeadPlace{}, 640, 480);

  int refused = 0;
  int64_t result = N3DS_NO_MEMORY;
  for (size_t size = 40; result != N3DS_OK; size += 64) {
    ASSERT_LT(size, 40000u);
    std::vector<unsigned char> area(size);
    const MHandle pool = MMemMgrCreate(area.data(), size);
    ASSERT_NE(pool, nullptr);
    const size_t before = GetMaxAllocMemSize(pool);
    int32_t out[19];
    std::fill_n(out, 19, kUntouched);
    result =
        UpdateContourCorrespondence(pool, landmarks.data(), vertices.data(), camera.k, r, t, out);
    EXPECT_EQ(GetMaxAllocMemSize(pool), before);
    if (result == N3DS_OK) {
      EXPECT_THAT(out, Each(::testing::Ne(kUntouched)));
    } else {
      ASSERT_EQ(result, N3DS_NO_MEMORY);
      EXPECT_THAT(out, Each(kUntouched));
      refused++;
    }
  }
  EXPECT_GT(refused, 200);  // up to two arrays of 534 points and the probes
}

TEST(ContourCorrespondence, MatchesTheStraightforwardVersionOnRandomPoses) {
  const std::vector<float> vertices = MeanShapeFloats();
  const std::vector<double> shape = ModelShape();
  Random random = TestRandom();
  size_t updated = 0, probes = 0;
  for (int trial = 0; trial < 600; trial++) {
    const int width = random.Int(40, 2000), height = random.Int(40, 2000);
    const Camera camera(width, height);
    HeadPlace place;
    place.yaw = random.In(-0.8, 0.8);
    place.pitch = random.In(-0.4, 0.4);
    place.roll = random.In(-1, 1);
    place.x = random.In(-300, 300);
    place.y = random.In(-300, 300);
    place.z = random.In(100, 3000);
    const RigidTransform pose = TransformOf(place);
    float r[9], t[3];
    for (int i = 0; i < 9; i++) r[i] = static_cast<float>(pose.r[i]);
    for (int i = 0; i < 3; i++) t[i] = static_cast<float>(pose.t[i]);
    const std::vector<int32_t> landmarks =
        DetectLandmarks(shape, place, width, height, 101, 1 + random.Int(0, 20), &random);

    const ContourResult expected = ReferenceContour(landmarks, vertices, camera.k, r, t);
    std::vector<int32_t> actual(19, kUntouched);
    ASSERT_EQ(UpdateContourCorrespondence(nullptr, landmarks.data(), vertices.data(), camera.k, r,
                                          t, actual.data()),
              N3DS_OK);
    if (expected.correspondence.empty()) {
      ASSERT_THAT(actual, Each(kUntouched)) << trial;
      continue;
    }
    updated++;
    probes += expected.probes.size();
    ASSERT_EQ(actual, expected.correspondence) << trial;
  }
  EXPECT_GT(updated, 500u);
  EXPECT_GT(probes, 5000u);
}

TEST(ContourCorrespondence, MatchesTheStraightforwardVersionOnRandomPixels) {
  Random random = TestRandom();
  for (int trial = 0; trial < 300; trial++) {
    const int32_t size = random.Int(3, 60);
    Plane plane(size / 2 + 1, size / 2 + 1);
    for (int32_t n = 0; n < 534; n++) plane.Put(n, random.Int(1, size), random.Int(1, size));
    for (size_t i = 0; i < 19; i++) plane.SetLandmark(i, random.Int(0, size), random.Int(0, size));
    const ContourResult expected = plane.Reference();
    std::vector<int32_t> vertices;
    for (const int32_t n : plane.Update()) {
      if (n != kUntouched) vertices.push_back(kContourCandidateVertexIndices[n]);
    }
    ASSERT_EQ(vertices, expected.correspondence) << trial;
  }
}

}  // namespace
}  // namespace n3ds::testing
