// SPDX-License-Identifier: MIT
#include "norvale_face_shape_imp.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>

#include "core/model_tables.h"

namespace {

// Reads a whole file into memory of the system heap, which the caller frees. Returns 0; 1 when the
// file cannot be read; -201.
MRESULT ReadFile(const char* path, uint8_t** bytes, size_t* size) {
  std::FILE* file = std::fopen(path, "rb");
  if (file == nullptr) return N3DS_FAILED;
  MRESULT result = N3DS_FAILED;
  long length = -1;
  if (std::fseek(file, 0, SEEK_END) == 0) length = std::ftell(file);
  // A directory can be opened, but on some file systems its end lies at the largest number.
  const bool has_end = length >= 0 && length < std::numeric_limits<long>::max();
  if (has_end && std::fseek(file, 0, SEEK_SET) == 0) {
    *size = static_cast<size_t>(length);
    // One byte at least: an empty file is read, and the loader says what it thinks of it; a
    // directory without a size shows here that it cannot be read.
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
  static char version_text[64];
  static char build_date[32];
  static char notice[128];
  static Norvale_3DSticker_Version version;
  version.major = 1;
  version.minor = 1;
  version.build = 12021;
  version.revision = 63;
  std::strcpy(version_text, "Norvale_3DSticker_1.1.12021.63");
  std::strcpy(build_date, "06/19/2018");
  std::snprintf(notice, sizeof(notice), "Norvale 3-D sticker engine, version %d.%d", 1, 1);
  version.versionText = version_text;
  version.buildDate = build_date;
  version.notice = notice;
  return &version;
}
