// SPDX-License-Identifier: MIT
#include "tracks/upright.h"

#include <gtest/gtest.h>

#include <set>

namespace n3ds::tool {
namespace {

TrackHeader Header(int degree, int mirror) {
  TrackHeader header;
  header.width = 640;
  header.height = 480;
  header.landmarks = 165;
  header.degree = degree;
  header.mirror = mirror;
  return header;
}

void ExpectUpright(const TrackHeader& header, double x, double y) {
  const PixelPoint p = ToUpright(header, 10, 20);
  EXPECT_EQ(p.x, x);
  EXPECT_EQ(p.y, y);
}

TEST(Upright, TurnsAPoint) {
  ExpectUpright(Header(0, 0), 10, 20);
  ExpectUpright(Header(90, 0), 460, 10);
  ExpectUpright(Header(180, 0), 630, 460);
  ExpectUpright(Header(270, 0), 20, 630);
}

TEST(Upright, MirrorsBeforeItTurns) {
  ExpectUpright(Header(0, 1), 630, 20);
  ExpectUpright(Header(90, 1), 460, 630);
  ExpectUpright(Header(180, 1), 10, 460);
  ExpectUpright(Header(270, 1), 20, 10);
}

TEST(Upright, SizeIsThatOfTheTurnedImage) {
  EXPECT_EQ(Header(90, 0).upright_width(), 480);
  EXPECT_EQ(Header(90, 0).upright_height(), 640);
  EXPECT_EQ(Header(180, 1).upright_width(), 640);
}

TEST(Upright, MirroringLandmarksTwiceRestoresThem) {
  for (const int landmarks : {101, 165}) {
    std::set<int> images;
    for (int k = 0; k < landmarks; ++k) {
      EXPECT_EQ(MirrorLandmark(MirrorLandmark(k, landmarks), landmarks), k);
      images.insert(MirrorLandmark(k, landmarks));
    }
    EXPECT_EQ(images.size(), static_cast<std::size_t>(landmarks));
    EXPECT_EQ(*images.begin(), 0);
    EXPECT_EQ(*images.rbegin(), landmarks - 1);
  }
}

TEST(Upright, LandmarksOnTheMidlineStay) {
  std::set<int> fixed;
  for (int k = 0; k < 165; ++k) {
    if (MirrorLandmark(k, 165) == k) fixed.insert(k);
  }
  EXPECT_EQ(fixed, (std::set<int>{9, 78, 84, 89, 93, 97, 98, 99, 100}));
}

TEST(Upright, NamesTheSamePlaceOnTheOtherSide) {
  EXPECT_EQ(MirrorLandmark(0, 101), 18);   // ends of the outline
  EXPECT_EQ(MirrorLandmark(19, 101), 34);  // outer ends of the brows
  EXPECT_EQ(MirrorLandmark(39, 101), 57);  // outer corners of the eyes
  EXPECT_EQ(MirrorLandmark(50, 101), 58);  // lower lids beside them
  EXPECT_EQ(MirrorLandmark(87, 101), 91);  // corners of the inner lips
  EXPECT_EQ(MirrorLandmark(95, 101), 96);  // pupils
  EXPECT_EQ(MirrorLandmark(101, 165), 102);
  EXPECT_EQ(MirrorLandmark(132, 165), 139);
  EXPECT_EQ(MirrorLandmark(164, 165), 161);
  EXPECT_EQ(MirrorLandmark(101, 101), 101);  // not part of the small layout
}

TEST(Upright, MirroredFacesAreRenumbered) {
  TrackFace face;
  for (int k = 0; k < 165; ++k) {
    face.points.push_back(k);
    face.points.push_back(1000 + k);
  }
  const auto plain = UprightLandmarks(Header(0, 0), face);
  EXPECT_EQ(plain[0].x, 0);
  EXPECT_EQ(plain[18].y, 1018);
  const auto mirrored = UprightLandmarks(Header(0, 1), face);
  EXPECT_EQ(mirrored[18].x, 640);
  EXPECT_EQ(mirrored[18].y, 1000);
  EXPECT_EQ(mirrored[9].x, 631);
  EXPECT_EQ(mirrored[140].y, 1131);
}

}  // namespace
}  // namespace n3ds::tool
