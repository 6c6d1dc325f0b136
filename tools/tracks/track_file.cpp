// SPDX-License-Identifier: MIT
#include "tracks/track_file.h"

#include <algorithm>
#include <cmath>
#include <fstream>
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
  std::size_t line() const { return line_; }

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

// A whole number within [low, high]. 3.0 is not one: a detector that writes fractions writes
// another format, and rounding silently would hide that.
std::int64_t Whole(const Place& place, const json& value, const std::string& what, std::int64_t low,
                   std::int64_t high) {
  if (!value.is_number_integer()) {
    place.Fail(what + " is " + Shown(value) + ", a whole number is needed");
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
  if (!value.is_number()) place.Fail(what + " is " + Shown(value) + ", a number is needed");
  const double number = value.get<double>();
  if (!std::isfinite(number)) place.Fail(what + " is not a finite number");
  return number;
}

std::string Text(const Place& place, const json& value, const std::string& what) {
  if (!value.is_string()) place.Fail(what + " is " + Shown(value) + ", a text is needed");
  return value.get<std::string>();
}

std::optional<double> OptionalNumber(const Place& place, const json& object, const char* name,
                                     double low) {
  const auto found = object.find(name);
  if (found == object.end()) return std::nullopt;
  const std::string what = std::string("\"") + name + "\"";
  const double number = Number(place, *found, what);
  if (number < low) place.Fail(what + " is " + Shown(*found) + ", below what is possible");
  return number;
}

const json& List(const Place& place, const json& value, const std::string& what) {
  if (!value.is_array()) place.Fail(what + " is " + Shown(value) + ", a list is needed");
  return value;
}

std::vector<double> Numbers(const Place& place, const json& value, const std::string& what,
                            std::size_t count) {
  List(place, value, what);
  if (value.size() != count) {
    place.Fail(what + " has " + std::to_string(value.size()) + " numbers instead of " +
               std::to_string(count));
  }
  std::vector<double> numbers;
  numbers.reserve(count);
  for (const json& item : value) numbers.push_back(Number(place, item, "a number of " + what));
  return numbers;
}

json ParseLine(const Place& place, const std::string& line) {
  if (line.find_first_not_of(" \t\r") == std::string::npos) place.Fail("the line is empty");
  json value;
  try {
    value = json::parse(line);
  } catch (const json::parse_error& error) {
    place.Fail("not valid JSON (at character " + std::to_string(error.byte) + ")");
  } catch (const json::exception&) {
    place.Fail("not valid JSON (a number is too large)");
  }
  if (!value.is_object()) place.Fail("not a JSON object but " + Shown(value));
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
  if (version != 1) place.Fail("version " + std::to_string(version) + " is not known, only 1 is");

  const auto whole = [&](const char* name, std::int64_t low, std::int64_t high) {
    const std::string what = std::string("\"") + name + "\"";
    return static_cast<int>(Whole(place, Field(place, object, name), what, low, high));
  };
  TrackHeader header;
  header.width = whole("width", 1, kMaxTrackImageSize);
  header.height = whole("height", 1, kMaxTrackImageSize);
  header.fps = Number(place, Field(place, object, "fps"), "\"fps\"");
  if (header.fps <= 0) place.Fail("\"fps\" is not above 0");
  header.landmarks = whole("landmarks", 0, 100000);
  if (header.landmarks != 101 && header.landmarks != 165) {
    place.Fail("\"landmarks\" is " + std::to_string(header.landmarks) + " instead of 101 or 165");
  }
  header.degree = whole("degree", -100000, 100000);
  if (header.degree % 90 != 0 || header.degree < 0 || header.degree > 270) {
    place.Fail("\"degree\" is " + std::to_string(header.degree) + " instead of 0, 90, 180 or 270");
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
  if (!object.is_object()) place.Fail("\"truth\" is not an object but " + Shown(object));
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

TrackFace ParseFace(const Place& place, const json& object, const TrackHeader& header) {
  if (!object.is_object()) place.Fail("a face is not an object but " + Shown(object));
  TrackFace face;
  face.id =
      Whole(place, Field(place, object, "id"), "a face's \"id\"",
            std::numeric_limits<std::int32_t>::min(), std::numeric_limits<std::int32_t>::max());
  const std::string points_name = "\"points\" of face " + std::to_string(face.id);
  const json& points = List(place, Field(place, object, "points"), points_name);
  const std::size_t expected = 2 * static_cast<std::size_t>(header.landmarks);
  if (points.size() != expected) {
    place.Fail(points_name + " has " + std::to_string(points.size()) + " numbers instead of " +
               std::to_string(expected));
  }
  face.points.reserve(expected);
  for (const json& item : points) {
    face.points.push_back(static_cast<std::int32_t>(
        Whole(place, item, "a number of " + points_name, std::numeric_limits<std::int32_t>::min(),
              std::numeric_limits<std::int32_t>::max())));
  }
  if (object.contains("truth")) face.truth = ParseTruth(place, object["truth"], header);
  return face;
}

TrackFrame ParseFrame(const Place& place, const json& object, const TrackHeader& header) {
  TrackFrame frame;
  frame.number = Whole(place, Field(place, object, "frame"), "\"frame\"", 0,
                       std::numeric_limits<std::int32_t>::max());
  const json& faces = List(place, Field(place, object, "faces"), "\"faces\"");
  if (faces.size() > kMaxTrackFaces) {
    place.Fail("a frame has " + std::to_string(faces.size()) + " faces, at most " +
               std::to_string(kMaxTrackFaces) + " are possible");
  }
  std::set<std::int64_t> ids;
  for (const json& item : faces) {
    frame.faces.push_back(ParseFace(place, item, header));
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
    const int c = buffer->sbumpc();
    if (c == std::char_traits<char>::eof()) {
      in.setstate(std::ios::eofbit);
      return !line.empty();
    }
    if (c == '\n') return true;
    if (line.size() == kMaxTrackLine) place.Fail("the line is longer than a frame can be");
    line.push_back(static_cast<char>(c));
  }
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

Track ReadTrack(std::istream& in, const std::string& name) {
  Place place(name);
  Track track;
  track.name = TrackName(name);
  std::string line;
  place.NextLine();
  if (!ReadLine(in, place, line)) throw TrackError(name + ": the file is empty");
  track.header = ParseHeader(place, ParseLine(place, line));
  for (place.NextLine(); ReadLine(in, place, line); place.NextLine()) {
    TrackFrame frame = ParseFrame(place, ParseLine(place, line), track.header);
    if (!track.frames.empty() && frame.number <= track.frames.back().number) {
      place.Fail("frame " + std::to_string(frame.number) + " follows frame " +
                 std::to_string(track.frames.back().number));
    }
    track.frames.push_back(std::move(frame));
  }
  if (in.bad()) throw TrackError(name + ": the file cannot be read to its end");
  if (track.frames.empty()) throw TrackError(name + ": there is a header but no frame");
  return track;
}

Track ReadTrackFile(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  // A folder opens, but nothing can be read from it.
  if (!in || (in.peek() == std::char_traits<char>::eof() && in.bad())) {
    throw TrackError(path + ": the file cannot be opened");
  }
  return ReadTrack(in, path);
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
