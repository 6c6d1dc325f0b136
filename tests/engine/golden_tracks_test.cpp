// SPDX-License-Identifier: MIT
// Both modes of both trackers give the same bits on every machine, with every compiler and at every
// optimisation level: hashes of all outputs of whole tracks, generated ones and the example tracks.
//
// A change of these values is a change of results, of the face model or of a track, and needs a
// reason. To renew them, and those of single steps:
//   tests/engine/renew_golden.sh
//
// The hashes of whole tracks decide. golden_frames.txt, with hashes of every frame and some values
// of every fourth, is for the message of a failure: it tells where a change starts and how large it
// is.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <fstream>
#include <iterator>
#include <sstream>
#include <string>
#include <vector>

#include "engine/engine_testing.h"
#include "norvale_3d_sticker_extensions.h"
#include "support/golden.h"
#include "tracks/track_file.h"

namespace n3ds::testing {
namespace {

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

// NaN has no one bit pattern, so it is refused.
bool AllFinite(const float* values, size_t count) {
  return std::all_of(values, values + count, [](float value) { return std::isfinite(value); });
}

// What a frame gives in each mode, and where some of its values are: of the face that comes first,
// two entries of the model matrix's rotation and two of its translation, coordinates of landmarks
// and of vertices.
struct Figure {
  const char* name;
  size_t samples[4];
};
constexpr Figure kFigures[] = {{"rigid matrices", {32, 38, 44, 46}},
                               {"rigid landmarks", {0, 100, 201, 302}},
                               {"mask matrices", {32, 38, 44, 46}},
                               {"mask landmarks", {0, 100, 201, 302}},
                               {"mesh", {0, 1811, 3623, 5435}}};
constexpr size_t kFigureCount = std::size(kFigures);
constexpr size_t kSampledFrames = 4;

// One frame: a hash of each figure, and in every fourth the samples.
struct FrameFigures {
  uint32_t hash[kFigureCount] = {};
  std::vector<float> samples[kFigureCount];

  void Set(size_t figure, size_t frame, const std::vector<float>& values) {
    Hash all;
    all.Add(Bits(values));
    hash[figure] = static_cast<uint32_t>(all.value() ^ all.value() >> 32);
    if (frame % kSampledFrames != 0 || values.empty()) return;
    for (const size_t at : kFigures[figure].samples) samples[figure].push_back(values[at]);
  }
};

// All that a track gives.
struct Results {
  uint64_t rigid = 0;
  uint64_t mask = 0;
  std::vector<FrameFigures> frames;
};

std::vector<float> MatricesOf(const RigidOutput& out) {
  std::vector<float> all;
  for (uint32_t k = 0; k < out.face_num(); k++) {
    const Norvale_3DSticker_Face_Matrix& face = out.face(k);
    for (const float* matrix : {face.projectionMatrix, face.viewMatrix, face.modelMatrix}) {
      all.insert(all.end(), matrix, matrix + 16);
    }
  }
  return all;
}

std::vector<float> LandmarksOf(const RigidOutput& out) {
  std::vector<float> all;
  for (uint32_t k = 0; k < out.face_num(); k++) {
    const std::vector<float> landmarks = out.landmarks(k);
    EXPECT_TRUE(AllFinite(landmarks.data(), landmarks.size()));
    all.insert(all.end(), landmarks.begin(), landmarks.end());
  }
  return all;
}

std::unique_ptr<Engine> ReadyFor(const Track& track, uint32_t tracker) {
  auto engine = Engine::Ready(track.degree, track.mirror);
  Norvale_3DSticker_Options options = {};
  options.size = sizeof(options);
  EXPECT_EQ(Norvale_3DSticker_GetOptions(engine->handle(), &options), N3DS_OK);
  options.tracker = tracker;
  EXPECT_EQ(Norvale_3DSticker_SetOptions(engine->handle(), &options), N3DS_OK);
  return engine;
}

// All matrices and 3-D landmarks.
void RunRigid(const Track& track, Results* results, uint32_t tracker = N3DS_TRACKER_CLASSIC) {
  const auto engine = ReadyFor(track, tracker);
  results->frames.resize(track.frames.size());
  Hash hash;
  for (size_t frame = 0; frame < track.frames.size(); frame++) {
    const Points& points = track.frames[frame];
    RigidOutput out(track.landmarks);
    EXPECT_EQ(Process(*engine, ImageOf(track.width, track.height), points, track.landmarks, &out),
              N3DS_OK);
    EXPECT_EQ(out.face_num(), points.size() / track.landmarks);
    hash.Add(out.AllBits());
    results->frames[frame].Set(0, frame, MatricesOf(out));
    results->frames[frame].Set(1, frame, LandmarksOf(out));
  }
  results->rigid = hash.value();
}

// The same and the meshes.
void RunMask(const Track& track, Results* results, uint32_t tracker = N3DS_TRACKER_CLASSIC) {
  const auto engine = ReadyFor(track, tracker);
  NSVL_OFFSCREEN image = ImageOf(track.width, track.height);
  Norvale_3DSticker_ModelInfo_Array models = {};
  results->frames.resize(track.frames.size());
  Hash hash;
  for (size_t frame = 0; frame < track.frames.size(); frame++) {
    RigidOutput out(track.landmarks);
    Points points = track.frames[frame];
    const auto faces = static_cast<uint32_t>(points.size() / track.landmarks);
    EXPECT_EQ(
        Norvale_3DSticker_Process_FaceMask(engine->handle(), &image, faces, track.landmarks,
                                           points.data(), nullptr, nullptr, out.get(), &models),
        N3DS_OK);
    EXPECT_EQ(out.face_num(), faces);
    hash.Add(out.AllBits());
    results->frames[frame].Set(2, frame, MatricesOf(out));
    results->frames[frame].Set(3, frame, LandmarksOf(out));
    EXPECT_EQ(models.modelNum, faces);
    std::vector<float> meshes;
    for (uint32_t k = 0; k < faces; k++) {
      const float* vertices = models.models[k].vertices;
      const size_t count = 3 * static_cast<size_t>(models.models[k].vertexNum);
      EXPECT_TRUE(AllFinite(vertices, count));
      meshes.insert(meshes.end(), vertices, vertices + count);
    }
    hash.Add(Bits(meshes));
    results->frames[frame].Set(4, frame, meshes);
  }
  results->mask = hash.value();
}

// The frames as golden_frames.txt has them: a line with the track's name, then a line a frame.
std::string FramesText(const std::string& name, const Results& results) {
  std::ostringstream text;
  text << name << '\n' << std::hex;
  for (const FrameFigures& frame : results.frames) {
    const char* separator = "";
    for (const uint32_t hash : frame.hash) {
      text << separator << hash;
      separator = " ";
    }
    for (const auto& samples : frame.samples) {
      for (const float value : samples) text << ' ' << Bits(value);
    }
    text << '\n';
  }
  return text.str();
}

std::vector<FrameFigures> ReadFrames(const std::string& name) {
  std::ifstream file(N3DS_SOURCE_DIR "/tests/engine/golden_frames.txt");
  std::string line;
  while (std::getline(file, line) && line != name) {
  }
  std::vector<FrameFigures> frames;
  // A track's name has an underscore, a frame none.
  while (std::getline(file, line) && line.find('_') == std::string::npos) {
    std::istringstream words(line);
    words >> std::hex;
    FrameFigures frame;
    for (uint32_t& hash : frame.hash) words >> hash;
    std::vector<float> values;
    for (uint32_t bits; words >> bits;) {
      values.emplace_back();
      std::memcpy(&values.back(), &bits, sizeof(bits));
    }
    for (size_t i = 0; i < values.size(); i++) frame.samples[i / 4].push_back(values[i]);
    frames.push_back(frame);
  }
  return frames;
}

// Where each figure starts to differ and by how much.
std::string Differences(const std::vector<FrameFigures>& was, const std::vector<FrameFigures>& is) {
  std::ostringstream text;
  if (was.size() != is.size()) {
    text << is.size() << " frames, golden_frames.txt has " << was.size() << '\n';
    return text.str();
  }
  for (size_t figure = 0; figure < kFigureCount; figure++) {
    size_t differing = 0, first = 0;
    std::ostringstream sampled;
    float largest = 0;
    for (size_t frame = 0; frame < is.size(); frame++) {
      if (was[frame].hash[figure] == is[frame].hash[figure]) continue;
      if (differing++ == 0) first = frame;
      const std::vector<float>& before = was[frame].samples[figure];
      const std::vector<float>& now = is[frame].samples[figure];
      for (size_t i = 0; i < std::min(before.size(), now.size()); i++) {
        if (Bits(before[i]) == Bits(now[i])) continue;
        if (sampled.str().empty()) {
          sampled << "; first of the samples: frame " << frame << ", value "
                  << kFigures[figure].samples[i] << " was " << before[i] << ", is " << now[i]
                  << " (" << std::showpos << now[i] - before[i] << std::noshowpos << ')';
        }
        largest = std::max(largest, std::fabs(now[i] - before[i]));
      }
    }
    if (differing == 0) continue;
    text << "  " << kFigures[figure].name << ": from frame " << first << " on, " << differing
         << " of " << is.size() << " frames differ" << sampled.str();
    if (largest > 0) text << "; largest change of a sample " << largest;
    text << '\n';
  }
  return text.str();
}

Track TrackOf(const std::string& name) {
  if (name == "generated_one_101") return GenerateTrack(1, 101, 80);
  if (name == "generated_three_165") return GenerateTrack(3, 165, 80);
  if (name == "generated_five_101") return GenerateTrack(5, 101, 80);
  if (name == "generated_two_turned_165") return Turned(GenerateTrack(2, 165, 60));
  return ReadTrack(name);
}

std::vector<std::string> TrackNames() {
  std::vector<std::string> names;
  for (const Golden& golden : kGolden) {
    const std::string name = golden.name;
    if (name.rfind("step_", 0) != 0 && name.rfind("steady_", 0) != 0) names.push_back(name);
  }
  return names;
}

class GoldenTracks : public ::testing::TestWithParam<std::string> {};

TEST_P(GoldenTracks, EveryBitIsAsItWas) {
  const Track track = TrackOf(GetParam());
  Results results;
  RunRigid(track, &results);
  RunMask(track, &results);
  const Golden found = {GetParam().c_str(), results.rigid, results.mask};
  Report(found, FramesText(GetParam(), results));
  EXPECT_EQ(found, GoldenOf(GetParam())) << Differences(ReadFrames(GetParam()), results.frames);
}

TEST_P(GoldenTracks, EveryBitOfTheSteadyTrackerIsAsItWas) {
  const Track track = TrackOf(GetParam());
  const std::string name = "steady_" + GetParam();
  Results results;
  RunRigid(track, &results, N3DS_TRACKER_STEADY);
  RunMask(track, &results, N3DS_TRACKER_STEADY);
  const Golden found = {name.c_str(), results.rigid, results.mask};
  Report(found);
  EXPECT_EQ(found, GoldenOf(name));
}

INSTANTIATE_TEST_SUITE_P(, GoldenTracks, ::testing::ValuesIn(TrackNames()),
                         [](const auto& name) { return name.param; });

// Otherwise a failure could not say where.
TEST_P(GoldenTracks, FramesOnFileAreThoseOfTheTrack) {
  EXPECT_EQ(ReadFrames(GetParam()).size(), TrackOf(GetParam()).frames.size());
}

TEST(TurnedTracks, AreTheSameTracksDeliveredOtherwise) {
  Results upright, turned;
  RunRigid(GenerateTrack(2, 165, 20), &upright);
  RunRigid(Turned(GenerateTrack(2, 165, 20)), &turned);
  EXPECT_EQ(turned.rigid, upright.rigid);
}

}  // namespace
}  // namespace n3ds::testing
