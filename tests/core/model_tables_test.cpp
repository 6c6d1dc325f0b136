// SPDX-License-Identifier: MIT
#include "core/model_tables.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <set>
#include <utility>
#include <vector>

namespace n3ds::testing {
namespace {

using ::testing::Each;
using ::testing::ElementsAreArray;

template <size_t kCount>
std::vector<int32_t> Values(const int32_t (&table)[kCount]) {
  return {table, table + kCount};
}

std::pair<float, float> CornerTexture(size_t corner) {
  return {kCornerTextureCoordinates[2 * corner], kCornerTextureCoordinates[2 * corner + 1]};
}

uint16_t CornerVertex(size_t corner) { return kTriangles[corner / 3][corner % 3]; }

TEST(LandmarkTables, DefaultContourRunsFromImageLeftOverTheChinToImageRight) {
  EXPECT_THAT(Values(kDefaultContourVertexIndices),
              ElementsAreArray({160, 157, 347, 354, 372, 379, 578, 558, 561, 566, 571, 430, 331,
                                325, 317, 306, 289, 101, 97}));
}

TEST(LandmarkTables, InnerLandmarksHaveTheirVertices) {
  EXPECT_THAT(Values(kInnerLandmarkVertexIndices),
              ElementsAreArray({237,  1114, 1136, 1160, 1171, 1188, 1173, 1162, 1138, 1116, 928,
                                839,  826,  808,  465,  257,  810,  818,  828,  841,  1091, 1124,
                                1158, 1155, 1198, 1205, 1222, 1044, 1046, 1054, 1067, 1094, 960,
                                953,  899,  893,  887,  879,  870,  861,  860,  979,  975,  973,
                                1254, 1275, 1283, 1289, 1299, 1592, 1524, 1381, 1370, 1361, 1338,
                                926,  1733, 1638, 1629, 1608, 1536, 1680, 1555, 1568, 1786, 1779,
                                1656, 1649, 1730, 1728, 1716, 1703, 1684, 1801, 1762, 1750}));
}

TEST(LandmarkTables, PupilsAndRidgeHaveTheirVertices) {
  EXPECT_THAT(Values(kLidVertexIndices[0]), ElementsAreArray({1154, 1054}));
  EXPECT_THAT(Values(kLidVertexIndices[1]), ElementsAreArray({893, 979}));
  EXPECT_THAT(Values(kRidgeVertexIndices), ElementsAreArray({1335, 1366, 1443, 1513}));
  EXPECT_THAT(Values(kMaskExtraVertexIndices), ElementsAreArray({893, 979, 1335, 1366}));
}

TEST(LandmarkTables, EveryLandmarkHasAVertexOfItsOwn) {
  std::set<int32_t> vertices(std::begin(kDefaultContourVertexIndices),
                             std::end(kDefaultContourVertexIndices));
  vertices.insert(std::begin(kInnerLandmarkVertexIndices), std::end(kInnerLandmarkVertexIndices));
  EXPECT_EQ(vertices.size(), static_cast<size_t>(kFitLandmarkCount));
  EXPECT_GE(*vertices.begin(), 0);
  EXPECT_LT(*vertices.rbegin(), kVertexCount);
}

TEST(ContourCandidates, AreExactlyTheseVertexRanges) {
  const std::pair<int32_t, int32_t> ranges[] = {
      {1, 4},       {11, 11},     {80, 83},     {92, 111},    {140, 165},   {196, 197},
      {237, 238},   {256, 464},   {466, 591},   {594, 621},   {628, 631},   {634, 640},
      {657, 663},   {680, 681},   {684, 685},   {687, 750},   {844, 844},   {847, 847},
      {849, 849},   {851, 851},   {853, 853},   {1068, 1068}, {1072, 1073}, {1077, 1078},
      {1080, 1083}, {1085, 1087}, {1096, 1099}, {1104, 1108}};
  std::vector<int32_t> expected;
  for (const auto& [first, last] : ranges) {
    for (int32_t v = first; v <= last; v++) expected.push_back(v);
  }
  ASSERT_EQ(expected.size(), 534u);
  EXPECT_EQ(Values(kContourCandidateVertexIndices), expected);
}

TEST(ContourCandidates, AscendStrictlyWithinTheModel) {
  const std::vector<int32_t> candidates = Values(kContourCandidateVertexIndices);
  EXPECT_TRUE(std::is_sorted(candidates.begin(), candidates.end()));
  EXPECT_EQ(std::set<int32_t>(candidates.begin(), candidates.end()).size(), candidates.size());
  EXPECT_GE(candidates.front(), 0);
  EXPECT_LT(candidates.back(), kVertexCount);
}

TEST(ContourCandidates, IncludeEveryDefaultContourVertex) {
  const std::vector<int32_t> candidates = Values(kContourCandidateVertexIndices);
  for (const int32_t v : kDefaultContourVertexIndices) {
    EXPECT_TRUE(std::binary_search(candidates.begin(), candidates.end(), v)) << v;
  }
}

TEST(Triangles, TheFirstIsTheOneMasksArePaintedFor) {
  EXPECT_THAT(kTriangles[0], ElementsAreArray({0, 2, 1}));
}

TEST(Triangles, UseEveryVertexAndNoOther) {
  std::set<int> used;
  for (const auto& triangle : kTriangles) used.insert(std::begin(triangle), std::end(triangle));
  EXPECT_EQ(used.size(), static_cast<size_t>(kVertexCount));
  EXPECT_EQ(*used.rbegin(), kVertexCount - 1);
}

TEST(Triangles, HaveThreeDifferentCornersAndAreAllDifferent) {
  std::set<std::vector<uint16_t>> seen;
  for (const auto& triangle : kTriangles) {
    std::vector<uint16_t> corners(std::begin(triangle), std::end(triangle));
    std::sort(corners.begin(), corners.end());
    EXPECT_NE(corners[0], corners[1]);
    EXPECT_NE(corners[1], corners[2]);
    EXPECT_TRUE(seen.insert(corners).second) << corners[0] << ' ' << corners[1];
  }
}

TEST(Triangles, ShareEachEdgeInOppositeDirectionsAtMostOnceEach) {
  // Consistent winding: a renderer that culls back faces shows the whole mesh.
  std::set<std::pair<int, int>> edges;
  for (const auto& t : kTriangles) {
    for (int i = 0; i < 3; i++) {
      EXPECT_TRUE(edges.insert({t[i], t[(i + 1) % 3]}).second) << t[i] << ' ' << t[(i + 1) % 3];
    }
  }
}

TEST(CornerTexture, FirstRowsAreTheOnesMasksArePaintedFor) {
  EXPECT_EQ(CornerTexture(0), std::make_pair(0.069524f, 0.281949f));
  EXPECT_EQ(CornerTexture(1), std::make_pair(0.038178f, 0.318155f));
  EXPECT_EQ(CornerTexture(2), std::make_pair(0.081158f, 0.319456f));
}

TEST(CornerTexture, HasOneDistinctPairPerVertex) {
  std::set<std::pair<float, float>> pairs;
  for (size_t i = 0; i < N3DS_MASK_CORNER_COUNT; i++) pairs.insert(CornerTexture(i));
  EXPECT_EQ(pairs.size(), 1812u);
}

TEST(CornerTexture, IsTheVertexTableUnrolledByTriangle) {
  std::set<std::pair<float, float>> of_vertex[kVertexCount];
  for (size_t i = 0; i < N3DS_MASK_CORNER_COUNT; i++) {
    const uint16_t vertex = CornerVertex(i);
    of_vertex[vertex].insert(CornerTexture(i));
    EXPECT_EQ(CornerTexture(i).first, kTextureCoordinates[vertex][0]) << i;
    EXPECT_EQ(CornerTexture(i).second, kTextureCoordinates[vertex][1]) << i;
  }
  for (const auto& pairs : of_vertex) EXPECT_EQ(pairs.size(), 1u);
}

TEST(CornerTexture, SpansTheExtremesMasksArePaintedFor) {
  float u_low = 2, u_high = -1, v_low = 2, v_high = -1;
  for (const auto& uv : kTextureCoordinates) {
    u_low = std::min(u_low, uv[0]);
    u_high = std::max(u_high, uv[0]);
    v_low = std::min(v_low, uv[1]);
    v_high = std::max(v_high, uv[1]);
  }
  EXPECT_EQ(u_low, 0.016646f);
  EXPECT_EQ(u_high, 0.983246f);
  EXPECT_EQ(v_low, 0.002930f);
  EXPECT_EQ(v_high, 0.997054f);
}

}  // namespace
}  // namespace n3ds::testing
