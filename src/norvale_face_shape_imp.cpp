// SPDX-License-Identifier: MIT
#include "norvale_face_shape_imp.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>

#include "core/model_tables.h"

namespace {

struct VersionTexts {
  char version[32];
  char date[16];
  char notice[48];
};
constexpr VersionTexts kVersionTexts = {"Norvale_3DSticker_1.1.12021.63", "06/19/2018",
                                        "Norvale 3-D sticker engine, version 1.1"};

// Reads a whole file into memory of the system heap, which the caller frees. Returns 0; 1 when the
// file cannot be read; -201.
MRESULT ReadFile(const char* path, uint8_t** bytes, size_t* size) {
  std::FILE* file = std::fopen(path, "rb");
  if (file == nullptr) return N3DS_FAILED;
  MRESULT result = N3DS_FAILED;
  long length = -1;
  if (std::fseek(file, 0, SEEK_END) == 0) length = std::ftell(file);
  // A directory can be opened, but some file systems report the largest number as its end.
  const bool has_end = length >= 0 && length < std::numeric_limits<long>::max();
  if (has_end && std::fseek(file, 0, SEEK_SET) == 0) {
    *size = static_cast<size_t>(length);
    // At least one byte: an empty file is read, for the loader to refuse; a directory of size zero
    // fails here.
    const size_t capacity = *size > 0 ? *size : 1;
    *bytes = static_cast<uint8_t*>(std::malloc(capacity));
    if (*bytes == nullptr) {
      result = N3DS_NO_MEMORY;
    } else if (std::fread(*bytes, 1, capacity, file) >= *size && std::ferror(file) == 0) {
      result = N3DS_OK;
    }
  }
  std::fclose(file);
  return result;
}

}  // namespace

MRESULT CNorvaleFaceShapeImp::Initialize(const char* path, unsigned int new_degree,
                                         unsigned int new_mirror) {
  MRESULT result = N3DS_FAILED;
  if (path != nullptr && N3DS_Init(nullptr, &core) == N3DS_OK && core != nullptr) {
    size_t size = 0;
    result = ReadFile(path, &modelBuffer, &size);
    if (result == N3DS_OK) result = N3DS_LoadFaceHouse(core, modelBuffer, size);
  }
  return FinishInitialize(result, new_degree, new_mirror);
}

MRESULT CNorvaleFaceShapeImp::InitializeEx(const unsigned char* data, unsigned int size,
                                           unsigned int new_degree, unsigned int new_mirror) {
  MRESULT result = N3DS_FAILED;
  if (data != nullptr && size != 0 && N3DS_Init(nullptr, &core) == N3DS_OK && core != nullptr) {
    modelBuffer = static_cast<uint8_t*>(std::malloc(size));
    if (modelBuffer == nullptr) {
      result = N3DS_NO_MEMORY;
    } else {
      std::memcpy(modelBuffer, data, size);
      result = N3DS_LoadFaceHouse(core, modelBuffer, size);
    }
  }
  return FinishInitialize(result, new_degree, new_mirror);
}

MRESULT CNorvaleFaceShapeImp::FinishInitialize(MRESULT result, unsigned int new_degree,
                                               unsigned int new_mirror) {
  if (result != N3DS_OK) {
    UnInitalize();
    return result;
  }
  SetDegreeAndMirror(new_degree, new_mirror);
  static_assert(sizeof(maskTexCoords) == sizeof(n3ds::kCornerTextureCoordinates));
  std::memcpy(maskTexCoords, n3ds::kCornerTextureCoordinates.data(), sizeof(maskTexCoords));
  return N3DS_OK;
}

MRESULT CNorvaleFaceShapeImp::UnInitalize() {
  extensions_.Release();
  if (core != nullptr) {
    N3DS_UnInit(core);
    core = nullptr;
  }
  if (modelBuffer != nullptr) {
    std::free(modelBuffer);
    modelBuffer = nullptr;
  }
  return N3DS_OK;
}

void CNorvaleFaceShapeImp::SetDegreeAndMirror(unsigned int new_degree, unsigned int new_mirror) {
  degree = new_degree;
  mirror = new_mirror;
}

const Norvale_3DSticker_Version* CNorvaleFaceShapeImp::GetVersion() {
  static VersionTexts texts = kVersionTexts;
  static constexpr Norvale_3DSticker_Version kVersion = {
      1, 1, 12021, 63, texts.version, texts.date, texts.notice};
  static Norvale_3DSticker_Version version = kVersion;
  // Restores what a host has written into, and writes nothing otherwise: calls from several threads
  // do not race.
  if (std::memcmp(&texts, &kVersionTexts, sizeof(texts)) != 0) texts = kVersionTexts;
  if (std::memcmp(&version, &kVersion, sizeof(version)) != 0) version = kVersion;
  return &version;
}
