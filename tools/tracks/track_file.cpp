// SPDX-License-Identifier: MIT
#include "tracks/track_file.h"

#include <algorithm>
#include <cmath>
#include <iostream>
#include <limits>
#include <nlohmann/json.hpp>
#include <set>
#include <sstream>
#include <utility>

namespace n3ds::tool {
namespace {

using nlohmann::json;

// Where the reader stands; every complaint goes through it so that none lacks file and line.
class Place {
 public:
  explicit Place(std::string file) : file_(std::move(file)) {}
  void NextLine() { ++line_; }

  [[noreturn]] void Fail(const std::string& sentence) const {
    throw TrackError(file_ + ":" + std::to_string(line_) + ": " + sentence);
  }

 private:
  std::string file_;
  std::size_t line_ = 0;
};

// A value in a message: short, and never more than one line.
std::string Shown(const json& value) {
  std::string text = value.dump(-1, ' ', true, json::error_handler_t::replace);
  constexpr std::size_t kLongest = 40;
  if (text.size() > kLongest) text = text.substr(0, kLongest) + "...";
  return text;
}

const json& Field(const Place& place, const json& object, const char* name) {
  const auto found = object.find(name);
  if (found == object.end()) place.Fail(std::string("field \"") + name + "\" is missing");
  return *found;
}

// An integer within [low, high]; 3.0 is not one.
std::int64_t Whole(const Place& place, const json& value, const std::string& what, std::int64_t low,
                   std::int64_t high) {
  if (!value.is_number_integer()) {
    place.Fail(what + " is " + Shown(value) + ", expected an integer");
  }
  const bool too_large =
      value.is_number_unsigned() && value.get<std::uint64_t>() > static_cast<std::uint64_t>(high);
  if (too_large || value.get<std::int64_t>() < low || value.get<std::int64_t>() > high) {
    place.Fail(what + " is " + Shown(value) + ", outside " + std::to_string(low) + " to " +
               std::to_string(high));
  }
  return value.get<std::int64_t>();
}

double Number(const Place& place, const json& value, const std::string& what) {
  if (!value.is_number()) place.Fail(what + " is " + Shown(value) + ", expected a number");
  const double number = value.get<double>();
  if (!std::isfinite(number)) place.Fail(what + " is not a finite number");
  return number;
}

std::string Text(const Place& place, const json& value, const std::string& what) {
  if (!value.is_string()) place.Fail(what + " is " + Shown(value) + ", expected a string");
  return value.get<std::string>();
}

std::optional<double> OptionalNumber(const Place& place, const json& object, const char* name,
                                     double low) {
  const auto found = object.find(name);
  if (found == object.end()) return std::nullopt;
  const std::string what = std::string("\"") + name + "\"";
  const double number = Number(place, *found, what);
  if (number < low) {
    place.Fail(what + " is " + Shown(*found) + ", expected at least " +
               std::to_string(static_cast<int>(low)));
  }
  return number;
}

const json& List(const Place& place, const json& value, const std::string& what) {
  if (!value.is_array()) place.Fail(what + " is " + Shown(value) + ", expected an array");
  return value;
}

std::vector<double> Numbers(const Place& place, const json& value, const std::string& what,
                            std::size_t count) {
  List(place, value, what);
  if (value.size() != count) {
    place.Fail(what + " has " + std::to_string(value.size()) + " numbers, expected " +
               std::to_string(count));
  }
  std::vector<double> numbers;
  numbers.reserve(count);
  for (const json& item : value) numbers.push_back(Number(place, item, "a number of " + what));
  return numbers;
}

// How deep arrays and objects lie in each other.
std::size_t Nesting(const std::string& line) {
  std::size_t depth = 0;
  std::size_t deepest = 0;
  bool in_string = false;
  for (std::size_t i = 0; i < line.size(); ++i) {
    const char letter = line[i];
    if (letter == '"') in_string = !in_string;
    if (letter == '\\') ++i;  // what it escapes
    if (in_string) continue;
    if (letter == '[' || letter == '{') deepest = std::max(deepest, ++depth);
    if ((letter == ']' || letter == '}') && depth > 0) --depth;
  }
  return deepest;
}

json ParseLine(const Place& place, const std::string& line) {
  if (line.find_first_not_of(" \t\r") == std::string::npos) place.Fail("the line is empty");
  // Values are shown and released by recursion, which a hostile line would let overflow the stack.
  if (Nesting(line) > kMaxTrackNesting) {
    place.Fail("nested more than " + std::to_string(kMaxTrackNesting) + " levels deep");
  }
  json value;
  try {
    value = json::parse(line);
  } catch (const json::parse_error& error) {
    place.Fail("not valid JSON (at character " + std::to_string(error.byte) + ")");
  } catch (const json::exception&) {
    place.Fail("not valid JSON (a number is too large)");
  }
  if (!value.is_object()) place.Fail("the line is " + Shown(value) + ", expected an object");
  return value;
}

TrackHeader ParseHeader(const Place& place, const json& object) {
  const auto format = object.find("format");
  if (format == object.end() || *format != "face-track") {
    place.Fail("not the header of a landmark track (\"format\":\"face-track\" is missing)");
  }
  const std::int64_t version =
      Whole(place, Field(place, object, "version"), "\"version\"",
            std::numeric_limits<std::int64_t>::min(), std::numeric_limits<std::int64_t>::max());
  if (version != 1) place.Fail("unsupported version " + std::to_string(version) + " (expected 1)");

  const auto whole = [&](const char* name, std::int64_t low, std::int64_t high) {
    const std::string what = std::string("\"") + name + "\"";
    return static_cast<int>(Whole(place, Field(place, object, name), what, low, high));
  };
  TrackHeader header;
  header.width = whole("width", 1, kMaxTrackImageSize);
  header.height = whole("height", 1, kMaxTrackImageSize);
  header.fps = Number(place, Field(place, object, "fps"), "\"fps\"");
  if (header.fps <= 0) place.Fail("\"fps\" is not positive");
  header.landmarks = whole("landmarks", 0, 100000);
  if (header.landmarks != N3DS_LANDMARKS_101 && header.landmarks != N3DS_LANDMARKS_165) {
    place.Fail("\"landmarks\" is " + std::to_string(header.landmarks) + ", expected 101 or 165");
  }
  header.degree = whole("degree", -100000, 100000);
  if (header.degree % 90 != 0 || header.degree < 0 || header.degree > 270) {
    place.Fail("\"degree\" is " + std::to_string(header.degree) + ", expected 0, 90, 180 or 270");
  }
  header.mirror = whole("mirror", 0, 1);
  header.source = Text(place, Field(place, object, "source"), "\"source\"");
  if (object.contains("title")) header.title = Text(place, object["title"], "\"title\"");
  header.focal = OptionalNumber(place, object, "focal", 1.0);
  header.noise_px = OptionalNumber(place, object, "noise_px", 0.0);
  header.noise_rho = OptionalNumber(place, object, "noise_rho", -1.0);
  return header;
}

// Rows of unit length at right angles, and not a mirror image. The tolerance leaves room for
// rotations written with four digits.
bool IsRotation(const std::array<double, 9>& r) {
  constexpr double kTolerance = 1e-3;
  for (std::size_t a = 0; a < 3; ++a) {
    for (std::size_t b = a; b < 3; ++b) {
      double dot = 0;
      for (std::size_t i = 0; i < 3; ++i) dot += r[3 * a + i] * r[3 * b + i];
      if (std::abs(dot - (a == b ? 1.0 : 0.0)) > kTolerance) return false;
    }
  }
  const double det = r[0] * (r[4] * r[8] - r[5] * r[7]) - r[1] * (r[3] * r[8] - r[5] * r[6]) +
                     r[2] * (r[3] * r[7] - r[4] * r[6]);
  return det > 0;
}

TrackTruth ParseTruth(const Place& place, const json& object, const TrackHeader& header) {
  if (!object.is_object()) place.Fail("\"truth\" is " + Shown(object) + ", expected an object");
  if (!header.focal) place.Fail("a face has \"truth\" but the header has no \"focal\"");
  TrackTruth truth;
  const auto rotation = Numbers(place, Field(place, object, "rotation"), "\"rotation\"", 9);
  std::copy(rotation.begin(), rotation.end(), truth.rotation.begin());
  if (!IsRotation(truth.rotation)) place.Fail("\"rotation\" is not a rotation matrix");
  const auto translation =
      Numbers(place, Field(place, object, "translation"), "\"translation\"", 3);
  std::copy(translation.begin(), translation.end(), truth.translation.begin());
  if (truth.translation[2] <= 0) place.Fail("\"translation\" puts the head behind the camera");
  if (object.contains("points3d")) {
    truth.points3d = Numbers(place, object["points3d"], "\"points3d\"",
                             3 * static_cast<std::size_t>(header.landmarks));
  }
  return truth;
}

// A landmark's coordinate, rounded to integer pixels; `rounded` counts the fractions.
std::int32_t Coordinate(const Place& place, const json& value, const std::string& what,
                        std::size_t& rounded) {
  constexpr std::int32_t kLow = std::numeric_limits<std::int32_t>::min();
  constexpr std::int32_t kHigh = std::numeric_limits<std::int32_t>::max();
  if (value.is_number_integer()) {
    return static_cast<std::int32_t>(Whole(place, value, what, kLow, kHigh));
  }
  const double exact = Number(place, value, what);
  const double pixel = std::floor(exact + 0.5);
  if (pixel < kLow || pixel > kHigh) {
    place.Fail(what + " is " + Shown(value) + ", outside " + std::to_string(kLow) + " to " +
               std::to_string(kHigh));
  }
  if (pixel != exact) ++rounded;
  return static_cast<std::int32_t>(pixel);
}

TrackFace ParseFace(const Place& place, const json& object, const TrackHeader& header,
                    std::size_t& rounded) {
  if (!object.is_object()) place.Fail("a face is " + Shown(object) + ", expected an object");
  TrackFace face;
  face.id =
      Whole(place, Field(place, object, "id"), "a face's \"id\"",
            std::numeric_limits<std::int32_t>::min(), std::numeric_limits<std::int32_t>::max());
  const std::string points_name = "\"points\" of face " + std::to_string(face.id);
  const json& points = List(place, Field(place, object, "points"), points_name);
  const std::size_t expected = 2 * static_cast<std::size_t>(header.landmarks);
  if (points.size() != expected) {
    place.Fail(points_name + " has " + std::to_string(points.size()) + " numbers, expected " +
               std::to_string(expected));
  }
  face.points.reserve(expected);
  for (const json& item : points) {
    face.points.push_back(Coordinate(place, item, "a number of " + points_name, rounded));
  }
  if (object.contains("truth")) face.truth = ParseTruth(place, object["truth"], header);
  return face;
}

TrackFrame ParseFrame(const Place& place, const json& object, const TrackHeader& header,
                      std::size_t& rounded) {
  TrackFrame frame;
  frame.number = Whole(place, Field(place, object, "frame"), "\"frame\"", 0,
                       std::numeric_limits<std::int32_t>::max());
  const json& faces = List(place, Field(place, object, "faces"), "\"faces\"");
  if (faces.size() > kMaxTrackFaces) {
    place.Fail("a frame has " + std::to_string(faces.size()) + " faces (at most " +
               std::to_string(kMaxTrackFaces) + ")");
  }
  std::set<std::int64_t> ids;
  for (const json& item : faces) {
    frame.faces.push_back(ParseFace(place, item, header, rounded));
    if (!ids.insert(frame.faces.back().id).second) {
      place.Fail("face " + std::to_string(frame.faces.back().id) + " appears twice in a frame");
    }
  }
  return frame;
}

// As std::getline, but refuses to fill the memory with a file that is no text.
bool ReadLine(std::istream& in, const Place& place, std::string& line) {
  line.clear();
  std::streambuf* buffer = in.rdbuf();
  for (;;) {
    int c = 0;
    try {
      c = buffer->sbumpc();
    } catch (const std::ios_base::failure&) {
      place.Fail("the line cannot be read");
    }
    if (c == std::char_traits<char>::eof()) {
      in.setstate(std::ios::eofbit);
      return !line.empty();
    }
    if (c == '\n') return true;
    if (line.size() == kMaxTrackLine) place.Fail("the line is longer than a frame can be");
    line.push_back(static_cast<char>(c));
  }
}

// Rounded to multiples of 1 / per_unit, so that the shortest form of each double is short.
template <typename Doubles>
std::vector<double> Rounded(const Doubles& values, double per_unit) {
  std::vector<double> rounded;
  rounded.reserve(values.size());
  for (const double value : values) rounded.push_back(std::round(value * per_unit) / per_unit);
  return rounded;
}

}  // namespace

bool Track::HasTruth() const {
  bool any = false;
  for (const TrackFrame& frame : frames) {
    for (const TrackFace& face : frame.faces) {
      if (!face.truth) return false;
      any = true;
    }
  }
  return any && header.focal.has_value();
}

std::size_t Track::FaceCount() const {
  std::size_t count = 0;
  for (const TrackFrame& frame : frames) count += frame.faces.size();
  return count;
}

std::size_t Track::MostFaces() const {
  std::size_t most = 0;
  for (const TrackFrame& frame : frames) most = std::max(most, frame.faces.size());
  return most;
}

std::string TrackName(const std::string& path) {
  std::string name = path.substr(path.find_last_of('/') + 1);
  const std::string ending = ".track.jsonl";
  if (name.size() > ending.size() &&
      name.compare(name.size() - ending.size(), ending.size(), ending) == 0) {
    name.resize(name.size() - ending.size());
  }
  return name;
}

struct TrackReader::State {
  std::istream& in;
  Place place;
  std::string line;
  TrackHeader header;
  std::int64_t last_number = -1;  // of the frame before; frame numbers are not negative
  std::size_t rounded = 0;
};

TrackReader::TrackReader(std::istream& in, const std::string& name)
    : name_(name), state_(new State{in, Place(name), {}, {}}) {
  state_->place.NextLine();
  if (!ReadLine(in, state_->place, state_->line)) throw TrackError(name + ": the file is empty");
  state_->header = ParseHeader(state_->place, ParseLine(state_->place, state_->line));
}

TrackReader::~TrackReader() = default;

const TrackHeader& TrackReader::header() const { return state_->header; }

std::size_t TrackReader::rounded_coordinates() const { return state_->rounded; }

std::optional<TrackFrame> TrackReader::Next() {
  const Place& place = state_->place;
  state_->place.NextLine();
  if (!ReadLine(state_->in, place, state_->line)) {
    if (state_->last_number < 0) throw TrackError(name_ + ": the file contains no frames");
    return std::nullopt;
  }
  TrackFrame frame =
      ParseFrame(place, ParseLine(place, state_->line), state_->header, state_->rounded);
  if (frame.number <= state_->last_number) {
    place.Fail("frame " + std::to_string(frame.number) + " follows frame " +
               std::to_string(state_->last_number));
  }
  state_->last_number = frame.number;
  return frame;
}

Track ReadTrack(std::istream& in, const std::string& name) {
  TrackReader reader(in, name);
  Track track;
  track.name = TrackName(name);
  track.header = reader.header();
  while (std::optional<TrackFrame> frame = reader.Next()) {
    track.frames.push_back(std::move(*frame));
  }
  track.rounded_coordinates = reader.rounded_coordinates();
  return track;
}

TrackInput::TrackInput(const std::string& path)
    : name_(path == "-" ? "standard input" : path), in_(path == "-" ? &std::cin : &file_) {
  if (path == "-") return;
  file_.open(path, std::ios::binary);
  // A folder opens, but nothing can be read from it.
  if (!file_ || (file_.peek() == std::char_traits<char>::eof() && file_.bad())) {
    throw TrackError(path + ": the file cannot be opened");
  }
}

Track ReadTrackFile(const std::string& path) {
  TrackInput input(path);
  return ReadTrack(input.stream(), input.name());
}

void WriteTrack(std::ostream& out, const Track& track) {
  const TrackHeader& h = track.header;
  nlohmann::ordered_json header = {{"format", "face-track"}, {"version", 1},
                                   {"width", h.width},       {"height", h.height},
                                   {"fps", h.fps},           {"landmarks", h.landmarks},
                                   {"degree", h.degree},     {"mirror", h.mirror}};
  if (h.focal) header["focal"] = *h.focal;
  if (h.noise_px) header["noise_px"] = *h.noise_px;
  if (h.noise_rho) header["noise_rho"] = *h.noise_rho;
  if (!h.title.empty()) header["title"] = h.title;
  header["source"] = h.source;
  out << header.dump() << '\n';

  constexpr double kPerUnit = 1e6;
  constexpr double kPerMillimetre = 1e3;
  for (const TrackFrame& frame : track.frames) {
    nlohmann::ordered_json faces = nlohmann::ordered_json::array();
    for (const TrackFace& face : frame.faces) {
      nlohmann::ordered_json item = {{"id", face.id}, {"points", face.points}};
      if (face.truth) {
        nlohmann::ordered_json truth;
        truth["rotation"] = Rounded(face.truth->rotation, kPerUnit);
        truth["translation"] = Rounded(face.truth->translation, kPerMillimetre);
        if (!face.truth->points3d.empty()) {
          truth["points3d"] = Rounded(face.truth->points3d, kPerMillimetre);
        }
        item["truth"] = truth;
      }
      faces.push_back(item);
    }
    out << nlohmann::ordered_json{{"frame", frame.number}, {"faces", faces}}.dump() << '\n';
  }
}

}  // namespace n3ds::tool
