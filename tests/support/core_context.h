// SPDX-License-Identifier: MIT
// A core context with the shipped model, and the records of a frame for it.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "core/tracking_context.h"
#include "norvale_3d_sticker_core.h"
#include "support/bits.h"
#include "support/face_scene.h"

namespace n3ds::testing {

// A core context, released at the end of its scope.
class Core {
 public:
  explicit Core(MHandle memory = nullptr) { EXPECT_EQ(N3DS_Init(memory, &handle_), N3DS_OK); }
  ~Core() { EXPECT_EQ(N3DS_UnInit(handle_), N3DS_OK); }
  Core(const Core&) = delete;
  Core& operator=(const Core&) = delete;

  // With the shipped model.
  static std::unique_ptr<Core> Ready(MHandle memory = nullptr) {
    auto core = std::make_unique<Core>(memory);
    EXPECT_EQ(N3DS_LoadFaceHouse(core->handle(), ModelBytes().data(), ModelBytes().size()),
              N3DS_OK);
    return core;
  }
  void* handle() const { return handle_; }
  TrackingContext& context() const { return *ContextOf(handle_); }

 private:
  void* handle_ = nullptr;
};

// The landmark records of a frame, each face's points in an allocation of exactly its size. The
// points are copies: workers smooth them in place.
class FaceRecords {
 public:
  explicit FaceRecords(const std::vector<std::vector<int32_t>>& faces) {
    for (const auto& face : faces) {
      points_.emplace_back(new int32_t[face.size()]);
      std::copy(face.begin(), face.end(), points_.back().get());
      records_.push_back({points_.back().get(), static_cast<uint32_t>(face.size() / 2)});
    }
  }
  N3DS_LANDMARK* get() { return records_.data(); }
  N3DS_LANDMARK& operator[](size_t k) { return records_[k]; }
  int32_t count() const { return static_cast<int32_t>(records_.size()); }
  std::vector<int32_t> points(size_t k) const {
    return {records_[k].points, records_[k].points + 2 * static_cast<size_t>(records_[k].count)};
  }

 private:
  std::vector<std::unique_ptr<int32_t[]>> points_;
  std::vector<N3DS_LANDMARK> records_;
};

}  // namespace n3ds::testing
