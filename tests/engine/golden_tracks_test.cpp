// The example tracks give the same bits on every machine, with every compiler and at every
// optimisation level, in both modes. A change of these values is a change of results: it needs a
// reason. To renew them, run this test; each failure prints the line for the table.
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

// FNV-1a, 64 bits. Not-a-number has no one bit pattern, so it is refused.
class Hash {
 public:
  void Add(const float* values, size_t count) {
    for (size_t i = 0; i < count; i++) {
      finite_ = finite_ && std::isfinite(values[i]);
      uint32_t bits;
      std::memcpy(&bits, &values[i], sizeof(bits));
      for (int byte = 0; byte < 4; byte++) {
        hash_ = (hash_ ^ (bits >> (8 * byte) & 255)) * 1099511628211u;
      }
    }
  }
  uint64_t value() const { return hash_; }
  bool finite() const { return finite_; }

 private:
  uint64_t hash_ = 14695981039346656037u;
  bool finite_ = true;
};

struct GoldenTrack {
  const char* name;
  uint64_t rigid;  // of all matrices and 3-D landmarks
  uint64_t mask;   // of these and the meshes
};

void PrintTo(const GoldenTrack& track, std::ostream* out) { *out << track.name; }

class GoldenTracks : public testing::TestWithParam<GoldenTrack> {};

// Runs a track through the engine's public functions; `mask` chooses the mode.
void RunTrack(const n3ds::tool::Track& track, bool mask, Hash* hash) {
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

  for (const n3ds::tool::TrackFrame& frame : track.frames) {
    std::vector<__tag_point> points;
    for (const n3ds::tool::TrackFace& face : frame.faces) {
      for (size_t i = 0; i < face.points.size(); i += 2) {
        points.push_back({face.points[i], face.points[i + 1]});
      }
    }
    const auto faces = static_cast<uint32_t>(frame.faces.size());
    const MRESULT result =
        mask ? Norvale_3DSticker_Process_FaceMask(engine, &image, faces, landmarks, points.data(),
                                                  nullptr, nullptr, &matrices, &models)
             : Norvale_3DSticker_Process(engine, &image, faces, landmarks, points.data(), nullptr,
                                         nullptr, &matrices);
    ASSERT_EQ(result, N3DS_OK) << "frame " << frame.number;
    ASSERT_EQ(matrices.faceNum, faces);
    for (uint32_t k = 0; k < faces; k++) {
      const Norvale_3DSticker_Face_Matrix& face = matrices.faces[k];
      hash->Add(face.projectionMatrix, 16);
      hash->Add(face.viewMatrix, 16);
      hash->Add(face.modelMatrix, 16);
      hash->Add(points_3d[k].data(), points_3d[k].size());
      if (!mask) continue;
      hash->Add(models.models[k].vertices, 3 * static_cast<size_t>(models.models[k].vertexNum));
    }
  }
  Norvale_3DSticker_DestroyEngine(engine);
}

TEST_P(GoldenTracks, EveryBitIsAsItWas) {
  const n3ds::tool::Track track = n3ds::tool::ReadTrackFile(
      std::string(N3DS_SOURCE_DIR) + "/examples/tracks/" + GetParam().name + ".track.jsonl");
  Hash rigid;
  Hash mask;
  RunTrack(track, false, &rigid);
  RunTrack(track, true, &mask);
  EXPECT_TRUE(rigid.finite());
  EXPECT_TRUE(mask.finite());
  EXPECT_TRUE(rigid.value() == GetParam().rigid && mask.value() == GetParam().mask)
      << "    {\"" << GetParam().name << "\", 0x" << std::hex << rigid.value() << ", 0x"
      << mask.value() << "},";
}

constexpr GoldenTrack kGoldenTracks[] = {
    {"photo_astronaut", 0x0, 0xa0c1fb8a0b69693f},
    {"photo_group_2", 0x0, 0x3c26be9abc41128a},
    {"photo_group_3", 0x0, 0xc366b55fee90b395},
    {"photo_group_5", 0x0, 0xd9d3ac78e745fc73},
    {"photo_portrait", 0x0, 0x79997272bb2af840},
    {"real_expressions", 0x0, 0x89fad224f5e98b3f},
    {"real_head_move_90", 0x0, 0x9d58a019fd16c592},
    {"real_man_270_mirror", 0x0, 0xd01badc68de460a8},
    {"real_two_people", 0x0, 0x1e454f0542fc6612},
    {"synthetic_five_cross", 0x0, 0xd16632c230d6e168},
    {"synthetic_mirror_portrait", 0x0, 0xfeb2fd734f56ab58},
    {"synthetic_natural", 0x0, 0xa658b459784243f8},
    {"synthetic_talk_165", 0x0, 0x62d57c5f173d8d56},
    {"synthetic_three", 0x0, 0x125b83510f7dbe07},
    {"synthetic_yaw_sweep", 0x0, 0x25e0b05d66c4022d},
};

INSTANTIATE_TEST_SUITE_P(, GoldenTracks, testing::ValuesIn(kGoldenTracks),
                         [](const auto& track) { return std::string(track.param.name); });

}  // namespace
