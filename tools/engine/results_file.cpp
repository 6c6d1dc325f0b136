// SPDX-License-Identifier: MIT
#include "engine/results_file.h"

#include <charconv>
#include <cmath>
#include <cstddef>

namespace n3ds::tool {
namespace {

template <typename Floats>
void WriteFloats(std::ostream& out, const char* name, const Floats& values) {
  out << ",\"" << name << "\":[";
  const char* separator = "";
  for (const float value : values) {
    out << separator;
    separator = ",";
    if (!std::isfinite(value)) {
      out << "null";
      continue;
    }
    char digits[32];
    const auto end = std::to_chars(digits, digits + sizeof digits, value).ptr;
    out.write(digits, end - digits);
  }
  out << ']';
}

}  // namespace

void WriteResultsHeader(std::ostream& out, const TrackHeader& header, const std::string& mode) {
  out << "{\"format\":\"face-track-results\",\"version\":1,\"width\":" << header.upright_width()
      << ",\"height\":" << header.upright_height() << ",\"landmarks\":" << header.landmarks
      << ",\"mode\":\"" << mode << "\"}\n";
}

void WriteResultsFrame(std::ostream& out, const FrameResult& frame) {
  out << "{\"frame\":" << frame.number << ",\"ok\":" << (frame.ok ? "true" : "false")
      << ",\"faces\":[";
  const char* separator = "";
  for (const FaceResult& face : frame.faces) {
    out << separator << "{\"id\":" << face.id;
    separator = ",";
    WriteFloats(out, "projection", face.projection);
    WriteFloats(out, "view", face.view);
    WriteFloats(out, "model", face.model);
    WriteFloats(out, "landmarks3d", face.landmarks3d);
    out << '}';
  }
  out << "]}\n";
}

}  // namespace n3ds::tool
