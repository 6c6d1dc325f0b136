// SPDX-License-Identifier: MIT
// Faces made from a model file, the measures of a mesh, and that every check can fail.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>
#include <set>
#include <sstream>
#include <string>
#include <utility>

#include "mesh/face_tables.h"
#include "mesh/mesh_shape.h"
#include "mesh/mesh_topology.h"
#include "model/face_shapes.h"
#include "model/model_checks.h"
#include "model/obj_export.h"
#include "model/random_people.h"
#include "scratch_folder.h"
#include "support/error.h"

namespace n3ds::tool {
namespace {

using ::testing::Contains;
using ::testing::DoubleNear;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Pointwise;
using ::testing::UnorderedElementsAre;

const std::string kModel = N3DS_SOURCE_DIR "/data/face_model.bin";

const FaceModelFile& Shipped() {
  static const FaceModelFile model = ReadFaceModelFile(kModel);
  return model;
}

FaceModelFile EmptyModel() {
  FaceModelFile model;
  model.mean.resize(kModelCoordinates);
  model.identity.resize(kModelIdentities * kModelCoordinates);
  model.expression.resize(kModelExpressions * kModelCoordinates);
  model.interaction.resize(kModelIdentities * kModelExpressions * kModelCoordinates);
  return model;
}

// Two triangles on the edge from (0, 0) to (0, 1), the second raised by `angle` degrees from lying
// flat beside the first.
Points Hinge(double angle) {
  const double radians = angle * 3.14159265358979 / 180;
  return {{0, 0, 0}, {0, 1, 0}, {-1, 0.5, 0}, {std::cos(radians), 0.5, std::sin(radians)}};
}
const std::vector<Triangle> kHinge = {{0, 1, 2}, {1, 0, 3}};

TEST(MeshTopology, ListsEdgesLoopsAndNeighbours) {
  EXPECT_EQ(EdgeOwners(kHinge).at({0, 1}).size(), 2u);
  EXPECT_EQ(EdgeOwners(kHinge).size(), 5u);
  const std::vector<Edge> border = BoundaryEdges(kHinge);
  EXPECT_THAT(border, UnorderedElementsAre(Edge(1, 2), Edge(2, 0), Edge(0, 3), Edge(3, 1)));
  EXPECT_THAT(BoundaryLoops(border), ElementsAre(4u));
  EXPECT_EQ(Neighbours(kHinge).size(), 1u);
}

TEST(MeshTopology, SeparateTrianglesHaveALoopEach) {
  EXPECT_THAT(BoundaryLoops(BoundaryEdges({{0, 1, 2}, {3, 4, 5}})), ElementsAre(3u, 3u));
}

TEST(MeshTopology, NoLoopsWhereTwoMeetInAVertex) {
  EXPECT_THAT(BoundaryLoops(BoundaryEdges({{0, 1, 2}, {0, 3, 4}})), IsEmpty());
  EXPECT_THAT(BoundaryLoops({{0, 1}, {1, 2}}), IsEmpty());
}

TEST(MeshShape, MeasuresAnglesAndAreas) {
  const Points right = {{0, 0, 5}, {2, 0, 5}, {0, 2, 5}};
  EXPECT_THAT(SmallestAngles(right, {{0, 1, 2}}), ElementsAre(DoubleNear(45, 1e-9)));
  const Facets facets = MeasureFacets(right, {{0, 1, 2}});
  EXPECT_THAT(facets.areas, ElementsAre(DoubleNear(2, 1e-12)));
  EXPECT_THAT(facets.normals[0], ElementsAre(0, 0, 1));
}

TEST(MeshShape, TheSharpestEdgeIsTheAngleBetweenNormals) {
  const FoldMeter folds(kHinge);
  for (const double angle : {0.0, 30.0, 90.0, 170.0}) {
    EXPECT_NEAR(folds.SharpestEdge(Hinge(angle)), angle, 1e-6);
    EXPECT_NEAR(folds.SharpestEdge(Hinge(-angle)), angle, 1e-6);
  }
}

TEST(MeshShape, ATriangleWithoutAreaCountsAsFolded) {
  Points points = Hinge(0);
  points[3] = points[0];
  EXPECT_DOUBLE_EQ(FoldMeter(kHinge).SharpestEdge(points), 180);
}

TEST(MeshShape, CountsEdgesThatCutThrough) {
  const std::vector<Triangle> two = {{0, 1, 2}, {3, 4, 5}};
  Points points = {{0, 0, 0}, {4, 0, 0}, {0, 4, 0}, {1, 1, 1}, {1, 1, 3}, {2, 1, 2}};
  EXPECT_EQ(CountCuts(points, two), 0u);
  points[3][2] = -1;  // two of the second triangle's edges now pass through the first
  EXPECT_EQ(CountCuts(points, two), 2u);
  EXPECT_EQ(CountCuts(Hinge(10), kHinge), 0u);  // neighbours touch without cutting
}

TEST(RandomPeople, AreTheSameEveryTimeAndFollowThePopulation) {
  RandomPeople people;
  RandomPeople again;
  double sum = 0;
  double squares = 0;
  constexpr int kCount = 2000;
  for (int n = 0; n < kCount; ++n) {
    const auto identity = people.Identity();
    ASSERT_EQ(identity, again.Identity());
    for (const double value : identity) {
      sum += value;
      squares += value * value;
    }
  }
  const double samples = kCount * kModelIdentities;
  EXPECT_NEAR(sum / samples, 0, 0.02);
  EXPECT_NEAR(squares / samples, 1, 0.03);
  const auto none = people.Expressions(0);
  EXPECT_THAT(none, Each(0));
  const auto all = people.Expressions(1);
  EXPECT_GT(*std::max_element(all.begin(), all.end()), 0.5);
  EXPECT_LT(*std::max_element(all.begin(), all.end()), 1);
}

TEST(FaceShapes, AddMeanModesAndTheBlocksTheEngineReads) {
  FaceModelFile model = EmptyModel();
  constexpr std::size_t kX = 3 * 7;  // of vertex 7; pitching leaves it alone
  model.mean[kX] = 256;
  model.identity[2 * kModelCoordinates + kX] = 2560;
  model.expression[4 * kModelCoordinates + kX] = 512;
  const auto block = [](std::size_t i, std::size_t e) {
    return (i * kModelExpressions + e) * kModelCoordinates + kX;
  };
  model.interaction[block(2, 4)] = 64;  // 10 mm
  model.interaction[block(3, 4)] = 64;  // odd: not read
  model.interaction[block(15, 4)] = -32;
  FaceCoefficients face;
  face.identity[2] = 1.5;
  face.identity[3] = 1;
  face.identity[15] = 1;
  face.expression[4] = 0.5;
  const FaceShapes shapes(model, 5);
  EXPECT_DOUBLE_EQ(shapes.mean()[7][0], 1);
  const Points points = shapes.Compose(face);
  EXPECT_NEAR(points[7][0], 1 + 1.5 * 2 + 0.5 * 2 + 1.5 * 0.5 * 2 - 0.5 * 1, 1e-12);
  EXPECT_DOUBLE_EQ(points[8][0], 0);
}

TEST(FaceShapes, AreUpright) {
  FaceModelFile model = EmptyModel();
  model.expression[1] = 256;  // y of vertex 0
  FaceCoefficients face;
  face.expression[0] = 1;
  EXPECT_THAT(FaceShapes(model, 8).Compose(face)[0],
              ElementsAre(0, DoubleNear(0.9397, 1e-12), DoubleNear(0.342, 1e-12)));
}

TEST(FaceTables, KnowTheExpressionsByName) {
  EXPECT_EQ(ExpressionNames().size(), kModelExpressions);
  EXPECT_EQ(ExpressionByName(ExpressionNames()[7]), 7u);
  try {
    ExpressionByName("smirk");
    ADD_FAILURE();
  } catch (const Error& error) {
    EXPECT_THAT(error.what(), HasSubstr("there is no expression 'smirk' (the model has "));
  }
}

TEST(ObjExport, IsTheArtistsFaceForTheMean) {
  const ScratchFolder folder;
  WriteFaceObj(folder.Path("a.obj"), MeanFace(Shipped()));
  std::istringstream ours(folder.Read("a.obj"));
  std::ifstream theirs(N3DS_SOURCE_DIR "/data/face.obj");
  std::string line;
  std::string wanted;
  std::size_t lines = 0;
  while (std::getline(ours, line) && std::getline(theirs, wanted)) {
    if (++lines == 1) continue;  // the comment
    if (line == wanted) continue;
    // The two are rounded from different ways to take the pitch back.
    double a[3];
    double b[3];
    ASSERT_EQ(std::sscanf(line.c_str(), "v %lf %lf %lf", a, a + 1, a + 2), 3) << line;
    ASSERT_EQ(std::sscanf(wanted.c_str(), "v %lf %lf %lf", b, b + 1, b + 2), 3) << wanted;
    EXPECT_THAT(a, Pointwise(DoubleNear(0.0011), b));
  }
  EXPECT_EQ(lines, 1 + 2 * kModelVertices + FaceTriangles().size());
  EXPECT_FALSE(std::getline(theirs, wanted));
}

TEST(ObjExport, LeavesNothingWhereItCannotWrite) {
  const ScratchFolder folder;
  EXPECT_THROW(WriteFaceObj(folder.Path("missing/a.obj"), MeanFace(Shipped())), Error);
  EXPECT_THAT(folder.Names(), IsEmpty());
}

std::vector<std::string> FailedNames(const CheckReport& report) {
  std::vector<std::string> names;
  for (const CheckLine& line : report.failures()) names.push_back(line.name);
  return names;
}

template <typename Check>
std::vector<std::string> Failures(Check check, const FaceModelFile& model) {
  CheckReport report;
  check(model, report);
  return FailedNames(report);
}

TEST(ModelChecks, TheShippedModelPasses) {
  const CheckReport report = CheckModel(Shipped(), kIdentityUnit);
  EXPECT_THAT(FailedNames(report), IsEmpty());
  EXPECT_GT(report.checks(), 60u);
}

TEST(ModelChecks, FormFindsACutOffMean) {
  FaceModelFile model = Shipped();
  model.mean[5] = -32768;
  EXPECT_THAT(Failures(CheckForm, model), ElementsAre("largest coordinate of the mean, mm"));
}

TEST(ModelChecks, SymmetryFindsOneNumberOff) {
  FaceModelFile model = Shipped();
  ++model.mean[3 * 100];
  model.identity[5 * kModelCoordinates + 700] += 2;
  model.expression[5 * kModelCoordinates + 700] -= 1;
  ++model.interaction[2 * kModelCoordinates + 33];
  EXPECT_THAT(Failures(CheckSymmetry, model),
              ElementsAre("mean against its mirror image, 1/256 mm", "identity modes, 1/256 mm",
                          "expressions against their partners, 1/256 mm", "interaction, steps"));
}

TEST(ModelChecks, ShapeFindsSliversAndFoldsInTheMean) {
  FaceModelFile model = Shipped();
  // Two places of the nose ridge change roles, and a border vertex before one ear comes out behind
  // the other.
  for (std::size_t k = 0; k < 3; ++k) std::swap(model.mean[3 * 1335 + k], model.mean[3 * 1443 + k]);
  model.mean[3 * 2] = static_cast<std::int16_t>(-1.3 * model.mean[3 * 2]);
  const auto failed = Failures(
      [](const FaceModelFile& m, CheckReport& r) { CheckShape(m, kIdentityUnit, r); }, model);
  EXPECT_THAT(failed, Contains("sharpest edge of the mean, degrees"));
  EXPECT_THAT(failed, Contains("smallest angle in the mean, degrees"));
  EXPECT_THAT(failed, Contains("edges that cut through the face at rest, lips too"));
  EXPECT_THAT(failed, Contains("folded faces of 1,000 people with random mixtures"));
}

TEST(ModelChecks, ShapeFindsOneBadExpression) {
  FaceModelFile model = Shipped();
  const std::size_t blink = ExpressionByName("eye_blink_L");
  for (std::size_t v = 0; v < kModelVertices; v += 2) {
    model.expression[blink * kModelCoordinates + 3 * v + 2] = 40 * 256;
  }
  EXPECT_THAT(
      Failures([](const FaceModelFile& m, CheckReport& r) { CheckShape(m, kIdentityUnit, r); },
               model),
      ElementsAre("sharpest edge with eye_blink_L", "sharpest edge with smile + blink",
                  "folded faces of 1,000 people with each of these in turn",
                  "folded faces of 1,000 people with random mixtures"));
}

TEST(ModelChecks, ShapeFindsPeopleTooFarApart) {
  // Read with a unit of a quarter, everybody lies 32 times as far from the mean.
  CheckReport report;
  CheckShape(Shipped(), kIdentityUnit / 32, report);
  EXPECT_THAT(FailedNames(report), Contains("sharpest edge over 1,000 random people"));
  EXPECT_THAT(FailedNames(report), Contains("triangles turned over in them"));
}

TEST(ModelChecks, InteractionFindsProductsThatWrapAndBlocksNobodyReads) {
  CheckReport report;
  CheckInteraction(Shipped(), 2, report);
  EXPECT_THAT(FailedNames(report), ElementsAre("people of 1,000 whose products wrap",
                                               "the same with every expression at full intensity"));
  FaceModelFile model = Shipped();
  model.interaction[kModelCoordinates] = 1;  // identity 0, expression 1
  EXPECT_THAT(Failures([](const FaceModelFile& m,
                          CheckReport& r) { CheckInteraction(m, kIdentityUnit, r); },
                       model),
              ElementsAre("filled blocks that nothing reads"));
}

TEST(ModelChecks, TextureFindsAFaceTheLayoutDoesNotFit) {
  FaceModelFile model = Shipped();
  for (std::size_t v = 0; v < kModelVertices; ++v) {
    model.mean[3 * v] = static_cast<std::int16_t>(model.mean[3 * v] / 3);
  }
  EXPECT_THAT(Failures(CheckTexture, model), ElementsAre("ratio of the two, 95th percentile"));
}

TEST(ModelChecks, AFaceWithoutExtentFailsWhereShapeCounts) {
  const auto failed = FailedNames(CheckModel(EmptyModel(), kIdentityUnit));
  EXPECT_THAT(failed, Contains("smallest triangle of the mean, mm2"));
  EXPECT_THAT(failed, Contains("sharpest edge of the mean, degrees"));
  EXPECT_THAT(failed, Contains("ratio of the two, 95th percentile"));
}

TEST(CheckReport, PrintsOneLineACheck) {
  CheckReport report;
  report.Section("Size");
  report.Below("length", 3.26, 1, 4);
  report.Equal("count", 3, 2);
  report.Section("Rest");
  report.Figure("colour", "red");
  std::ostringstream out;
  report.Print(out);
  EXPECT_EQ(out.str(),
            "Size\n"
            "  ok    length  3.3  < 4.0\n"
            "  FAIL  count     3  = 2\n"
            "\n"
            "Rest\n"
            "  ok    colour  red\n");
  EXPECT_EQ(report.checks(), 3u);
  EXPECT_THAT(FailedNames(report), ElementsAre("count"));
}

}  // namespace
}  // namespace n3ds::tool
