// SPDX-License-Identifier: MIT
// What the tests of the engine interface share: engines and output records that clean up after
// themselves, and upright landmarks as a turned or mirrored camera would deliver them.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <memory>
#include <utility>
#include <vector>

#include "norvale_3d_sticker_engine.h"
#include "support/bits.h"
#include "support/face_scene.h"

namespace n3ds::testing {

using Points = std::vector<__tag_point>;

// x, y, x, y, ... as the core's tests have them.
inline Points ToPoints(const std::vector<int32_t>& coordinates) {
  Points points;
  for (size_t i = 0; i + 1 < coordinates.size(); i += 2) {
    points.push_back({coordinates[i], coordinates[i + 1]});
  }
  return points;
}

class Engine {
 public:
  Engine() : handle_(Norvale_3DSticker_CreateEngine()) {}
  ~Engine() { Norvale_3DSticker_DestroyEngine(handle_); }
  Engine(const Engine&) = delete;
  Engine& operator=(const Engine&) = delete;

  // With the shipped model.
  static std::unique_ptr<Engine> Ready(uint32_t degree = 0, uint32_t mirror = 0) {
    auto engine = std::make_unique<Engine>();
    EXPECT_EQ(engine->Initialize(degree, mirror), N3DS_OK);
    return engine;
  }
  MRESULT Initialize(uint32_t degree = 0, uint32_t mirror = 0) const {
    return Norvale_3DSticker_Initialize(handle_, ModelPath().c_str(), degree, mirror);
  }
  void* handle() const { return handle_; }

 private:
  void* handle_;
};

// The output record of a rigid frame, with landmark buffers of exactly the size a host must give.
// Everything starts as a pattern, to see what was written.
class RigidOutput {
 public:
  static constexpr float kUntouched = -12345.0f;

  explicit RigidOutput(size_t landmarks, size_t faces = N3DS_MAX_FACES) {
    std::memset(static_cast<void*>(&record_), 0x5A, sizeof(record_));
    for (size_t k = 0; k < faces; k++) {
      buffers_.emplace_back(new float[3 * landmarks]);
      std::fill_n(buffers_.back().get(), 3 * landmarks, kUntouched);
      record_.faces[k].landmarks3D = buffers_.back().get();
    }
    size_ = 3 * landmarks;
    before_ = record_;
  }
  Norvale_3DSticker_Matrix_Array* get() { return &record_; }
  const Norvale_3DSticker_Face_Matrix& face(size_t k) const { return record_.faces[k]; }
  uint32_t face_num() const { return record_.faceNum; }
  std::vector<float> landmarks(size_t k) const {
    return {buffers_[k].get(), buffers_[k].get() + size_};
  }
  // Whether nothing at all has been written.
  bool Untouched() const {
    return std::memcmp(&record_, &before_, sizeof(record_)) == 0 && FacesUntouchedFrom(0);
  }
  // Whether entries k, k + 1, ... have not been written, nor any pointer.
  bool FacesUntouchedFrom(size_t k) const {
    for (size_t i = 0; i < N3DS_FACE_CAPACITY; i++) {
      if (record_.faces[i].landmarks3D != before_.faces[i].landmarks3D) return false;
      if (i < k) continue;
      if (std::memcmp(&record_.faces[i], &before_.faces[i], sizeof(record_.faces[i])) != 0) {
        return false;
      }
      if (i >= buffers_.size()) continue;
      const float* buffer = buffers_[i].get();
      if (std::count(buffer, buffer + size_, kUntouched) != static_cast<std::ptrdiff_t>(size_)) {
        return false;
      }
    }
    return true;
  }
  // All bits of the first faces' matrices and landmarks.
  std::vector<uint32_t> AllBits() const {
    std::vector<uint32_t> all;
    for (uint32_t k = 0; k < record_.faceNum; k++) {
      const Norvale_3DSticker_Face_Matrix& face = record_.faces[k];
      for (const float* matrix : {face.projectionMatrix, face.viewMatrix, face.modelMatrix}) {
        const std::vector<uint32_t> bits = Bits(matrix, 16);
        all.insert(all.end(), bits.begin(), bits.end());
      }
      const std::vector<uint32_t> bits = Bits(buffers_[k], size_);
      all.insert(all.end(), bits.begin(), bits.end());
    }
    return all;
  }

 private:
  Norvale_3DSticker_Matrix_Array record_;
  Norvale_3DSticker_Matrix_Array before_;
  std::vector<std::unique_ptr<float[]>> buffers_;
  size_t size_;
};

// A rigid frame of faces with `landmarks` points each.
inline MRESULT Process(const Engine& engine, const NSVL_OFFSCREEN& image, Points points,
                       uint32_t landmarks, RigidOutput* out) {
  NSVL_OFFSCREEN copy = image;
  const auto faces = static_cast<uint32_t>(points.size() / std::max(landmarks, 1u));
  return Norvale_3DSticker_Process(engine.handle(), &copy, faces, landmarks,
                                   points.empty() ? nullptr : points.data(), nullptr, nullptr,
                                   out->get());
}

// Which of 165 landmarks takes each landmark's place in a mirror, read off the mean face, whose
// midline is x = 0: the one nearest to the landmark's mirror image. Landmarks from 101 on are a set
// of their own, because they repeat the pupils.
inline std::vector<size_t> PartnersOnTheMeanFace() {
  const std::vector<Vec3> points = LandmarkPoints(ModelShape(), 165);
  std::vector<size_t> partners;
  for (size_t i = 0; i < points.size(); i++) {
    const auto gap = [&](size_t j) {
      const double x = points[i].x + points[j].x, y = points[i].y - points[j].y,
                   z = points[i].z - points[j].z;
      return x * x + y * y + z * z;
    };
    size_t nearest = i < 101 ? 0 : 101;
    for (size_t j = nearest; j < (i < 101 ? 101 : points.size()); j++) {
      if (gap(j) < gap(nearest)) nearest = j;
    }
    partners.push_back(nearest);
  }
  return partners;
}

// The same among the first `count`; a landmark whose partner is not among them stays.
inline std::vector<size_t> MirrorPartners(size_t count) {
  static const std::vector<size_t> all = PartnersOnTheMeanFace();
  std::vector<size_t> partners;
  for (size_t i = 0; i < count; i++) partners.push_back(all[i] < count ? all[i] : i);
  return partners;
}

// One face's upright landmarks as a camera delivers them whose image has to be turned clockwise
// by `degree`, and is mirrored or not; width and height are those of the upright image.
inline Points Deliver(const Points& upright, uint32_t degree, bool mirrored, int32_t width,
                      int32_t height) {
  const bool quarter = degree == 90 || degree == 270;
  const int32_t delivered_width = quarter ? height : width;
  const std::vector<size_t> partner = MirrorPartners(upright.size());
  Points delivered(upright.size());
  for (size_t i = 0; i < upright.size(); i++) {
    __tag_point p = upright[i];
    if (degree == 90) {
      p = {p.y, width - p.x};
    } else if (degree == 180) {
      p = {width - p.x, height - p.y};
    } else if (degree == 270) {
      p = {height - p.y, p.x};
    }
    if (mirrored) p.x = delivered_width - p.x;
    delivered[mirrored ? partner[i] : i] = p;
  }
  return delivered;
}

}  // namespace n3ds::testing
