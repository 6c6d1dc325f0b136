// SPDX-License-Identifier: MIT
#include "model/face_model_file.h"

#include <fstream>

#include "support/error.h"

namespace n3ds::tool {
namespace {

// Takes little-endian numbers off the front of a buffer whose size has been checked.
class Cursor {
 public:
  explicit Cursor(const std::vector<char>& bytes) : next_(bytes.data()) {}

  std::uint8_t Byte() { return static_cast<std::uint8_t>(*next_++); }
  std::int16_t Int16() {
    const unsigned low = Byte();
    return static_cast<std::int16_t>(low | static_cast<unsigned>(Byte()) << 8);
  }
  std::int32_t Int32() {
    const std::uint32_t low = static_cast<std::uint16_t>(Int16());
    return static_cast<std::int32_t>(low | static_cast<std::uint32_t>(Int16()) << 16);
  }
  std::vector<std::int16_t> Int16s(std::size_t count) {
    std::vector<std::int16_t> values(count);
    for (std::int16_t& value : values) value = Int16();
    return values;
  }
  std::vector<std::int8_t> Int8s(std::size_t count) {
    std::vector<std::int8_t> values(count);
    for (std::int8_t& value : values) value = static_cast<std::int8_t>(Byte());
    return values;
  }

 private:
  const char* next_;
};

void CheckCount(const std::string& path, const char* what, std::int32_t count,
                std::size_t expected) {
  if (count != static_cast<std::int32_t>(expected)) {
    throw Error(path + ": the header says " + std::to_string(count) + " " + what + " instead of " +
                std::to_string(expected));
  }
}

}  // namespace

FaceModelFile ReadFaceModelFile(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) throw Error(path + ": the face model cannot be opened");
  // One byte more than a model has tells a longer file, whatever its length.
  std::vector<char> bytes(N3DS_FACE_MODEL_BYTES + 1);
  in.read(bytes.data(), static_cast<std::streamsize>(bytes.size()));
  const auto size = static_cast<std::size_t>(in.gcount());
  if (in.bad()) throw Error(path + ": the face model cannot be read");
  if (size != N3DS_FACE_MODEL_BYTES) {
    const std::string found = size > N3DS_FACE_MODEL_BYTES ? "more" : std::to_string(size);
    throw Error(path + ": a face model has " + std::to_string(N3DS_FACE_MODEL_BYTES) +
                " bytes, this file has " + found);
  }
  Cursor cursor(bytes);
  CheckCount(path, "vertices", cursor.Int32(), kModelVertices);
  CheckCount(path, "identity components", cursor.Int32(), kModelIdentities);
  CheckCount(path, "expression components", cursor.Int32(), kModelExpressions);
  FaceModelFile model;
  model.mean = cursor.Int16s(kModelCoordinates);
  model.identity = cursor.Int16s(kModelIdentities * kModelCoordinates);
  model.expression = cursor.Int16s(kModelExpressions * kModelCoordinates);
  model.interaction = cursor.Int8s(kModelIdentities * kModelExpressions * kModelCoordinates);
  return model;
}

Vector3 UprightPoint(const std::int16_t* stored) {
  const double x = stored[0] / 256.0;
  const double y = stored[1] / 256.0;
  const double z = stored[2] / 256.0;
  return {x, kTiltCosine * y - kTiltSine * z, kTiltSine * y + kTiltCosine * z};
}

Points MeanFace(const FaceModelFile& model) {
  Points points(kModelVertices);
  for (std::size_t v = 0; v < kModelVertices; ++v) points[v] = UprightPoint(&model.mean[3 * v]);
  return points;
}

}  // namespace n3ds::tool
