// SPDX-License-Identifier: MIT
// Landmark tracks: what a face detector saw, frame by frame, as JSON lines (*.track.jsonl).
//
// Line 1 is the header, every further line one frame; docs in examples/tracks/README.md. The reader
// trusts nothing: whatever is wrong with a file is reported as "FILE:LINE: one sentence".
//
// Frames: points are integer pixels of the image as delivered, before it is un-mirrored and turned.
// Fractions are rounded to floor(x + 0.5), because the engine takes integers.
// Truth is in the upright, unmirrored camera frame (x right, y down, z forward, mm) and its
// landmark numbering; it takes the head frame (x to the image right, y up, z out of the face) to
// the camera.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <fstream>
#include <istream>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include "norvale_3d_sticker_engine.h"
#include "support/error.h"

namespace n3ds::tool {

constexpr std::size_t kMaxTrackFaces = N3DS_MAX_FACES;
constexpr int kMaxTrackImageSize = 16384;       // pixels a side; beyond it a header is damaged
constexpr std::size_t kMaxTrackLine = 1 << 20;  // bytes; the longest real line has about 60,000
constexpr std::size_t kMaxTrackNesting = 64;    // arrays and objects; a frame has 5 levels

struct TrackTruth {
  std::array<double, 9> rotation{};     // row-major, head to camera
  std::array<double, 3> translation{};  // mm
  std::vector<double> points3d;         // empty, or x, y, z per landmark in the camera frame, mm
};

struct TrackFace {
  std::int64_t id = 0;               // the person, the same over the file
  std::vector<std::int32_t> points;  // x, y per landmark
  std::optional<TrackTruth> truth;
};

struct TrackFrame {
  std::int64_t number = 0;
  std::vector<TrackFace> faces;  // in any order, at most kMaxTrackFaces
};

struct TrackHeader {
  int width = 0;  // of the image as delivered
  int height = 0;
  double fps = 0;
  int landmarks = 0;  // N3DS_LANDMARKS_101 or N3DS_LANDMARKS_165
  int degree = 0;     // 0, 90, 180 or 270, clockwise turn of the delivered image
  int mirror = 0;     // 1 for a mirrored image
  std::string source;
  std::string title;
  std::optional<double> focal;      // true focal length in pixels; needed by truth
  std::optional<double> noise_px;   // standard deviation of the noise a coordinate
  std::optional<double> noise_rho;  // its correlation from frame to frame

  bool turned() const { return degree == 90 || degree == 270; }
  int upright_width() const { return turned() ? height : width; }
  int upright_height() const { return turned() ? width : height; }
};

struct Track {
  std::string name;  // file name without folder and .track.jsonl
  TrackHeader header;
  std::vector<TrackFrame> frames;  // at least one
  std::size_t rounded_coordinates = 0;

  bool HasTruth() const;          // every face has truth and the focal length is known
  std::size_t FaceCount() const;  // face entries over all frames
  std::size_t MostFaces() const;  // in one frame
};

// Something is wrong with a track; what() is "FILE:LINE: sentence", or "FILE: sentence" when the
// file as a whole is at fault.
class TrackError : public Error {
 public:
  using Error::Error;
};

// Reads a track frame by frame, each when its line has arrived.
class TrackReader {
 public:
  // Reads the header. `name` stands for the file in messages.
  TrackReader(std::istream& in, const std::string& name);
  ~TrackReader();
  TrackReader(const TrackReader&) = delete;
  TrackReader& operator=(const TrackReader&) = delete;

  const TrackHeader& header() const;
  // Nothing at the end of the file, which must not come before the first frame.
  std::optional<TrackFrame> Next();
  // Coordinates with a fraction so far.
  std::size_t rounded_coordinates() const;

 private:
  struct State;
  std::string name_;
  std::unique_ptr<State> state_;
};

// A file with a track, or standard input for "-".
class TrackInput {
 public:
  // Throws TrackError when it cannot be opened.
  explicit TrackInput(const std::string& path);

  std::istream& stream() { return *in_; }
  const std::string& name() const { return name_; }

 private:
  std::string name_;
  std::ifstream file_;
  std::istream* in_;
};

// The file name without folder and .track.jsonl.
std::string TrackName(const std::string& path);

// Reads a whole track.
Track ReadTrack(std::istream& in, const std::string& name);
Track ReadTrackFile(const std::string& path);

// Writes a track in the compact form in which the reader takes it: rotations to six decimals,
// lengths to a micrometre.
void WriteTrack(std::ostream& out, const Track& track);

}  // namespace n3ds::tool
