// Mask mode over the example tracks gives the same bits on every machine, with every compiler and
// at every optimisation level. A change of these values is a change of results: it needs a reason.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <ostream>
#include <string>
#include <vector>

#include "norvale_3d_sticker_engine.h"
#include "tracks/track_file.h"

namespace {

// FNV-1a, 64 bits.
class Hash {
 public:
  void Add(const float* values, size_t count) {
    for (size_t i = 0; i < count; i++) {
      uint32_t bits;
      std::memcpy(&bits, &values[i], sizeof(bits));
      for (int byte = 0; byte < 4; byte++) {
        hash_ = (hash_ ^ (bits >> (8 * byte) & 255)) * 1099511628211u;
      }
    }
  }
  uint64_t value() const { return hash_; }

 private:
  uint64_t hash_ = 14695981039346656037u;
};

struct GoldenTrack {
  const char* name;
  uint64_t hash;  // of all matrices, 3-D landmarks and meshes
};

void PrintTo(const GoldenTrack& track, std::ostream* out) { *out << track.name; }

class GoldenMask : public testing::TestWithParam<GoldenTrack> {};

TEST_P(GoldenMask, EveryBitIsAsItWas) {
  const n3ds::tool::Track track = n3ds::tool::ReadTrackFile(
      std::string(N3DS_SOURCE_DIR) + "/examples/tracks/" + GetParam().name + ".track.jsonl");
  void* engine = Norvale_3DSticker_CreateEngine();
  ASSERT_EQ(Norvale_3DSticker_Initialize(engine, N3DS_SOURCE_DIR "/data/face_model.bin",
                                         static_cast<uint32_t>(track.header.degree),
                                         static_cast<uint32_t>(track.header.mirror)),
            N3DS_OK);
  NSVL_OFFSCREEN image = {};
  image.width = track.header.width;
  image.height = track.header.height;
  const auto landmarks = static_cast<uint32_t>(track.header.landmarks);

  Norvale_3DSticker_Matrix_Array matrices = {};
  Norvale_3DSticker_ModelInfo_Array models = {};
  std::vector<std::vector<float>> points_3d(N3DS_MAX_FACES, std::vector<float>(3 * landmarks));
  for (size_t k = 0; k < points_3d.size(); k++) matrices.faces[k].landmarks3D = points_3d[k].data();

  Hash hash;
  for (const n3ds::tool::TrackFrame& frame : track.frames) {
    std::vector<__tag_point> points;
    for (const n3ds::tool::TrackFace& face : frame.faces) {
      for (size_t i = 0; i < face.points.size(); i += 2) {
        points.push_back({face.points[i], face.points[i + 1]});
      }
    }
    const auto faces = static_cast<uint32_t>(frame.faces.size());
    ASSERT_EQ(Norvale_3DSticker_Process_FaceMask(engine, &image, faces, landmarks, points.data(),
                                                 nullptr, nullptr, &matrices, &models),
              N3DS_OK)
        << frame.number;
    ASSERT_EQ(matrices.faceNum, faces);
    for (uint32_t k = 0; k < faces; k++) {
      const Norvale_3DSticker_Face_Matrix& face = matrices.faces[k];
      const size_t mesh_floats = 3 * static_cast<size_t>(models.models[k].vertexNum);
      hash.Add(face.projectionMatrix, 16);
      hash.Add(face.viewMatrix, 16);
      hash.Add(face.modelMatrix, 16);
      hash.Add(points_3d[k].data(), points_3d[k].size());
      hash.Add(models.models[k].vertices, mesh_floats);
      for (size_t i = 0; i < mesh_floats; i++) {
        ASSERT_TRUE(std::isfinite(models.models[k].vertices[i])) << frame.number;
      }
    }
  }
  Norvale_3DSticker_DestroyEngine(engine);
  EXPECT_EQ(hash.value(), GetParam().hash)
      << "    {\"" << GetParam().name << "\", 0x" << std::hex << hash.value() << "},";
}

constexpr GoldenTrack kGoldenTracks[] = {
    {"photo_astronaut", 0xa0c1fb8a0b69693f},
    {"photo_group_2", 0x3c26be9abc41128a},
    {"photo_group_3", 0xc366b55fee90b395},
    {"photo_group_5", 0xd9d3ac78e745fc73},
    {"photo_portrait", 0x79997272bb2af840},
    {"real_expressions", 0x89fad224f5e98b3f},
    {"real_head_move_90", 0x9d58a019fd16c592},
    {"real_man_270_mirror", 0xd01badc68de460a8},
    {"real_two_people", 0x1e454f0542fc6612},
    {"synthetic_five_cross", 0xd16632c230d6e168},
    {"synthetic_mirror_portrait", 0xfeb2fd734f56ab58},
    {"synthetic_natural", 0xa658b459784243f8},
    {"synthetic_talk_165", 0x62d57c5f173d8d56},
    {"synthetic_three", 0x125b83510f7dbe07},
    {"synthetic_yaw_sweep", 0x25e0b05d66c4022d},
};

INSTANTIATE_TEST_SUITE_P(, GoldenMask, testing::ValuesIn(kGoldenTracks),
                         [](const auto& track) { return std::string(track.param.name); });

}  // namespace
