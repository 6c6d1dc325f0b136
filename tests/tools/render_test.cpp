// SPDX-License-Identifier: MIT
// Images, meshes and the scene.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <limits>
#include <numeric>

#include "engine/engine_session.h"
#include "mesh/face_tables.h"
#include "render/contact_sheet.h"
#include "render/image.h"
#include "render/obj_file.h"
#include "render/scene.h"
#include "render/shapes.h"
#include "render/view.h"
#include "scratch_folder.h"
#include "support/data_files.h"
#include "tracks/upright.h"

namespace n3ds::tool {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;

Image Pattern(int width, int height) {
  Image image(width, height);
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      std::uint8_t* pixel = image.Pixel(x, y);
      pixel[0] = static_cast<std::uint8_t>(37 * x + 11);
      pixel[1] = static_cast<std::uint8_t>(59 * y + 7);
      pixel[2] = static_cast<std::uint8_t>(x * y);
    }
  }
  return image;
}

template <typename Function>
std::string Message(Function function) {
  try {
    function();
  } catch (const Error& error) {
    return error.what();
  }
  return "";
}

TEST(Image, PngReadsBack) {
  const ScratchFolder folder;
  const Image image = Pattern(7, 5);
  WritePng(folder.Path("a.png"), image);
  const Image again = ReadImage(folder.Path("a.png"));
  EXPECT_EQ(again.width, 7);
  EXPECT_EQ(again.height, 5);
  EXPECT_EQ(again.rgba, image.rgba);
  EXPECT_THAT(folder.Names(), ElementsAre("a.png"));
}

TEST(Image, RejectsTruncatedImages) {
  const ScratchFolder folder;
  WritePng(folder.Path("a.png"), Pattern(40, 30));
  const std::string bytes = folder.Read("a.png");
  const auto refusal = [&](const std::string& content) {
    const std::string path = folder.Write("b.png", content);
    return Message([&] { ReadImage(path); });
  };
  EXPECT_THAT(refusal(bytes.substr(0, bytes.size() / 2)),
              HasSubstr("truncated or damaged PNG file"));
  EXPECT_THAT(refusal(bytes.substr(0, 20)), HasSubstr("truncated or damaged PNG file"));
  EXPECT_THAT(refusal("\xff\xd8 nothing"), HasSubstr("truncated or damaged JPEG file"));
  EXPECT_THAT(refusal("GIF89a"), HasSubstr("neither a PNG nor a JPEG"));
  EXPECT_THAT(refusal(""), HasSubstr("cannot be read"));
  EXPECT_THAT(Message([&] { ReadImage(folder.Path("none.png")); }), HasSubstr("cannot be opened"));
}

// The middle of each pixel goes where a landmark on it goes.
TEST(Image, TurnsLikeTheLandmarks) {
  const Image delivered = Pattern(9, 6);
  for (const int degree : {0, 90, 180, 270}) {
    for (const int mirror : {0, 1}) {
      TrackHeader header;
      header.width = delivered.width;
      header.height = delivered.height;
      header.degree = degree;
      header.mirror = mirror;
      const Image upright = Upright(delivered, degree, mirror == 1);
      EXPECT_EQ(upright.width, header.upright_width());
      EXPECT_EQ(upright.height, header.upright_height());
      for (int y = 0; y < delivered.height; ++y) {
        for (int x = 0; x < delivered.width; ++x) {
          const PixelPoint p = ToUpright(header, x + 0.5, y + 0.5);
          const std::uint8_t* moved =
              upright.Pixel(static_cast<int>(p.x - 0.5), static_cast<int>(p.y - 0.5));
          EXPECT_EQ(moved[0], delivered.Pixel(x, y)[0]);
          EXPECT_EQ(moved[1], delivered.Pixel(x, y)[1]);
        }
      }
    }
  }
}

TEST(ContactSheet, ChoosesEvenlySpacedFrames) {
  EXPECT_THAT(EvenlySpaced(300, 4), ElementsAre(0, 100, 199, 299));
  EXPECT_THAT(EvenlySpaced(3, 12), ElementsAre(0, 1, 2));
  EXPECT_THAT(EvenlySpaced(100, 1), ElementsAre(0));
}

TEST(ContactSheet, LaysTilesOutInAGrid) {
  ContactSheet sheet(12, 160, 90);
  for (int i = 0; i < 12; ++i) sheet.Add(Pattern(160, 90), 25 * i);
  EXPECT_GE(sheet.image().width, 3 * 160);
  EXPECT_GE(sheet.image().height, 2 * 90);
  EXPECT_EQ((sheet.image().width + 4) % 164, 0);
  EXPECT_EQ((sheet.image().height + 4) % 94, 0);
}

TEST(ObjFile, ReadsPartsWithMaterials) {
  const ScratchFolder folder;
  folder.Write("m.mtl", "newmtl red\nKd 1 0 0\nd 0.5\nNs 50\nnewmtl blue\nKd 0 0 1\n");
  const Mesh mesh = ReadObj(folder.Write("a.obj",
                                         "# a square and a triangle\nmtllib m.mtl\n"
                                         "v 0 0 0\nv 1 0 0\nv 1 1 0\nv 0 1 0\nvn 0 0 1\n"
                                         "usemtl red\nf 1//1 2//1 3//1 4//1\n"
                                         "usemtl blue\nf 1/7/1 2/7/1 3/7/1\n"));
  ASSERT_EQ(mesh.parts.size(), 2u);
  EXPECT_EQ(mesh.parts[0].index_count, 6u);
  EXPECT_EQ(mesh.parts[0].material.opacity, 0.5F);
  EXPECT_EQ(mesh.parts[0].material.gloss, 0.5F);
  EXPECT_EQ(mesh.parts[1].first_index, 6u);
  EXPECT_EQ(mesh.parts[1].material.colour[2], 1.0F);
  EXPECT_EQ(mesh.vertices[mesh.indices[5]].position, (std::array<float, 3>{0, 1, 0}));
}

TEST(ObjFile, NamesTheLineOfAMistake) {
  const ScratchFolder folder;
  const auto refusal = [&](const std::string& text) {
    const std::string path = folder.Write("a.obj", text);
    return Message([&] { ReadObj(path); });
  };
  EXPECT_THAT(refusal("v 0 0 0\nv 1 x 0\n"), HasSubstr("a.obj:2: expected three numbers"));
  EXPECT_THAT(refusal("v 0 0 0\nvn 0 0 1\nf 1//1 1//1\n"), HasSubstr(":3: a face has fewer"));
  EXPECT_THAT(refusal("v 0 0 0\nvn 0 0 1\nf 1//1 2//1 1//1\n"),
              HasSubstr(":3: there is no entry 2"));
  EXPECT_THAT(refusal("v 0 0 0\nvn 0 0 1\nf 1//1 -1//1 1//1\n"),
              HasSubstr(":3: there is no entry"));
  EXPECT_THAT(refusal("v 0 0 0\nf 1 1 1\n"), HasSubstr(":2: corner 1 has no normal"));
  EXPECT_THAT(refusal("usemtl gold\n"), HasSubstr(":1: there is no material gold"));
  EXPECT_THAT(refusal("mtllib none.mtl\n"), HasSubstr("none.mtl: cannot be opened"));
  EXPECT_THAT(refusal(""), HasSubstr("file contains no faces"));
}

double Length(const std::array<float, 3>& v) {
  return std::sqrt(std::inner_product(v.begin(), v.end(), v.begin(), 0.0));
}

TEST(Assets, AreSoundMeshesThatFitTheHead) {
  for (const char* name : {"glasses", "hat"}) {
    const Mesh mesh = ReadObj(std::string(N3DS_SOURCE_DIR "/examples/assets/") + name + ".obj");
    for (const Vertex& vertex : mesh.vertices) {
      EXPECT_NEAR(Length(vertex.normal), 1, 0.02) << name;
      EXPECT_LT(std::abs(vertex.position[0]), 150) << name;
    }
    std::size_t covered = 0;
    for (const MeshPart& part : mesh.parts) {
      EXPECT_EQ(part.first_index, covered);
      covered += part.index_count;
    }
    EXPECT_EQ(covered, mesh.indices.size());
  }
}

// The frame and the lenses must not cut into the face where the eyes are.
TEST(Assets, GlassesStandBeforeTheFace) {
  const Mesh glasses = ReadObj(N3DS_SOURCE_DIR "/examples/assets/glasses.obj");
  const Mesh face = FaceMesh(ReadFaceModelFile(N3DS_SOURCE_DIR "/data/face_model.bin"));
  for (const Vertex& vertex : glasses.vertices) {
    const auto& p = vertex.position;
    if (std::abs(p[0]) < 14 || std::abs(p[0]) > 58) continue;  // nose pads and temples
    for (const Vertex& skin : face.vertices) {
      const double distance = std::hypot(skin.position[0] - p[0], skin.position[1] - p[1]);
      if (distance > 3) continue;
      EXPECT_GT(p[2], skin.position[2]) << p[0] << " " << p[1];
    }
  }
}

// Mean of some landmarks' places in a mask image, as its alpha there.
int MaskAlpha(const Image& mask, std::size_t first, std::size_t last) {
  double u = 0;
  double v = 0;
  for (std::size_t k = first; k <= last; ++k) {
    u += FaceTexture()[LandmarkVertices()[k]][0];
    v += FaceTexture()[LandmarkVertices()[k]][1];
  }
  const double count = static_cast<double>(last - first + 1);
  return mask.Pixel(static_cast<int>(u / count * mask.width),
                    static_cast<int>(v / count * mask.height))[3];
}

// A mask drawn for another layout would close an eye or the mouth.
TEST(Assets, MasksFitTheTextureLayout) {
  for (const char* name : {"carnival", "tiger", "gold"}) {
    const std::string path = std::string(N3DS_SOURCE_DIR "/examples/assets/mask_") + name + ".png";
    const Image mask = ReadImage(path);
    EXPECT_EQ(mask.width, 512);
    EXPECT_EQ(mask.height, 512);
    EXPECT_LT(std::filesystem::file_size(path), 250000u);
    EXPECT_EQ(MaskAlpha(mask, 39, 50), 0) << name;  // eyes
    EXPECT_EQ(MaskAlpha(mask, 51, 62), 0) << name;
    EXPECT_EQ(MaskAlpha(mask, 87, 94), 0) << name;    // mouth
    EXPECT_GT(MaskAlpha(mask, 19, 28), 250) << name;  // brows
    EXPECT_GT(MaskAlpha(mask, 29, 38), 250) << name;
    EXPECT_EQ(mask.Pixel(0, 0)[3], 0) << name;
  }
}

TEST(Shapes, SurfacesFaceOutwards) {
  const Mesh face = FaceMesh(ReadFaceModelFile(N3DS_SOURCE_DIR "/data/face_model.bin"));
  double forward = 0;
  for (const Vertex& vertex : face.vertices) forward += vertex.normal[2];
  EXPECT_GT(forward / static_cast<double>(face.vertices.size()), 0.3);

  const Mesh skull = SkullMesh();
  for (std::size_t i = 0; i < skull.parts[0].index_count; ++i) {
    const Vertex& vertex = skull.vertices[skull.indices[i]];
    const double out = vertex.normal[0] * vertex.position[0] +
                       vertex.normal[1] * (vertex.position[1] - 45) +
                       vertex.normal[2] * (vertex.position[2] + 1);
    EXPECT_GT(out, 0);
  }
}

TEST(Shapes, SkullLiesUnderTheForehead) {
  const Mesh face = FaceMesh(ReadFaceModelFile(N3DS_SOURCE_DIR "/data/face_model.bin"));
  for (const Vertex& vertex : face.vertices) {
    const auto& p = vertex.position;
    if (p[1] < 55 || p[2] < 60) continue;
    const double x = p[0] / 76;
    const double y = (p[1] - 45) / 87;
    const double z = (p[2] + 1) / 94;
    EXPECT_GT(x * x + y * y + z * z, 0.97) << p[0] << " " << p[1] << " " << p[2];
  }
}

TEST(View, TheWholeImageGoesIntoTheBox) {
  TrackHeader header;
  header.width = 400;
  header.height = 1000;
  header.degree = 90;  // upright 1000 x 400
  View view = WholeView(header, Size{501, 900}, 1280);
  EXPECT_EQ(view.shown.width, 501);
  EXPECT_EQ(view.shown.height, 200);
  EXPECT_EQ(view.whole.width, 501);
  view.MakeEven();
  EXPECT_EQ(view.shown.width, 500);
  view = WholeView(header, std::nullopt, 500);
  EXPECT_EQ(view.shown.width, 500);
  EXPECT_EQ(WholeView(header, std::nullopt, 1280).shown.width, 1000);
}

TEST(View, ACloseupHoldsTheHeads) {
  Track track = ReadTrackFile(N3DS_SOURCE_DIR "/examples/tracks/real_man_270_mirror.track.jsonl");
  const View view = CloseView(track, {0, 30}, Size{300, 400}, 1280);
  EXPECT_LE(view.shown.width, 300);
  EXPECT_LE(view.shown.height, 400);
  EXPECT_TRUE(view.shown.width >= 299 || view.shown.height >= 399);
  EXPECT_GT(view.whole.width, view.shown.width);
  EXPECT_LE(view.left + view.shown.width, view.whole.width);
  EXPECT_LE(view.top + view.shown.height, view.whole.height);
  const double scale = view.whole.width / static_cast<double>(track.header.upright_width());
  for (const std::size_t f : {0, 30}) {
    for (const PixelPoint& p : UprightLandmarks(track.header, track.frames[f].faces[0])) {
      EXPECT_GE(p.x * scale, view.left);
      EXPECT_LE(p.x * scale, view.left + view.shown.width);
      EXPECT_GE(p.y * scale, view.top);
      EXPECT_LE(p.y * scale, view.top + view.shown.height);
    }
  }
  track.frames[0].faces.clear();
  const View without = CloseView(track, {0}, Size{300, 400}, 1280);
  EXPECT_EQ(without.shown.width, 300);
  EXPECT_EQ(without.whole.width, 300);
}

TEST(View, CutsItsPart) {
  View view;
  view.whole = {9, 6};
  view.left = 2;
  view.top = 1;
  view.shown = {5, 3};
  const Image whole = Pattern(9, 6);
  const Image cut = view.Cut(whole);
  ASSERT_EQ(cut.width, 5);
  ASSERT_EQ(cut.height, 3);
  for (int y = 0; y < 3; ++y) {
    for (int x = 0; x < 5; ++x) {
      EXPECT_TRUE(std::equal(cut.Pixel(x, y), cut.Pixel(x, y) + 4, whole.Pixel(x + 2, y + 1)));
    }
  }
}

// What a part of the scene adds to the image: its pixels' bounding box.
struct Extent {
  int left = 1 << 20;
  int top = 1 << 20;
  int right = -1;
  int bottom = -1;
  int pixels = 0;
};

Extent Difference(const Image& a, const Image& b) {
  Extent extent;
  for (int y = 0; y < a.height; ++y) {
    for (int x = 0; x < a.width; ++x) {
      if (std::equal(a.Pixel(x, y), a.Pixel(x, y) + 3, b.Pixel(x, y))) continue;
      extent.left = std::min(extent.left, x);
      extent.right = std::max(extent.right, x);
      extent.top = std::min(extent.top, y);
      extent.bottom = std::max(extent.bottom, y);
      ++extent.pixels;
    }
  }
  return extent;
}

// A frontal head 700 mm before the camera of a 640 x 480 image, its middle at (400, 200).
FrameResult FrontalHead() {
  const float focal = 560;
  FaceResult face;
  face.projection = {
      2 * focal / 640,  0, 0, 0, 0, 2 * focal / 480, 0, 0, 0, 0, -5001.0F / 4999, -1, 0, 0,
      -10000.0F / 4999, 0};
  face.view = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 0, 0, -500, 1};
  face.model = {1, 0, 0, 0, 0, 1, 0, 0, 0, 0, 1, 0, 100, 50, -200, 1};
  FrameResult frame;
  frame.ok = true;
  frame.faces.push_back(face);
  return frame;
}

TrackHeader SmallHeader() {
  TrackHeader header;
  header.width = 640;
  header.height = 480;
  header.fps = 30;
  header.landmarks = 101;
  return header;
}

Image DrawParts(const FrameResult& frame, const SceneParts& parts) {
  Scene scene(SmallHeader(), DefaultModelPath(), parts, std::nullopt, 640, 480);
  return scene.Draw(frame);
}

constexpr SceneParts kNothing = {false, false, false, false, false};

// Where the vertices of an asset lie in the image, as continuous pixel coordinates.
struct Outline {
  double left = 1e9;
  double top = 1e9;
  double right = -1e9;
  double bottom = -1e9;
};

Outline Projected(const char* asset, const FaceResult& face) {
  Outline outline;
  for (const Vertex& vertex :
       ReadObj(std::string(N3DS_SOURCE_DIR "/examples/assets/") + asset + ".obj").vertices) {
    const auto& v = vertex.position;
    const PixelPoint p = ProjectToPixel(face, SmallHeader(), v[0], v[1], v[2]);
    outline.left = std::min(outline.left, p.x);
    outline.right = std::max(outline.right, p.x);
    outline.top = std::min(outline.top, p.y);
    outline.bottom = std::max(outline.bottom, p.y);
  }
  return outline;
}

TEST(Scene, DrawsStickersWhereTheMatricesSay) {
  constexpr double kPixels = 1.5;
  const FrameResult frame = FrontalHead();
  const Image empty = DrawParts(frame, kNothing);
  SceneParts parts = kNothing;
  parts.hat = true;
  const Extent hat = Difference(empty, DrawParts(frame, parts));
  const Outline expected_hat = Projected("hat", frame.faces[0]);
  EXPECT_NEAR(hat.left, expected_hat.left, kPixels);
  EXPECT_NEAR(hat.right, expected_hat.right, kPixels);
  EXPECT_NEAR(hat.top, expected_hat.top, kPixels);

  // The temples are hidden in part, the rims are not.
  parts = kNothing;
  parts.glasses = true;
  const Extent glasses = Difference(empty, DrawParts(frame, parts));
  const Outline expected_glasses = Projected("glasses", frame.faces[0]);
  EXPECT_NEAR(glasses.top, expected_glasses.top, kPixels);
  EXPECT_GE(glasses.left, expected_glasses.left - kPixels);
  EXPECT_LE(glasses.right, expected_glasses.right + kPixels);
  EXPECT_GT(glasses.top, hat.top);
}

TEST(Scene, ThePlainImageIsTheBackground) {
  Image photo = Pattern(640, 480);
  Scene scene(SmallHeader(), DefaultModelPath(), kNothing, photo, 640, 480);
  const Image drawn = scene.Draw(FrontalHead());
  EXPECT_EQ(drawn.rgba, photo.rgba);
}

TEST(Scene, TheHeadHidesWhatIsBehindIt) {
  // Seen from behind, glasses are hidden but for the ends of the temples.
  FrameResult frame = FrontalHead();
  const Extent before = [&] {
    SceneParts parts = kNothing;
    const Image empty = DrawParts(frame, parts);
    parts.glasses = true;
    return Difference(empty, DrawParts(frame, parts));
  }();
  Matrix4& model = frame.faces[0].model;
  model[0] = -1;
  model[10] = -1;
  SceneParts parts = kNothing;
  const Image empty = DrawParts(frame, parts);
  parts.glasses = true;
  const Extent behind = Difference(empty, DrawParts(frame, parts));
  EXPECT_LT(behind.pixels, before.pixels / 8);
}

TEST(Scene, NearerHeadsHideFartherOnes) {
  FrameResult frame = FrontalHead();
  FaceResult far = frame.faces[0];
  far.model[14] = -800;  // 1300 mm away, behind the other in the image
  far.model[12] = 100.0F * 1300 / 700;
  far.model[13] = 50.0F * 1300 / 700;
  SceneParts parts = kNothing;
  parts.head = true;
  const Image near_alone = DrawParts(frame, parts);
  frame.faces.insert(frame.faces.begin(), far);
  const Extent added = Difference(near_alone, DrawParts(frame, parts));
  EXPECT_LT(added.pixels, 50);
}

TEST(Scene, LeavesOutFacesWithoutAPose) {
  FrameResult frame = FrontalHead();
  const SceneParts parts;
  const Image empty = DrawParts({}, parts);
  frame.faces[0].model[12] = std::numeric_limits<float>::quiet_NaN();
  EXPECT_EQ(DrawParts(frame, parts).rgba, empty.rgba);
}

TEST(Shapes, TheOpenSkullLeavesTheFaceOut) {
  const Mesh whole = SkullMesh();
  const Mesh open = OpenSkullMesh();
  EXPECT_LT(open.indices.size(), whole.indices.size());
  EXPECT_GT(open.indices.size(), whole.indices.size() / 2);
  std::size_t covered = 0;
  for (const MeshPart& part : open.parts) {
    EXPECT_EQ(part.first_index, covered);
    covered += part.index_count;
  }
  EXPECT_EQ(covered, open.indices.size());
  // Nothing before the eyes and the mouth.
  for (std::size_t i = 0; i < open.indices.size(); i += 3) {
    const auto& p = open.vertices[open.indices[i]].position;
    EXPECT_FALSE(p[1] < 60 && p[2] > 45) << p[0] << " " << p[1] << " " << p[2];
  }
}

// A talking face in mask mode, with the engine's texture coordinates.
class MaskScene : public ::testing::Test {
 protected:
  MaskScene()
      : track_(ReadTrackFile(N3DS_SOURCE_DIR "/examples/tracks/synthetic_talk_165.track.jsonl")) {
    EngineSession session(DefaultModelPath(), track_.header, TrackMode::kMask);
    for (std::size_t f = 0; f < 30; ++f) result_ = session.Process(track_.frames[f]);
    coordinates_ = session.texture_coordinates();
  }

  Image Draw(const SceneParts& parts, const std::optional<Image>& mask = std::nullopt) const {
    Scene scene(track_.header, DefaultModelPath(), parts, std::nullopt, 640, 480, mask);
    return scene.Draw(result_, coordinates_);
  }

  // The landmark as the upright image has it.
  PixelPoint Seen(std::size_t landmark) const {
    return UprightLandmarks(track_.header, track_.frames[29].faces[0])[landmark];
  }

  // Colour between landmarks, in the middle of them.
  std::array<int, 3> Between(const Image& image, const std::vector<std::size_t>& landmarks) {
    double x = 0;
    double y = 0;
    for (const std::size_t k : landmarks) {
      x += Seen(k).x / static_cast<double>(landmarks.size());
      y += Seen(k).y / static_cast<double>(landmarks.size());
    }
    const std::uint8_t* p = image.Pixel(static_cast<int>(x), static_cast<int>(y));
    return {p[0], p[1], p[2]};
  }

  static Image Quarters() {
    Image image(64, 64);
    for (int y = 0; y < 64; ++y) {
      for (int x = 0; x < 64; ++x) {
        std::uint8_t* p = image.Pixel(x, y);
        p[0] = x < 32 ? 250 : 0;
        p[1] = y < 32 ? 250 : 0;
        p[2] = 0;
      }
    }
    return image;
  }

  Track track_;
  FrameResult result_;
  std::vector<float> coordinates_;
};

TEST_F(MaskScene, TheTextureIsNeitherMirroredNorTurned) {
  const Image drawn = Draw(kNothing, Quarters());
  const auto left_brow = Between(drawn, {21, 22, 26, 27});
  const auto right_brow = Between(drawn, {31, 32, 36, 37});
  const auto left_cheek = Between(drawn, {75, 3});
  const auto right_cheek = Between(drawn, {81, 15});
  EXPECT_GT(left_brow[0], 100);
  EXPECT_GT(left_brow[1], 100);
  EXPECT_LT(right_brow[0], 20);
  EXPECT_GT(right_brow[1], 100);
  EXPECT_GT(left_cheek[0], 100);
  EXPECT_LT(left_cheek[1], 20);
  EXPECT_LT(right_cheek[0], 20);
  EXPECT_LT(right_cheek[1], 20);
}

TEST_F(MaskScene, EyesAndAnOpenMouthShowTheGround) {
  const Image empty = Draw(kNothing);
  const Image drawn = Draw(kNothing, Quarters());
  EXPECT_EQ(Between(drawn, {89, 93}), Between(empty, {89, 93}));
  EXPECT_EQ(Between(drawn, {42, 48}), Between(empty, {42, 48}));
  EXPECT_EQ(Between(drawn, {54, 60}), Between(empty, {54, 60}));
}

TEST_F(MaskScene, WhatIsTransparentLeavesNoTrace) {
  Image clear(64, 64);  // white
  for (std::size_t i = 3; i < clear.rgba.size(); i += 4) clear.rgba[i] = 0;
  EXPECT_EQ(Draw(kNothing, clear).rgba, Draw(kNothing).rgba);
}

TEST_F(MaskScene, TheWireframeCoversTheMeshThinly) {
  SceneParts parts = kNothing;
  const Image empty = Draw(parts);
  parts.mesh = true;
  const Extent mesh = Difference(empty, Draw(parts));
  parts.mesh = false;
  parts.wireframe = true;
  const Extent wires = Difference(empty, Draw(parts));
  EXPECT_NEAR(wires.left, mesh.left, 2);
  EXPECT_NEAR(wires.right, mesh.right, 2);
  EXPECT_NEAR(wires.top, mesh.top, 2);
  EXPECT_NEAR(wires.bottom, mesh.bottom, 2);
  EXPECT_LT(wires.pixels, mesh.pixels);
}

// Stickers are made for the upright head; mask mode's matrices are for the pitched one.
TEST_F(MaskScene, StickersSitAsInRigidMode) {
  EngineSession session(DefaultModelPath(), track_.header, TrackMode::kRigid);
  FrameResult rigid;
  for (std::size_t f = 0; f < 30; ++f) rigid = session.Process(track_.frames[f]);
  SceneParts parts = kNothing;
  parts.glasses = true;
  Scene scene(track_.header, DefaultModelPath(), parts, std::nullopt, 640, 480);
  Scene plain(track_.header, DefaultModelPath(), kNothing, std::nullopt, 640, 480);
  const Extent in_mask =
      Difference(plain.Draw(result_, coordinates_), scene.Draw(result_, coordinates_));
  const Extent in_rigid = Difference(plain.Draw(rigid), scene.Draw(rigid));
  EXPECT_NEAR(in_mask.left, in_rigid.left, 12);
  EXPECT_NEAR(in_mask.right, in_rigid.right, 12);
  EXPECT_NEAR(in_mask.top, in_rigid.top, 12);
  EXPECT_NEAR(in_mask.bottom, in_rigid.bottom, 12);
}

TEST(Scene, DrawsTheSameImageTwice) {
  const FrameResult frame = FrontalHead();
  const SceneParts parts;
  Scene scene(SmallHeader(), DefaultModelPath(), parts, std::nullopt, 320, 240);
  const Image first = scene.Draw(frame);
  EXPECT_EQ(scene.Draw(frame).rgba, first.rgba);
}

}  // namespace
}  // namespace n3ds::tool
