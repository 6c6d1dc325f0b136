// SPDX-License-Identifier: MIT
// CNorvaleFaceShapeImp::TransformInputInfo: from the delivered image's landmarks to upright ones.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <vector>

#include "engine/engine_testing.h"
#include "norvale_face_shape_imp.h"
#include "support/face_scene.h"
#include "support/random.h"

namespace n3ds::testing {

static bool Same(const Points& a, const Points& b) {
  return a.size() == b.size() && std::equal(a.begin(), a.end(), b.begin(), [](auto& p, auto& q) {
           return p.x == q.x && p.y == q.y;
         });
}

namespace {

// The object, as an engine's creation leaves it, with an orientation.
class Orientation {
 public:
  Orientation(uint32_t degree, uint32_t mirror) : engine_(new CNorvaleFaceShapeImp()) {
    engine_->SetDegreeAndMirror(degree, mirror);
  }
  // The points in an allocation of exactly their size, in and out.
  Points Transform(const Points& points, int32_t width = 640, int32_t height = 480) const {
    const std::unique_ptr<__tag_point[]> in(new __tag_point[points.size()]);
    std::copy(points.begin(), points.end(), in.get());
    const std::unique_ptr<int32_t[]> out(new int32_t[2 * points.size()]);
    N3DS_LANDMARK record = {out.get(), static_cast<uint32_t>(points.size())};
    NSVL_OFFSCREEN image = ImageOf(width, height);
    EXPECT_NE(engine_->TransformInputInfo(&image, record.count, in.get(), record), 0);
    EXPECT_EQ(record.points, out.get());
    EXPECT_EQ(record.count, points.size());
    return ToPoints({out.get(), out.get() + 2 * points.size()});
  }
  // Where (10, 20) goes that is not part of a mirror pair: landmark 9.
  __tag_point TransformOne(int32_t x = 10, int32_t y = 20) const {
    Points points(101, {0, 0});
    points[9] = {x, y};
    return Transform(points)[9];
  }
  const CNorvaleFaceShapeImp& engine() const { return *engine_; }

 private:
  std::unique_ptr<CNorvaleFaceShapeImp> engine_;
};

Points RandomPoints(size_t count, uint64_t seed) {
  Random random(seed);
  Points points;
  for (size_t i = 0; i < count; i++) points.push_back({random.Int(-99, 999), random.Int(-99, 999)});
  return points;
}

void ExpectPoint(const __tag_point& p, int32_t x, int32_t y) {
  EXPECT_EQ(p.x, x);
  EXPECT_EQ(p.y, y);
}

TEST(InputOrientation, UprightUnmirroredPointsStay) {
  const Points points = RandomPoints(165, 1);
  EXPECT_TRUE(Same(Orientation(0, 0).Transform(points), points));
}

TEST(InputOrientation, Degree90) { ExpectPoint(Orientation(90, 0).TransformOne(), 460, 10); }
TEST(InputOrientation, Degree270) { ExpectPoint(Orientation(270, 0).TransformOne(), 20, 630); }
TEST(InputOrientation, Degree180) { ExpectPoint(Orientation(180, 0).TransformOne(), 630, 460); }

TEST(InputOrientation, EveryOtherDegreeTurnsBy180) {
  for (const uint32_t degree : {45u, 1u, 360u, 89u, 271u, 0xFFFFFFFFu}) {
    ExpectPoint(Orientation(degree, 0).TransformOne(), 630, 460);
  }
}

TEST(InputOrientation, MirroringComesBeforeTheTurn) {
  ExpectPoint(Orientation(0, 1).TransformOne(), 630, 20);
  ExpectPoint(Orientation(90, 1).TransformOne(), 460, 630);
  ExpectPoint(Orientation(270, 1).TransformOne(), 20, 10);
  ExpectPoint(Orientation(180, 1).TransformOne(), 10, 460);
}

TEST(InputOrientation, MirroredPointsMoveToTheirPartnersIndex) {
  Points points(101, {0, 0});
  points[0] = {10, 20};
  points[18] = {500, 30};
  const Points out = Orientation(0, 1).Transform(points);
  ExpectPoint(out[18], 630, 20);
  ExpectPoint(out[0], 140, 30);
}

TEST(InputOrientation, MirrorIsExactlyOne) {
  for (const uint32_t mirror : {0u, 2u, 3u, 0xFFFFFFFFu}) {
    ExpectPoint(Orientation(0, mirror).TransformOne(), 10, 20);
    Points points(101, {0, 0});
    points[0] = {10, 20};
    ExpectPoint(Orientation(0, mirror).Transform(points)[0], 10, 20);
  }
}

TEST(InputOrientation, ColumnZeroGoesToTheFullWidth) {
  ExpectPoint(Orientation(0, 1).TransformOne(0, 0), 640, 0);
  ExpectPoint(Orientation(180, 0).TransformOne(0, 0), 640, 480);
  ExpectPoint(Orientation(90, 0).TransformOne(0, 0), 480, 0);
  ExpectPoint(Orientation(270, 0).TransformOne(0, 0), 0, 640);
}

// Where each landmark goes when mirrored: with width 0 and degree 0 the index alone matters.
std::vector<size_t> Renumbering(size_t count) {
  Points points;
  for (size_t i = 0; i < count; i++) points.push_back({0, static_cast<int32_t>(i)});
  std::vector<size_t> from;
  for (const __tag_point& p : Orientation(0, 1).Transform(points)) {
    from.push_back(static_cast<size_t>(p.y));
  }
  return from;
}

TEST(InputOrientation, RenumberingIsThatOfAFaceInAMirror) {
  EXPECT_EQ(Renumbering(101), MirrorPartners(101));
  EXPECT_EQ(Renumbering(165), MirrorPartners(165));
}

TEST(InputOrientation, RenumberingIsAnInvolution) {
  for (const size_t count : {101, 165}) {
    const std::vector<size_t> partner = Renumbering(count);
    for (size_t i = 0; i < count; i++) {
      ASSERT_LT(partner[i], count);
      EXPECT_EQ(partner[partner[i]], i);
    }
    const Points points = RandomPoints(count, count);
    const Orientation mirrored(0, 1);
    EXPECT_TRUE(Same(mirrored.Transform(mirrored.Transform(points)), points));
  }
}

TEST(InputOrientation, NineLandmarksLieOnTheMidline) {
  for (const size_t count : {101, 165}) {
    const std::vector<size_t> partner = Renumbering(count);
    std::vector<size_t> fixed;
    for (size_t i = 0; i < count; i++) {
      if (partner[i] == i) fixed.push_back(i);
    }
    EXPECT_THAT(fixed, ::testing::ElementsAre(9, 78, 84, 89, 93, 97, 98, 99, 100)) << count;
  }
}

TEST(InputOrientation, TheFurtherPairsNeedExactly165Landmarks) {
  for (const size_t count : {164, 166, 200}) {
    const std::vector<size_t> partner = Renumbering(count);
    EXPECT_EQ(partner[0], 18u);
    EXPECT_EQ(partner[101], 101u) << count;
    EXPECT_EQ(partner[163], 163u) << count;
  }
}

TEST(InputOrientation, PairsBeyondTheLandmarksAreSkipped) {
  // Buffers of exact size: a sanitizer sees a pair too many.
  for (size_t count = 1; count < 101; count++) EXPECT_EQ(Renumbering(count), MirrorPartners(count));
}

TEST(InputOrientation, EveryOrientationIsUndoneByItsDelivery) {
  const Points upright = RandomPoints(165, 7);
  for (const uint32_t degree : {0u, 90u, 180u, 270u}) {
    for (const bool mirrored : {false, true}) {
      const Points delivered = Deliver(upright, degree, mirrored, 600, 800);
      const bool quarter = degree == 90 || degree == 270;
      const Orientation orientation(degree, mirrored ? 1 : 0);
      EXPECT_TRUE(
          Same(orientation.Transform(delivered, quarter ? 800 : 600, quarter ? 600 : 800), upright))
          << degree << mirrored;
    }
  }
}

TEST(InputOrientation, NullPointsNullImageAndNoPointsAreRefused) {
  const Orientation orientation(90, 1);
  Points points(101, {1, 2});
  int32_t buffer[202];
  std::fill_n(buffer, 202, -7);
  N3DS_LANDMARK out = {buffer, 55};
  NSVL_OFFSCREEN image = ImageOf(640, 480);
  const CNorvaleFaceShapeImp& engine = orientation.engine();
  EXPECT_EQ(engine.TransformInputInfo(&image, 101, nullptr, out), 0);
  EXPECT_EQ(engine.TransformInputInfo(nullptr, 101, points.data(), out), 0);
  EXPECT_EQ(engine.TransformInputInfo(&image, 0, points.data(), out), 0);
  EXPECT_THAT(buffer, ::testing::Each(-7));
  EXPECT_EQ(out.points, buffer);
  EXPECT_EQ(out.count, 55u);
}

TEST(InputOrientation, ArithmeticWrapsAtTheEndsOfTheRange) {
  ExpectPoint(Orientation(0, 1).TransformOne(INT32_MIN, 5), INT32_MIN + 640, 5);
  ExpectPoint(Orientation(90, 0).TransformOne(5, INT32_MIN), INT32_MIN + 480, 5);
  ExpectPoint(Orientation(180, 0).TransformOne(INT32_MIN, INT32_MIN), INT32_MIN + 640,
              INT32_MIN + 480);
}

}  // namespace
}  // namespace n3ds::testing
