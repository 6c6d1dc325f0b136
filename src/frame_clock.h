// SPDX-License-Identifier: MIT
// The times of an engine's frames.
#pragma once

#include <cstdint>

#include "norvale_3d_sticker_engine.h"

namespace n3ds {

class FrameClock {
 public:
  // Returns 0; -2, with nothing changed, for a time before the last frame.
  MRESULT SetNext(int64_t nanoseconds) {
    if (has_last_ && nanoseconds < last_) return N3DS_BAD_VALUE;
    next_ = nanoseconds;
    has_next_ = true;
    return N3DS_OK;
  }

  // Takes a frame: seconds since the one before, 1/30 where the host has told no times.
  double Advance() {
    constexpr int64_t kFrame = 33333333;
    constexpr double kSecond = 1e9;
    double seconds = 1.0 / 30;
    if (has_next_) {
      // Unsigned, since the two may lie further apart than a signed number holds.
      const uint64_t passed = static_cast<uint64_t>(next_) - static_cast<uint64_t>(last_);
      if (has_last_) seconds = static_cast<double>(passed) / kSecond;
      last_ = next_;
      has_last_ = true;
    } else if (has_last_) {
      last_ = last_ > INT64_MAX - kFrame ? INT64_MAX : last_ + kFrame;
    }
    has_next_ = false;
    now_ += seconds;
    return seconds;
  }

  // Seconds over all frames so far.
  double now() const { return now_; }

  void Reset() { *this = FrameClock(); }

 private:
  int64_t last_ = 0;
  int64_t next_ = 0;
  bool has_last_ = false;
  bool has_next_ = false;
  double now_ = 0;
};

}  // namespace n3ds
