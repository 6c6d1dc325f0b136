// SPDX-License-Identifier: MIT
// Images for the tests of the image functions. Every plane is a block of its own of exactly the
// promised size, so that a sanitizer sees one byte too many.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "norvale_3d_sticker_core.h"
#include "support/random.h"

namespace n3ds::testing {

class TestImage {
 public:
  // Rows are `padding` bytes longer than their pixels; the last row has its padding too.
  TestImage(uint32_t format, int width, int height, int padding = 0) {
    descriptor_.pixelFormat = format;
    descriptor_.width = width;
    descriptor_.height = height;
    const int bytes = format == N3DS_FORMAT_BGRA32 ? 4 : format == N3DS_FORMAT_BGR24 ? 3 : 1;
    AddPlane(0, bytes * width + padding, height);
    // One chroma row per two image rows; a lone last column has a pair of its own.
    if (format == N3DS_FORMAT_NV21) AddPlane(1, (width + 1) / 2 * 2 + padding, (height + 1) / 2);
  }

  // The same descriptor and a copy of the bytes.
  TestImage(const TestImage& other) : descriptor_(other.descriptor_) {
    for (int p = 0; p < 2; ++p) {
      sizes_[p] = other.sizes_[p];
      if (other.planes_[p] == nullptr) continue;
      planes_[p] = std::make_unique<uint8_t[]>(sizes_[p]);
      std::copy_n(other.planes_[p].get(), sizes_[p], planes_[p].get());
      descriptor_.plane[p] = planes_[p].get();
    }
  }
  TestImage& operator=(const TestImage&) = delete;

  NSVL_OFFSCREEN* get() { return &descriptor_; }
  const NSVL_OFFSCREEN& descriptor() const { return descriptor_; }
  int width() const { return descriptor_.width; }
  int height() const { return descriptor_.height; }

  uint8_t* At(int plane, int byte, int row) {
    return planes_[plane].get() + static_cast<ptrdiff_t>(row) * descriptor_.pitch[plane] + byte;
  }
  // A pixel of four bytes.
  uint8_t* Pixel(int x, int y) { return At(0, 4 * x, y); }

  void Fill(uint8_t value) {
    for (int p = 0; p < 2; ++p) {
      if (planes_[p] != nullptr) std::fill_n(planes_[p].get(), sizes_[p], value);
    }
  }
  void Randomise(Random& random) {
    for (int p = 0; p < 2; ++p) {
      if (planes_[p] == nullptr) continue;
      std::generate_n(planes_[p].get(), sizes_[p],
                      [&] { return static_cast<uint8_t>(random.Next() >> 23); });
    }
  }

  // All bytes, padding included.
  std::vector<uint8_t> Bytes() const {
    std::vector<uint8_t> bytes;
    for (int p = 0; p < 2; ++p) {
      if (planes_[p] != nullptr) {
        bytes.insert(bytes.end(), planes_[p].get(), planes_[p].get() + sizes_[p]);
      }
    }
    return bytes;
  }

 private:
  void AddPlane(int plane, int pitch, int rows) {
    sizes_[plane] = static_cast<size_t>(pitch) * static_cast<size_t>(rows);
    planes_[plane] = std::make_unique<uint8_t[]>(sizes_[plane]);
    descriptor_.plane[plane] = planes_[plane].get();
    descriptor_.pitch[plane] = pitch;
  }

  NSVL_OFFSCREEN descriptor_ = {};
  std::unique_ptr<uint8_t[]> planes_[2];
  size_t sizes_[2] = {};
};

}  // namespace n3ds::testing
