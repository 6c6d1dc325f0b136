// SPDX-License-Identifier: MIT
// Both modes give the same bits on every machine, with every compiler and at every optimisation
// level: hashes of all outputs of whole tracks, generated ones and the example tracks.
//
// A change of these values is a change of results, of the face model or of a track, and needs a
// reason. To renew them run this program and put what it prints in place of the lines of
// golden_values.inc:
//   build/release/tests/engine/golden_tracks_test | grep -oE '\{"[a-z0-9_]*", 0x[0-9a-f, x]*\},'
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

#include "engine/engine_testing.h"
#include "tracks/track_file.h"

namespace n3ds::testing {
namespace {

// FNV-1a, 64 bits.
class Hash {
 public:
  void Add(const std::vector<uint32_t>& words) {
    for (const uint32_t word : words) {
      for (int byte = 0; byte < 4; byte++) {
        hash_ = (hash_ ^ (word >> (8 * byte) & 255)) * 1099511628211u;
      }
    }
  }
  uint64_t value() const { return hash_; }

 private:
  uint64_t hash_ = 14695981039346656037u;
};

// A landmark track as the engine gets it.
struct Track {
  int32_t width;
  int32_t height;
  uint32_t degree;
  uint32_t mirror;
  uint32_t landmarks;
  std::vector<Points> frames;
};

Track ReadTrack(const std::string& name) {
  const tool::Track file = tool::ReadTrackFile(std::string(N3DS_SOURCE_DIR) + "/examples/tracks/" +
                                               name + ".track.jsonl");
  Track track = {file.header.width,
                 file.header.height,
                 static_cast<uint32_t>(file.header.degree),
                 static_cast<uint32_t>(file.header.mirror),
                 static_cast<uint32_t>(file.header.landmarks),
                 {}};
  for (const tool::TrackFrame& frame : file.frames) {
    Points points;
    for (const tool::TrackFace& face : frame.faces) {
      const Points some = ToPoints({face.points.begin(), face.points.end()});
      points.insert(points.end(), some.begin(), some.end());
    }
    track.frames.push_back(points);
  }
  return track;
}

// `people` persons of the shipped model, who leave and come back one after the other. Upright.
Track GenerateTrack(int people, uint32_t landmarks, int frames) {
  Track track = {1280, 720, 0, 0, landmarks, {}};
  std::vector<Person> persons;
  for (int k = 0; k < people; k++) {
    persons.push_back(Person(static_cast<uint64_t>(100 * people + k))
                          .At(120.0 * (k - 2), 20.0 * (k - 2), 600 + 50 * k));
  }
  for (int frame = 0; frame < frames; frame++) {
    Points points;
    for (int k = 0; k < people; k++) {
      if (people > 1 && frame / 10 % (people + 2) == k) continue;  // away
      const Points face = ToPoints(
          persons[static_cast<size_t>(k)].Detect(frame, 1280, 720, static_cast<int>(landmarks), 1));
      points.insert(points.end(), face.begin(), face.end());
    }
    track.frames.push_back(points);
  }
  return track;
}

// The same, delivered by a front camera held sideways.
Track Turned(Track track) {
  for (Points& frame : track.frames) {
    Points delivered;
    for (size_t first = 0; first < frame.size(); first += track.landmarks) {
      const auto from = frame.begin() + static_cast<std::ptrdiff_t>(first);
      const Points face =
          Deliver(Points(from, from + track.landmarks), 270, true, track.width, track.height);
      delivered.insert(delivered.end(), face.begin(), face.end());
    }
    frame = delivered;
  }
  track.degree = 270;
  track.mirror = 1;
  std::swap(track.width, track.height);
  return track;
}

// Not-a-number has no one bit pattern, so it is refused.
bool AllFinite(const float* values, size_t count) {
  return std::all_of(values, values + count, [](float value) { return std::isfinite(value); });
}

// All matrices and 3-D landmarks.
uint64_t RigidHash(const Track& track) {
  const auto engine = Engine::Ready(track.degree, track.mirror);
  Hash hash;
  for (const Points& frame : track.frames) {
    RigidOutput out(track.landmarks);
    EXPECT_EQ(Process(*engine, ImageOf(track.width, track.height), frame, track.landmarks, &out),
              N3DS_OK);
    EXPECT_EQ(out.face_num(), frame.size() / track.landmarks);
    for (uint32_t k = 0; k < out.face_num(); k++) {
      EXPECT_TRUE(AllFinite(out.landmarks(k).data(), out.landmarks(k).size()));
    }
    hash.Add(out.AllBits());
  }
  return hash.value();
}

// The same and the meshes.
uint64_t MaskHash(const Track& track) {
  const auto engine = Engine::Ready(track.degree, track.mirror);
  NSVL_OFFSCREEN image = ImageOf(track.width, track.height);
  Norvale_3DSticker_ModelInfo_Array models = {};
  Hash hash;
  for (const Points& frame : track.frames) {
    RigidOutput out(track.landmarks);
    Points points = frame;
    const auto faces = static_cast<uint32_t>(points.size() / track.landmarks);
    EXPECT_EQ(
        Norvale_3DSticker_Process_FaceMask(engine->handle(), &image, faces, track.landmarks,
                                           points.data(), nullptr, nullptr, out.get(), &models),
        N3DS_OK);
    EXPECT_EQ(out.face_num(), faces);
    for (uint32_t k = 0; k < out.face_num(); k++) {
      EXPECT_TRUE(AllFinite(out.landmarks(k).data(), out.landmarks(k).size()));
    }
    hash.Add(out.AllBits());
    EXPECT_EQ(models.modelNum, faces);
    for (uint32_t k = 0; k < faces; k++) {
      const float* vertices = models.models[k].vertices;
      const size_t count = 3 * static_cast<size_t>(models.models[k].vertexNum);
      EXPECT_TRUE(AllFinite(vertices, count));
      hash.Add(Bits(vertices, count));
    }
  }
  return hash.value();
}

struct Golden {
  const char* name;
  uint64_t rigid;
  uint64_t mask;
};
void PrintTo(const Golden& golden, std::ostream* out) { *out << golden.name; }

constexpr Golden kGolden[] = {
#include "engine/golden_values.inc"
};

Track TrackOf(const std::string& name) {
  if (name == "generated_one_101") return GenerateTrack(1, 101, 80);
  if (name == "generated_three_165") return GenerateTrack(3, 165, 80);
  if (name == "generated_five_101") return GenerateTrack(5, 101, 80);
  if (name == "generated_two_turned_165") return Turned(GenerateTrack(2, 165, 60));
  return ReadTrack(name);
}

class GoldenTracks : public ::testing::TestWithParam<Golden> {};

TEST_P(GoldenTracks, EveryBitIsAsItWas) {
  const Track track = TrackOf(GetParam().name);
  const uint64_t rigid = RigidHash(track);
  const uint64_t mask = MaskHash(track);
  EXPECT_TRUE(rigid == GetParam().rigid && mask == GetParam().mask)
      << "{\"" << GetParam().name << "\", 0x" << std::hex << rigid << ", 0x" << mask << "},";
}

INSTANTIATE_TEST_SUITE_P(, GoldenTracks, ::testing::ValuesIn(kGolden),
                         [](const auto& golden) { return std::string(golden.param.name); });

TEST(TurnedTracks, AreTheSameTracksDeliveredOtherwise) {
  EXPECT_EQ(RigidHash(Turned(GenerateTrack(2, 165, 20))), RigidHash(GenerateTrack(2, 165, 20)));
}

}  // namespace
}  // namespace n3ds::testing
