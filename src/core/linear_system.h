// SPDX-License-Identifier: MIT
// A linear least-squares problem while it is being built.
#pragma once

#include <algorithm>
#include <cstddef>

#include "norvale_3d_sticker_core.h"
#include "platform/scratch_array.h"

namespace n3ds {

// rows x columns coefficients and a right-hand side, with values that are not set. False without
// memory.
class LinearSystem {
 public:
  LinearSystem(MHandle memory, int rows, int columns)
      : memory_(memory),
        rows_(rows),
        columns_(columns),
        coefficients_(memory, static_cast<size_t>(rows) * static_cast<size_t>(columns)),
        right_side_(memory, static_cast<size_t>(rows)) {}

  explicit operator bool() const { return coefficients_ && right_side_; }

  float* Row(int row) const { return coefficients_.get() + static_cast<ptrdiff_t>(row) * columns_; }
  float& RightSide(int row) const { return right_side_.get()[row]; }

  // Sets row `to` to what row `from` says.
  void CopyRow(int from, int to) const {
    std::copy_n(Row(from), columns_, Row(to));
    RightSide(to) = RightSide(from);
  }

  // Sets one row per coefficient, from `first` on, that pulls it toward zero (ridge).
  void SetRidge(int first, float weight) const {
    std::fill_n(Row(first), static_cast<ptrdiff_t>(columns_) * columns_, 0.0f);
    for (int k = 0; k < columns_; ++k) {
      Row(first + k)[k] = weight;
      RightSide(first + k) = 0.0f;
    }
  }

  // A singular system leaves the solution as it was.
  void Solve(float* solution) const {
    SolveLinearAxb(memory_, coefficients_.get(), rows_, columns_, solution, right_side_.get());
  }

 private:
  MHandle memory_;
  int rows_;
  int columns_;
  ScratchArray<float> coefficients_;
  ScratchArray<float> right_side_;
};

}  // namespace n3ds
